// The one self-describing value of all messages: a tree of nulls, arrays, maps, integers, strings,
// binaries and buffers.
//
// Ownership: a plain owning value; a copy is a copy of the whole tree, nothing is shared.
// Threads: no lock; each thread works on values of its own. The empty constants are never written.
// Results: a const read of what is not there gives an empty constant, 0 or an empty string, never
// an error. Strings and keys are bytes and may hold any of them.
// Depth: no operation is recursive, so that a value may be nested a million levels deep.
#pragma once

#include <concepts>
#include <cstddef>
#include <cstdint>
#include <map>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

class PObject {
public:
    // The numbers never leave the process; the wire has its own tags.
    enum Kind : int32_t {
        KIND_NULL = 0,
        KIND_ARRAY = 1,
        KIND_MAP = 2,
        KIND_INTEGER = 3,
        KIND_STRING = 4,
        KIND_BINARY = 5,
        KIND_BUFFER = 6,
    };

    using array_type = std::vector<PObject>;
    // Byte-wise order, found without a call for two keys that differ early.
    struct KeyLess {
        using is_transparent = void;
        bool operator()(std::string_view a, std::string_view b) const {
            const size_t common = a.size() < b.size() ? a.size() : b.size();
            for (size_t i = 0; i < common && i < 8; ++i) {
                if (a[i] != b[i]) {
                    return static_cast<unsigned char>(a[i]) < static_cast<unsigned char>(b[i]);
                }
            }
            return a < b;
        }
    };
    using map_type = std::map<std::string, PObject, KeyLess>;

    // A stretch of a file, not its bytes.
    struct binary_type {
        uint64_t offset = 0;
        uint64_t length = 0;
        std::string path;

        void Clear();
        [[nodiscard]] bool IsEmpty() const { return path.empty(); }
    };

    // A small block of bytes in memory.
    class buffer_type {
    public:
        buffer_type() = default;
        // A copy for which there is no memory stays empty.
        buffer_type(const buffer_type& other);
        buffer_type& operator=(const buffer_type& other);
        ~buffer_type();

        // Makes room for n bytes. Keeps the block if it is large enough and not more than twice too
        // large, else reallocates it to exactly n. Returns 0, or -1 with nothing changed.
        [[nodiscard]] int Reserve(uint16_t n);
        // Zeroes the whole block and sets the length to 0; the block stays.
        void Clear();
        // Replaces the content by a copy of n bytes. Returns 0, or -1 with nothing changed.
        [[nodiscard]] int Assign(const void* bytes, uint16_t n);
        [[nodiscard]] bool IsEmpty() const { return m_length == 0; }
        [[nodiscard]] uint16_t Length() const { return m_length; }
        [[nodiscard]] uint16_t Capacity() const { return m_capacity; }
        [[nodiscard]] const void* Data() const { return m_data; }

    private:
        uint16_t m_length = 0;
        uint16_t m_capacity = 0;
        void* m_data = nullptr;  // from malloc
    };

    static const PObject empty_object;
    static const array_type empty_array;
    static const map_type empty_map;
    static const binary_type empty_binary;
    static const buffer_type empty_buffer;

    constexpr PObject() = default;
    PObject(const char* text);
    PObject(const std::string& text);
    PObject(std::string_view text);
    PObject(const buffer_type& buffer);
    // Any integer, sign-extended to 64 bits; a bool is stored as 0 or 1.
    template <std::integral T>
    PObject(T value) : m_kind(KIND_INTEGER) {
        m_payload.integer = static_cast<uint64_t>(static_cast<int64_t>(value));
    }
    PObject(std::nullptr_t) = delete;
    PObject(const PObject& other);
    PObject(PObject&& other) noexcept : m_kind(other.m_kind), m_payload(other.m_payload) {
        other.m_kind = KIND_NULL;
    }
    ~PObject() {
        if (OwnsBlock()) Destroy();
    }

    // Every assignment builds the new payload before it drops the old one: assigning from something
    // inside the same value is safe.
    PObject& operator=(const char* text) { return *this = PObject(text); }
    PObject& operator=(const std::string& text) { return *this = PObject(text); }
    PObject& operator=(std::string_view text) { return *this = PObject(text); }
    PObject& operator=(const buffer_type& buffer) { return *this = PObject(buffer); }
    PObject& operator=(const binary_type& binary);
    PObject& operator=(const array_type& array);
    PObject& operator=(const map_type& map);
    template <std::integral T>
    PObject& operator=(T value) {
        return *this = PObject(value);
    }
    PObject& operator=(std::nullptr_t) = delete;
    PObject& operator=(const PObject& other) { return *this = PObject(other); }
    PObject& operator=(PObject&& other) noexcept {
        // By way of a third value: `other` may lie inside what is dropped here.
        PObject taken(std::move(other));
        Swap(taken);
        return *this;
    }

