#include "host/share-admin.h"

#include <thread>

#include "host/share-rules.h"
#include "share-admin-fixture.h"

using keld_host::AddShare;
using keld_host::CheckRemoveShare;
using keld_host::CheckRenameShare;
using keld_host::CheckShareConf;
using keld_host::RemoveShare;
using keld_host::RenameShare;
using keld_host::ShareNameFault;

TEST(ShareName, WhatAShareCannotBeCalled) {
    const std::string nul("a\0b", 3);
    const std::string tooLong(256, 'n');
    const std::pair<std::string, const char*> cases[] = {
        {"",         "empty"    },
        {".",        "itself"   },
        {"..",       "itself"   },
        {"a/b",      "slash"    },
        {"/",        "slash"    },
        {"a\nb",     "control"  },
        {"a\tb",     "control"  },
        {"\x1b[2J",  "control"  },
        {nul,        "control"  },
        {"a\x7f",    "control"  },
        {"@Ferrix",  "starts"   },
        {"#recycle", "starts"   },
        {".hidden",  "starts"   },
        {"...",      "starts"   },
        {"a]",       "]"        },
        {"a;b",      ";"        },
        {" a",       "blank"    },
        {"a ",       "blank"    },
        {tooLong,    "255 bytes"},
    };
    for (const auto& [name, fault] : cases) {
        EXPECT_THAT(ShareNameFault(name), testing::HasSubstr(fault)) << name;
    }
    for (const std::string& name :
         {std::string("photos"), std::string("my pictures, 100% 'new'"), std::string("a.b@c#d"),
          std::string("\xFF\xFE"), std::string("写真"), std::string("-rf"), std::string("a=b"),
          std::string(255, 'n')}) {
        EXPECT_EQ("", ShareNameFault(name)) << name;
    }
}

// --- A box that names no shares: every folder of a volume is one

TEST_F(ShareAdmin, WithoutSectionsAddingMakesAFolder) {
    ExpectDone(AddShare("photos"), "volume1/photos");
    ExpectDone(AddShare(At("volume1//music/")), "volume1/music");
    EXPECT_EQ((Texts{"music=/volume1/music", "photos=/volume1/photos"}), Shares());
    EXPECT_FALSE(Exists("etc")) << "and nothing else";
}

TEST_F(ShareAdmin, WithoutSectionsHostConfStaysAsItIs) {
    const std::string text = "[removable]\ndevices = /dev/nothing*\n";
    Conf(text);
    ExpectDone(AddShare("photos"), "volume1/photos");
    ExpectDone(RenameShare("photos", "pictures"), "volume1/pictures");
    ExpectDone(RemoveShare("pictures"), "volume1/pictures");
    EXPECT_EQ(text, ConfText());
    EXPECT_EQ(Texts{}, Shares());
}

TEST_F(ShareAdmin, WithoutSectionsAShareLiesRightBelowAVolume) {
    m_dir.MakeDir("volume1/a");
    ExpectWrong(AddShare(At("volume1/.b/c")), "starts with");
    ExpectRefused(AddShare(At("volume1/b/c")), "right below a volume");
    ExpectRefused(AddShare(At("volume1/a/c")), "right below a volume");
    EXPECT_EQ(Texts{"a=/volume1/a"}, Shares());
}

TEST_F(ShareAdmin, WithoutSectionsRenamingRenamesTheFolder) {
    m_dir.Write("volume1/photos/2019/img", "picture");
    ExpectDone(CheckRenameShare("photos", "pictures"), "volume1/photos");
    ExpectDone(RenameShare("photos", "pictures"), "volume1/pictures");
    EXPECT_EQ("picture", ReadWholeFile(At("volume1/pictures/2019/img")));
    EXPECT_FALSE(Exists("volume1/photos"));
}

TEST_F(ShareAdmin, WithoutSectionsOnlyAnEmptyFolderIsRemoved) {
    m_dir.Write("volume1/photos/.hidden", "picture");
    for (const Outcome& outcome : {CheckRemoveShare("photos"), RemoveShare("photos")}) {
        ExpectRefused(outcome, "is not empty, and no files are removed here: move them away first");
    }
    EXPECT_EQ("picture", ReadWholeFile(At("volume1/photos/.hidden")));
    ASSERT_EQ(0, unlink(At("volume1/photos/.hidden").c_str()));
    ExpectDone(CheckRemoveShare("photos"), "volume1/photos");
    EXPECT_TRUE(Exists("volume1/photos")) << "a check changes nothing";
    ExpectDone(RemoveShare("photos"), "volume1/photos");
    EXPECT_FALSE(Exists("volume1/photos"));
}

