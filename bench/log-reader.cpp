// Stands in for the log daemon during a measurement: takes every line, as fast as they come, and
// writes down when the first and the last line with each of some texts arrived.
//
// usage: log-reader SOCKET OUTPUT TEXT...
// On SIGUSR1 writes one line for each TEXT to OUTPUT, "COUNT FIRST LAST TEXT" (seconds of the
// monotonic clock), then "LINES total", and starts over. Ends on SIGTERM. The socket holds 512
// lines, as on a machine that systemd started.
#include <sched.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <atomic>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <string>
#include <string_view>
#include <vector>

namespace {

struct Watched {
    std::string text;
    unsigned long count = 0;
    double first = 0;
    double last = 0;
};

std::atomic<bool> g_end{false};
std::atomic<bool> g_report{false};

double Now() {
    timespec now{};
    clock_gettime(CLOCK_MONOTONIC, &now);
    return static_cast<double>(now.tv_sec) + static_cast<double>(now.tv_nsec) * 1e-9;
}

void Look(std::string_view line, std::vector<Watched>& watched) {
    for (Watched& entry : watched) {
        if (line.find(entry.text) == std::string_view::npos) continue;
        entry.last = Now();
        if (entry.count++ == 0) entry.first = entry.last;
    }
}

// Under another name first, so that whoever waits for the report finds a whole one.
bool Report(const std::string& path, const std::vector<Watched>& watched, unsigned long lines) {
    const std::string part = path + ".part";
    FILE* out = std::fopen(part.c_str(), "w");
    if (out == nullptr) return false;
    for (const Watched& entry : watched) {
        std::fprintf(out, "%lu %.6f %.6f %s\n", entry.count, entry.first, entry.last,
                     entry.text.c_str());
    }
    std::fprintf(out, "LINES %lu\n", lines);
    return std::fclose(out) == 0 && std::rename(part.c_str(), path.c_str()) == 0;
}

void Handle(int number, void (*handler)(int)) {
    struct sigaction action {};
    action.sa_handler = handler;  // no SA_RESTART: recvmmsg has to come back
    sigaction(number, &action, nullptr);
}

// A socket holds ten lines as the kernel comes up; systemd raises that when a machine starts. The
// limit belongs to a network namespace: here to one of our own, and the machine keeps its setting.
bool RaiseQueueLimit() {
    if (unshare(CLONE_NEWNET) != 0) return false;
    FILE* limit = std::fopen("/proc/sys/net/unix/max_dgram_qlen", "w");
    if (limit == nullptr) return false;
    const bool is_written = std::fputs("512", limit) >= 0;
    return std::fclose(limit) == 0 && is_written;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc < 3) {
        std::fprintf(stderr, "usage: log-reader SOCKET OUTPUT TEXT...\n");
        return 2;
    }
    std::vector<Watched> watched;
    for (int i = 3; i < argc; ++i) watched.push_back({argv[i], 0, 0, 0});
    Handle(SIGTERM, [](int) { g_end = true; });
    Handle(SIGUSR1, [](int) { g_report = true; });

    if (!RaiseQueueLimit()) std::perror("max_dgram_qlen stays as it is");
    const int fd = socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0);
    sockaddr_un address{};
    address.sun_family = AF_UNIX;
    std::strncpy(address.sun_path, argv[1], sizeof(address.sun_path) - 1);
    unlink(argv[1]);
    if (fd < 0 || bind(fd, reinterpret_cast<const sockaddr*>(&address), sizeof(address)) != 0) {
        std::perror("log-reader");
        return 1;
    }
    constexpr unsigned kBatch = 64;
    constexpr size_t kLine = 16384;
    std::vector<char> buffer(kBatch * kLine);
    iovec parts[kBatch];
    mmsghdr messages[kBatch]{};
    for (unsigned i = 0; i < kBatch; ++i) {
        parts[i] = {buffer.data() + i * kLine, kLine};
        messages[i].msg_hdr.msg_iov = &parts[i];
        messages[i].msg_hdr.msg_iovlen = 1;
    }
    unsigned long lines = 0;
    while (!g_end) {
        const int got = recvmmsg(fd, messages, kBatch, MSG_WAITFORONE, nullptr);
        for (int i = 0; i < got; ++i) {
            Look({buffer.data() + static_cast<size_t>(i) * kLine, messages[i].msg_len}, watched);
        }
        if (got > 0) lines += static_cast<unsigned long>(got);
        if (g_report.exchange(false)) {
            if (!Report(argv[2], watched, lines)) std::perror(argv[2]);
            lines = 0;
            for (Watched& entry : watched) entry.count = 0;
        }
    }
    return 0;
}
