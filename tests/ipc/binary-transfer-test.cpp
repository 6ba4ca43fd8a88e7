// Where received binaries are stored when names are taken, and the progress of long transfers.
#include "ipc/binary-transfer.h"

#include <gtest/gtest.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <filesystem>
#include <string>
#include <thread>
#include <vector>

#include "ipc/binary-fixture.h"
#include "ipc/channel.h"
#include "ipc/memory-channel.h"
#include "ipc/stream.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/unique-fd.h"

namespace {

namespace fs = std::filesystem;

class BinaryNameTest : public testing::Test {
protected:
    // Receives "mine" with names of this seed, so that a twin of the generator can tell them
    // before.
    [[nodiscard]] int Receive() {
        MemoryChannel channel("mine");
        return BinaryReceiver(channel, m_names, m_dir.Path(), [](uint64_t, uint64_t) {})
            .Receive(4, m_record);
    }
    TempDir m_dir;
    TmpNameGen m_names{"seed"};
    TmpNameGen m_twin{"seed"};
    PObject::binary_type m_record;
};

TEST_F(BinaryNameTest, AFileThatHasTheNameIsLeftAlone) {
    const std::string first = m_twin.NewName();
    const std::string second = m_twin.NewName();
    m_dir.Write(first, "somebody's");
    ASSERT_EQ(0, Receive());
    EXPECT_EQ("somebody's", ReadWholeFile(m_dir / first));
    EXPECT_EQ(m_dir / second, m_record.path);
    EXPECT_EQ("mine", ReadWholeFile(m_record.path));
}

TEST_F(BinaryNameTest, ALinkPlantedUnderTheNameIsNotFollowed) {
    const std::string victim = m_dir.Write("victim", "precious");
    fs::create_symlink(victim, m_dir / m_twin.NewName());
    fs::create_symlink(m_dir / "not there yet", m_dir / m_twin.NewName());
    m_dir.MakeDir(m_twin.NewName());
    ASSERT_EQ(0, mkfifo((m_dir / m_twin.NewName()).c_str(), 0600));
    ASSERT_EQ(0, Receive());
    EXPECT_EQ("precious", ReadWholeFile(victim));
    EXPECT_FALSE(fs::exists(m_dir / "not there yet"));
    EXPECT_EQ(m_dir / m_twin.NewName(), m_record.path);
}

TEST_F(BinaryNameTest, WhenNameAfterNameIsTakenItFails) {
    for (int i = 0; i < 64; ++i) m_dir.Write(m_twin.NewName(), "taken");
    LogCapture log;
    EXPECT_EQ(-1, Receive());
    EXPECT_TRUE(log.Has("[ERR] no free name in '" + m_dir.Path() + "'"));
    EXPECT_EQ("", m_record.path);
    EXPECT_EQ(0, Receive());  // the next one is free
}

// --- Progress

TEST(BinaryProgressTest, EachBlockIsToldAndEachHundredMiBLogged) {
    const TempDir dir;
    const uint64_t size = 2 * kBinaryLogStep + 5;
    const std::string source = dir.Write("source", "");
    ASSERT_EQ(0, truncate(source.c_str(), static_cast<off_t>(size)));  // a hole: takes no room
    int ends[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
    Channel out(Channel::DEFAULT_CAPACITY);
    Channel in(Channel::DEFAULT_CAPACITY);
    ASSERT_EQ(0, out.Open(ends[0], true));
    ASSERT_EQ(0, in.Open(ends[1], true));
    TmpNameGen names("x");
    PObject::binary_type record{0, 0, "/dev/null"};
    LogCapture log;
    std::vector<uint64_t> told;
    std::thread receiver([&] {
        const auto check = [&](uint64_t total, uint64_t done) {
            EXPECT_EQ(size, total);
            told.push_back(done);
        };
        EXPECT_EQ(0, BinaryReceiver(in, names, "", check).Receive(size, record));
    });
    uint64_t last = 1;
    const auto progress = [&](uint64_t total, uint64_t done) {
        EXPECT_EQ(size, total);
        EXPECT_EQ(last == 1 ? 0 : std::min(last + kBinaryBlock, size), done);
        last = done;
    };
    EXPECT_EQ(0, SendBinary(out, {0, size, source}, progress));
    EXPECT_EQ(0, out.FlushWrite(0));
    receiver.join();
    EXPECT_EQ(size, last);
    ASSERT_EQ(2 * kBinaryLogStep / kBinaryBlock + 2, told.size());
    EXPECT_EQ(0U, told[0]);
    EXPECT_EQ(kBinaryBlock, told[1]);
    EXPECT_EQ(size, told.back());
    const std::string total = std::to_string(size);
    for (const char* done : {"104857600", "209715200"}) {
        EXPECT_EQ(1, log.Count("[INFO] sending " + source + " ... (" + done + " / " + total + ")"));
        EXPECT_EQ(1, log.Count(std::string("[INFO] receiving /dev/null ... (") + done + " / " +
                               total + ")"));
    }
}

TEST(BinaryProgressTest, AnotherThreadSeesHowFarATransferIs) {
    const TempDir dir;
    int ends[2];
    ASSERT_EQ(0, socketpair(AF_UNIX, SOCK_STREAM, 0, ends));
    const UniqueFd peer(ends[1]);
    Channel channel(Channel::DEFAULT_CAPACITY);
    ASSERT_EQ(0, channel.Open(ends[0], true));
    PStream stream;
    stream.SetTempDirectory(dir.Path());
    PObject value;
    std::thread receiver([&] { EXPECT_EQ(0, stream.Recv(channel, value)); });
    const auto send_all = [&](const std::string& bytes) {
        EXPECT_EQ(static_cast<ssize_t>(bytes.size()),
                  send(peer.Get(), bytes.data(), bytes.size(), 0));
    };
    send_all(std::string("\x42\x10\0\1k", 5) + Head(kBinaryBlock + 1) +
             std::string(kBinaryBlock, 'x'));
    std::string path;
    uint64_t done = 0;
    uint64_t total = 0;
    while (done != kBinaryBlock) stream.GetStatus(path, done, total);
    EXPECT_EQ("k.k", path);
    EXPECT_EQ(kBinaryBlock + 1, total);
    send_all("y\x40");
    receiver.join();
    stream.GetStatus(path, done, total);
    EXPECT_EQ(0U, done);
    EXPECT_EQ(0U, total);
}

}  // namespace
