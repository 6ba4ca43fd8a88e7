// Texts of requests.
#pragma once

#include <string>

class PObject;

// A text of the request up to its first NUL byte: that much of it is stored, and that much is the
// name of a file. A check of the whole could be talked past by what stands behind the byte.
[[nodiscard]] std::string RequestText(const PObject& request, const char* key);
