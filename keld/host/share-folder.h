// The folder of a share, made, renamed or removed. Nothing that is there is ever lost by it, and
// what is done is on the disk.
//
// Paths are absolute. Results are 0 or an errno; after a failure all is as it was, as far as the
// disk allows: an empty folder that is removed is not made again.
#pragma once

#include <string>

namespace keld_host {

// Its parent has to be there. A folder that exists is kept as it is, and `wasMade` false; ENOTDIR
// for anything else of that name, a link too.
[[nodiscard]] int MakeShareFolder(const std::string& path, bool& wasMade);
// Within one folder. EEXIST when there is anything under the new name.
[[nodiscard]] int RenameShareFolder(const std::string& from, const std::string& to);
// ENOTEMPTY unless the folder is empty.
[[nodiscard]] int RemoveShareFolder(const std::string& path);

}  // namespace keld_host
