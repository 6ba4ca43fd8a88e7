// Makes system calls of this program fail on demand: the functions stand in for the C library's.
// Threads: set while no other thread makes such calls.
#pragma once

// From now on: the call after `after` more ones of this name fails, and those behind it, with
// `error`. The destructor ends it.
class FailReadDir {
public:
    FailReadDir(int after, int error);
    ~FailReadDir();
    FailReadDir(const FailReadDir&) = delete;
    FailReadDir& operator=(const FailReadDir&) = delete;
};

class FailFsync {
public:
    explicit FailFsync(int error);
    ~FailFsync();
    FailFsync(const FailFsync&) = delete;
    FailFsync& operator=(const FailFsync&) = delete;
};

// Directory entries come without a type, as from file systems that do not keep it there.
class HideDirTypes {
public:
    HideDirTypes();
    ~HideDirTypes();
    HideDirTypes(const HideDirTypes&) = delete;
    HideDirTypes& operator=(const HideDirTypes&) = delete;
};

// Runs after each entry that readdir() has found while it lives.
class OnReadDir {
public:
    explicit OnReadDir(void (*action)(const char* name));
    ~OnReadDir();
    OnReadDir(const OnReadDir&) = delete;
    OnReadDir& operator=(const OnReadDir&) = delete;
};
