// PObject::ToText.
#include <charconv>

#include "ipc/pobject.h"

namespace {

void AppendNumber(std::string& out, uint64_t value) {
    char digits[20];
    const auto result = std::to_chars(digits, digits + sizeof(digits), value);
    out.append(digits, result.ptr);
}

void AppendQuoted(std::string& out, std::string_view bytes) {
    out += '"';
    out += bytes;
    out += '"';
}

void AppendBinary(std::string& out, const PObject::binary_type& binary) {
    out += "{offset: ";
    AppendNumber(out, binary.offset);
    out += ", length: ";
    AppendNumber(out, binary.length);
    out += ", path: ";
    AppendQuoted(out, binary.path);
    out += '}';
}

void AppendBuffer(std::string& out, const PObject::buffer_type& buffer) {
    out += "{data_length: ";
    AppendNumber(out, buffer.Length());
    out += ", }";  // the separator is followed by nothing: part of the format
}

void AppendLeaf(std::string& out, const PObject& value) {
    switch (value.GetKind()) {
        case PObject::KIND_STRING:
            return AppendQuoted(out, value.StringView());
        case PObject::KIND_INTEGER:
            return AppendNumber(out, value.AsUInt64());
        case PObject::KIND_BINARY:
            return AppendBinary(out, value.AsBinary());
        case PObject::KIND_BUFFER:
            return AppendBuffer(out, value.AsBuffer());
        default:
            out += "null";
    }
}

// A container whose children are being written.
struct Level {
    explicit Level(const PObject& value) : container(&value), next_entry(value.AsMap().begin()) {}
    const PObject* container;
    size_t next_element = 0;
    PObject::map_type::const_iterator next_entry;
};

// The next child with what stands before it, or nullptr at the end.
const PObject* NextChild(std::string& out, Level& level) {
    if (level.container->IsArray()) {
        const auto& elements = level.container->AsArray();
        if (level.next_element == elements.size()) return nullptr;
        if (level.next_element != 0) out += ", ";
        return &elements[level.next_element++];
    }
    const auto& entries = level.container->AsMap();
    if (level.next_entry == entries.end()) return nullptr;
    if (level.next_entry != entries.begin()) out += ", ";
    AppendQuoted(out, level.next_entry->first);
    out += ": ";
    return &(level.next_entry++)->second;
}

}  // namespace

std::string PObject::ToText() const {
    std::string out;
    std::vector<Level> levels;
    for (const PObject* value = this;;) {
        if (value->IsContainer()) {
            out += value->IsMap() ? '{' : '[';
            levels.emplace_back(*value);
        } else {
            AppendLeaf(out, *value);
        }
        value = nullptr;
        while (!levels.empty() && (value = NextChild(out, levels.back())) == nullptr) {
            out += levels.back().container->IsMap() ? '}' : ']';
            levels.pop_back();
        }
        if (value == nullptr) return out;
    }
}
