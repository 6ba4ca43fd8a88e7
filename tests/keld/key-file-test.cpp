#include <keld/error.h>
#include <keld/keyfile.h>
#include <keld/support.h>
#include <sys/stat.h>
#include <unistd.h>

#include <thread>

#include "host-fixture.h"

namespace {

class KeyFile : public HostFixture {
protected:
    std::string Get(const std::string& key) const {
        char buffer[256];
        return KLIBCFileGetKeyValue(m_path.c_str(), key.c_str(), buffer, sizeof(buffer), 0) == 1
                   ? buffer
                   : "(none)";
    }
    int Set(const std::string& key, const std::string& value,
            const char* format = KELD_KEY_VALUE_FORMAT) const {
        return KLIBCFileSetKeyValue(m_path.c_str(), key.c_str(), value.c_str(), format);
    }
    std::string Text() const { return ReadWholeFile(m_path); }
    void Write(const std::string& text) const { m_dir.Write("f", text); }

    const std::string m_path = m_dir / "f";
};

}  // namespace

TEST_F(KeyFile, AValueIsReadBack) {
    EXPECT_EQ(0, Set("state", "4"));
    EXPECT_EQ("state=\"4\"\n", Text());
    EXPECT_EQ("4", Get("state"));
}

TEST_F(KeyFile, AMissingFileHoldsNoKeyAndIsNoError) {
    char buffer[4] = "x";
    EXPECT_EQ(0, KLIBCFileGetKeyValue(m_path.c_str(), "k", buffer, sizeof(buffer), 0));
    EXPECT_STREQ("", buffer);
}

TEST_F(KeyFile, AnEmptyValueIsFound) {
    EXPECT_EQ(0, Set("error", ""));
    char buffer[4] = "x";
    EXPECT_EQ(1, KLIBCFileGetKeyValue(m_path.c_str(), "error", buffer, sizeof(buffer), 0));
    EXPECT_STREQ("", buffer);
}

TEST_F(KeyFile, AMissingKeyGivesNothing) {
    Write("other=\"1\"\n");
    char buffer[4] = "x";
    EXPECT_EQ(0, KLIBCFileGetKeyValue(m_path.c_str(), "oth", buffer, sizeof(buffer), 0));
    EXPECT_STREQ("", buffer);
}

TEST_F(KeyFile, AValueThatDoesNotFitIsAnErrorAndNeverCut) {
    Write("path=\"/volume1\"\n");
    char buffer[8] = "x";
    EXPECT_GT(0, KLIBCFileGetKeyValue(m_path.c_str(), "path", buffer, sizeof(buffer), 0));
    EXPECT_EQ(KELDERR_INVALID_ARGUMENT, KLIBCErrGet());
    EXPECT_STREQ("", buffer);
    char enough[9];
    EXPECT_EQ(1, KLIBCFileGetKeyValue(m_path.c_str(), "path", enough, sizeof(enough), 0));
    EXPECT_STREQ("/volume1", enough);
}

TEST_F(KeyFile, AnUnreadableFileIsAnError) {
    ASSERT_EQ(0, mkdir(m_path.c_str(), 0700));
    char buffer[4];
    EXPECT_GT(0, KLIBCFileGetKeyValue(m_path.c_str(), "k", buffer, sizeof(buffer), 0));
    EXPECT_GT(0, Set("k", "v"));
    EXPECT_GT(0, KLIBCFileCheckKeyValue(m_path.c_str(), "k", "v"));
    EXPECT_GT(0, KLIBCFileRemoveKey(m_path.c_str(), "k"));
}

TEST_F(KeyFile, ReplacingKeepsCommentsUnknownLinesAndTheOrder) {
    Write("# hello\nbeep=\"yes\"\nsome words\n\nrepo=\"/volume1\"");
    EXPECT_EQ(0, Set("beep", "no"));
    EXPECT_EQ("# hello\nbeep=\"no\"\nsome words\n\nrepo=\"/volume1\"", Text());
    EXPECT_EQ(0, Set("new", "1"));
    EXPECT_EQ("# hello\nbeep=\"no\"\nsome words\n\nrepo=\"/volume1\"\nnew=\"1\"\n", Text());
}

