#include "ipc/pobject.h"

#include <cstdlib>
#include <cstring>
#include <new>
#include <stdexcept>
#include <utility>

// The payload of an array or a map. The link lets a whole tree be taken apart without recursion and
// without memory: what still waits to be freed hangs on one chain.
struct PObject::ContainerPayload {
    explicit ContainerPayload(Kind payload_kind) : kind(payload_kind) {}
    ContainerPayload* next = nullptr;
    Kind kind;
};

struct PObject::ArrayPayload : ContainerPayload {
    ArrayPayload() : ContainerPayload(KIND_ARRAY) {}
    explicit ArrayPayload(const array_type& other) : ContainerPayload(KIND_ARRAY), items(other) {}
    array_type items;
};

struct PObject::MapPayload : ContainerPayload {
    MapPayload() : ContainerPayload(KIND_MAP) {}
    explicit MapPayload(const map_type& other) : ContainerPayload(KIND_MAP), items(other) {}
    map_type items;
};

// One block with its bytes behind it.
struct PObject::StringPayload {
    size_t length;

    [[nodiscard]] static StringPayload* New(std::string_view text) {
        void* block = ::operator new(sizeof(StringPayload) + text.size());
        auto* payload = new (block) StringPayload{text.size()};
        if (!text.empty()) std::memcpy(payload + 1, text.data(), text.size());
        return payload;
    }
    [[nodiscard]] std::string_view View() const {
        return {reinterpret_cast<const char*>(this + 1), length};
    }
};

constinit const PObject PObject::empty_object;
const PObject::array_type PObject::empty_array;
const PObject::map_type PObject::empty_map;
const PObject::binary_type PObject::empty_binary;
const PObject::buffer_type PObject::empty_buffer;

void PObject::binary_type::Clear() {
    offset = 0;
    length = 0;
    path.clear();
}

PObject::buffer_type::buffer_type(const buffer_type& other) { *this = other; }

PObject::buffer_type& PObject::buffer_type::operator=(const buffer_type& other) {
    if (this != &other && Assign(other.m_data, other.m_length) != 0) Clear();
    return *this;
}

PObject::buffer_type::~buffer_type() { std::free(m_data); }

int PObject::buffer_type::Reserve(uint16_t n) {
    if (m_capacity >= n && 2U * n >= m_capacity) return 0;
    void* block = std::realloc(m_data, n == 0 ? 1 : n);  // realloc(p, 0) frees or does not
    if (block == nullptr) return -1;
    m_data = block;
    m_capacity = n;
    if (m_length > n) m_length = n;
    return 0;
}

void PObject::buffer_type::Clear() {
    if (m_data == nullptr) return;
    std::memset(m_data, 0, m_capacity);
    m_length = 0;
}

int PObject::buffer_type::Assign(const void* bytes, uint16_t n) {
    if (Reserve(n) != 0) return -1;
    Clear();
    if (n != 0) std::memcpy(m_data, bytes, n);
    m_length = n;
    return 0;
}

PObject::PObject(const char* text)
    : PObject(text != nullptr ? std::string_view(text) : std::string_view()) {}

PObject::PObject(const std::string& text) : PObject(std::string_view(text)) {}

PObject::PObject(std::string_view text) : PObject(KIND_STRING, StringPayload::New(text)) {}

PObject::PObject(const buffer_type& buffer) : PObject(KIND_BUFFER, new buffer_type(buffer)) {}

PObject& PObject::operator=(const binary_type& binary) {
    return *this = PObject(KIND_BINARY, new binary_type(binary));
}

PObject& PObject::operator=(const array_type& array) {
    return *this = PObject(KIND_ARRAY, static_cast<ContainerPayload*>(new ArrayPayload(array)));
}

PObject& PObject::operator=(const map_type& map) {
    return *this = PObject(KIND_MAP, static_cast<ContainerPayload*>(new MapPayload(map)));
}

PObject PObject::ShallowCopy(const PObject& other) {
    switch (other.m_kind) {
        case KIND_ARRAY:
            return {KIND_ARRAY, static_cast<ContainerPayload*>(new ArrayPayload)};
        case KIND_MAP:
            return {KIND_MAP, static_cast<ContainerPayload*>(new MapPayload)};
        case KIND_STRING:
            return PObject(other.StringView());
        case KIND_BINARY:
            return {KIND_BINARY, new binary_type(other.AsBinary())};
        case KIND_BUFFER:
            return {KIND_BUFFER, new buffer_type(other.AsBuffer())};
        case KIND_INTEGER:
            return PObject(other.m_payload.integer);
        case KIND_NULL:
            break;
    }
    return {};
}

// The containers that wait to be filled stand on a stack. Their targets keep their place meanwhile:
// an array gets its full size at once, and a map's entries do not move.
PObject::PObject(const PObject& other) : PObject(ShallowCopy(other)) {
    if (!other.IsContainer()) return;
    std::vector<std::pair<const PObject*, PObject*>> pending = {
        {&other, this}
    };
    while (!pending.empty()) {
        const auto [source, target] = pending.back();
        pending.pop_back();
        if (source->IsArray()) {
            array_type& to = target->AsArray();
            to.reserve(source->AsArray().size());
            for (const PObject& from : source->AsArray()) {
                to.push_back(ShallowCopy(from));
                if (from.IsContainer()) pending.emplace_back(&from, &to.back());
            }
        } else {
            map_type& to = target->AsMap();
            for (const auto& [key, from] : source->AsMap()) {
                PObject& member = to.try_emplace(to.end(), key, ShallowCopy(from))->second;
                if (from.IsContainer()) pending.emplace_back(&from, &member);
            }
        }
    }
}

