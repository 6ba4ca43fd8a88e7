#include "ipc/stream-reader.h"

#include <cstring>

#include "ipc/binary-transfer.h"
#include "ipc/channel.h"
#include "ipc/tmp-name-gen.h"
#include "ipc/wire-tag.h"
#include "utils/error-code.h"
#include "utils/log.h"

int PStream::Reader::Read(PObject& value) {
    const int result = ReadTree(value);
    PublishKey();
    ReturnPiece();
    return result;
}

int PStream::Reader::ReadTree(PObject& root) {
    uint8_t tag = 0;
    if (const int result = TakeByte(&tag); result != 0) return result;
    if (root.IsContainer() || root.IsBinary()) m_former.Swap(root);
    for (PObject* value = &root;;) {
        if (tag == TAG_ARRAY || tag == TAG_MAP) {
            OpenContainer(*value, tag == TAG_MAP);
        } else {
            if (const int result = ReadLeaf(tag, *value); result != 0) {
                KeepRecord(*value);
                return result;
            }
            EndOfChild();
        }
        for (value = nullptr; value == nullptr;) {
            if (m_levels.empty()) return 0;
            if (const int result = NextChild(&tag, &value); result != 0) {
                if (value != nullptr) KeepRecord(*value);
                return result;
            }
            if (value == nullptr) CloseContainer();
        }
    }
}

// An element is decoded where it will stay: the array grows only after it is whole.
void PStream::Reader::OpenContainer(PObject& target, bool is_map) {
    PublishKey();
    SLOG_DBG("%sread %s\n", m_stream.Indent(), is_map ? "map" : "array");
    if (is_map) {
        target = PObject::empty_map;
    } else {
        target = PObject::empty_array;
    }
    m_levels.push_back(&target);
    ++m_stream.m_level;
}

void PStream::Reader::CloseContainer() {
    m_levels.pop_back();
    --m_stream.m_level;
    EndOfChild();
}

void PStream::Reader::EndOfChild() {
    if (m_unpublished_key != nullptr) {
        m_unpublished_key = nullptr;
    } else if (!m_levels.empty() && m_levels.back()->IsMap()) {
        m_stream.PopKey();
    }
}

void PStream::Reader::PublishKey() {
    if (m_unpublished_key != nullptr) m_stream.PushKey(*m_unpublished_key);
    m_unpublished_key = nullptr;
}

// Makes room for the next child of the innermost container and reads its tag; nullptr at the end.
int PStream::Reader::NextChild(uint8_t* tag, PObject** child) {
    *child = nullptr;
    if (const int result = TakeByte(tag); result != 0) return result;
    if (*tag == TAG_END) return 0;
    PObject& container = *m_levels.back();
    if (container.IsMap()) return NextMember(*tag, tag, child);
    *child = &container.AsArray().emplace_back();
    return 0;
}

int PStream::Reader::NextMember(uint8_t key_tag, uint8_t* tag, PObject** child) {
    if (key_tag != TAG_STRING) {
        SLOG_ERR("PStream: expect string, but get tag %u\n", key_tag);
        return kBadWire;
    }
    std::string_view key;
    if (const int result = ReadString(key); result != 0) return result;
    PObject::map_type& members = m_levels.back()->AsMap();
    // Keys arrive in order as a rule, and then the end is the place.
    const auto member = members.try_emplace(members.end(), std::string(key));
    m_unpublished_key = &member->first;
    *child = &member->second;
    return TakeByte(tag);
}

int PStream::Reader::ReadLeaf(uint8_t tag, PObject& target) {
    switch (tag) {
        case TAG_NULL:
            return ReadNull(target);
        case TAG_INTEGER:
            return ReadInteger(target);
        case TAG_STRING: {
            std::string_view text;
            if (const int result = ReadString(text); result != 0) return result;
            target = text;
            return 0;
        }
        case TAG_BINARY:
            if (m_stream.m_takes_binaries) return ReadBinary(target);
            [[fallthrough]];
        default:
            SLOG_ERR("PStream: unknown tag %u\n", tag);
    }
    return kBadWire;
}

