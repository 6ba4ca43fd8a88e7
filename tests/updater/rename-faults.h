// Makes renames and removals of this program fail on demand, and flushes after them: the functions
// stand in for the C library's. A name is told by its end.
// Threads: set while no other thread makes such calls; one object of each class at a time.
#pragma once

#include <string>

// Renames to such a name fail with this error.
class FailRename {
public:
    enum Which { ANY, WITH_FLAGS };

    FailRename(std::string new_name, int error, Which which = ANY);
    ~FailRename();
    FailRename(const FailRename&) = delete;
    FailRename& operator=(const FailRename&) = delete;
};

// The removal of such a file fails.
class FailUnlink {
public:
    explicit FailUnlink(std::string name);
    ~FailUnlink();
    FailUnlink(const FailUnlink&) = delete;
    FailUnlink& operator=(const FailUnlink&) = delete;
};

// Flushes fail from the first rename to such a name on.
class FailFlushAfterRename {
public:
    explicit FailFlushAfterRename(std::string new_name);
    ~FailFlushAfterRename();
    FailFlushAfterRename(const FailFlushAfterRename&) = delete;
    FailFlushAfterRename& operator=(const FailFlushAfterRename&) = delete;
};
