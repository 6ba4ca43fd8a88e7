#include "ipc/tmp-name-gen.h"

#include <sys/time.h>

#include <algorithm>
#include <cstdio>
#include <cstdlib>
#include <ctime>
#include <numeric>

#include "utils/mutex-lock.h"

namespace {

constexpr char kAlphabet[] = "0123456789abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ-_";
static_assert(sizeof(kAlphabet) == 64 + 1);

std::string TimeSeed() {
    timeval now{};
    gettimeofday(&now, nullptr);
    char text[64];
    std::snprintf(text, sizeof(text), "%lu-%lu", static_cast<unsigned long>(now.tv_sec),
                  static_cast<unsigned long>(now.tv_usec));
    return text;
}

// Three bytes as four characters, the highest bits first.
void AppendEncoded(const uint8_t* bytes, std::string& out) {
    const unsigned group =
        static_cast<unsigned>(bytes[0]) << 16 | static_cast<unsigned>(bytes[1]) << 8 | bytes[2];
    for (int shift = 18; shift >= 0; shift -= 6) out += kAlphabet[group >> shift & 63U];
}

}  // namespace

pthread_mutex_t TmpNameGen::m_lock = PTHREAD_MUTEX_INITIALIZER;

TmpNameGen& TmpNameGen::Instance() {
    static TmpNameGen instance(TimeSeed());
    return instance;
}

// RC4: the seed is its key, whatever stands after it being zero.
TmpNameGen::TmpNameGen(std::string_view seed) {
    std::copy_n(seed.begin(), std::min(seed.size(), m_key.size() - 1), m_key.begin());
    std::iota(m_permutation.begin(), m_permutation.end(), uint8_t{0});
    if (m_key[0] == 0) {
        std::srand(static_cast<unsigned>(std::time(nullptr)));
        for (uint8_t& byte : m_key) byte = static_cast<uint8_t>(std::rand());
    }
    uint8_t j = 0;
    for (size_t i = 0; i < kStateSize; ++i) {
        j = static_cast<uint8_t>(j + m_permutation[i] + m_key[i]);
        std::swap(m_permutation[i], m_permutation[j]);
    }
}

// The permutation goes on from name to name, i and j begin anew.
void TmpNameGen::FillBytesLocked() {
    uint8_t i = 1;
    uint8_t j = 0;
    for (uint8_t& byte : m_bytes) {
        j = static_cast<uint8_t>(j + m_permutation[i]);
        std::swap(m_permutation[i], m_permutation[j]);
        byte = m_permutation[static_cast<uint8_t>(m_permutation[i] + m_permutation[j])];
        ++i;
    }
}

std::string TmpNameGen::NewName() {
    const MutexLock lock(m_lock);
    FillBytesLocked();
    std::string name;
    AppendEncoded(m_bytes.data(), name);
    AppendEncoded(m_bytes.data() + 3, name);
    return name;
}

std::string TmpNameGen::NewPath(const std::string& directory) {
    return directory + "/" + NewName();
}

int FSMakeTempName(const std::string& directory, std::string& out) {
    if (directory.empty()) return -1;
    out = TmpNameGen::Instance().NewPath(directory);
    return out.empty() ? -1 : 0;
}
