#include "client/share-folder-maker.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include "client/exit-status.h"
#include "fake/fake-keld.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "utils/file-op.h"

using testing::HasSubstr;

namespace {

class ShareFolderMakerTest : public testing::Test {
protected:
    ShareFolderMakerTest() {
        FakeKeld& fake = FakeKeld::Reset();
        fake.AddShare({.name = "photos", .path = m_share});
        fake.AddShare({.name = "gone", .path = m_dir / "volume2/gone"});
    }
    // Why the folder was not made; empty when it was.
    std::string Make(const ShareFolder& folder) {
        try {
            m_maker.Make(folder);
        } catch (const CommandError& error) {
            EXPECT_EQ(EXIT_REFUSED, error.Status());
            return error.what();
        }
        return "";
    }
    [[nodiscard]] bool Has(const std::string& folder) const { return FSExists(m_share + folder); }

    TempDir m_dir;
    std::string m_share = m_dir.MakeDir("volume1/photos");
    LogCapture m_log;
    ShareFolderMaker m_maker;
};

}  // namespace

TEST_F(ShareFolderMakerTest, WhatIsMissingIsMadeAndTakenBack) {
    m_dir.MakeDir("volume1/photos/a");
    EXPECT_EQ("", Make({"photos", "/a/b/c"}));
    EXPECT_TRUE(Has("/a/b/c"));
    m_maker.TakeBack();
    EXPECT_FALSE(Has("/a/b"));
    EXPECT_TRUE(Has("/a")) << "it was there before";
}

TEST_F(ShareFolderMakerTest, WhatIsThereIsNeverTaken) {
    m_dir.MakeDir("volume1/photos/a");
    EXPECT_EQ("", Make({"photos", "/a"}));
    EXPECT_EQ("", Make({"photos", "/"}));
    m_maker.TakeBack();
    EXPECT_TRUE(Has("/a"));
    EXPECT_EQ("", Make({"photos", "/b/c"}));
    m_dir.Write("volume1/photos/b/file", "put there meanwhile");
    m_maker.TakeBack();
    EXPECT_FALSE(Has("/b/c"));
    EXPECT_TRUE(Has("/b/file"));
}

TEST_F(ShareFolderMakerTest, NothingIsLeftOfAFailure) {
    m_dir.Write("volume1/photos/a/file", "in the way");
    EXPECT_THAT(Make({"photos", "/a/file/b"}), HasSubstr("a file in its place"));
    EXPECT_EQ("in the way", ReadWholeFile(m_share + "/a/file"));
    const std::string too_long(300, 'x');
    EXPECT_THAT(Make({"photos", "/new/" + too_long}), HasSubstr("could not be made"));
    EXPECT_FALSE(Has("/new"));
}

TEST_F(ShareFolderMakerTest, NoLinkLeadsOut) {
    m_dir.MakeDir("outside");
    ASSERT_EQ(0, symlink((m_dir / "outside").c_str(), (m_share + "/link").c_str()));
    EXPECT_NE("", Make({"photos", "/link/new"}));
    EXPECT_FALSE(FSExists(m_dir / "outside/new"));
}

TEST_F(ShareFolderMakerTest, AShareThatCannotBeReachedSaysWhy) {
    EXPECT_THAT(Make({"nosuch", "/a"}), HasSubstr("there is no share \"nosuch\""));
    EXPECT_THAT(Make({"gone", "/a"}), HasSubstr("is its volume mounted?"));
    EXPECT_FALSE(FSExists(m_dir / "volume2"));
    FakeKeld::Get().LockShare("photos");
    EXPECT_THAT(Make({"photos", "/a"}), HasSubstr("locked"));
    EXPECT_FALSE(Has("/a"));
}
