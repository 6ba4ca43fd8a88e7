// The one way in which user data is deleted: into the share's recycle bin where it has one, else
// for good. What could not be moved to the bin stays where it is; it is never deleted instead. A
// share that does not tell whether it has a bin counts as one without.
//
// Without data; made on the stack for each use. Threads: any.
#pragma once

#include <string>

class RecycleBin {
public:
    // Removes a file, or a folder with all it holds. Returns 0 or -1. Refuses a path outside every
    // share, and the recycle bin itself and what lies in it.
    [[nodiscard]] int RemoveFile(const std::string& path, bool is_dir) const;
};
