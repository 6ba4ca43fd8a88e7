// Moves a file or a folder into the recycle bin of its share.
//
// Threads: any; the lock of the layer is held for the call.
#pragma once

#include <string>

#include "platform/sdk-system.h"

namespace SDK {

// `share_path` is the share's root, `relative_path` what is to be moved, below it. With
// `is_admin_only` a bin that has to be made is for administrators alone. 0, or -1 with the
// platform's error; what could not be moved stays where it is.
[[nodiscard]] int RecycleFile(const std::string& share_path, const std::string& relative_path,
                              PlatformError& error);
[[nodiscard]] int RecycleDir(const std::string& share_path, const std::string& relative_path,
                             bool is_admin_only, PlatformError& error);

}  // namespace SDK
