#include "ipc/wait-ready.h"

#include <poll.h>

#include <cerrno>

// poll(2), not select(2): a set of select has room for the first 1024 descriptors only, and a
// higher number writes past it.
int WaitReady(int descriptor, bool for_writing, const timeval& timeout) {
    if (descriptor < 0) {  // poll would wait for nothing
        errno = EBADF;
        return -1;
    }
    pollfd entry{descriptor, static_cast<short>(for_writing ? POLLOUT : POLLIN), 0};
    const timespec limit{timeout.tv_sec, timeout.tv_usec * 1000};
    const int ready = ppoll(&entry, 1, &limit, nullptr);
    if (ready > 0 && (entry.revents & POLLNVAL) != 0) {
        errno = EBADF;
        return -1;
    }
    return ready;
}
