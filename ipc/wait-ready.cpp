#include "ipc/wait-ready.h"

#include <poll.h>

#include <cerrno>
#include <cstring>

#include "ipc/deadline.h"
#include "utils/error-code.h"
#include "utils/log.h"

// poll(2), not select(2): a set of select has room for the first 1024 descriptors only, and a
// higher number writes past it. Its answer is about the one descriptor asked for: the lines for a
// wake of select without the descriptor in its set ("ReadFd: select but fd [%d] not ready" and the
// like) have no place here.
int WaitReady(int descriptor, bool for_writing, const timeval& timeout) {
    if (descriptor < 0) {  // poll would wait for nothing
        errno = EBADF;
        return -1;
    }
    pollfd entry{descriptor, static_cast<short>(for_writing ? POLLOUT : POLLIN), 0};
    // Where long has 32 bits, tv_usec may have more.
    const timespec limit{timeout.tv_sec, static_cast<long>(timeout.tv_usec * 1000)};
    const int ready = ppoll(&entry, 1, &limit, nullptr);
    if (ready > 0 && (entry.revents & POLLNVAL) != 0) {
        errno = EBADF;
        return -1;
    }
    return ready;
}

int WaitDespiteSignals(int descriptor, bool for_writing, const timeval& timeout) {
    const Deadline deadline(timeout);
    for (timeval left = timeout;; left = deadline.Left()) {
        const int ready = WaitReady(descriptor, for_writing, left);
        if (ready >= 0 || errno != EINTR) return ready;
        SLOG_DBG("select: EINTR\n");
        // Not with no time left either: signals without an end would have no end here.
        if (deadline.IsOver()) return 0;
    }
}

int WaitForSocket(int descriptor, bool for_writing, const timeval& timeout) {
    const int ready = WaitDespiteSignals(descriptor, for_writing, timeout);
    if (ready > 0) return 0;
    if (ready == 0) {
        SLOG_DBG("select: timeout\n");
        return ERR_CONNECTION_TIMEOUT;
    }
    if (for_writing) {
        SLOG_ERR("select: %s\n", std::strerror(errno));
    } else {
        SLOG_ERR("select: [%d] %s\n", errno, std::strerror(errno));
    }
    return ERR_IO;
}
