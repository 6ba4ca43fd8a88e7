// Stands between the program and the flushes of the system: fsync(), fdatasync() and syncfs() fail
// on demand, or have something done before them. One at a time.
#pragma once

#include <functional>
#include <string>

class OnFlush {
public:
    // What takes the place of a flush: 0 lets it happen, anything else is its errno. It is told
    // what is flushed: the path of a file or folder, with "fs:" before it for a file system.
    explicit OnFlush(std::function<int(const std::string& what)> action);
    ~OnFlush();
    // For the action: the descriptor that is flushed.
    [[nodiscard]] static int Fd();
    OnFlush(const OnFlush&) = delete;
    OnFlush& operator=(const OnFlush&) = delete;
};