void PObject::DestroyLeaf() noexcept {
    switch (m_kind) {
        case KIND_STRING:
            ::operator delete(m_payload.block);
            break;
        case KIND_BINARY:
            delete static_cast<binary_type*>(m_payload.block);
            break;
        case KIND_BUFFER:
            delete static_cast<buffer_type*>(m_payload.block);
            break;
        default:
            break;
    }
    m_kind = KIND_NULL;
}

PObject::ContainerPayload* PObject::ReleaseContainer() noexcept {
    auto* payload = static_cast<ContainerPayload*>(m_payload.block);
    m_kind = KIND_NULL;
    return payload;
}

void PObject::Destroy() noexcept {
    if (!IsContainer()) {
        DestroyLeaf();
        return;
    }
    ContainerPayload* pending = ReleaseContainer();
    const auto take_out = [&pending](PObject& child) {
        if (!child.IsContainer()) return;
        ContainerPayload* payload = child.ReleaseContainer();
        payload->next = pending;
        pending = payload;
    };
    while (pending != nullptr) {
        ContainerPayload* payload = pending;
        pending = payload->next;
        if (payload->kind == KIND_ARRAY) {
            auto* array = static_cast<ArrayPayload*>(payload);
            for (PObject& child : array->items) take_out(child);
            delete array;  // holds leaves only
        } else {
            auto* map = static_cast<MapPayload*>(payload);
            for (auto& [key, child] : map->items) take_out(child);
            delete map;
        }
    }
}

bool PObject::IsEmpty() const {
    switch (m_kind) {
        case KIND_NULL:
            return true;
        case KIND_ARRAY:
            return AsArray().empty();
        case KIND_MAP:
            return AsMap().empty();
        case KIND_INTEGER:
            return false;
        case KIND_STRING:
            return StringView().empty();
        case KIND_BINARY:
            return AsBinary().IsEmpty();
        case KIND_BUFFER:
            return AsBuffer().IsEmpty();
    }
    return true;
}

bool PObject::HasMember(std::string_view key) const {
    return IsMap() && AsMap().find(key) != AsMap().end();
}

bool PObject::AsBool() const { return IsInteger() ? AsUInt64() != 0 : !IsEmpty(); }

std::string PObject::AsString() const {
    if (IsInteger()) return std::to_string(AsUInt32());
    return std::string(StringView());
}

std::string_view PObject::StringView() const {
    if (!IsString()) return {};
    return static_cast<const StringPayload*>(m_payload.block)->View();
}

const PObject::array_type& PObject::AsArray() const {
    if (!IsArray()) return empty_array;
    return static_cast<const ArrayPayload*>(static_cast<const ContainerPayload*>(m_payload.block))
        ->items;
}

const PObject::map_type& PObject::AsMap() const {
    if (!IsMap()) return empty_map;
    return static_cast<const MapPayload*>(static_cast<const ContainerPayload*>(m_payload.block))
        ->items;
}

const PObject::binary_type& PObject::AsBinary() const {
    return IsBinary() ? *static_cast<const binary_type*>(m_payload.block) : empty_binary;
}

const PObject::buffer_type& PObject::AsBuffer() const {
    return IsBuffer() ? *static_cast<const buffer_type*>(m_payload.block) : empty_buffer;
}

PObject::array_type& PObject::AsArray() {
    if (!IsArray()) *this = empty_array;
    return static_cast<ArrayPayload*>(static_cast<ContainerPayload*>(m_payload.block))->items;
}

PObject::map_type& PObject::AsMap() {
    if (!IsMap()) *this = empty_map;
    return static_cast<MapPayload*>(static_cast<ContainerPayload*>(m_payload.block))->items;
}

PObject::binary_type& PObject::AsBinary() {
    if (!IsBinary()) *this = empty_binary;
    return *static_cast<binary_type*>(m_payload.block);
}

PObject::buffer_type& PObject::AsBuffer() {
    if (!IsBuffer()) *this = empty_buffer;
    return *static_cast<buffer_type*>(m_payload.block);
}

const PObject& PObject::operator[](std::string_view key) const {
    const map_type& members = AsMap();
    const auto member = members.find(key);
    return member != members.end() ? member->second : empty_object;
}

PObject& PObject::operator[](std::string_view key) {
    map_type& members = AsMap();
    const auto member = members.lower_bound(key);
    if (member != members.end() && member->first == key) return member->second;
    return members.try_emplace(member, std::string(key))->second;
}

const PObject& PObject::operator[](int index) const {
    const auto position = static_cast<size_t>(static_cast<unsigned>(index));
    if (IsArray()) return position < AsArray().size() ? AsArray()[position] : empty_object;
    if (index < 0 || position >= AsMap().size()) return empty_object;
    return std::next(AsMap().begin(), index)->second;
}

PObject& PObject::operator[](int index) {
    if (!IsMap() || index < 0 || static_cast<size_t>(index) >= AsMap().size()) {
        throw std::out_of_range("out_of_range: PObject::operator[]");
    }
    return std::next(AsMap().begin(), index)->second;
}
