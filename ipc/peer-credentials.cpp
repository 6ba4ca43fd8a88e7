#include "ipc/peer-credentials.h"

#include <sys/socket.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "utils/log.h"

bool IsTrustedUser(uid_t peer, uid_t own) { return peer == 0 || peer == own; }

bool IsTrustedPeer(int descriptor) {
    ucred peer{};
    socklen_t size = sizeof(peer);
    if (getsockopt(descriptor, SOL_SOCKET, SO_PEERCRED, &peer, &size) != 0) {
        SLOG_ERR("cannot tell who has connected: %s (%d)\n", std::strerror(errno), errno);
        return false;
    }
    if (IsTrustedUser(peer.uid, geteuid())) return true;
    SLOG_WARN("user %u (pid = %d) may not give orders, connection refused\n",
              static_cast<unsigned>(peer.uid), static_cast<int>(peer.pid));
    return false;
}