TEST_F(ShareAdmin, WithoutSectionsANameOfAnotherVolumeIsTaken) {
    m_dir.MakeDir("volume1/photos");
    m_dir.MakeDir("volume2/music");
    ExpectRefused(AddShare(At("volume2/photos")), "there is a share \"photos\" already");
    ExpectRefused(RenameShare("music", "photos"), "there is a share \"photos\" already");
    EXPECT_TRUE(Exists("volume2/music"));
    EXPECT_FALSE(Exists("volume2/photos"));
}

TEST_F(ShareAdmin, ANameAloneNeedsAnOnlyVolume) {
    m_dir.MakeDir("volume2");
    ExpectWrong(AddShare("photos"), At("volume1/photos") + " or " + At("volume2/photos"));
    Conf("[volume $/volume2]\n");
    ExpectDone(AddShare("photos"), "volume2/photos");
}

TEST_F(ShareAdmin, ABoxWithoutAVolumeSaysHowToGetOne) {
    ASSERT_EQ(0, rmdir(At("volume1").c_str()));
    ExpectRefused(AddShare("photos"), "[volume PATH]");
}

TEST_F(ShareAdmin, HostileNamesAreRefusedAndNothingIsMade) {
    m_dir.MakeDir("volume1/photos");
    for (const std::string& name :
         {std::string(), std::string("."), std::string(".."), std::string("@x"), std::string("#x"),
          std::string(".x"), std::string("a\nb"), std::string("a]"), std::string("a;b"),
          std::string(" a"), std::string("a "), std::string("../photos2"),
          std::string("a\n[share evil]\npath = /etc"), std::string(256, 'n')}) {
        for (const std::string& place : {name, At("volume1/" + name)}) {
            EXPECT_NE(Outcome::DONE, AddShare(place).kind) << place;
        }
        ExpectWrong(RenameShare("photos", name), "cannot be the name of a share");
        ExpectWrong(CheckRenameShare("photos", name), "take another name");
    }
    EXPECT_EQ(Texts{"photos=/volume1/photos"}, Shares());
    EXPECT_FALSE(Exists("photos2"));
}

TEST_F(ShareAdmin, PlacesOutsideTheVolumesAreRefused) {
    m_dir.MakeDir("elsewhere");
    for (const std::string& place :
         {At("elsewhere/photos"), At("volume1"), At("volume1/"), At("volume12/photos"),
          std::string("/"), std::string("/etc"), At("volume1/../elsewhere/photos"),
          At("volume1/./photos"), At("volume1/..")}) {
        ExpectWrong(AddShare(place), "does not lie on a volume of this box");
    }
    ExpectWrong(AddShare("volume1/photos"), "neither a name nor a whole path");
    EXPECT_FALSE(Exists("elsewhere/photos"));
}

TEST_F(ShareAdmin, WhatIsNoFolderIsLeftAlone) {
    m_dir.Write("volume1/file", "text");
    ASSERT_EQ(0, symlink("/etc", At("volume1/link").c_str()));
    for (const char* name : {"file", "link"}) {
        ExpectRefused(AddShare(name), "is no folder but a link or a file");
    }
    EXPECT_EQ("text", ReadWholeFile(At("volume1/file")));
}

TEST_F(ShareAdmin, AShareThatIsNotThereCannotBeChanged) {
    m_dir.MakeDir("volume1/.hidden");
    for (const char* name : {"none", ".hidden", "..", ""}) {
        ExpectWrong(RemoveShare(name), "there is no share");
        ExpectWrong(RenameShare(name, "new"), "there is no share");
    }
}

