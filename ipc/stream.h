// Encodes one PObject onto a Channel and decodes one from it.
//
// The wire: a value is a tag of one byte and a body; a value ends where its own encoding ends,
// there is no outer length. Integers are big-endian.
//   0x00 null     one byte 0x00
//   0x01 integer  one byte n (1, 2, 4 or 8 when written; 0 to 8 when read), n bytes, unsigned
//   0x10 string   16-bit length, the bytes; a reader ends the text at the first NUL
//   0x40 end      closes an array or a map
//   0x41 array    values, then 0x40
//   0x42 map      pairs of a string with its tag and a value, in key order, then 0x40
//   0x30 binary   64-bit length, that many bytes of file content
// A key that begins with '_' is sent without it. Buffers cannot be sent.
//
// A binary is a stretch of a file. The sender reads it from its file, the receiver stores it in a
// file, made for its owner alone: where a binary with a path stands at the same place of the target
// that Recv is given, in that file from its offset on, so that a broken transfer can go on; else,
// and for every element of an array, in a new file of the temp directory. After Recv, also a failed
// one, offset and length both tell where its content ends. A record is left as it was by a transfer
// that fails before its content begins, but in a map those of members that have not arrived are
// gone: the caller keeps a copy of a target that holds several.
// Files stay when a transfer fails; removing them is the caller's affair.
//
// Threads: one thread sends and receives; GetStatus may be called from any.
// Results: 0; -1 for a value that cannot be sent, and for a file that cannot be read, made or
// written; ERR_IO when the channel failed; -4 when the disk is full; -5 for bytes that are no
// value, and for a file that ended before the length of its binary. After a failure the connection
// is out of step and has to be closed; a target of Recv is then partly filled, an array with the
// element that broke off as its last.
#pragma once

#include <pthread.h>

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

class Channel;
class PObject;

class PStream {
public:
    PStream() = default;
    PStream(const PStream&) = delete;
    PStream& operator=(const PStream&) = delete;
    ~PStream();

    // Encodes and flushes.
    [[nodiscard]] int Send(Channel& channel, const PObject& value);
    // Decodes exactly one value; what the target held before is dropped, once a value has begun.
    [[nodiscard]] int Recv(Channel& channel, PObject& value);
    // The path of map keys being worked on, and the bytes done and in total of a binary in transit.
    void GetStatus(std::string& error_path, uint64_t& done, uint64_t& total) const;

    // The folder of received binaries that have no path yet; empty, as at first, is the root.
    void SetTempDirectory(const std::string& directory) { m_temp_directory = directory; }
    // From now on a binary counts as bytes that are no value: for a stream whose peer has no
    // business storing files here.
    void RefuseBinaries() { m_takes_binaries = false; }

private:
    class Reader;  // stream-reader.h
    class Writer;  // stream-writer.h

    void PushKey(std::string_view key);
    void PopKey();
    void SetProgress(uint64_t total, uint64_t done);
    [[nodiscard]] std::string ErrorPathLocked() const;
    [[nodiscard]] int Finish(int result);
    [[nodiscard]] const char* Indent() const;

    mutable pthread_mutex_t m_mutex = PTHREAD_MUTEX_INITIALIZER;
    // Under m_mutex. The first m_key_count strings are the keys, outermost first; the others are
    // kept for their memory.
    std::vector<std::string> m_error_stack;
    size_t m_key_count = 0;
    uint64_t m_total_bytes = 0;  // under m_mutex
    uint64_t m_done_bytes = 0;   // under m_mutex
    unsigned m_level = 0;        // of nesting, for the indent of debug lines
    std::string m_temp_directory;
    bool m_takes_binaries = true;
};
