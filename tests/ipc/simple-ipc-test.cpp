#include "ipc/simple-ipc.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include "ipc/channel.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/unique-fd.h"

namespace {

bool Exists(const std::string& path) { return access(path.c_str(), F_OK) == 0; }

class IPCListenerTest : public testing::Test {
protected:
    TempDir m_dir;
    std::string m_path = m_dir / "socket";
    IPCListener m_listener{
        {0, 1000}
    };
};

TEST_F(IPCListenerTest, AClientIsSeenAndAccepted) {
    LogCapture log;
    ASSERT_EQ(0, m_listener.Listen(m_path));
    EXPECT_TRUE(log.Has("[DBG] listening on domain socket '" + m_path + "'"));
    EXPECT_FALSE(m_listener.Wait());
    Channel client(16);
    ASSERT_EQ(0, client.Open(m_path));
    EXPECT_TRUE(m_listener.Wait());
    const UniqueFd server(m_listener.Accept());
    EXPECT_TRUE(server.IsValid());
    EXPECT_FALSE(m_listener.Wait());
}

TEST_F(IPCListenerTest, AStaleSocketFileIsReplaced) {
    m_dir.Write("socket", "stale");
    ASSERT_EQ(0, m_listener.Listen(m_path));
    struct stat info {};
    ASSERT_EQ(0, lstat(m_path.c_str(), &info));
    EXPECT_TRUE(S_ISSOCK(info.st_mode));
}

TEST_F(IPCListenerTest, StopRemovesTheSocketFile) {
    ASSERT_EQ(0, m_listener.Listen(m_path));
    m_listener.Stop();
    EXPECT_FALSE(Exists(m_path));
    EXPECT_FALSE(m_listener.Wait());
    EXPECT_EQ(-1, m_listener.Accept());
    m_listener.Stop();
    ASSERT_EQ(0, m_listener.Listen(m_path));
    EXPECT_TRUE(Exists(m_path));
}

TEST_F(IPCListenerTest, TheDestructorRemovesTheSocketFile) {
    {
        IPCListener listener;
        ASSERT_EQ(0, listener.Listen(m_path));
    }
    EXPECT_FALSE(Exists(m_path));
}

TEST_F(IPCListenerTest, AListenerThatListensKeepsItsFirstSocket) {
    ASSERT_EQ(0, m_listener.Listen(m_path));
    EXPECT_EQ(-1, m_listener.Listen(m_dir / "other"));
    EXPECT_FALSE(Exists(m_dir / "other"));
    Channel client(16);
    EXPECT_EQ(0, client.Open(m_path));
    EXPECT_TRUE(m_listener.Wait());
}

TEST_F(IPCListenerTest, AnEmptyPathFailsWithoutALine) {
    LogCapture log;
    EXPECT_EQ(-1, m_listener.Listen(""));
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(IPCListenerTest, AFolderThatIsMissingFailsTheBind) {
    LogCapture log;
    EXPECT_EQ(-1, m_listener.Listen(m_dir / "none/socket"));
    EXPECT_TRUE(log.Has("[ERR] bind: No such file or directory (2)"));
    EXPECT_EQ(0, m_listener.Listen(m_path));
}

TEST_F(IPCListenerTest, APathTooLongForAnAddressFailsTheBindAndItsFileStays) {
    const std::string path = m_dir.Write(std::string(108, 'x'), "somebody's");
    LogCapture log;
    EXPECT_EQ(-1, m_listener.Listen(path));
    EXPECT_TRUE(log.Has("[ERR] bind: File name too long (36)"));
    EXPECT_EQ("somebody's", ReadWholeFile(path));
}

}  // namespace
