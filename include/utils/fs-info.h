// The records of the file layer: what is known of one file.
#pragma once

#include <sys/stat.h>

#include <cstdint>
#include <string>

// The numbers are part of the interface: they are logged and compared.
enum FSType : int {
    FS_TYPE_UNKNOWN = 0,
    FS_TYPE_FILE = 1,
    FS_TYPE_DIR = 2,
    FS_TYPE_LINK = 3,
    FS_TYPE_DEVICE = 5,
    FS_TYPE_FIFO = 6,
    FS_TYPE_SOCKET = 7,
};

// The result of a stat. A fresh one is all empty and zero.
struct FSInfo {
    std::string path;      // as given
    std::string name;      // the last component
    std::string reserved;  // stays empty
    FSType type = FS_TYPE_UNKNOWN;
    // Whole seconds, the low 32 bits. A time before 1970 or after 2106 wraps; since every reading
    // wraps alike, equal times stay equal.
    uint32_t mtime = 0;
    uint64_t size = 0;
    bool exist = false;
    uint32_t uid = 0;
    uint32_t gid = 0;
    int64_t full_mtime = 0;  // the same time unwrapped: the one to hand on to FSUtime()
};

// What FSReadDir() tells of an entry.
struct FSDirEntry {
    std::string name;
    FSType type = FS_TYPE_UNKNOWN;
    uint32_t mtime = 0;  // as in FSInfo; 0 unless the folder was opened with FS_DIR_STAT
    uint64_t size = 0;   // likewise
};

// The type of a file from the mode bits of its stat, and from the type of a directory entry.
[[nodiscard]] FSType FSTypeFromMode(mode_t mode);
[[nodiscard]] FSType FSTypeFromDirent(unsigned char d_type);
