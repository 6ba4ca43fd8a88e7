// Stands between the program and readdir(): an entry is listed under another name than the one that
// finds it, as on a file system that ignores case.
#pragma once

#include <string>

class OtherSpelling {
public:
    // In the folders from `root` on. Both names have one length. One object at a time.
    OtherSpelling(std::string root, std::string found, std::string listed);
    ~OtherSpelling();
    OtherSpelling(const OtherSpelling&) = delete;
    OtherSpelling& operator=(const OtherSpelling&) = delete;
};
