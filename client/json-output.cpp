#include "client/json-output.h"

#include <json/writer.h>
#include <unicode/utf16.h>
#include <unicode/utf8.h>

#include <algorithm>
#include <iostream>

#include "client/text.h"
#include "ipc/pobject.h"

namespace {

// Sent as 0 or 1, since the wire knows no truth values.
constexpr std::string_view TRUTH_KEYS[] = {
    "keep_dir_structure", "smart_create_date_dir", "rename_photo_video", "remove_src_file",
    "enable_rotation",    "is_default_task",       "run_when_plug_in",   "eject_when_task_done",
    "is_usb_mounted",     "is_hub_mounted",        "is_task_runnable",
};

void AppendEscape(std::string& text, unsigned unit) {
    constexpr char HEX[] = "0123456789abcdef";
    text += {'\\', 'u', HEX[unit >> 12], HEX[unit >> 8 & 15], HEX[unit >> 4 & 15], HEX[unit & 15]};
}

// What a terminal would obey stands in strings only, where an escape means the same. The writer
// itself escapes no more than the controls of ASCII.
std::string WithEscapes(std::string_view json) {
    constexpr UChar32 REPLACEMENT = 0xFFFD;
    std::string text;
    const int32_t length = static_cast<int32_t>(json.size());
    for (int32_t at = 0; at < length;) {
        const int32_t begin = at;
        UChar32 c = 0;
        U8_NEXT(json.data(), at, length, c);
        const std::string_view character =
            json.substr(static_cast<size_t>(begin), static_cast<size_t>(at - begin));
        if (c < 0) c = REPLACEMENT;
        if (c == '\n' || (c >= ' ' && c <= '~') || Printable(character) == character) {
            text += character;
        } else if (c <= 0xFFFF) {
            AppendEscape(text, static_cast<unsigned>(c));
        } else {
            AppendEscape(text, static_cast<unsigned>(U16_LEAD(c)));
            AppendEscape(text, static_cast<unsigned>(U16_TRAIL(c)));
        }
    }
    return text;
}

std::string Write(const Json::Value& value, const char* indentation) {
    Json::StreamWriterBuilder builder;
    builder["indentation"] = indentation;
    builder["emitUTF8"] = true;
    return WithEscapes(Json::writeString(builder, value));
}

}  // namespace

Json::Value JsonText(std::string_view bytes) {
    std::string text;
    const int32_t length = static_cast<int32_t>(bytes.size());
    for (int32_t at = 0; at < length;) {
        const int32_t begin = at;
        UChar32 c = 0;
        U8_NEXT(bytes.data(), at, length, c);
        if (c < 0) {
            text += "\xEF\xBF\xBD";
        } else {
            text.append(bytes, static_cast<size_t>(begin), static_cast<size_t>(at - begin));
        }
    }
    return text;
}

Json::Value ToJson(const PObject& value) {
    switch (value.GetKind()) {
        case PObject::KIND_MAP: {
            Json::Value json(Json::objectValue);
            for (const auto& [key, member] : value.AsMap()) {
                const bool is_truth = std::find(std::begin(TRUTH_KEYS), std::end(TRUTH_KEYS),
                                                key) != std::end(TRUTH_KEYS);
                json[JsonText(key).asString()] =
                    is_truth ? Json::Value(member.AsBool()) : ToJson(member);
            }
            return json;
        }
        case PObject::KIND_ARRAY: {
            Json::Value json(Json::arrayValue);
            for (const PObject& element : value.AsArray()) json.append(ToJson(element));
            return json;
        }
        case PObject::KIND_INTEGER:
            return Json::Value(static_cast<Json::Int64>(value.AsInt64()));
        case PObject::KIND_STRING:
            return JsonText(value.StringView());
        default:
            return {};
    }
}

void PrintJson(const Json::Value& value) { std::cout << Write(value, "  ") << '\n'; }

std::string JsonLine(const Json::Value& value) { return Write(value, ""); }
