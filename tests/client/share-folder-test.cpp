#include "client/share-folder.h"

#include <gmock/gmock.h>
#include <unistd.h>

#include <functional>

#include "client/exit-status.h"
#include "fake/fake-keld.h"
#include "support/temp-dir.h"

namespace {

// The status and text with which a command ends.
std::pair<ExitStatus, std::string> EndOf(const std::function<void()>& command) {
    try {
        command();
    } catch (const CommandError& error) {
        return {error.Status(), error.what()};
    }
    return {EXIT_DONE, ""};
}

class ShareFolderTest : public testing::Test {
protected:
    ShareFolderTest() {
        FakeKeld::Reset().AddShare({.name = "photos", .path = m_dir.MakeDir("volume1/photos")});
    }
    // "SHARE:FOLDER" of what was parsed.
    static std::string Parsed(const std::string& text) {
        const ShareFolder folder = ParseShareFolder(text);
        return folder.share + ":" + folder.folder;
    }

    TempDir m_dir;
};

}  // namespace

TEST_F(ShareFolderTest, AFolderIsNamedByItsShare) {
    EXPECT_EQ("photos:/", Parsed("photos"));
    EXPECT_EQ("photos:/", Parsed("photos/"));
    EXPECT_EQ("photos:/x", Parsed("photos/x"));
    EXPECT_EQ("photos:/x/y", Parsed("./photos//x/./y/"));
    EXPECT_EQ("photos:/x", Parsed("/photos/x"));
    EXPECT_EQ("photos:/", Parsed("/photos"));
}

TEST_F(ShareFolderTest, OrByItsFullPath) {
    EXPECT_EQ("photos:/", Parsed(m_dir / "volume1/photos"));
    EXPECT_EQ("photos:/inbox/2026", Parsed(m_dir / "volume1/photos/inbox//2026/"));
}

TEST_F(ShareFolderTest, WhatIsNoShareIsLeftToTheDaemonToRefuse) {
    EXPECT_EQ("nosuch:/inbox", Parsed("nosuch/inbox"));
    EXPECT_EQ("nosuch:/inbox", Parsed("/nosuch/inbox"));
}

TEST_F(ShareFolderTest, NoWayLeadsOut) {
    for (const char* text : {"..", "photos/..", "photos/../../etc", "/photos/x/../y"}) {
        const auto [status, said] = EndOf([text] { (void)ParseShareFolder(text); });
        EXPECT_EQ(EXIT_USAGE, status) << text;
        EXPECT_THAT(said, testing::HasSubstr("\"..\" leads out of it")) << text;
        EXPECT_EQ(EXIT_USAGE, EndOf([text] { (void)ParseDeviceFolder(text, ""); }).first) << text;
    }
    EXPECT_EQ("photos:/..x", Parsed("photos/..x")) << "only a name";
}

TEST_F(ShareFolderTest, WithoutANameThereIsNoShare) {
    for (const char* text : {"", "/", "//", "./"}) {
        EXPECT_EQ(EXIT_USAGE, EndOf([text] { (void)ParseShareFolder(text); }).first) << text;
    }
}

TEST_F(ShareFolderTest, ADisplayedPathIsTakenApart) {
    EXPECT_EQ("photos", SplitDisplayPath("/photos/a/b").share);
    EXPECT_EQ("/a/b", SplitDisplayPath("/photos/a/b").folder);
    EXPECT_EQ("photos", SplitDisplayPath("/photos").share);
    EXPECT_EQ("/", SplitDisplayPath("/photos").folder);
}

TEST(DeviceFolderTest, AFolderIsNamedFromTheRootOfTheDevice) {
    for (const char* text : {"DCIM", "/DCIM", "DCIM/", "./DCIM", "/media/card/DCIM",
                             "//media/card//DCIM/", "/media/card/./DCIM"}) {
        EXPECT_EQ("/DCIM", ParseDeviceFolder(text, "/media/card")) << text;
    }
    for (const char* text : {"", "/", ".", "/media/card", "/media/card/"}) {
        EXPECT_EQ("/", ParseDeviceFolder(text, "/media/card")) << text;
    }
}

TEST(DeviceFolderTest, OnlyAFullPathOfThisDeviceIsTakenAsOne) {
    EXPECT_EQ("/media/card/DCIM", ParseDeviceFolder("media/card/DCIM", "/media/card"));
    EXPECT_EQ("/media/card2/DCIM", ParseDeviceFolder("/media/card2/DCIM", "/media/card"));
    EXPECT_EQ("/media", ParseDeviceFolder("/media", "/media/card"));
    EXPECT_EQ("/media/card/DCIM", ParseDeviceFolder("/media/card/DCIM", "")) << "not plugged in";
}

TEST(DeviceFolderTest, WhatIsNotThereOrNoFolderIsRefused) {
    const TempDir device;
    device.Write("DCIM/100/a.jpg", "a");
    ASSERT_EQ(0, symlink((device / "DCIM").c_str(), (device / "link").c_str()));
    for (const char* folder : {"/", "/DCIM", "/DCIM/100"}) {
        EXPECT_EQ("", EndOf([&] { CheckDeviceFolder(device.Path(), folder); }).second);
    }
    for (const char* folder : {"/none", "/DCIM/none/none", "/DCIM/100/a.jpg", "/DCIM/100/a.jpg/x",
                               "/link", "/link/100"}) {
        const auto [status, said] = EndOf([&] { CheckDeviceFolder(device.Path(), folder); });
        EXPECT_EQ(EXIT_REFUSED, status) << folder;
        EXPECT_THAT(said, testing::HasSubstr("has no folder \"" + std::string(folder) + "\""));
    }
}
