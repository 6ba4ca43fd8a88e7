// Tells which names may be spellings of one and the same name. Threads: any.
#pragma once

#include <string>
#include <string_view>

// A text that is equal for all names that some file system takes for the same: it leaves out the
// difference of upper and lower case, that of the Unicode normal forms, and dots and blanks at the
// end. Equal keys are no proof: few file systems do all of that, and most do none of it.
[[nodiscard]] std::string SpellingKey(std::string_view name);
// The name without the dots and blanks at its end, which some file systems do not keep.
[[nodiscard]] std::string_view WithoutTail(std::string_view name);
