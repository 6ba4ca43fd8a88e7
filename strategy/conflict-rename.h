// Moves an entry aside under a new name that tells why and when: what has to make way at a
// destination is not deleted.
//
// The new name gets a suffix "_PRODUCT_TIME_REASON" before its extension, and a number after the
// suffix when the name is taken. Threads: any.
#pragma once

#include <string>

// Returns 0 or the negative code of FSRename; after a failure the entry is where it was.
int ConflictRename(const std::string& path, const char* product, const char* reason);

// Renames `path` within its folder to `name` without the blanks at its end; when that name is
// taken, with a suffix as above. Returns 0 or the negative code of FSRename.
int WhiteSpaceConflictRename(const std::string& path, const std::string& name, const char* product);
