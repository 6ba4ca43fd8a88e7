// Moves one file or folder of a share into the share's recycle bin.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "utils/unique-fd.h"

namespace keld_host {

// Serves one move. Not thread-safe, but any number of objects may work on one bin at once.
class RecycleMove {
public:
    // `is_admin_only` decides the mode of a bin that has to be made.
    RecycleMove(std::string share_path, bool is_admin_only)
        : m_share_path(std::move(share_path)), m_is_admin_only(is_admin_only) {}

    // Moves `relative_path`, which has to be a folder or must not be one. Returns 0 or a KELDERR
    // value; after a failure what was to be moved stands where it was.
    [[nodiscard]] int Run(std::string_view relative_path, bool is_folder);

private:
    // Each of the ints below is 0 or an errno, if not said otherwise.
    [[nodiscard]] bool SplitPath(std::string_view relative_path);
    [[nodiscard]] int OpenSource();
    [[nodiscard]] int FindSource(bool is_folder) const;
    [[nodiscard]] bool IsBinItself() const;
    [[nodiscard]] UniqueFd OpenBin() const;
    [[nodiscard]] int OpenTarget(int bin_fd);
    [[nodiscard]] int MoveToTarget() const;
    [[nodiscard]] int MoveTo(const std::string& name) const;
    [[nodiscard]] int MoveOverPlaceholder(const std::string& name) const;
    [[nodiscard]] std::string FreeName() const;

    const std::string m_share_path;
    const bool m_is_admin_only;
    std::vector<std::string> m_folders;  // components of the path but the last
    std::string m_name;                  // the last
    bool m_is_folder = false;
    UniqueFd m_root;    // of the share
    UniqueFd m_source;  // the folder that holds what is to be moved
    UniqueFd m_target;  // the folder of the bin that it goes to
};

}  // namespace keld_host
