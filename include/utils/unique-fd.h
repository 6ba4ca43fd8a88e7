// Owners of file descriptors and directory streams.
#pragma once

#include <dirent.h>
#include <unistd.h>

#include <memory>
#include <utility>

// Owns a descriptor; -1 is none. Movable, not copyable, not thread-safe.
class UniqueFd {
public:
    UniqueFd() = default;
    explicit UniqueFd(int fd) : m_fd(fd) {}
    UniqueFd(UniqueFd&& other) noexcept : m_fd(other.Release()) {}
    UniqueFd& operator=(UniqueFd&& other) noexcept {
        if (this != &other) Reset(other.Release());
        return *this;
    }
    UniqueFd(const UniqueFd&) = delete;
    UniqueFd& operator=(const UniqueFd&) = delete;
    ~UniqueFd() { Reset(); }

    [[nodiscard]] int Get() const { return m_fd; }
    [[nodiscard]] bool IsValid() const { return m_fd >= 0; }
    // Gives the descriptor up to the caller.
    [[nodiscard]] int Release() { return std::exchange(m_fd, -1); }
    void Reset(int fd = -1) {
        if (m_fd >= 0) ::close(m_fd);
        m_fd = fd;
    }
    // Closes and returns the result of close(2): for a written file, the destructor cannot tell.
    [[nodiscard]] int Close() { return m_fd < 0 ? 0 : ::close(Release()); }

private:
    int m_fd = -1;
};

// Deleter for a C resource: std::unique_ptr<DIR, FreeWith<closedir>>.
template <auto Free>
struct FreeWith {
    template <typename T>
    void operator()(T* resource) const {
        Free(resource);
    }
};
using UniqueDir = std::unique_ptr<DIR, FreeWith<closedir>>;