    [[nodiscard]] Kind GetKind() const { return m_kind; }
    [[nodiscard]] bool IsNull() const { return m_kind == KIND_NULL; }
    [[nodiscard]] bool IsArray() const { return m_kind == KIND_ARRAY; }
    [[nodiscard]] bool IsMap() const { return m_kind == KIND_MAP; }
    [[nodiscard]] bool IsInteger() const { return m_kind == KIND_INTEGER; }
    [[nodiscard]] bool IsString() const { return m_kind == KIND_STRING; }
    [[nodiscard]] bool IsBinary() const { return m_kind == KIND_BINARY; }
    [[nodiscard]] bool IsBuffer() const { return m_kind == KIND_BUFFER; }
    [[nodiscard]] bool IsContainer() const { return IsArray() || IsMap(); }
    // True for null, for a string, array, map or buffer without content, and for a binary without
    // a path. An integer is never empty.
    [[nodiscard]] bool IsEmpty() const;
    [[nodiscard]] bool HasMember(std::string_view key) const;

    [[nodiscard]] int64_t AsInt64() const { return static_cast<int64_t>(AsUInt64()); }
    [[nodiscard]] uint64_t AsUInt64() const { return IsInteger() ? m_payload.integer : 0; }
    [[nodiscard]] int32_t AsInt32() const { return static_cast<int32_t>(AsUInt64()); }
    [[nodiscard]] uint32_t AsUInt32() const { return static_cast<uint32_t>(AsUInt64()); }
    [[nodiscard]] int16_t AsInt16() const { return static_cast<int16_t>(AsUInt64()); }
    [[nodiscard]] uint16_t AsUInt16() const { return static_cast<uint16_t>(AsUInt64()); }
    [[nodiscard]] int8_t AsInt8() const { return static_cast<int8_t>(AsUInt64()); }
    [[nodiscard]] uint8_t AsUInt8() const { return static_cast<uint8_t>(AsUInt64()); }
    // An integer: not 0. Anything else: not empty; so the string "false" is true.
    [[nodiscard]] bool AsBool() const;
    // A string: a copy. An integer: its low 32 bits as an unsigned decimal. Else empty.
    [[nodiscard]] std::string AsString() const;
    // The bytes of a string without a copy, valid until the value changes; empty for other kinds.
    [[nodiscard]] std::string_view StringView() const;

    // Of another kind: the matching empty constant.
    [[nodiscard]] const array_type& AsArray() const;
    [[nodiscard]] const map_type& AsMap() const;
    [[nodiscard]] const binary_type& AsBinary() const;
    [[nodiscard]] const buffer_type& AsBuffer() const;
    // A value of another kind is replaced by an empty one of this kind.
    [[nodiscard]] array_type& AsArray();
    [[nodiscard]] map_type& AsMap();
    [[nodiscard]] binary_type& AsBinary();
    [[nodiscard]] buffer_type& AsBuffer();

    // The member, or empty_object; inserts nothing.
    [[nodiscard]] const PObject& operator[](std::string_view key) const;
    // The member, inserted as null when it is missing. A value that is no map becomes an empty one.
    PObject& operator[](std::string_view key);
    // The element of an array, or the index-th entry of a map in key order; else empty_object.
    [[nodiscard]] const PObject& operator[](int index) const;
    // The index-th entry of a map; in every other case, arrays included, std::out_of_range.
    [[nodiscard]] PObject& operator[](int index);

    // Frees the payload; the value is null afterwards. Allocates nothing.
    void Clear() {
        if (OwnsBlock()) Destroy();
        m_kind = KIND_NULL;
    }
    void Swap(PObject& other) noexcept {
        std::swap(m_kind, other.m_kind);
        std::swap(m_payload, other.m_payload);
    }

    // The value as one text for the log, for example {"a": 1, "b": [2, "x"]}; nothing is escaped.
    [[nodiscard]] std::string ToText() const;

private:
    struct ContainerPayload;
    struct ArrayPayload;
    struct MapPayload;
    struct StringPayload;

    // An integer stands in the value itself: most values of a message are integers, and a block on
    // the heap for each would cost more than all the rest of decoding it.
    union Payload {
        void* block;  // owned; of the struct or record that belongs to the kind
        uint64_t integer;
    };

    PObject(Kind kind, void* block) : m_kind(kind) { m_payload.block = block; }

    [[nodiscard]] bool OwnsBlock() const { return m_kind != KIND_NULL && m_kind != KIND_INTEGER; }
    void Destroy() noexcept;
    void DestroyLeaf() noexcept;
    // Gives up the payload of a container; the value is null afterwards.
    ContainerPayload* ReleaseContainer() noexcept;
    // A copy of a leaf, or an empty container of the other's kind.
    [[nodiscard]] static PObject ShallowCopy(const PObject& other);

    Kind m_kind = KIND_NULL;
    Payload m_payload{nullptr};
};
