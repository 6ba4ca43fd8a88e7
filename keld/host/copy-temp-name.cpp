#include "host/copy-temp-name.h"

#include <fcntl.h>
#include <pthread.h>
#include <signal.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <unistd.h>

#include <array>
#include <atomic>
#include <cerrno>
#include <charconv>
#include <cinttypes>
#include <compare>
#include <cstdint>
#include <cstdio>
#include <ctime>
#include <set>
#include <string>

#include "utils/log.h"
#include "utils/mutex-lock.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

constexpr std::string_view PREFIX = ".ferrix-tmp-";
constexpr size_t BOOT_DIGITS = 8;
constexpr size_t RANDOM_DIGITS = 16;
// Folders remembered as swept. When it is full all are forgotten: sweeping again does no harm.
constexpr size_t SWEPT_MAX = 16384;

// Tells the processes of one boot from those of another, which had the same numbers.
const std::string& BootText() {
    static const std::string text = [] {
        std::array<char, BOOT_DIGITS> digits{};
        const UniqueFd file(open("/proc/sys/kernel/random/boot_id", O_RDONLY | O_CLOEXEC));
        if (!file.IsValid() || read(file.Get(), digits.data(), digits.size()) != BOOT_DIGITS) {
            digits.fill('0');
        }
        return std::string(digits.data(), digits.size());
    }();
    return text;
}

uint64_t RandomStart() {
    uint64_t value = 0;
    if (getrandom(&value, sizeof(value), 0) != sizeof(value)) {
        timespec now{};
        clock_gettime(CLOCK_REALTIME, &now);
        value = static_cast<uint64_t>(now.tv_sec) << 30 | static_cast<uint64_t>(now.tv_nsec);
    }
    return value;
}

bool IsLowerHex(std::string_view text) {
    return text.find_first_not_of("0123456789abcdef") == text.npos;
}

// A folder as it is found by one mount: numbers of folders are given again after a removal, and
// those of devices after an unplugging.
struct FolderKey {
    unsigned devMajor;
    unsigned devMinor;
    uint64_t inode;
    uint64_t mount;
    int64_t birth;
    uint32_t birthNanoseconds;
    auto operator<=>(const FolderKey&) const = default;
};

pthread_mutex_t g_mutex = PTHREAD_MUTEX_INITIALIZER;  // guards the sets below
// Never destroyed: worker threads may outlive statics.
std::set<FolderKey>& Swept() {
    static auto* folders = new std::set<FolderKey>;
    return *folders;
}
std::set<std::string, std::less<>>& InUse() {
    static auto* names = new std::set<std::string, std::less<>>;
    return *names;
}

// False when the folder does not answer.
bool KeyOf(int dir_fd, FolderKey* key) {
    // Since Linux 6.8, in place of a number that is used again; older kernels give that one.
    constexpr unsigned UNIQUE_MOUNT = 0x4000;
    struct statx info {};
    if (statx(dir_fd, "", AT_EMPTY_PATH, STATX_INO | STATX_BTIME | STATX_MNT_ID | UNIQUE_MOUNT,
              &info) != 0) {
        return false;
    }
    *key = {info.stx_dev_major, info.stx_dev_minor,    info.stx_ino,
            info.stx_mnt_id,    info.stx_btime.tv_sec, info.stx_btime.tv_nsec};
    return true;
}

// True the first time in this process that the folder is asked about.
bool IsFirstVisit(int dir_fd) {
    FolderKey key{};
    if (!KeyOf(dir_fd, &key)) return false;
    const MutexLock lock(g_mutex);
    if (Swept().size() >= SWEPT_MAX) Swept().clear();
    return Swept().insert(key).second;
}

bool IsInUse(std::string_view name) {
    const MutexLock lock(g_mutex);
    return InUse().contains(name);
}

}  // namespace

std::string TakeCopyTempName() {
    // A counter from a random start: as good as random against a clash, and no system call.
    static std::atomic<uint64_t> counter{RandomStart()};
    std::array<char, RANDOM_DIGITS + 1> digits{};
    (void)snprintf(digits.data(), digits.size(), "%016" PRIx64, counter.fetch_add(1));
    std::string name =
        std::string(PREFIX) + std::to_string(getpid()) + "-" + BootText() + "-" + digits.data();
    const MutexLock lock(g_mutex);
    InUse().insert(name);
    return name;
}

void GiveBackCopyTempName(const std::string& name, bool is_file_left) {
    const MutexLock lock(g_mutex);
    InUse().erase(name);
    if (is_file_left) Swept().clear();
}

bool IsCopyLeftover(std::string_view name) {
    std::string_view rest = name;
    if (!rest.starts_with(PREFIX)) return false;
    rest.remove_prefix(PREFIX.size());
    pid_t pid = 0;
    const auto [end, error] = std::from_chars(rest.data(), rest.data() + rest.size(), pid);
    if (error != std::errc() || pid <= 0) return false;
    rest.remove_prefix(static_cast<size_t>(end - rest.data()));
    if (rest.size() != 1 + BOOT_DIGITS + 1 + RANDOM_DIGITS) return false;
    const auto boot = rest.substr(1, BOOT_DIGITS);
    if (rest[0] != '-' || rest[1 + BOOT_DIGITS] != '-' || !IsLowerHex(boot) ||
        !IsLowerHex(rest.substr(2 + BOOT_DIGITS))) {
        return false;
    }
    if (boot != BootText()) return true;
    if (pid == getpid()) return !IsInUse(name);
    return kill(pid, 0) != 0 && errno == ESRCH;
}

void SweepCopyLeftovers(int dir_fd) {
    if (!IsFirstVisit(dir_fd)) return;
    UniqueFd fd(openat(dir_fd, ".", O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    if (!fd.IsValid()) return;
    const UniqueDir dir(fdopendir(fd.Get()));
    if (!dir) return;
    (void)fd.Release();  // the stream owns it now
    while (const dirent* entry = readdir(dir.get())) {
        if (!IsCopyLeftover(entry->d_name)) continue;
        if (unlinkat(dir_fd, entry->d_name, 0) == 0) {
            SLOG_NOTICE("removed what a crashed copy left: '%s'", entry->d_name);
        }
    }
}

}  // namespace keld_host
