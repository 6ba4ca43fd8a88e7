// Binaries: stretches of files on the wire.
#include <signal.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <unistd.h>

#include "ipc/binary-fixture.h"
#include "ipc/binary-transfer.h"
#include "ipc/channel.h"
#include "support/log-capture.h"
#include "utils/error-code.h"

namespace {

class BinarySendTest : public BinaryTest {};

TEST_F(BinarySendTest, TheStretchFollowsItsTagAndLength) {
    const std::string path = m_dir.Write("file", "0123456789");
    EXPECT_EQ(0, Send(Binary(3, 4, path)));
    EXPECT_EQ(Head(4) + "3456", m_channel.pipe.output);
    EXPECT_EQ(0, Send(Binary(0, 10, path)));
    EXPECT_EQ(Head(10) + "0123456789", m_channel.pipe.output);
    EXPECT_EQ(0, Send(Binary(0, 0, path)));
    EXPECT_EQ(Head(0), m_channel.pipe.output);
}

TEST_F(BinarySendTest, SizesAroundABlockPassWhole) {
    for (const size_t size : {kBinaryBlock - 1, kBinaryBlock, kBinaryBlock + 1, 3 * kBinaryBlock}) {
        const std::string content = Pattern(size);
        const std::string path = m_dir.Write("file", content);
        ASSERT_EQ(0, Send(Binary(0, size, path)));
        EXPECT_TRUE(Head(size) + content == m_channel.pipe.output) << size;
    }
}

TEST_F(BinarySendTest, StandsBetweenOtherValues) {
    const std::string path = m_dir.Write("file", "abc");
    PObject value;
    value["a"] = 1;
    value["b"] = Binary(1, 2, path);
    value["c"] = 2;
    EXPECT_EQ(0, Send(value));
    EXPECT_EQ(std::string("\x42\x10\0\1a\1\1\1\x10\0\1b", 12) + Head(2) + "bc" +
                  std::string("\x10\0\1c\1\1\2\x40", 8),
              m_channel.pipe.output);
}

TEST_F(BinarySendTest, AFileThatIsMissingFailsAfterTagAndLength) {
    LogCapture log;
    EXPECT_EQ(-1, Send(Binary(0, 5, m_dir / "none")));
    EXPECT_TRUE(log.Has("[ERR] fopen(" + (m_dir / "none") + ") error"));
    EXPECT_EQ(Head(5), m_channel.pipe.output);
    EXPECT_EQ(-1, Send(Binary(0, 5, "")));
    EXPECT_TRUE(log.Has("[ERR] fopen() error"));
}

TEST_F(BinarySendTest, AnOffsetThatIsNoneFails) {
    const std::string path = m_dir.Write("file", "abc");
    LogCapture log;
    EXPECT_EQ(-1, Send(Binary(UINT64_MAX, 1, path)));
    EXPECT_TRUE(log.Has("[ERR] fseek error"));
}

TEST_F(BinarySendTest, AFileThatCanNotBeReadFails) {
    LogCapture log;
    EXPECT_EQ(-1, Send(Binary(0, 5, m_dir.Path())));  // a folder
    EXPECT_TRUE(log.Has("[ERR] fread error"));
}

TEST_F(BinarySendTest, AFileThatIsShorterThanItsRecordFails) {
    const std::string path = m_dir.Write("file", "abc");
    LogCapture log;
    for (const uint64_t length : {uint64_t{4}, uint64_t{1} << 40, UINT64_MAX}) {
        EXPECT_EQ(-5, Send(Binary(0, length, path)));
        EXPECT_EQ(Head(length) + "abc", m_channel.pipe.output);
    }
    EXPECT_EQ(3, log.Count("[ERR] file length is incorrect."));
    EXPECT_EQ(-5, Send(Binary(1000, 1, path)));
}

TEST_F(BinarySendTest, AFailingChannelIsAnInputError) {
    const std::string path = m_dir.Write("file", Pattern(3 * kBinaryBlock));
    m_channel.pipe.writes_left = 1;
    LogCapture log;
    EXPECT_EQ(ERR_IO, Send(Binary(0, 3 * kBinaryBlock, path)));
    EXPECT_TRUE(log.Has("[WARN] Channel: -2"));
}

class BinaryRecvTest : public BinaryTest {};

TEST_F(BinaryRecvTest, ANewFileOfTheTempFolderHoldsIt) {
    ASSERT_EQ(0, Recv(Head(5) + "hello", m_value));
    const auto temps = Temps();
    ASSERT_EQ(1U, temps.size());
    EXPECT_EQ("hello", ReadWholeFile(temps[0]));
    ASSERT_TRUE(m_value.IsBinary());
    EXPECT_EQ(temps[0], m_value.AsBinary().path);
    EXPECT_EQ(5U, m_value.AsBinary().offset);
    EXPECT_EQ(5U, m_value.AsBinary().length);
}

TEST_F(BinaryRecvTest, ALengthOfZeroMakesAnEmptyFile) {
    LogCapture log;
    ASSERT_EQ(0, Recv(Head(0), m_value));
    ASSERT_EQ(1U, Temps().size());
    EXPECT_EQ("", ReadWholeFile(Temps()[0]));
    EXPECT_EQ(0U, m_value.AsBinary().length);
    EXPECT_TRUE(log.Has("[DBG] binary has been stored at '" + Temps()[0] + "' with length 0"));
}

TEST_F(BinaryRecvTest, TheFileIsForItsOwnerAloneWhateverTheUmask) {
    const mode_t former = umask(0);
    ASSERT_EQ(0, Recv(Head(1) + "x", m_value));
    const std::string named = m_dir / "named";
    PObject record = Binary(0, 0, named);
    ASSERT_EQ(0, Recv(Head(1) + "x", record));
    umask(former);
    for (const std::string& path : {m_value.AsBinary().path, named}) {
        struct stat info {};
        ASSERT_EQ(0, stat(path.c_str(), &info));
        EXPECT_EQ(0600U, info.st_mode & 07777U);
    }
}

TEST_F(BinaryRecvTest, SizesAroundABlockPassWhole) {
    for (const size_t size : {kBinaryBlock - 1, kBinaryBlock, kBinaryBlock + 1, 3 * kBinaryBlock}) {
        const std::string content = Pattern(size);
        PObject value;
        ASSERT_EQ(0, Recv(Head(size) + content, value));
        EXPECT_TRUE(content == ReadWholeFile(value.AsBinary().path)) << size;
        EXPECT_EQ(size, value.AsBinary().length);
    }
}

TEST_F(BinaryRecvTest, StandsBetweenOtherValuesInRingsOfAnySize) {
    const std::string bytes = std::string("\x42\x10\0\1a\1\1\1\x10\0\1b\x41", 13) + Head(9) +
                              "ninebytes" + Head(1) + "z" +
                              std::string("\x40\x10\0\1c\1\1\2\x40", 9);
    for (const size_t capacity : {1U, 3U, 20U, 4096U}) {
        MemoryChannel channel(bytes, capacity);
        channel.pipe.read_limit = 7;
        PObject value;
        ASSERT_EQ(0, m_stream.Recv(channel, value)) << capacity;
        EXPECT_EQ(1, value["a"].AsInt32());
        EXPECT_EQ(2, value["c"].AsInt32());
        EXPECT_EQ("ninebytes", ReadWholeFile(value["b"].AsArray()[0].AsBinary().path));
        EXPECT_EQ("z", ReadWholeFile(value["b"].AsArray()[1].AsBinary().path));
    }
}

TEST_F(BinaryRecvTest, APathWithOffsetZeroIsWrittenOver) {
    m_value = Binary(0, 99, m_dir.Write("file", "what was there before"));
    LogCapture log;
    ASSERT_EQ(0, Recv(Head(3) + "new", m_value));
    EXPECT_EQ("new", ReadWholeFile(m_dir / "file"));
    EXPECT_EQ(3U, m_value.AsBinary().offset);
    EXPECT_EQ(3U, m_value.AsBinary().length);
    EXPECT_TRUE(log.Has("[DBG] store binary to " + (m_dir / "file") + ", offset 0"));
    EXPECT_TRUE(Temps().empty());
}

TEST_F(BinaryRecvTest, AFileThatCanNotBeMadeFails) {
    m_value = Binary(0, 7, m_dir / "none/file");
    EXPECT_EQ(-1, Recv(Head(1) + "x", m_value));
    EXPECT_EQ(0U, m_value.AsBinary().length);
    m_value = Binary(0, 0, m_dir.Path());  // a folder
    EXPECT_EQ(-1, Recv(Head(1) + "x", m_value));
}

TEST_F(BinaryRecvTest, AHostileLengthTakesNoMoreThanWhatComes) {
    for (const uint64_t length : {uint64_t{1} << 32, uint64_t{1} << 63, UINT64_MAX}) {
        PObject value;
        EXPECT_EQ(ERR_IO, Recv(Head(length) + Pattern(kBinaryBlock), value));
        EXPECT_EQ(kBinaryBlock, value.AsBinary().length);
        EXPECT_EQ(kBinaryBlock, ReadWholeFile(value.AsBinary().path).size());
    }
}

TEST_F(BinaryRecvTest, AFullDiskIsTold) {
    m_value = Binary(0, 0, "/dev/full");
    EXPECT_EQ(-4, Recv(Head(3) + "abc", m_value));
    EXPECT_EQ(0U, m_value.AsBinary().length);
}

TEST_F(BinaryRecvTest, AWriteThatFailsForAnotherReasonIsTold) {
    signal(SIGXFSZ, SIG_IGN);
    rlimit former{};
    ASSERT_EQ(0, getrlimit(RLIMIT_FSIZE, &former));
    const rlimit tight{kBinaryBlock + 10, former.rlim_max};
    const std::string content = Pattern(2 * kBinaryBlock);
    ASSERT_EQ(0, setrlimit(RLIMIT_FSIZE, &tight));
    const int result = Recv(Head(content.size()) + content, m_value);
    ASSERT_EQ(0, setrlimit(RLIMIT_FSIZE, &former));
    EXPECT_EQ(-1, result);
    EXPECT_EQ(kBinaryBlock, m_value.AsBinary().length);
    // Ten bytes more than counted are in the file; going on takes them away.
    EXPECT_EQ(kBinaryBlock + 10, ReadWholeFile(m_value.AsBinary().path).size());
    const std::string rest = content.substr(kBinaryBlock);
    EXPECT_EQ(0, Recv(Head(rest.size()) + rest, m_value));
    EXPECT_TRUE(content == ReadWholeFile(m_value.AsBinary().path));
}

TEST_F(BinaryRecvTest, AStreamThatRefusesBinariesStoresNothing) {
    m_stream.RefuseBinaries();
    EXPECT_EQ(-5, Recv(Head(1) + "x", m_value));
    m_value = Binary(0, 0, m_dir / "file");
    EXPECT_EQ(-5, Recv(Head(1) + "x", m_value));
    EXPECT_TRUE(Temps().empty());
    EXPECT_NE(0, access((m_dir / "file").c_str(), F_OK));
}

TEST_F(BinaryRecvTest, ATempFolderThatTakesNoFileFails) {
    for (const std::string& folder :
         {m_dir / "none", m_dir.Write("file", ""), std::string("/proc")}) {
        m_stream.SetTempDirectory(folder);
        PObject value;
        LogCapture log;
        EXPECT_EQ(-1, Recv(Head(1) + "x", value)) << folder;
        EXPECT_TRUE(log.Contains("[ERR] fopen(" + folder + "/")) << folder;
        EXPECT_TRUE(value.IsBinary());
        EXPECT_EQ("", value.AsBinary().path) << "a name that was not taken must not be used again";
    }
}

}  // namespace
