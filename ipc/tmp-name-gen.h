// Makes names for temporary files: 8 characters out of letters, digits, '-' and '_'.
//
// Two names are hardly ever alike, but they can be guessed, and no folder is looked at: who makes a
// file must insist on its being new.
//
// Threads: any may call; one lock for all generators.
#pragma once

#include <pthread.h>

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

class TmpNameGen {
public:
    // The one of the process, seeded by the time of the first call.
    [[nodiscard]] static TmpNameGen& Instance();

    // The same seed gives the same names. Of a seed the first 255 bytes count; from none, or one
    // that begins with a zero byte, a random one is made.
    explicit TmpNameGen(std::string_view seed);
    TmpNameGen(const TmpNameGen&) = delete;
    TmpNameGen& operator=(const TmpNameGen&) = delete;

    [[nodiscard]] std::string NewName();
    // `directory`, a slash and a new name.
    [[nodiscard]] std::string NewPath(const std::string& directory);

private:
    static constexpr size_t kStateSize = 256;

    void FillBytesLocked();

    static pthread_mutex_t m_lock;

    std::array<uint8_t, kStateSize> m_permutation{};  // under m_lock
    std::array<uint8_t, kStateSize> m_key{};
    std::array<uint8_t, 6> m_bytes{};  // under m_lock: of the name being made
};

// Gives in `out` the path of a new temporary name in a folder; nothing is made. Returns 0, or -1
// for an empty folder or when there is no name.
[[nodiscard]] int FSMakeTempName(const std::string& directory, std::string& out);
