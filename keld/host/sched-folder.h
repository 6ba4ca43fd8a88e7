// Folders of the scheduler's files.
#pragma once

#include <string>

namespace keld_host {

// Makes a folder and its parents, each with mode 0755 whatever the umask is; existing ones are left
// as they are. Returns 0 or an errno.
[[nodiscard]] int MakeFolders(const std::string& path);

}  // namespace keld_host
