#include "ipc/peer-credentials.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>

#include "ipc/channel.h"
#include "ipc/simple-ipc.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/unique-fd.h"

namespace {

constexpr uid_t kNobody = 65534;

TEST(PeerCredentials, OnlyRootAndTheOwnUserAreTrusted) {
    EXPECT_TRUE(IsTrustedUser(0, 0));
    EXPECT_TRUE(IsTrustedUser(0, 1000));
    EXPECT_TRUE(IsTrustedUser(1000, 1000));
    EXPECT_FALSE(IsTrustedUser(1000, 0));
    EXPECT_FALSE(IsTrustedUser(1001, 1000));
}

TEST(PeerCredentials, AConnectionOfTheOwnUserIsTrusted) {
    int ends[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
    const UniqueFd first(ends[0]);
    const UniqueFd second(ends[1]);
    EXPECT_TRUE(IsTrustedPeer(first.Get()));
}

TEST(PeerCredentials, WhatIsNoSocketIsNotTrusted) {
    LogCapture log;
    EXPECT_FALSE(IsTrustedPeer(-1));
    EXPECT_TRUE(log.Contains("[ERR] cannot tell who has connected"));
}

TEST(PeerCredentials, AConnectionOfAnotherUserIsRefused) {
    if (geteuid() != 0) GTEST_SKIP() << "needs root to become another user";
    const TempDir dir;
    ASSERT_EQ(0, chmod(dir.Path().c_str(), 0755));
    IPCListener listener({5, 0});
    ASSERT_EQ(0, listener.Listen(dir / "socket"));
    ASSERT_EQ(0, chmod((dir / "socket").c_str(), 0777));
    const pid_t child = fork();
    if (child == 0) {
        Channel client(16);
        const bool is_connected = setuid(kNobody) == 0 && client.Open(dir / "socket") == 0;
        _exit(is_connected ? 0 : 1);
    }
    int status = 0;
    ASSERT_EQ(child, waitpid(child, &status, 0));
    ASSERT_EQ(0, status) << "the other user could not even connect";
    ASSERT_TRUE(listener.Wait());
    const UniqueFd accepted(listener.Accept());
    LogCapture log;
    EXPECT_FALSE(IsTrustedPeer(accepted.Get()));
    EXPECT_TRUE(log.Contains("[WARN] user 65534 (pid = "));
}

}  // namespace
