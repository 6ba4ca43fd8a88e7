// The entry check of event paths.
#pragma once

#include <string>

// True when the UTF-8 path is in Unicode NFC form. It fails open: what cannot be tested (no UTF-8,
// or longer than 4096 UTF-16 units) is logged and counts as normalized. Any thread.
[[nodiscard]] bool IsNfcPath(const std::string& path);
