// Stands between the program and readdir() and fdopendir(): a folder breaks in the middle of its
// listing or cannot be opened, as on a dying disk.
#pragma once

class BreakListing {
public:
    // The call after `entries` more ones fails, and no other.
    explicit BreakListing(int entries);
    ~BreakListing();
    BreakListing(const BreakListing&) = delete;
    BreakListing& operator=(const BreakListing&) = delete;
};

class CloseFolder {
public:
    // The folder that is opened after `folders` more ones fails with `error`, and no other.
    CloseFolder(int folders, int error);
    ~CloseFolder();
    CloseFolder(const CloseFolder&) = delete;
    CloseFolder& operator=(const CloseFolder&) = delete;
};