TEST_F(KeyFile, LinesWrittenByHandAreRead) {
    Write(" a = 1 \nb=\"x y\"  \n#c=\"3\"\nd=\"cut\ne='q'\n");
    EXPECT_EQ("1", Get("a"));
    EXPECT_EQ("x y", Get("b"));
    EXPECT_EQ("(none)", Get("c"));
    EXPECT_EQ("(none)", Get("d"));
    EXPECT_EQ("'q'", Get("e"));
}

TEST_F(KeyFile, OfSeveralLinesOfAKeyTheFirstCountsAndASetLeavesOne) {
    Write("a=\"1\"\nb=\"2\"\na=\"3\"\n");
    EXPECT_EQ("1", Get("a"));
    EXPECT_EQ(0, Set("a", "4"));
    EXPECT_EQ("a=\"4\"\nb=\"2\"\n", Text());
}

TEST_F(KeyFile, ValuesComeBackByteForByte) {
    for (const std::string value :
         {"back\\slash\\", "%s%n%d", " blanks ", "a=b", "#x", "\xff\xfe", "tab\there", "\\n"}) {
        EXPECT_EQ(0, Set("k", value)) << value;
        EXPECT_EQ(value, Get("k"));
    }
}

TEST_F(KeyFile, WhatTheFormatCannotHoldIsRefusedAndTheFileStaysAsItWas) {
    Write("k=\"old\"\n");
    for (const std::string value : {"a\"b", "a\nk=\"evil\"", "a\r", "\"", "\n"}) {
        EXPECT_GT(0, Set("k", value)) << value;
        EXPECT_EQ(KELDERR_INVALID_ARGUMENT, KLIBCErrGet());
        EXPECT_EQ("k=\"old\"\n", Text());
    }
    for (const std::string key : {"", "a b", "a=b", "#a", "a\nb", "a\"", " a"}) {
        EXPECT_GT(0, Set(key, "v")) << key;
        EXPECT_EQ("k=\"old\"\n", Text());
    }
}

TEST_F(KeyFile, AFormatMustWriteALineThatReadsBack) {
    EXPECT_EQ(0, Set("a", "1", "%s=%s\n"));
    EXPECT_EQ("a=1\n", Text());
    EXPECT_EQ(0, Set("b", "2", nullptr));
    EXPECT_EQ("a=1\nb=\"2\"\n", Text());
    for (const char* format : {"%s=\"%s\"", "%s\n", "%s %s\n", "%s=%s%s\n", "%d=%s\n", "%s=%s", "%",
                               "", "%s=\"%s\"\n\n", "%s=\"x%s\"\n", "%s=\"%s\" %n\n"}) {
        EXPECT_GT(0, Set("c", "3", format)) << format;
    }
    EXPECT_GT(0, Set("c", " 3", "%s=%s\n"));  // the blank would be lost
    EXPECT_EQ("a=1\nb=\"2\"\n", Text());
}

TEST_F(KeyFile, TheFileIsWritableByItsOwnerAloneWhateverTheUmask) {
    const mode_t old = umask(0);
    EXPECT_EQ(0, Set("a", "1"));
    umask(old);
    struct stat info {};
    ASSERT_EQ(0, stat(m_path.c_str(), &info));
    EXPECT_EQ(0644u, info.st_mode & 07777u);
}

TEST_F(KeyFile, AWriteLeavesNothingElseInTheFolder) {
    EXPECT_EQ(0, Set("a", "1"));
    EXPECT_GT(0, Set("a", "\n"));
    EXPECT_EQ(0, unlink(m_path.c_str()));
    EXPECT_EQ(0, rmdir(m_dir.MakeDir("probe").c_str()));
    // Removable only when it is empty.
    const std::string folder = m_dir.MakeDir("sub");
    EXPECT_EQ(0, KLIBCFileSetKeyValue((folder + "/f").c_str(), "a", "1", nullptr));
    EXPECT_EQ(0, unlink((folder + "/f").c_str()));
    EXPECT_EQ(0, rmdir(folder.c_str()));
}

