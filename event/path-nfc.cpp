#include "event/path-nfc.h"

#include <unicode/unorm2.h>
#include <unicode/ustring.h>

#include <cstring>

#include "utils/log.h"

namespace {

constexpr int32_t kMaxUnits = 4096;

// ASCII is normalized in every form. Only for what fits the buffer: a longer path is treated the
// same whatever it consists of.
bool IsShortAscii(const std::string& path) {
    if (path.size() > static_cast<size_t>(kMaxUnits)) return false;
    const char* data = path.data();
    size_t left = path.size();
    for (; left >= sizeof(uint64_t); left -= sizeof(uint64_t), data += sizeof(uint64_t)) {
        uint64_t word = 0;
        std::memcpy(&word, data, sizeof(word));
        if ((word & 0x8080808080808080ULL) != 0) return false;
    }
    for (; left > 0; --left, ++data) {
        if ((static_cast<unsigned char>(*data) & 0x80) != 0) return false;
    }
    return true;
}

}  // namespace

bool IsNfcPath(const std::string& path) {
    if (IsShortAscii(path)) return true;

    UChar units[kMaxUnits];
    int32_t length = 0;
    UErrorCode error = U_ZERO_ERROR;
    u_strFromUTF8(units, kMaxUnits, &length, path.c_str(), -1, &error);
    if (U_FAILURE(error)) {
        SLOG_ERR("Failed to u_strFromUTF8 for '%s'\n", path.c_str());
        return true;
    }
    // With the length that came out: a path that just fits leaves no room for a terminator.
    error = U_ZERO_ERROR;
    const UNormalizer2* const nfc = unorm2_getNFCInstance(&error);
    const UBool is_normalized = unorm2_isNormalized(nfc, units, length, &error);
    if (U_FAILURE(error)) {
        SLOG_ERR("Failed to test unorm_isNormalized NFC for '%s'\n", path.c_str());
        return true;
    }
    return is_normalized != 0;
}
