// host.conf for a program that changes it.
//
// Threads: an object belongs to one thread; several threads and processes may each have one, and
// wait for each other. Results are 0 or an errno.
#pragma once

#include <sys/stat.h>

#include <string>

#include "utils/unique-fd.h"

namespace keld_host {

class HostConfFile {
public:
    // Reads the file; a missing one is an empty text. With `forChange`, waits first until no other
    // such program is at it, and keeps them from it until this object goes. A missing file is not
    // locked: it is never made here.
    [[nodiscard]] int Open(bool forChange);

    [[nodiscard]] const std::string& Text() const { return m_text; }
    // What CanReplace and Replace change: where a link at the file's name leads.
    [[nodiscard]] const std::string& Path() const { return m_path; }

    // Whether the folder takes a new file, as far as that can be told beforehand.
    [[nodiscard]] int CanReplace() const;
    // Puts the text in place whole and flushed; mode and owner of the file stay. After a failure
    // the file holds what it held, as far as the disk allows.
    [[nodiscard]] int Replace(const std::string& text);

private:
    [[nodiscard]] int Lock();
    [[nodiscard]] int Put(const std::string& text) const;

    UniqueFd m_lock;
    std::string m_path;
    std::string m_text;
    struct stat m_info {};
};

}  // namespace keld_host
