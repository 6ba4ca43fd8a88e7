#include "service/child-daemon.h"

#include <gtest/gtest.h>
#include <sys/wait.h>
#include <unistd.h>

#include <climits>
#include <csignal>
#include <fstream>

#include "ipc/channel.h"
#include "ipc/pobject.h"
#include "ipc/simple-ipc.h"
#include "ipc/stream.h"

namespace {

// Serves one client after the other until one says "stop", and means it.
void Serve(IPCListener& listener, ChildDaemon::Manner manner) {
    for (;;) {
        if (!listener.Wait()) continue;
        Channel channel(Channel::DEFAULT_CAPACITY);
        PStream stream;
        PObject request;
        if (channel.Open(listener.Accept(), true) < 0 || stream.Recv(channel, request) < 0)
            continue;
        if (manner == ChildDaemon::IGNORES_STOP) continue;
        if (request["action"].AsString() == "stop" && !request["need_ack"].AsBool()) return;
    }
}

// As the daemon does: among what a control program has open is its lock.
void CloseAllBut(int fd) {
    if (fd > 3) close_range(3, static_cast<unsigned>(fd) - 1, 0);
    close_range(static_cast<unsigned>(fd) + 1, UINT_MAX, 0);
}

[[noreturn]] void RunChild(const std::string& pid_file, ChildDaemon::Manner manner,
                           const std::string& socket_path, int ready_fd) {
    CloseAllBut(ready_fd);
    signal(SIGTERM, manner == ChildDaemon::IGNORES_SIGTERM ? SIG_IGN : SIG_DFL);
    IPCListener listener;
    const bool listens = !socket_path.empty() && listener.Listen(socket_path) == 0;
    std::ofstream(pid_file) << getpid() << "\n";
    close(ready_fd);
    if (!listens) {
        for (;;) pause();
    }
    Serve(listener, manner);
    unlink(pid_file.c_str());
    _exit(0);
}

}  // namespace

ChildDaemon::ChildDaemon(const std::string& pid_file, Manner manner,
                         const std::string& socket_path) {
    int fds[2];
    EXPECT_EQ(0, pipe(fds));
    m_pid = fork();
    if (m_pid == 0) {
        close(fds[0]);
        RunChild(pid_file, manner, socket_path, fds[1]);
    }
    close(fds[1]);
    char nothing;
    EXPECT_EQ(0, read(fds[0], &nothing, 1)) << "closed when it is ready";
    close(fds[0]);
}

ChildDaemon::~ChildDaemon() {
    if (!IsRunning()) return;
    kill(m_pid, SIGKILL);
    EndSignal();
}

int ChildDaemon::EndSignal() {
    int status = 0;
    EXPECT_EQ(m_pid, waitpid(m_pid, &status, 0));
    m_pid = -1;
    return WIFSIGNALED(status) ? WTERMSIG(status) : 0;
}

bool ChildDaemon::IsRunning() {
    siginfo_t info = {};
    return m_pid > 0 &&
           waitid(P_PID, static_cast<id_t>(m_pid), &info, WEXITED | WNOHANG | WNOWAIT) == 0 &&
           info.si_pid == 0;
}
