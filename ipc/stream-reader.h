// Decodes one value: the receiving half of PStream, for stream.cpp alone.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "ipc/pobject.h"
#include "ipc/stream.h"

class PStream::Reader {
public:
    Reader(PStream& stream, Channel& channel) : m_stream(stream), m_channel(channel) {}

    [[nodiscard]] int Read(PObject& value);

private:
    void OpenContainer(PObject& target, bool is_map);
    void CloseContainer();
    [[nodiscard]] int ReadTree(PObject& root);
    [[nodiscard]] int NextChild(uint8_t* tag, PObject** child);
    [[nodiscard]] int NextMember(uint8_t key_tag, uint8_t* tag, PObject** child);
    void EndOfChild();
    void PublishKey();
    [[nodiscard]] int ReadLeaf(uint8_t tag, PObject& target);
    [[nodiscard]] int ReadNull(PObject& target);
    [[nodiscard]] int ReadInteger(PObject& target);
    [[nodiscard]] int ReadString(std::string_view& text);
    [[nodiscard]] int ReadBinary(PObject& target);
    [[nodiscard]] const PObject& FormerTarget() const;
    void KeepRecord(PObject& child);
    [[nodiscard]] int Take(void* out, size_t length);
    [[nodiscard]] int TakeByte(uint8_t* out);
    [[nodiscard]] bool HasInPiece(size_t length) const { return m_piece.size() >= length; }
    void ReturnPiece();
    [[nodiscard]] int ReadFromChannel(void* out, size_t length);

    PStream& m_stream;
    Channel& m_channel;
    // What is left of the bytes that the channel holds in one piece, and how many of them it held
    // at first. The channel learns what was taken when the piece is returned.
    std::string_view m_piece;
    size_t m_piece_size = 0;
    std::string m_scratch;  // a string that does not lie in the piece
    // The key of the member being read, while it is not on the error stack: it goes there only
    // before anything that may wait or fail. Most members are over before anybody could look.
    const std::string* m_unpublished_key = nullptr;
    PObject m_former;  // what the caller's value held: it may say where binaries are stored
    std::vector<PObject*> m_levels;  // the containers being filled, outermost first
};
