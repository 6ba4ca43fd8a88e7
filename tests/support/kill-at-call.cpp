#include "support/kill-at-call.h"

#include <fcntl.h>
#include <sys/ptrace.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

#include <algorithm>
#include <csignal>
#include <iterator>

namespace {

constexpr int CANNOT_TRACE_STATUS = 77;
constexpr int SYSCALL_STOP = SIGTRAP | 0x80;

// Beside them those that start programs, which change something in their turn.
constexpr long CHANGING_CALLS[] = {
    SYS_write,     SYS_writev,   SYS_pwrite64,  SYS_pwritev,  SYS_sendfile,  SYS_copy_file_range,
    SYS_ftruncate, SYS_fsync,    SYS_fdatasync, SYS_syncfs,   SYS_fallocate, SYS_renameat,
    SYS_renameat2, SYS_unlinkat, SYS_mkdirat,   SYS_linkat,   SYS_symlinkat, SYS_mknodat,
    SYS_fchmod,    SYS_fchmodat, SYS_fchown,    SYS_fchownat, SYS_utimensat,
#ifdef SYS_rename
    SYS_rename,    SYS_unlink,   SYS_mkdir,     SYS_rmdir,    SYS_link,      SYS_symlink,
    SYS_mknod,     SYS_chmod,    SYS_chown,     SYS_creat,    SYS_truncate,  SYS_open,
    SYS_fork,      SYS_vfork,
#endif
    SYS_clone,     SYS_execve,
};

// The call that the child has stopped at: when it enters one that counts.
bool EntersChangingCall(pid_t pid) {
    struct __ptrace_syscall_info info = {};
    if (ptrace(PTRACE_GET_SYSCALL_INFO, pid, sizeof(info), &info) <= 0) return false;
    if (info.op != PTRACE_SYSCALL_INFO_ENTRY) return false;
    const auto number = static_cast<long>(info.entry.nr);
    if (number == SYS_openat) return (info.entry.args[2] & (O_CREAT | O_TRUNC)) != 0;
    return std::ranges::find(CHANGING_CALLS, number) != std::end(CHANGING_CALLS);
}

[[noreturn]] void RunChild(const std::function<int()>& work) {
    if (ptrace(PTRACE_TRACEME, 0, nullptr, nullptr) != 0) _exit(CANNOT_TRACE_STATUS);
    raise(SIGSTOP);
    _exit(work() == 0 ? 0 : 1);
}

KillResult EndOf(int status) {
    if (!WIFEXITED(status)) return KillResult::FAILED;
    if (WEXITSTATUS(status) == CANNOT_TRACE_STATUS) return KillResult::CANNOT_TRACE;
    return WEXITSTATUS(status) == 0 ? KillResult::DONE : KillResult::FAILED;
}

}  // namespace

KillResult KillAtCall(int nth, const std::function<int()>& work) {
    const pid_t pid = fork();
    if (pid < 0) return KillResult::CANNOT_TRACE;
    if (pid == 0) RunChild(work);
    int status = 0;
    waitpid(pid, &status, 0);
    if (!WIFSTOPPED(status)) return EndOf(status);
    ptrace(PTRACE_SETOPTIONS, pid, nullptr, PTRACE_O_TRACESYSGOOD | PTRACE_O_EXITKILL);
    for (int calls = 0, signal = 0; calls < nth;) {
        ptrace(PTRACE_SYSCALL, pid, nullptr, signal);
        waitpid(pid, &status, 0);
        if (!WIFSTOPPED(status)) return EndOf(status);
        const bool is_call = WSTOPSIG(status) == SYSCALL_STOP;
        signal = is_call ? 0 : WSTOPSIG(status);
        if (is_call && EntersChangingCall(pid)) ++calls;
    }
    kill(pid, SIGKILL);
    waitpid(pid, &status, 0);
    return KillResult::KILLED;
}
