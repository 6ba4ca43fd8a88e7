// Encodes one value: the sending half of PStream, for stream.cpp alone.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "ipc/pobject.h"
#include "ipc/stream.h"

class PStream::Writer {
public:
    Writer(PStream& stream, Channel& channel) : m_stream(stream), m_channel(channel) {}

    [[nodiscard]] int WriteAndFlush(const PObject& value);

private:
    // A container whose children are being written.
    struct Level {
        explicit Level(const PObject& value)
            : container(&value), next_entry(value.AsMap().begin()) {}
        const PObject* container;
        size_t next_element = 0;
        PObject::map_type::const_iterator next_entry;
    };

    [[nodiscard]] int WriteTree(const PObject& value);
    [[nodiscard]] int OpenContainer(const PObject& value);
    [[nodiscard]] int CloseContainer();
    [[nodiscard]] int NextChild(const PObject** child);
    void EndOfChild();
    [[nodiscard]] int WriteLeaf(const PObject& value);
    [[nodiscard]] int WriteInteger(uint64_t value);
    [[nodiscard]] int WriteString(std::string_view bytes);
    [[nodiscard]] int WriteBinary(const PObject::binary_type& record);
    [[nodiscard]] int Put(const void* bytes, size_t length);
    [[nodiscard]] int Drain();
    [[nodiscard]] int Checked(int channel_result) const;

    PStream& m_stream;
    Channel& m_channel;
    std::vector<Level> m_levels;
    // Small fields are put together here, so that the channel takes them in pieces of some size and
    // logs a line for each piece, not for each field.
    uint8_t m_piece[4096];
    size_t m_piece_size = 0;
};
