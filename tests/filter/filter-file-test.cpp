#include "filter/filter-file.h"

#include <gmock/gmock.h>
#include <sys/stat.h>

#include "support/temp-dir.h"

namespace {

using testing::ElementsAre;

class FilterFileTest : public testing::Test {
protected:
    std::string Written(const BlackFilter& record) {
        EXPECT_EQ(0, WriteBlackFilterFile(record, m_path));
        return ReadWholeFile(m_path);
    }
    int Load(const std::string& text, BlackFilter& record) {
        testing::internal::CaptureStdout();
        testing::internal::CaptureStderr();
        const int result = ReadBlackFilterFile(record, m_dir.Write("test.filter", text));
        testing::internal::GetCapturedStdout();
        testing::internal::GetCapturedStderr();
        return result;
    }

    TempDir m_dir;
    std::string m_path = m_dir / "test.filter";
};

TEST_F(FilterFileTest, ABlackListIsWrittenByteForByteLikeThis) {
    BlackFilter record;
    record.major = 1;
    record.common.black_name.Add("tmp");
    record.common.black_name.Add("cache");
    record.file.black_ext.Add("iso");
    EXPECT_EQ(
        "[Version]\nmajor = 1\nminor = 0\n\n"
        "[Common]\nblack_name = \"tmp\", \"cache\"\nmax_length = 0\nmax_path = 0\n"
        "max_dst_path = 0\n\n"
        "[File]\nblack_ext = \"iso\"\nmax_size = 0\n\n"
        "[Directory]\n\n",
        Written(record));
}

TEST_F(FilterFileTest, KeysAreWrittenInTheirFixedOrder) {
    BlackFilter record;
    record.major = 1;
    record.minor = 3;
    record.common.black_char = "c1";
    record.common.black_prefix.Add("c2");
    record.common.black_dir_prefix.Add("c3");
    record.common.black_suffix.Add("c4");
    record.common.black_name.Add("c5");
    record.common.max_length = 6;
    record.common.max_path = 7;
    record.common.max_dst_path = UINT64_MAX;
    record.file.black_char = "f1";
    record.file.black_ext.Add("f2");
    record.file.black_name.Add("f3");
    record.file.black_prefix.Add("f4");
    record.file.black_suffix.Add("f5");
    record.file.black_glob.Add("f6");
    record.file.max_size = 7;
    record.directory.black_char = "d1";
    record.directory.black_name.Add("d2");
    record.directory.black_prefix.Add("d3");
    record.directory.black_suffix.Add("d4");
    record.directory.black_glob.Add("d5");
    EXPECT_EQ(
        "[Version]\nmajor = 1\nminor = 3\n\n"
        "[Common]\nblack_char = \"c1\"\nblack_prefix = \"c2\"\nblack_dir_prefix = \"c3\"\n"
        "black_suffix = \"c4\"\nblack_name = \"c5\"\nmax_length = 6\nmax_path = 7\n"
        "max_dst_path = 18446744073709551615\n\n"
        "[File]\nblack_char = \"f1\"\nblack_ext = \"f2\"\nblack_name = \"f3\"\n"
        "black_prefix = \"f4\"\nblack_suffix = \"f5\"\nblack_glob = \"f6\"\nmax_size = 7\n\n"
        "[Directory]\nblack_char = \"d1\"\nblack_name = \"d2\"\nblack_prefix = \"d3\"\n"
        "black_suffix = \"d4\"\nblack_glob = \"d5\"\n\n",
        Written(record));
}

TEST_F(FilterFileTest, AWhiteListIsWrittenByteForByteLikeThis) {
    WhiteFilter record;
    record.major = 1;
    record.common.white_name.Add("*");
    record.file.white_ext.Add("jpg");
    ASSERT_EQ(0, WriteWhiteFilterFile(record, m_path));
    EXPECT_EQ(
        "[Version]\nmajor = 1\nminor = 0\n\n[Common]\nwhite_name = \"*\"\n\n"
        "[File]\nwhite_ext = \"jpg\"\n\n",
        ReadWholeFile(m_path));
}

TEST_F(FilterFileTest, BytesAreWrittenInTheirForm) {
    WhiteFilter record;
    record.common.white_name.Add("a\"b\\c\td\ne\vf\fg\rh$i@j`k\x7f\xc3~ '");
    ASSERT_EQ(0, WriteWhiteFilterFile(record, m_path));
    EXPECT_THAT(
        ReadWholeFile(m_path),
        testing::HasSubstr(R"(white_name = "a\"b\\c\td\ne\vf\fg\x0dh\x24i\x40j\x60k\x7f\xc3~ '")"));
}

TEST_F(FilterFileTest, ALineBreakFollowsEveryFifthValueAndIsReadBack) {
    WhiteFilter record;
    for (const char c : std::string("abcdefghijk")) record.common.white_name.Add({c});
    ASSERT_EQ(0, WriteWhiteFilterFile(record, m_path));
    EXPECT_THAT(ReadWholeFile(m_path),
                testing::HasSubstr("white_name = \"a\", \"b\", \"c\", \"d\", \"e\", \n"
                                   "\"f\", \"g\", \"h\", \"i\", \"j\", \n\"k\"\n"));
    WhiteFilter back;
    ASSERT_EQ(0, ReadWhiteFilterFile(back, m_path));
    EXPECT_EQ(record.common.white_name.Items(), back.common.white_name.Items());
}

TEST_F(FilterFileTest, FiveValuesOfTheLongestWrittenFormFitALine) {
    WhiteFilter record;
    for (int i = 0; i < 12; ++i) record.file.white_ext.Add(std::string(1022, 'x') + "abc"[i % 3]);
    ASSERT_EQ(0, WriteWhiteFilterFile(record, m_path));
    WhiteFilter back;
    ASSERT_EQ(0, ReadWhiteFilterFile(back, m_path));
    EXPECT_EQ(record.file.white_ext.Items(), back.file.white_ext.Items());
}

TEST_F(FilterFileTest, AValueIsCutOffWhereItsFormWouldPass1023Bytes) {
    WhiteFilter record;
    record.common.white_name.Add(std::string(1024, 'x'));
    record.common.white_name.Add(std::string(1021, 'x') + "\xff" + "y");
    ASSERT_EQ(0, WriteWhiteFilterFile(record, m_path));
    WhiteFilter back;
    ASSERT_EQ(0, ReadWhiteFilterFile(back, m_path));
    EXPECT_THAT(back.common.white_name.Items(),
                ElementsAre(std::string(1023, 'x'), std::string(1021, 'x')));
}

TEST_F(FilterFileTest, EveryByteAValueMayHoldComesBack) {
    BlackFilter record;
    for (int byte = 0; byte < 256; ++byte) {
        const std::string one(1, static_cast<char>(byte));
        record.common.black_name.Add(one);
        record.file.black_ext.Add("0" + one + "f");  // a digit behind an escape is no part of it
        record.directory.black_char += one;
    }
    record.directory.black_char.resize(200);
    ASSERT_EQ(0, WriteBlackFilterFile(record, m_path));
    BlackFilter back;
    ASSERT_EQ(0, ReadBlackFilterFile(back, m_path));
    EXPECT_EQ(record.common.black_name.Items(), back.common.black_name.Items());
    EXPECT_EQ(record.file.black_ext.Items(), back.file.black_ext.Items());
    EXPECT_EQ(record.directory.black_char, back.directory.black_char);
}

TEST_F(FilterFileTest, TheLengthOfAWrittenFormCountsItsEscapes) {
    EXPECT_EQ(0u, FilterWrittenLength(""));
    EXPECT_EQ(3u, FilterWrittenLength("abc"));
    EXPECT_EQ(4u, FilterWrittenLength("\t\""));
    EXPECT_EQ(8u, FilterWrittenLength("$\xff"));
}

TEST_F(FilterFileTest, AFilterIsWritableByItsOwnerAloneWhateverTheUmask) {
    const mode_t old = umask(0);
    EXPECT_EQ(0, WriteBlackFilterFile(BlackFilter(), m_path));
    struct stat st {};
    ASSERT_EQ(0, stat(m_path.c_str(), &st));
    EXPECT_EQ(0644u, st.st_mode & 07777);
    chmod(m_path.c_str(), 0666);
    EXPECT_EQ(0, WriteBlackFilterFile(BlackFilter(), m_path));
    ASSERT_EQ(0, stat(m_path.c_str(), &st));
    EXPECT_EQ(0644u, st.st_mode & 07777) << "also one that was there";
    umask(old);
}

TEST_F(FilterFileTest, AShorterFilterReplacesALongerOne) {
    m_dir.Write("test.filter", std::string(10000, '#'));
    EXPECT_EQ(0, WriteWhiteFilterFile(WhiteFilter(), m_path));
    EXPECT_EQ("[Version]\nmajor = 0\nminor = 0\n\n[Common]\n\n[File]\n\n", ReadWholeFile(m_path));
}

TEST_F(FilterFileTest, WritingFailsWhereNoFileCanBe) {
    EXPECT_EQ(-1, WriteBlackFilterFile(BlackFilter(), m_dir / "missing/test.filter"));
    EXPECT_EQ(-1, WriteWhiteFilterFile(WhiteFilter(), m_dir.Path()));
    EXPECT_EQ(-1, WriteWhiteFilterFile(WhiteFilter(), "/dev/full")) << "a full disk";
}

TEST_F(FilterFileTest, AnUnknownKeyIsAcceptedInAFileThatSaysItIsNewer) {
    BlackFilter record;
    EXPECT_EQ(0, Load("[Version]\nmajor=1\nminor=1\n[Common]\nnew=1\nblack_name=\"a\"\n", record));
    EXPECT_THAT(record.common.black_name.Items(), ElementsAre("a"));
}

TEST_F(FilterFileTest, AnUnknownKeyIsRefusedInAnyOtherFileAndTheRecordIsEmptied) {
    for (const char* version : {"major=1\nminor=0\n", "major=2\nminor=1\n", "minor=1\n", ""}) {
        BlackFilter record;
        EXPECT_EQ(-1,
                  Load(std::string("[Version]\n") + version + "[Common]\nblack_name=\"a\"\nnew=1\n",
                       record))
            << version;
        EXPECT_EQ(0u, record.common.black_name.Count());
        EXPECT_EQ(0, record.major);
    }
}

TEST_F(FilterFileTest, AFileWithoutUnknownKeysLoadsWhateverItsVersion) {
    BlackFilter record;
    EXPECT_EQ(0, Load("[Version]\nmajor=9\n", record));
    EXPECT_EQ(9, record.major);
}

TEST_F(FilterFileTest, AnErrorEmptiesTheRecord) {
    BlackFilter record;
    record.common.max_length = 5;
    EXPECT_EQ(-1,
              Load("[Version]\nmajor=1\nminor=1\n[Common]\nblack_name=\"a\"\nmax_path=\n", record));
    EXPECT_EQ(0u, record.common.black_name.Count());
    EXPECT_EQ(0u, record.common.max_length);
    EXPECT_EQ(-1, ReadBlackFilterFile(record, m_dir / "missing"));
}

TEST_F(FilterFileTest, AWhiteListWithABlackListsKeyIsRefused) {
    WhiteFilter record;
    testing::internal::CaptureStdout();
    EXPECT_EQ(-1, ReadWhiteFilterFile(record, m_dir.Write("w", "[Common]\nblack_name=\"a\"\n")));
    EXPECT_EQ("warning: unknown key (black_name)\n", testing::internal::GetCapturedStdout());
}

}  // namespace
