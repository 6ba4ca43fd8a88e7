// A file that is written beside its final place and put there in one step.
#pragma once

#include <sys/types.h>

#include <string>

#include "utils/unique-fd.h"

namespace keld_host {

// Unnamed where the file system can, else under a temporary name. An object that was not placed
// leaves nothing behind. Not thread-safe.
class NewFile {
public:
    // `dir_fd` is the open folder (O_PATH will do) and must stay open; AT_FDCWD is none.
    explicit NewFile(int dir_fd) : m_dir_fd(dir_fd) {}
    ~NewFile();
    NewFile(const NewFile&) = delete;
    NewFile& operator=(const NewFile&) = delete;

    // Makes the file, open for writing: with `mode` if it is unnamed, so that nobody else can open
    // it yet, else with 0600. The umask and the folder's defaults apply. Returns 0 or a KELDERR
    // value.
    [[nodiscard]] int Create(mode_t mode);
    [[nodiscard]] int Fd() const { return m_file.Get(); }
    // Gives it the name `name` in the folder and closes it. An existing regular file is replaced if
    // `may_replace`, else the answer is KELDERR_DST_EXISTS; anything else there is
    // KELDERR_DST_TYPE_CONFLICT. Returns 0 or a KELDERR value; after a failure the name is what it
    // was.
    [[nodiscard]] int Place(const char* name, bool may_replace);

private:
    [[nodiscard]] int CreateNamed();
    [[nodiscard]] int PlaceUnnamed(const char* name, bool may_replace);
    [[nodiscard]] int PlaceNamed(const char* name, bool may_replace);
    [[nodiscard]] int Link(const char* name) const;
    [[nodiscard]] int LinkTemporarily();
    [[nodiscard]] int RenameError(int error) const;

    const int m_dir_fd;
    UniqueFd m_file;
    std::string m_temp_name;  // empty while the file has no name
};

// What stands under a name, as a copy sees it: KELDERR_SUCCESS nothing, KELDERR_DST_EXISTS a
// regular file, KELDERR_DST_TYPE_CONFLICT anything else, or what looking met.
[[nodiscard]] int LookAtDestination(int dir_fd, const char* name);

}  // namespace keld_host
