#include "platform/request-setting.h"

#include <cstring>

#include "ipc/pobject.h"

// A missing key reads as the empty value of the type.

bool GetChangedString(const PObject& request, const std::string& key, const std::string& old_value,
                      std::string& value) {
    // Up to the first NUL byte: that much of a text is stored.
    std::string sent = request[key].AsString();
    sent.resize(std::strlen(sent.c_str()));
    const bool is_changed = !sent.empty() && sent != old_value;
    value = sent;
    return is_changed;
}

bool GetChangedBool(const PObject& request, const std::string& key, bool old_value, bool& value) {
    value = request[key].AsBool();
    return request.HasMember(key) && value != old_value;
}

bool GetChangedInt(const PObject& request, const std::string& key, int old_value, int& value) {
    value = request[key].AsInt32();
    return request.HasMember(key) && value != old_value;
}

bool GetChangedUInt64(const PObject& request, const std::string& key, uint64_t old_value,
                      uint64_t& value) {
    value = request[key].AsUInt64();
    return request.HasMember(key) && value != old_value;
}