TEST_F(ShareAdmin, NothingIsRenamedOverWhatIsThere) {
    m_dir.Write("volume1/photos/img", "picture");
    m_dir.MakeDir("volume1/empty");
    m_dir.Write("volume1/file", "text");
    ASSERT_EQ(0, symlink("nowhere", At("volume1/link").c_str()));
    ExpectRefused(RenameShare("photos", "empty"), "there is a share \"empty\" already");
    ExpectRefused(RenameShare("photos", "file"), "nothing is ever replaced");
    ExpectRefused(RenameShare("photos", "link"), "nothing is ever replaced");
    ExpectWrong(RenameShare("photos", "photos"), "already");
    EXPECT_EQ("picture", ReadWholeFile(At("volume1/photos/img")));
    EXPECT_EQ("text", ReadWholeFile(At("volume1/file")));
    EXPECT_TRUE(Exists("volume1/link"));
}

// --- A box whose shares are named in host.conf

TEST_F(ShareAdmin, WithSectionsAddingNamesTheFolderAndMakesItIfMissing) {
    MakeTwoSections();
    m_dir.Write("volume1/films/film", "long");
    ExpectDone(AddShare("films"), "volume1/films");
    m_dir.MakeDir("volume1/data");
    ExpectDone(AddShare(At("volume1/data/books")), "volume1/data/books");
    EXPECT_EQ((Texts{"books=/volume1/data/books", "films=/volume1/films", "music=/volume1/music",
                     "photos=/volume1/photos"}),
              Shares());
    EXPECT_EQ("long", ReadWholeFile(At("volume1/films/film")));
    EXPECT_EQ(std::string(TWO_SECTIONS) +
                  "\n[share films]\npath = $/volume1/films\n"
                  "\n[share books]\npath = $/volume1/data/books\n",
              ShortConf());
}

TEST_F(ShareAdmin, WithSectionsATakenNameIsRefused) {
    MakeTwoSections();
    m_dir.MakeDir("volume2");
    ExpectRefused(AddShare(At("volume2/photos")), "there is a share \"photos\" already");
    Conf("[share films]\npath = $/volume1/photos\n");
    ExpectRefused(AddShare(At("volume1/films")), "has a section [share films] already");
    ExpectRefused(RenameShare("photos", "films"), "has a section [share films] already");
    EXPECT_FALSE(Exists("volume1/films"));
}

TEST_F(ShareAdmin, AShareInsideAnotherOneIsRefused) {
    MakeTwoSections();
    ExpectRefused(AddShare(At("volume1/photos/2019")), "lies in the share \"photos\"");
    Conf("[share deep]\npath = $/volume1/data/deep\n");
    m_dir.MakeDir("volume1/data/deep");
    ExpectRefused(AddShare("data"), "the share \"deep\" lies in");
    EXPECT_FALSE(Exists("volume1/photos/2019"));
}

TEST_F(ShareAdmin, AWayThroughALinkIsRefused) {
    MakeTwoSections();
    m_dir.MakeDir("elsewhere");
    ASSERT_EQ(0, symlink("../elsewhere", At("volume1/out").c_str()));
    ASSERT_EQ(0, symlink("photos", At("volume1/alias").c_str()));
    ExpectRefused(AddShare(At("volume1/out/new")), "through a link");
    ExpectRefused(AddShare(At("volume1/alias/new")), "through a link");
    ExpectRefused(AddShare(At("volume1/none/new")), "make it first");
    EXPECT_FALSE(Exists("elsewhere/new"));
    EXPECT_FALSE(Exists("volume1/photos/new"));
    EXPECT_EQ(TWO_SECTIONS, ShortConf());
}

TEST_F(ShareAdmin, WithSectionsRemovingLeavesTheFiles) {
    MakeTwoSections();
    ExpectDone(CheckRemoveShare("photos"), "volume1/photos");
    EXPECT_EQ(TWO_SECTIONS, ShortConf()) << "a check changes nothing";
    ExpectDone(RemoveShare("photos"), "volume1/photos");
    EXPECT_EQ("; two of them\n\n[share music]\npath = $/volume1/music\n", ShortConf());
    EXPECT_EQ("picture", ReadWholeFile(At("volume1/photos/img")));
    EXPECT_EQ(Texts{"music=/volume1/music"}, Shares());
}

