// The way of lines to the log daemon, with a socket of the test in its place.
#include <gtest/gtest.h>
#include <poll.h>
#include <signal.h>
#include <sys/socket.h>
#include <sys/un.h>
#include <unistd.h>

#include <chrono>
#include <cstring>
#include <string>
#include <thread>

#include "platform/log-connection.h"
#include "support/temp-dir.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

using std::chrono::steady_clock;

class LogSocketTest : public testing::Test {
protected:
    void SetUp() override {
        m_path = m_dir.Path() + "/log";
        Listen();
        SetLogSocketForTest(m_path.c_str());
        LogOpen("boxd");
    }
    void TearDown() override {
        LogClose();
        SetLogSocketForTest("/dev/log");
    }
    void Listen() {
        m_socket.Reset(socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
        sockaddr_un address{};
        address.sun_family = AF_UNIX;
        ASSERT_LT(m_path.size(), sizeof(address.sun_path));
        std::memcpy(address.sun_path, m_path.c_str(), m_path.size());
        ASSERT_EQ(
            0, bind(m_socket.Get(), reinterpret_cast<const sockaddr*>(&address), sizeof(address)));
    }
    void Unlisten() {
        m_socket.Reset();
        unlink(m_path.c_str());
    }
    // The next line that has arrived, or "" if there is none.
    std::string Next() {
        std::string line(200000, 0);
        const ssize_t size = recv(m_socket.Get(), line.data(), line.size(), 0);
        line.resize(size < 0 ? 0 : static_cast<size_t>(size));
        return line;
    }
    // Its text alone, after "file(line): ".
    std::string NextText() {
        const std::string line = Next();
        const size_t at = line.find("): ");
        return at == line.npos ? line : line.substr(at + 3);
    }

    TempDir m_dir;
    std::string m_path;
    UniqueFd m_socket;
};

TEST_F(LogSocketTest, ALineHasPriorityTimeAndIdentityBeforeItsText) {
    SLOG_DBG("%s", "text");
    const std::string line = Next();
    EXPECT_EQ(0U, line.find("<15>")) << line;  // LOG_USER | LOG_DEBUG
    EXPECT_EQ(std::string("<15>Nov 21 08:00:00 ").size(), line.find("boxd: [DBG] ")) << line;
    SLOG_CRIT("%s", "text");
    EXPECT_EQ(0U, Next().find("<10>"));  // LOG_USER | LOG_CRIT
}

TEST_F(LogSocketTest, LinesOfABatchComeAtItsEnd) {
    {
        const LogBatch batch;
        SLOG_INFO("one");
        {
            const LogBatch inner;
            SLOG_INFO("two");
        }
        EXPECT_EQ("", NextText());
    }
    EXPECT_EQ("one", NextText());
    EXPECT_EQ("two", NextText());
    EXPECT_EQ("", NextText());
}

TEST_F(LogSocketTest, AWarningSendsWhatIsKeptBackFirst) {
    const LogBatch batch;
    SLOG_INFO("before");
    SLOG_WARN("warning");
    EXPECT_EQ("before", NextText());
    EXPECT_EQ("warning", NextText());
}

TEST_F(LogSocketTest, ALineOfAThreadWithoutABatchSendsWhatIsKeptBackFirst) {
    const LogBatch batch;
    SLOG_INFO("worker");
    std::thread([] { SLOG_INFO("control"); }).join();
    EXPECT_EQ("worker", NextText());
    EXPECT_EQ("control", NextText());
}

TEST_F(LogSocketTest, AFlushSendsWhatIsKeptBack) {
    const LogBatch batch;
    SLOG_INFO("kept");
    LogFlush();
    EXPECT_EQ("kept", NextText());
}

TEST_F(LogSocketTest, NoMoreThanSixtyFourLinesAreKeptBack) {
    const LogBatch batch;
    for (int i = 0; i < 64; ++i) SLOG_INFO("%d", i);
    EXPECT_EQ("", NextText());
    // Beside it: the socket holds fewer lines than are sent here.
    std::thread reader([this] {
        for (int i = 0; i < 64; ++i) {
            pollfd entry{m_socket.Get(), POLLIN, 0};
            ASSERT_EQ(1, poll(&entry, 1, 5000)) << i;
            EXPECT_EQ(std::to_string(i), NextText());
        }
    });
    SLOG_INFO("%d", 64);
    reader.join();
    EXPECT_EQ("", NextText());
}

TEST_F(LogSocketTest, ALineThatNoBatchHoldsKeepsItsPlaceInTheOrder) {
    const std::string name(60000, 'n');
    {
        const LogBatch batch;
        SLOG_INFO("before");
        SLOG_INFO("%s", name.c_str());
        SLOG_INFO("after");
    }
    EXPECT_EQ("before", NextText());
    EXPECT_EQ(name, NextText());
    EXPECT_EQ("after", NextText());
}

TEST_F(LogSocketTest, ALogDaemonThatHangsHoldsACallerUpForAShortTimeOnly) {
    const auto start = steady_clock::now();
    constexpr int lines = 5000;  // far more than a socket holds
    for (int i = 0; i < lines; ++i) SLOG_INFO("%d", i);
    EXPECT_LT(steady_clock::now() - start, std::chrono::seconds(2));

    int arrived = 0;
    while (!Next().empty()) ++arrived;
    EXPECT_LT(arrived, lines);
    SLOG_INFO("again");
    EXPECT_EQ(std::to_string(lines - arrived) + " log lines were lost\n", NextText());
    EXPECT_EQ("again", NextText());
}

TEST_F(LogSocketTest, ALogDaemonThatWasRestartedGetsTheNextLine) {
    SLOG_INFO("one");
    EXPECT_EQ("one", NextText());
    Unlisten();
    Listen();
    SLOG_INFO("two");
    EXPECT_EQ("two", NextText());
}

TEST_F(LogSocketTest, ACrashSendsWhatIsKeptBack) {
    EXPECT_EXIT(
        {
            LogOpen("boxd");
            const LogBatch batch;
            SLOG_INFO("last words");
            abort();
        },
        testing::KilledBySignal(SIGABRT), "");
    EXPECT_EQ("last words", NextText());
}

TEST_F(LogSocketTest, ACrashSignalFromOutsideEndsTheProcessToo) {
    EXPECT_EXIT(
        {
            LogOpen("boxd");
            const LogBatch batch;
            SLOG_INFO("last words");
            kill(getpid(), SIGABRT);
            for (;;) pause();
        },
        testing::KilledBySignal(SIGABRT), "");
    EXPECT_EQ("last words", NextText());
}

}  // namespace
