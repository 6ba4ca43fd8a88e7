#include "ipc/stream-writer.h"

#include <cstring>

#include "ipc/binary-transfer.h"
#include "ipc/channel.h"
#include "ipc/wire-tag.h"
#include "utils/error-code.h"
#include "utils/log.h"

int PStream::Writer::WriteAndFlush(const PObject& value) {
    const int written = WriteTree(value);
    const int drained = Drain();  // after a failure, too: what went before it is on the wire
    if (written != 0) return written;
    if (drained != 0) return drained;
    return Checked(m_channel.FlushWrite(0));
}

int PStream::Writer::Checked(int channel_result) const {
    if (channel_result >= 0) return 0;
    SLOG_WARN("Channel: %d\n", channel_result);
    return ERR_IO;
}

int PStream::Writer::WriteTree(const PObject& root) {
    for (const PObject* value = &root;;) {
        const int result = value->IsContainer() ? OpenContainer(*value) : WriteLeaf(*value);
        if (result != 0) return result;
        if (!value->IsContainer()) EndOfChild();
        for (value = nullptr; value == nullptr;) {
            if (m_levels.empty()) return 0;
            if (const int next = NextChild(&value); next != 0) return next;
            if (value != nullptr) break;
            if (const int closed = CloseContainer(); closed != 0) return closed;
        }
    }
}

int PStream::Writer::OpenContainer(const PObject& value) {
    const uint8_t tag = value.IsMap() ? TAG_MAP : TAG_ARRAY;
    SLOG_DBG("%swrite %s of %zu\n", m_stream.Indent(), value.IsMap() ? "map" : "array",
             value.IsMap() ? value.AsMap().size() : value.AsArray().size());
    if (const int result = Put(&tag, 1); result != 0) return result;
    m_levels.emplace_back(value);
    ++m_stream.m_level;
    return 0;
}

int PStream::Writer::CloseContainer() {
    const uint8_t tag = TAG_END;
    if (const int result = Put(&tag, 1); result != 0) return result;
    m_levels.pop_back();
    --m_stream.m_level;
    EndOfChild();
    return 0;
}

// Gives the next child of the innermost container, its key written and on the error stack; nullptr
// at the end.
int PStream::Writer::NextChild(const PObject** child) {
    Level& level = m_levels.back();
    *child = nullptr;
    if (level.container->IsArray()) {
        const auto& elements = level.container->AsArray();
        if (level.next_element < elements.size()) *child = &elements[level.next_element++];
        return 0;
    }
    if (level.next_entry == level.container->AsMap().end()) return 0;
    std::string_view key = level.next_entry->first;
    if (!key.empty() && key.front() == '_') key.remove_prefix(1);
    if (const int result = WriteString(key); result != 0) return result;
    m_stream.PushKey(key);
    *child = &(level.next_entry++)->second;
    return 0;
}

void PStream::Writer::EndOfChild() {
    if (!m_levels.empty() && m_levels.back().container->IsMap()) m_stream.PopKey();
}

int PStream::Writer::WriteLeaf(const PObject& value) {
    static constexpr uint8_t kNull[] = {TAG_NULL, 0};
    switch (value.GetKind()) {
        case PObject::KIND_NULL:
            return Put(kNull, sizeof(kNull));
        case PObject::KIND_INTEGER:
            return WriteInteger(value.AsUInt64());
        case PObject::KIND_STRING:
            return WriteString(value.StringView());
        case PObject::KIND_BINARY:
            return WriteBinary(value.AsBinary());
        default:
            SLOG_ERR("PStream: a value of kind %d can not be sent\n", value.GetKind());
    }
    return kCannotSend;
}

int PStream::Writer::WriteInteger(uint64_t value) {
    const uint8_t n = value <= UINT8_MAX    ? 1
                      : value <= UINT16_MAX ? 2
                      : value <= UINT32_MAX ? 4
                                            : 8;
    uint8_t field[2 + kMaxIntegerBytes] = {TAG_INTEGER, n};
    for (unsigned i = 0; i < n; ++i)
        field[2 + i] = static_cast<uint8_t>(value >> (8 * (n - 1 - i)));
    return Put(field, 2U + n);
}

// The length field takes the low 16 bits only: the wire has no way to carry a longer string.
int PStream::Writer::WriteString(std::string_view bytes) {
    const uint8_t head[] = {TAG_STRING, static_cast<uint8_t>(bytes.size() >> 8),
                            static_cast<uint8_t>(bytes.size())};
    if (const int result = Put(head, sizeof(head)); result != 0) return result;
    return Put(bytes.data(), bytes.size());
}

// A file that cannot be read fails only after the tag and the length: the peer is left waiting.
int PStream::Writer::WriteBinary(const PObject::binary_type& record) {
    uint8_t head[1 + sizeof(record.length)] = {TAG_BINARY};
    for (unsigned i = 1; i < sizeof(head); ++i) {
        head[i] = static_cast<uint8_t>(record.length >> (8 * (sizeof(head) - 1 - i)));
    }
    if (const int result = Put(head, sizeof(head)); result != 0) return result;
    if (const int result = Drain(); result != 0) return result;
    return SendBinary(m_channel, record,
                      [this](uint64_t total, uint64_t done) { m_stream.SetProgress(total, done); });
}

int PStream::Writer::Put(const void* bytes, size_t length) {
    if (length > sizeof(m_piece) - m_piece_size) {
        if (const int result = Drain(); result != 0) return result;
        if (length > sizeof(m_piece)) return Checked(m_channel.Write(bytes, length));
    }
    if (length != 0) std::memcpy(m_piece + m_piece_size, bytes, length);
    m_piece_size += length;
    return 0;
}

int PStream::Writer::Drain() {
    if (m_piece_size == 0) return 0;
    const int result = Checked(m_channel.Write(m_piece, m_piece_size));
    m_piece_size = 0;
    return result;
}