TEST_F(ShareAdmin, TheLastSectionStaysOrEveryFolderWouldBecomeAShare) {
    m_dir.MakeDir("volume1/private");
    m_dir.MakeDir("volume1/photos");
    Conf("[share photos]\npath = $/volume1/photos\n");
    ExpectRefused(CheckRemoveShare("photos"), "the only share that host.conf names");
    ExpectRefused(RemoveShare("photos"), "add another share first");
    EXPECT_EQ(Texts{"photos=/volume1/photos"}, Shares());
}

TEST_F(ShareAdmin, AShareWhoseFolderIsGoneCanBeRemovedButNotRenamed) {
    MakeTwoSections();
    std::filesystem::remove_all(At("volume1/photos"));
    ExpectRefused(RenameShare("photos", "pictures"), "is not there: bring it back first");
    ExpectDone(RemoveShare("photos"), "volume1/photos");
}

TEST_F(ShareAdmin, WithSectionsRenamingChangesFolderHeaderAndPath) {
    MakeTwoSections();
    ExpectDone(CheckRenameShare("photos", "new pictures"), "volume1/photos");
    EXPECT_EQ(TWO_SECTIONS, ShortConf()) << "a check changes nothing";
    ExpectDone(RenameShare("photos", "new pictures"), "volume1/new pictures");
    EXPECT_EQ(
        "; two of them\n"
        "[share new pictures]\n"
        "path = $/volume1/new pictures ; pictures\n"
        "recycle_bin = yes\n"
        "\n"
        "[share music]\n"
        "path = $/volume1/music\n",
        ShortConf());
    EXPECT_EQ("picture", ReadWholeFile(At("volume1/new pictures/img")));
    EXPECT_FALSE(Exists("volume1/photos"));
}

TEST_F(ShareAdmin, WithSectionsAFolderThatIsNoShareIsNotRenamedOver) {
    MakeTwoSections();
    m_dir.MakeDir("volume1/empty");
    ExpectRefused(RenameShare("photos", "empty"), "nothing is ever replaced");
    EXPECT_EQ(TWO_SECTIONS, ShortConf());
}

TEST_F(ShareAdmin, AShareThatIsAMountPointIsNotRenamed) {
    m_dir.MakeDir("volume1/photos");
    Conf("[share photos]\npath = $/volume1/photos\nmount_point = yes\n");
    ExpectRefused(RenameShare("photos", "pictures"), "would not follow");
    EXPECT_TRUE(Exists("volume1/photos"));
}

TEST_F(ShareAdmin, AShareThatHoldsAnotherOneIsNotRenamed) {
    m_dir.MakeDir("volume1/data/deep");
    Conf("[share data]\npath = $/volume1/data\n[share deep]\npath = $/volume1/data/deep\n");
    ExpectRefused(RenameShare("data", "new"), "the share \"deep\" lies in");
    Conf("[volume $]\n[volume $/volume1/data]\n[share data]\npath = $/volume1/data\n");
    ExpectRefused(RenameShare("data", "new"), "the volume ");
    EXPECT_TRUE(Exists("volume1/data/deep"));
}

TEST_F(ShareAdmin, ABrokenFileIsNotTouchedAndItsLineIsTold) {
    m_dir.MakeDir("volume1/photos");
    const std::string text = "[share photos]\npath = $/volume1/photos\ncolour = red\n";
    Conf(text);
    for (const Outcome& outcome :
         {CheckShareConf(), AddShare("films"), RemoveShare("photos"), RenameShare("photos", "p")}) {
        ExpectRefused(outcome, "is broken in line 3, unknown key 'colour'");
    }
    EXPECT_EQ(text, ShortConf());
    EXPECT_FALSE(Exists("volume1/films"));
}

TEST_F(ShareAdmin, AFileThatCannotBeReadIsNoFileOfDefaults) {
    m_dir.MakeDir("volume1/photos");
    m_dir.MakeDir("etc/keld/host.conf");
    ExpectRefused(CheckShareConf(), "cannot be read");
    ExpectRefused(RemoveShare("photos"), "cannot be changed");
    EXPECT_TRUE(Exists("volume1/photos"));
}

