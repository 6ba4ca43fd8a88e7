#include "platform/global-setting.h"

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include "fake/fake-keld.h"
#include "platform/package-paths.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

namespace {

class GlobalSettingTest : public testing::Test {
protected:
    GlobalSettingTest() {
        m_dir.MakeDir("etc");
        SetPackageFolderForTest(m_dir.Path());
    }
    ~GlobalSettingTest() override { SetPackageFolderForTest(""); }

    void Write(const std::string& content) { m_dir.Write("etc/setting.conf", content); }
    std::string Content() { return ReadWholeFile(m_dir / "etc/setting.conf"); }

    FakeKeld& m_fake = FakeKeld::Reset();
    TempDir m_dir;
};

// --- The repository's volume

TEST_F(GlobalSettingTest, RepositoryVolumeIsWrittenAsAKeyLineAndReadsBack) {
    EXPECT_TRUE(SetRepoVolPath("/volume1"));
    EXPECT_EQ("repo_vol_path=\"/volume1\"\n", Content());
    EXPECT_EQ("/volume1", GetRepoVolPath());
    EXPECT_TRUE(SetRepoVolPath("/volume2"));
    EXPECT_EQ("/volume2", GetRepoVolPath());
}

TEST_F(GlobalSettingTest, MissingVolumeReadsAsEmptyWithoutALogLine) {
    const LogCapture log;
    EXPECT_EQ("", GetRepoVolPath());
    Write("beep=\"yes\"\n");
    EXPECT_EQ("", GetRepoVolPath());
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(GlobalSettingTest, UnreadableVolumeReadsAsEmpty) {
    Write("repo_vol_path=\"/volume1\"\n");
    m_fake.FailCall("KLIBCFileGetKeyValue");
    EXPECT_EQ("", GetRepoVolPath());
}

TEST_F(GlobalSettingTest, VolumeOf64BytesOrMoreIsCutTo63) {
    const std::string path63 = "/" + std::string(62, 'v');
    Write("repo_vol_path=\"" + path63 + "\"\n");
    EXPECT_EQ(path63, GetRepoVolPath());
    Write("repo_vol_path=\"" + path63 + "w\"\n");
    EXPECT_EQ(path63, GetRepoVolPath());
    Write("repo_vol_path=\"" + path63 + std::string(2000, 'w') + "\"\n");
    EXPECT_EQ(path63, GetRepoVolPath());
}

TEST_F(GlobalSettingTest, VolumeThatCannotBeWrittenIsLogged) {
    m_fake.FailCall("KLIBCFileSetKeyValue", 0x2400);
    const LogCapture log;
    EXPECT_FALSE(SetRepoVolPath("/vol%s1"));
    ASSERT_EQ(1u, log.Lines().size());
    EXPECT_TRUE(log.Contains("platform/global-setting.cpp:"));
    EXPECT_TRUE(log.Contains(" KLIBCFileSetKeyValue() failed, path=[/vol%s1],[0x2400 "));
}

// --- The beep

TEST_F(GlobalSettingTest, BeepIsWrittenAsYesOrNo) {
    EXPECT_TRUE(SetBeep(true));
    EXPECT_EQ("beep=\"yes\"\n", Content());
    EXPECT_TRUE(GetBeep());
    EXPECT_TRUE(SetBeep(false));
    EXPECT_EQ("beep=\"no\"\n", Content());
    EXPECT_FALSE(GetBeep());
}

TEST_F(GlobalSettingTest, OnlyYesInAnyCaseSwitchesTheBeepOn) {
    const LogCapture log;
    for (const char* value : {"yes", "YES", "Yes", "yEs"}) {
        Write(std::string("beep=\"") + value + "\"\n");
        EXPECT_TRUE(GetBeep()) << value;
    }
    for (const char* value : {"", "no", "y", "ye", "yess", "yes ", " yes", "true", "1",
                              "yes please", "a very long value"}) {
        Write(std::string("beep=\"") + value + "\"\n");
        EXPECT_FALSE(GetBeep()) << value;
    }
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(GlobalSettingTest, MissingBeepReadsAsFalseWhileInitBeepMakesItYes) {
    const LogCapture log;
    EXPECT_FALSE(GetBeep());
    EXPECT_TRUE(InitBeep());
    EXPECT_EQ("beep=\"yes\"\n", Content());
    EXPECT_TRUE(GetBeep());
    EXPECT_TRUE(log.Lines().empty());
}

TEST_F(GlobalSettingTest, InitBeepLeavesASettingAlone) {
    for (const char* content : {"beep=\"no\"\n", "beep=\"\"\n"}) {
        Write(content);
        EXPECT_TRUE(InitBeep());
        EXPECT_EQ(content, Content());
    }
}

TEST_F(GlobalSettingTest, UnreadableBeepIsLoggedAndFalse) {
    Write("beep=\"yes\"\n");
    m_fake.FailCall("KLIBCFileGetKeyValue", 0x6C00, 2);
    const LogCapture log;
    EXPECT_FALSE(GetBeep());
    EXPECT_FALSE(InitBeep());
    ASSERT_EQ(2u, log.Lines().size());
    EXPECT_THAT(log.Lines()[0],
                testing::MatchesRegex("\\[ERR\\] .*platform/global-setting.cpp:[0-9]+ "
                                      "KLIBCFileGetKeyValue\\(\\) failed\\[0x6C00 .*:[0-9]+\\]"));
    EXPECT_EQ(0, m_fake.CallCount("KLIBCFileSetKeyValue"));
}

TEST_F(GlobalSettingTest, BeepThatCannotBeWrittenIsLogged) {
    m_fake.FailCall("KLIBCFileSetKeyValue", 0x0300, 3);
    const LogCapture log;
    EXPECT_FALSE(SetBeep(true));
    EXPECT_FALSE(SetBeep(false));
    EXPECT_FALSE(InitBeep());
    ASSERT_EQ(3u, log.Lines().size());
    EXPECT_TRUE(log.Contains(" KLIBCFileSetKeyValue() failed, beep=[1],[0x0300 "));
    EXPECT_TRUE(log.Contains(" KLIBCFileSetKeyValue() failed, beep=[0],[0x0300 "));
}

}  // namespace
