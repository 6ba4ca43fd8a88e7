#include "platform/utility.h"

#include <atomic>
#include <cctype>

#include "platform/keld-sdk-wrapper.h"
#include "utils/log.h"

namespace {

constexpr size_t kTimeTextSize = 1024;

std::atomic<bool> g_is_device_supported = false;

}  // namespace

bool IsValidID(uint64_t id) { return id != 0; }

std::string ToLower(const std::string& text) {
    std::string lower = text;
    for (char& c : lower) c = static_cast<char>(tolower(static_cast<unsigned char>(c)));
    return lower;
}

void InitDeviceSupport() {
    g_is_device_supported = SDK::HasCapability("sdferrix") || SDK::HasCapability("ferrix");
}

bool IsDeviceSupported() { return g_is_device_supported; }

int GetTimeString(const struct tm& time, const char* format, std::string& out) {
    char text[kTimeTextSize];
    // Callers' formats are checked by the attribute of this function.
#pragma GCC diagnostic push
#pragma GCC diagnostic ignored "-Wformat-nonliteral"
    const size_t length = strftime(text, sizeof(text), format, &time);
#pragma GCC diagnostic pop
    if (length == 0) {
        SLOG_ERR("Failed to strftime\n");
        return -1;
    }
    out.assign(text, length);
    return 0;
}
