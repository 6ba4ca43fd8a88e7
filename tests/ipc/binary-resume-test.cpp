// Binaries that go on in the file of a record that the caller has left in the target.
#include <unistd.h>

#include "ipc/binary-fixture.h"
#include "ipc/binary-transfer.h"
#include "support/log-capture.h"
#include "utils/error-code.h"

namespace {

class BinaryResumeTest : public BinaryTest {};

TEST_F(BinaryResumeTest, AnOffsetAtTheEndIsAppendedTo) {
    m_value = Binary(6, 6, m_dir.Write("file", "begin-"));
    ASSERT_EQ(0, Recv(Head(3) + "end", m_value));
    EXPECT_EQ("begin-end", ReadWholeFile(m_dir / "file"));
    EXPECT_EQ(9U, m_value.AsBinary().offset);
    EXPECT_EQ(9U, m_value.AsBinary().length);
}

TEST_F(BinaryResumeTest, AnOffsetBeforeTheEndCutsTheFileThere) {
    m_value = Binary(4, 10, m_dir.Write("file", "0123456789"));
    ASSERT_EQ(0, Recv(Head(1) + "x", m_value));
    EXPECT_EQ("0123x", ReadWholeFile(m_dir / "file"));
    EXPECT_EQ(5U, m_value.AsBinary().length);
}

TEST_F(BinaryResumeTest, MoreThanWasCountedIsCutOff) {
    m_value = Binary(4, 4, m_dir.Write("file", "0123456789"));
    ASSERT_EQ(0, Recv(Head(1) + "x", m_value));
    EXPECT_EQ("0123x", ReadWholeFile(m_dir / "file"));
}

// Filled up with zeros, it would be told as done.
TEST_F(BinaryResumeTest, AFileThatIsGoneOrShorterThanItsOffsetFails) {
    for (const uint64_t length : {4U, 9U}) {
        m_value = Binary(4, length, m_dir / "none");
        LogCapture log;
        EXPECT_EQ(-1, Recv(Head(1) + "x", m_value));
        EXPECT_TRUE(log.Has("[ERR] truncate: No such file or directory (2)"));
        EXPECT_EQ(4U, m_value.AsBinary().offset);
        EXPECT_EQ(4U, m_value.AsBinary().length);
        EXPECT_NE(0, access((m_dir / "none").c_str(), F_OK));
        for (const uint64_t offset : {uint64_t{4}, uint64_t{1} << 40, UINT64_MAX}) {
            m_value = Binary(offset, length == 4 ? offset : length, m_dir.Write("file", "abc"));
            log.Clear();
            EXPECT_EQ(-1, Recv(Head(1) + "x", m_value)) << offset;
            EXPECT_TRUE(log.Has("[ERR] truncate: Invalid argument (22)"));
            EXPECT_EQ(offset, m_value.AsBinary().offset);
            EXPECT_EQ(3U, std::filesystem::file_size(m_dir / "file")) << "filled up";
        }
    }
}

TEST_F(BinaryResumeTest, AMissingFileIsMadeWhenItsContentBeginsAtTheBeginning) {
    m_value = Binary(0, 0, m_dir / "new");
    ASSERT_EQ(0, Recv(Head(1) + "x", m_value));
    EXPECT_EQ("x", ReadWholeFile(m_dir / "new"));
}

TEST_F(BinaryResumeTest, AMemberThatNamesAPlaceIsStoredThere) {
    m_value["deep"]["er"] = Binary(2, 2, m_dir.Write("file", "ab"));
    m_value["other"] = Binary(0, 0, m_dir / "other");
    m_value["gone"] = "dropped";
    const std::string bytes = std::string("\x42\x10\0\4deep\x42\x10\0\2er", 14) + Head(1) + "c" +
                              "\x40" + std::string("\x10\0\5fresh", 8) + Head(1) + "d" +
                              std::string("\x10\0\5other", 8) + Head(1) + "e\x40";
    ASSERT_EQ(0, Recv(bytes, m_value));
    EXPECT_EQ("abc", ReadWholeFile(m_dir / "file"));
    EXPECT_EQ("e", ReadWholeFile(m_dir / "other"));
    EXPECT_EQ(3U, m_value["deep"]["er"].AsBinary().length);
    ASSERT_EQ(1U, Temps().size());
    EXPECT_EQ("d", ReadWholeFile(m_value["fresh"].AsBinary().path));
    EXPECT_FALSE(m_value.HasMember("gone"));
}

TEST_F(BinaryResumeTest, AnElementIsANewValueWhateverStoodThere) {
    const std::string precious = m_dir.Write("file", "precious");
    // An array, a map whose first entry would be found under the index, and deeper below both.
    PObject array;
    array.AsArray().push_back(Binary(0, 0, precious));
    PObject map;
    map["a"] = Binary(0, 0, precious);
    PObject deep;
    deep.AsArray().emplace_back()["k"] = Binary(0, 0, precious);
    const std::string element = Head(1) + "x";
    const std::string member = std::string("\x42\x10\0\1k", 5) + Head(1) + "x\x40";
    for (const PObject& former : {array, map, deep}) {
        for (const std::string& content : {element, member}) {
            PObject value = former;
            ASSERT_EQ(0, Recv("\x41" + content + "\x40", value)) << former.ToText();
            EXPECT_EQ("precious", ReadWholeFile(precious)) << former.ToText();
            value["list"] = former;
            ASSERT_EQ(0,
                      Recv(std::string("\x42\x10\0\4list\x41", 9) + content + "\x40\x40", value));
            EXPECT_EQ("precious", ReadWholeFile(precious)) << former.ToText();
        }
    }
    EXPECT_EQ(12U, Temps().size());
}

TEST_F(BinaryResumeTest, AMapInPlaceOfAnArrayFindsNoPlaceInIt) {
    m_value.AsArray().push_back(Binary(0, 0, m_dir.Write("file", "precious")));
    ASSERT_EQ(0, Recv(std::string("\x42\x10\0\1k", 5) + Head(1) + "x\x40", m_value));
    EXPECT_EQ("precious", ReadWholeFile(m_dir / "file"));
}

TEST_F(BinaryResumeTest, ARepeatedKeyReplacesTheContent) {
    m_value["a"] = Binary(0, 0, m_dir / "file");
    const std::string key("\x10\0\1a", 4);
    ASSERT_EQ(0, Recv("\x42" + key + Head(5) + "first" + key + Head(2) + "2." + "\x40", m_value));
    EXPECT_EQ("2.", ReadWholeFile(m_dir / "file"));
    EXPECT_EQ(2U, m_value["a"].AsBinary().length);
}

TEST_F(BinaryResumeTest, APeerThatHangsUpLeavesWhatIsNeededToGoOn) {
    const std::string content = Pattern(2 * kBinaryBlock + 100);
    const std::string bytes = Head(content.size()) + content;
    for (const size_t cut : {0U, 1U, 8U}) {
        PObject value;
        EXPECT_EQ(ERR_IO, Recv(bytes.substr(0, cut), value)) << cut;
        EXPECT_TRUE(Temps().empty()) << cut;
    }
    LogCapture log;
    EXPECT_EQ(ERR_IO, Recv(bytes.substr(0, 9 + kBinaryBlock + 50), m_value));
    EXPECT_TRUE(log.Has("[WARN] Channel: -2"));
    const PObject::binary_type record = m_value.AsBinary();
    EXPECT_EQ(kBinaryBlock, record.offset);
    EXPECT_EQ(kBinaryBlock, record.length);
    EXPECT_TRUE(content.substr(0, kBinaryBlock) == ReadWholeFile(record.path));
    const std::string rest = content.substr(record.offset);
    EXPECT_EQ(0, Recv(Head(rest.size()) + rest, m_value));
    EXPECT_TRUE(content == ReadWholeFile(record.path));
    EXPECT_EQ(content.size(), m_value.AsBinary().length);
}

TEST_F(BinaryResumeTest, ARecordStaysAsItWasUntilItsContentBegins) {
    const std::string path = m_dir.Write("file", "begin-");
    const std::string key("\x42\x10\0\1k", 5);
    for (size_t cut = 0; cut < 9; ++cut) {
        for (const bool is_member : {false, true}) {
            PObject value;
            PObject& record = is_member ? value["k"] : value;
            record = Binary(6, 6, path);
            const std::string head = (is_member ? key : "") + Head(3).substr(0, cut);
            ASSERT_EQ(ERR_IO, Recv(head, value)) << cut;
            const PObject& left = is_member ? value["k"] : value;
            ASSERT_TRUE(left.IsBinary()) << cut << " " << is_member;
            EXPECT_EQ(path, left.AsBinary().path);
            EXPECT_EQ(6U, left.AsBinary().offset);
            EXPECT_EQ(6U, left.AsBinary().length);
            ASSERT_EQ(0, Recv((is_member ? key : "") + Head(3) + "end" + (is_member ? "\x40" : ""),
                              value));
            EXPECT_EQ("begin-end", ReadWholeFile(path));
            m_dir.Write("file", "begin-");
        }
    }
}

TEST_F(BinaryResumeTest, ARecordStaysAsItWasWhenSomethingElseIsCutShort) {
    for (const std::string& bytes : {std::string("\x01\4ab", 4), std::string("\x10\0\x10str", 6),
                                     std::string("\x77", 1), std::string("\0\1", 2)}) {
        m_value = Binary(6, 6, m_dir / "file");
        EXPECT_GT(0, Recv(bytes, m_value));
        ASSERT_TRUE(m_value.IsBinary());
        EXPECT_EQ(m_dir / "file", m_value.AsBinary().path);
    }
}

}  // namespace