int PStream::Reader::ReadNull(PObject& target) {
    uint8_t length = 0;
    if (const int result = TakeByte(&length); result != 0) return result;
    if (length != 0) {
        SLOG_ERR("expect length 0, but we've got %u\n", length);
        return kBadWire;
    }
    target.Clear();
    return 0;
}

int PStream::Reader::ReadInteger(PObject& target) {
    uint8_t n = 0;
    if (const int result = TakeByte(&n); result != 0) return result;
    if (n > kMaxIntegerBytes) {
        SLOG_ERR("PStream: an integer has no %u bytes\n", n);
        return kBadWire;
    }
    uint8_t bytes[kMaxIntegerBytes];
    if (const int result = Take(bytes, n); result != 0) return result;
    uint64_t value = 0;
    for (unsigned i = 0; i < n; ++i) value = value << 8 | bytes[i];
    target = value;
    return 0;
}

// The body of a string, without its tag: all its bytes are consumed, the text ends at a NUL. It
// stays where it is until the next read.
int PStream::Reader::ReadString(std::string_view& text) {
    uint8_t head[2];
    if (const int result = Take(head, sizeof(head)); result != 0) return result;
    const size_t length = static_cast<size_t>(head[0]) << 8 | head[1];
    const char* bytes = m_piece.data();
    if (HasInPiece(length)) {
        m_piece.remove_prefix(length);
    } else {
        m_scratch.resize(length);
        if (const int result = Take(m_scratch.data(), length); result != 0) return result;
        bytes = m_scratch.data();
    }
    text = {bytes, length == 0 ? 0 : strnlen(bytes, length)};
    return 0;
}

int PStream::Reader::ReadBinary(PObject& target) {
    uint8_t head[sizeof(uint64_t)];
    if (const int result = Take(head, sizeof(head)); result != 0) return result;
    uint64_t length = 0;
    for (const uint8_t byte : head) length = length << 8 | byte;
    ReturnPiece();
    PublishKey();
    PObject::binary_type record = FormerTarget().AsBinary();
    const int result =
        BinaryReceiver(m_channel, TmpNameGen::Instance(), m_stream.m_temp_directory,
                       [this](uint64_t total, uint64_t done) { m_stream.SetProgress(total, done); })
            .Receive(length, record);
    SLOG_DBG("%sbinary has been stored at '%s' with length %llu\n", m_stream.Indent(),
             record.path.c_str(), Llu(record.length));
    target = record;
    return result;
}

// What stood in the caller's value where the present child stands; an element of an array is a new
// value. Found only when it is asked for, by the keys on the error stack, so that values without
// binaries cost nothing.
const PObject& PStream::Reader::FormerTarget() const {
    const PObject* former = &m_former;
    size_t key = 0;
    for (const PObject* level : m_levels) {
        if (!level->IsMap()) return PObject::empty_object;
        former = &(*former)[m_stream.m_error_stack[key++]];
    }
    return *former;
}

// Nothing of the child has arrived: the caller's record of a broken transfer still says where to go
// on.
void PStream::Reader::KeepRecord(PObject& child) {
    PublishKey();
    if (child.IsNull() && FormerTarget().IsBinary()) child = FormerTarget().AsBinary();
}

int PStream::Reader::TakeByte(uint8_t* out) {
    if (!HasInPiece(1)) return ReadFromChannel(out, 1);
    *out = static_cast<uint8_t>(m_piece.front());
    m_piece.remove_prefix(1);
    return 0;
}

int PStream::Reader::Take(void* out, size_t length) {
    if (!HasInPiece(length)) return ReadFromChannel(out, length);
    if (length != 0) std::memcpy(out, m_piece.data(), length);
    m_piece.remove_prefix(length);
    return 0;
}

void PStream::Reader::ReturnPiece() {
    m_channel.Skip(m_piece_size - m_piece.size());
    m_piece = {};
    m_piece_size = 0;
}

int PStream::Reader::ReadFromChannel(void* out, size_t length) {
    ReturnPiece();
    PublishKey();
    if (const int result = m_channel.Read(out, length); result != 0) {
        SLOG_WARN("Channel: %d\n", result);
        return ERR_IO;
    }
    m_piece = m_channel.Buffered();
    m_piece_size = m_piece.size();
    return 0;
}
