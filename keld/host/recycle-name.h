// Numbered names for newcomers in a recycle bin.
#pragma once

#include <string>
#include <string_view>

namespace keld_host {

// "a.txt" with 2 gives "a (2).txt"; a name without an extension, and a folder's, "a (2)". With
// `max_bytes` other than 0 the part before the number is cut so that the whole has no more bytes,
// never in the middle of a UTF-8 character; an extension that leaves no room for it is given up.
[[nodiscard]] std::string NumberedName(std::string_view name, unsigned number, bool is_folder,
                                       size_t max_bytes = 0);

}  // namespace keld_host
