// A stream that sends and receives binaries by way of memory.
#pragma once

#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "ipc/memory-channel.h"
#include "ipc/pobject.h"
#include "ipc/stream.h"
#include "support/temp-dir.h"

// The tag and the length of a binary.
inline std::string Head(uint64_t length) {
    std::string head = "\x30";
    for (int shift = 56; shift >= 0; shift -= 8) head += static_cast<char>(length >> shift);
    return head;
}

inline PObject Binary(uint64_t offset, uint64_t length, const std::string& path) {
    PObject value;
    value = PObject::binary_type{offset, length, path};
    return value;
}

inline std::string Pattern(size_t size) {
    std::string out(size, '\0');
    for (size_t i = 0; i < size; ++i) out[i] = static_cast<char>(i * 31 % 251);
    return out;
}

class BinaryTest : public testing::Test {
protected:
    [[nodiscard]] int Send(const PObject& value) {
        m_channel.pipe.output.clear();
        const int result = m_stream.Send(m_channel, value);
        static_cast<void>(m_channel.FlushWrite(0));  // what a failure has left in the ring
        return result;
    }
    [[nodiscard]] int Recv(const std::string& bytes, PObject& value) {
        m_channel.ResetRead();
        m_channel.pipe.input = bytes;
        m_channel.pipe.position = 0;
        return m_stream.Recv(m_channel, value);
    }
    void SetUp() override { m_stream.SetTempDirectory(m_temp); }
    [[nodiscard]] std::vector<std::string> Temps() const {
        std::vector<std::string> out;
        for (const auto& entry : std::filesystem::directory_iterator(m_temp))
            out.push_back(entry.path());
        return out;
    }

    TempDir m_dir;
    std::string m_temp = m_dir.MakeDir("temp");
    MemoryChannel m_channel;
    PStream m_stream;
    PObject m_value;
};
