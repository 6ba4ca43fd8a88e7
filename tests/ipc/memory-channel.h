// A Channel whose bytes come from memory and go to memory: no socket, any amount.
//
// A read past the end of `input` fails as a socket does whose peer has closed.
#pragma once

#include <algorithm>
#include <cstring>
#include <string>

#include "ipc/channel.h"
#include "utils/error-code.h"

struct MemoryPipe {
    std::string input;
    size_t position = 0;
    size_t read_limit = SIZE_MAX;  // bytes a single read gives at most
    std::string output;
    size_t write_limit = SIZE_MAX;  // bytes a single write takes at most
    int writes_left = -1;           // number of writes before they fail; -1: they do not
};

class MemoryChannel : public Channel {
public:
    explicit MemoryChannel(std::string input = {}, size_t capacity = DEFAULT_CAPACITY)
        : Channel(capacity) {
        pipe.input = std::move(input);
        SetFunctions({FromInput, ToOutput, [](const void*) { return -1; }, [](void*) {},
                      [](const void* handle) { return handle == nullptr; }});
        m_handle = &pipe;
    }
    ~MemoryChannel() override { Channel::Close(); }  // while `pipe` is there to take the rest

    MemoryPipe pipe;

private:
    static ssize_t FromInput(void* handle, void* buffer, size_t length,
                             const timeval& /*timeout*/) {
        auto* pipe = static_cast<MemoryPipe*>(handle);
        const size_t left = pipe->input.size() - pipe->position;
        const size_t count = std::min({length, left, pipe->read_limit});
        if (count == 0) return ERR_IO;
        std::memcpy(buffer, pipe->input.data() + pipe->position, count);
        pipe->position += count;
        return static_cast<ssize_t>(count);
    }
    static ssize_t ToOutput(void* handle, const void* buffer, size_t length,
                            const timeval& /*timeout*/) {
        auto* pipe = static_cast<MemoryPipe*>(handle);
        if (pipe->writes_left == 0) return ERR_IO;
        if (pipe->writes_left > 0) --pipe->writes_left;
        const size_t count = std::min(length, pipe->write_limit);
        pipe->output.append(static_cast<const char*>(buffer), count);
        return static_cast<ssize_t>(count);
    }
};