TEST_F(KeyFile, ALinkInItsPlaceIsReplacedAndNotWrittenThrough) {
    const std::string victim = m_dir.Write("victim", "precious\n");
    ASSERT_EQ(0, symlink(victim.c_str(), m_path.c_str()));
    EXPECT_EQ(0, Set("a", "1"));
    EXPECT_EQ("precious\n", ReadWholeFile(victim));
    EXPECT_EQ("1", Get("a"));
}

TEST_F(KeyFile, ANameOf255BytesWorks) {
    const std::string path = m_dir / std::string(255, 'n');
    EXPECT_EQ(0, KLIBCFileSetKeyValue(path.c_str(), "a", "1", nullptr));
    EXPECT_EQ(1, KLIBCFileCheckKeyValue(path.c_str(), "a", "1"));
}

TEST_F(KeyFile, AMissingFolderIsAnError) {
    EXPECT_GT(0, KLIBCFileSetKeyValue((m_dir / "no/f").c_str(), "a", "1", nullptr));
    EXPECT_EQ(KELDERR_SRC_MISS, KLIBCErrGet());
}

TEST_F(KeyFile, AReaderNeverSeesHalfAFile) {
    const std::string first(2000, 'a');
    const std::string second(3000, 'b');
    ASSERT_EQ(0, Set("k", first));
    std::thread writer([&] {
        for (int i = 0; i < 100; ++i) EXPECT_EQ(0, Set("k", i % 2 == 0 ? second : first));
    });
    for (int i = 0; i < 2000; ++i) {
        char buffer[4096];
        EXPECT_EQ(1, KLIBCFileGetKeyValue(m_path.c_str(), "k", buffer, sizeof(buffer), 0));
        const std::string seen = buffer;
        EXPECT_TRUE(seen == first || seen == second);
    }
    writer.join();
}

TEST_F(KeyFile, CheckComparesTheWholeValue) {
    Write("a=\"yes\"\n");
    EXPECT_EQ(1, KLIBCFileCheckKeyValue(m_path.c_str(), "a", "yes"));
    EXPECT_EQ(0, KLIBCFileCheckKeyValue(m_path.c_str(), "a", "YES"));
    EXPECT_EQ(0, KLIBCFileCheckKeyValue(m_path.c_str(), "a", "ye"));
    EXPECT_EQ(0, KLIBCFileCheckKeyValue(m_path.c_str(), "b", "yes"));
    EXPECT_EQ(0, KLIBCFileCheckKeyValue((m_dir / "none").c_str(), "a", "yes"));
}

TEST_F(KeyFile, RemovingAKeyTakesEveryLineOfIt) {
    Write("# c\na=\"1\"\nb=\"2\"\na=\"3\"\n");
    EXPECT_EQ(1, KLIBCFileRemoveKey(m_path.c_str(), "a"));
    EXPECT_EQ("# c\nb=\"2\"\n", Text());
    EXPECT_EQ(0, KLIBCFileRemoveKey(m_path.c_str(), "a"));
    EXPECT_EQ(0, KLIBCFileRemoveKey((m_dir / "none").c_str(), "a"));
    EXPECT_EQ(0, KLIBCFileExist((m_dir / "none").c_str()));
}

TEST_F(KeyFile, ExistFollowsLinks) {
    EXPECT_EQ(0, KLIBCFileExist(m_path.c_str()));
    Write("");
    EXPECT_EQ(1, KLIBCFileExist(m_path.c_str()));
    ASSERT_EQ(0, symlink("nowhere", (m_dir / "dangling").c_str()));
    EXPECT_EQ(0, KLIBCFileExist((m_dir / "dangling").c_str()));
    EXPECT_EQ(0, KLIBCFileExist(nullptr));
}

TEST_F(KeyFile, ACapabilityIsAKeyWithTheValueYes) {
    EXPECT_EQ(0, KLIBCSupportGet("ferrix"));
    m_dir.Write("etc.defaults/keldinfo.conf", "ferrix=\"yes\"\nsdferrix=\"no\"\nupper=\"YES\"\n");
    EXPECT_EQ(1, KLIBCSupportGet("ferrix"));
    EXPECT_EQ(0, KLIBCSupportGet("sdferrix"));
    EXPECT_EQ(0, KLIBCSupportGet("upper"));
    EXPECT_EQ(0, KLIBCSupportGet("other"));
    EXPECT_EQ(0, KLIBCSupportGet(nullptr));
}
