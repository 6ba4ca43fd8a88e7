// Makes sure that a copy is on the disk and equals its source, and that the source is still the one
// that was compared, before the source goes.
//
// Below a registered root no symbolic link is followed (utils/confined-path.h).
// Threads: any, without locks. Failures are logged where they happen.
#pragma once

#include <sys/stat.h>

#include <atomic>
#include <string>

#include "utils/unique-fd.h"

// Flushes the file, and the entries of the folders that lead to it from `root` on: after that it is
// found after a power cut. 0; -1 when a flush failed: a second one would not tell the truth.
[[nodiscard]] int FSFlushFile(const std::string& path, const std::string& root);

enum FSCompareResult : int {
    FS_COMPARE_EQUAL = 0,
    FS_COMPARE_DIFFERENT = 1,
    FS_COMPARE_SOURCE_FAILED = 2,  // the source could not be read
    FS_COMPARE_COPY_FAILED = 3,    // the copy could not be read
    FS_COMPARE_ABORTED = 4,        // the abort flag was set
};

// Reads the copy back from the medium, past the page cache as far as the system allows it, and
// compares it byte by byte with the source. The copy must have been flushed. Memory is fixed.
// `abort_flag` may be null.
[[nodiscard]] FSCompareResult FSCompareOnMedium(const std::string& source, const std::string& copy,
                                                const std::atomic<int>* abort_flag);

// Which file stood under a path, and in what state: tells later whether somebody has written to it,
// or put another in its place. Writes show as far as the clock of the file system tells them apart.
class FileIdentity {
public:
    // 0; -1 on failure, and then no path leads to it.
    [[nodiscard]] int Take(const std::string& path);
    // Whether the path leads to the same file, in the same state.
    [[nodiscard]] bool IsAt(const std::string& path) const;

private:
    UniqueFd m_file;  // as long as it is open, its number is given to no other file
    struct stat m_state {};
};
