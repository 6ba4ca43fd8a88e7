// Stands between the program and readdir(): a folder breaks in the middle of its listing, as on a
// dying disk.
#pragma once

class BreakListing {
public:
    // The call after `entries` more ones fails, and no other.
    explicit BreakListing(int entries);
    ~BreakListing();
    BreakListing(const BreakListing&) = delete;
    BreakListing& operator=(const BreakListing&) = delete;
};
