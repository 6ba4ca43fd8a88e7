// Numbered newcomers and folders of a recycle bin.
#pragma once

#include <string>
#include <string_view>

#include "utils/unique-fd.h"

namespace keld_host {

// The name for newcomer `number` of the name `name` in the open folder `dir_fd`: as NumberedName,
// cut only if the file system there takes no longer one.
[[nodiscard]] std::string NumberedNameIn(int dir_fd, std::string_view name, unsigned number,
                                         bool is_folder);

// Opens (O_PATH) the folder `name` in the open folder `dir_fd`, made with the owner and mode of the
// folder `like_fd` when it is missing. If anything else has the name, even a link to a folder, a
// numbered folder takes its place. Returns a descriptor, or none with errno.
[[nodiscard]] UniqueFd EnterRecycleFolder(int dir_fd, const std::string& name, int like_fd);

}  // namespace keld_host