TEST_F(ShareAdmin, WhoMayNotChangeTheBoxIsToldBeforeAnythingHappens) {
    MakeTwoSections();
    const auto refusals = [] {
        const bool isRoot = geteuid() == 0;
        EXPECT_EQ(0, isRoot ? seteuid(65534) : 0);
        const std::pair<Outcome, Outcome> outcomes = {CheckRenameShare("photos", "pictures"),
                                                      CheckRemoveShare("photos")};
        EXPECT_EQ(0, isRoot ? seteuid(0) : 0);
        return outcomes;
    };
    ASSERT_EQ(0, chmod(m_dir.Path().c_str(), 0755));
    ASSERT_EQ(0, chmod(At("etc/keld").c_str(), 0555));
    const auto [rename, removal] = refusals();
    ExpectRefused(removal, "host.conf cannot be changed: Permission denied; this takes root");
    EXPECT_EQ(Outcome::REFUSED, rename.kind);
    ASSERT_EQ(0, chmod(At("etc/keld").c_str(), 0777));
    ASSERT_EQ(0, chmod(At("volume1").c_str(), 0555));
    ExpectRefused(refusals().first, "volume1 cannot be changed: Permission denied");
    EXPECT_TRUE(refusals().second.IsDone()) << "removing leaves the folder alone";
    ASSERT_EQ(0, chmod(At("volume1").c_str(), 0777));
    EXPECT_TRUE(refusals().first.IsDone());
}

// --- host.conf as a file

TEST_F(ShareAdmin, HostConfKeepsItsModeAndOwner) {
    MakeTwoSections();
    const std::string path = At("etc/keld/host.conf");
    ASSERT_EQ(0, chmod(path.c_str(), 0640));
    const bool isRoot = geteuid() == 0;
    if (isRoot) {
        ASSERT_EQ(0, chown(path.c_str(), 12, 34));
    }
    ExpectDone(AddShare("films"), "volume1/films");
    struct stat info {};
    ASSERT_EQ(0, stat(path.c_str(), &info));
    EXPECT_EQ(0640u, info.st_mode & 07777);
    EXPECT_EQ(isRoot ? 12u : geteuid(), info.st_uid);
    EXPECT_EQ(isRoot ? 34u : getegid(), info.st_gid);
}

TEST_F(ShareAdmin, ALinkToHostConfStaysALink) {
    MakeTwoSections();
    const std::string path = At("etc/keld/host.conf");
    m_dir.MakeDir("managed");
    std::filesystem::rename(path, At("managed/box.conf"));
    ASSERT_EQ(0, symlink("../../managed/box.conf", path.c_str()));
    ExpectDone(AddShare("films"), "volume1/films");
    EXPECT_TRUE(std::filesystem::is_symlink(path));
    EXPECT_THAT(ReadWholeFile(At("managed/box.conf")), testing::HasSubstr("[share films]"));
}

TEST_F(ShareAdmin, TwoWhoChangeTheFileAtOnceLoseNothing) {
    MakeTwoSections();
    constexpr int EACH = 15;
    const auto addMany = [this](const std::string& prefix) {
        for (int i = 0; i < EACH; ++i) {
            const std::string name = prefix + std::to_string(i);
            ExpectDone(AddShare(name), "volume1/" + name);
        }
    };
    std::thread first(addMany, "first");
    std::thread second(addMany, "second");
    std::string name = "music";
    for (int i = 0; i < EACH; ++i) {
        const std::string next = "music" + std::to_string(i);
        ExpectDone(RenameShare(name, next), "volume1/" + next);
        name = next;
    }
    first.join();
    second.join();
    ExpectDone(RenameShare(name, "music"), "volume1/music");
    EXPECT_EQ(size_t{2 * EACH + 2}, Shares().size());
    EXPECT_EQ(TWO_SECTIONS, ShortConf().substr(0, std::string(TWO_SECTIONS).size()));
}

TEST_F(ShareAdmin, OfTwoWhoWantOneNameOneGetsIt) {
    MakeTwoSections();
    m_dir.MakeDir("volume2");
    for (int round = 0; round < 10; ++round) {
        const std::string name = "new" + std::to_string(round);
        Outcome first;
        std::thread other([&] { first = AddShare(At("volume1/" + name)); });
        const Outcome second = AddShare(At("volume2/" + name));
        other.join();
        EXPECT_NE(first.IsDone(), second.IsDone()) << first.text << " / " << second.text;
        EXPECT_NE(Exists("volume1/" + name), Exists("volume2/" + name));
    }
}
