// One row of a file database: what became of one entry of the source.
#pragma once

#include <cstdint>
#include <string>

// The numbers are stored: they are never renumbered.
enum FileInfoType : int32_t {
    FILE_INFO_FILE = 0,
    FILE_INFO_DIR = 1,
};

// Both paths are relative to the roots of the task and start with "/". The destination of a folder
// that was not made is empty.
struct FileInfo {
    std::string source_path;
    std::string destination_path;
    int32_t file_type = FILE_INFO_FILE;
    uint64_t size = 0;
    uint32_t mtime = 0;
};
