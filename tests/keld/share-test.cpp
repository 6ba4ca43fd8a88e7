#include <keld/error.h>
#include <keld/fs.h>
#include <keld/share.h>
#include <keld/volume.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <thread>

#include "host-fixture.h"
#include "host/share-table.h"
#include "support/log-capture.h"

namespace {

class Shares : public HostFixture {
protected:
    // "name path" of the share that holds a path, or "(none)".
    static std::string Holding(const std::string& path) {
        char name[4095];
        char root[4095];
        return KELDShareNamePathGet(path.c_str(), name, sizeof(name), root, sizeof(root)) == 0
                   ? std::string(name) + " " + root
                   : "(none)";
    }
    static std::vector<std::string> Names() {
        KLIBCSzList* list = nullptr;
        const int count = KELDShareDBEnumTypeMatched(KELD_SHARE_TYPE_INTERNAL, &list);
        std::vector<std::string> names;
        for (int i = 0; KLIBCSzListGet(list, i) != nullptr; ++i) {
            names.emplace_back(KLIBCSzListGet(list, i));
        }
        EXPECT_EQ(count, static_cast<int>(names.size()));
        KLIBCSzListFree(list);
        return names;
    }
    static std::string VolumeOf(const std::string& path) {
        char volume[4095];
        return VolumePathParseEx(path.c_str(), volume, sizeof(volume)) == 0 ? volume : "(none)";
    }
    using Texts = std::vector<std::string>;
};

class ShareOwner {
public:
    explicit ShareOwner(const char* name) { m_result = KELDShareGet(name, &m_share); }
    ~ShareOwner() { KELDShareFree(m_share); }
    ShareOwner(const ShareOwner&) = delete;
    ShareOwner& operator=(const ShareOwner&) = delete;
    [[nodiscard]] int Result() const { return m_result; }
    [[nodiscard]] KELDShare* Get() const { return m_share; }

private:
    KELDShare* m_share = nullptr;
    int m_result;
};

int StatusOf(int (*ask)(const KELDShare*, int*), const KELDShare* share) {
    int status = -7;
    EXPECT_EQ(0, ask(share, &status));
    return status;
}

}  // namespace

TEST_F(Shares, WithoutSectionsEveryFolderOfAVolumeIsAShare) {
    m_dir.MakeDir("volume1/photos");
    m_dir.MakeDir("volume1/#recycle");
    m_dir.MakeDir("volume1/@Ferrix");
    m_dir.MakeDir("volume1/.hidden");
    m_dir.MakeDir("volume2/music");
    m_dir.MakeDir("volumeX/none");
    m_dir.MakeDir("volume/none2");
    m_dir.MakeDir("other/none3");
    m_dir.Write("volume1/file", "");
    ASSERT_EQ(0, symlink("photos", (m_dir / "volume1/link").c_str()));
    EXPECT_EQ((Texts{"music", "photos"}), Names());
    EXPECT_EQ("photos " + (m_dir / "volume1/photos"), Holding(m_dir / "volume1/photos/a/b"));
}

TEST_F(Shares, ANewFolderIsAShareAtOnceAndARemovedOneIsNoneAtOnce) {
    m_dir.MakeDir("volume1/a");
    for (int i = 0; i < 20; ++i) {
        EXPECT_EQ((Texts{"a"}), Names());
        const std::string folder = m_dir.MakeDir("volume1/b");
        EXPECT_EQ((Texts{"a", "b"}), Names());
        ASSERT_EQ(0, rmdir(folder.c_str()));
    }
    m_dir.MakeDir("volume3/c");
    EXPECT_EQ((Texts{"a", "c"}), Names());
}

TEST_F(Shares, APathIsInAShareAsLongAsTheSharesFolderIsThere) {
    const std::string folder = m_dir.MakeDir("volume1/a");
    m_dir.MakeDir("volume1/b");
    EXPECT_EQ("b " + (m_dir / "volume1/b"), Holding(m_dir / "volume1/b/x"));
    for (int i = 0; i < 20; ++i) {
        EXPECT_EQ("a " + folder, Holding(folder + "/x"));
        ASSERT_EQ(0, rmdir(folder.c_str()));
        EXPECT_EQ("(none)", Holding(folder + "/x"));
        ASSERT_EQ(0, symlink("b", folder.c_str()));
        EXPECT_EQ("(none)", Holding(folder + "/x"));
        ASSERT_EQ(0, unlink(folder.c_str()));
        m_dir.MakeDir("volume1/a");
    }
}

TEST_F(Shares, ManyThreadsMayAskWhileTheConfigurationChanges) {
    Conf("[share a]\npath = $/v/a\n");
    const std::string path = m_dir / "v/a/x";
    ASSERT_EQ("a " + (m_dir / "v/a"), Holding(path));
    const std::string renamed = (m_dir / "etc/keld/new");
    std::atomic<bool> isDone{false};
    std::vector<std::thread> threads;
    for (int i = 0; i < 4; ++i) {
        threads.emplace_back([&] {
            while (!isDone) {
                EXPECT_EQ("a " + (m_dir / "v/a"), Holding(path));
                KELDMountVolInfoFree(KELDMountVolAllEnum(0, 0));
                const ShareOwner share("a");
                EXPECT_EQ(0, share.Result());
            }
        });
    }
    for (int i = 0; i < 100; ++i) {
        m_dir.Write("etc/keld/new", "[share a]\npath = " + (m_dir / "v/a") +
                                        (i % 2 == 0 ? "\nrecycle_bin = yes\n" : "\n"));
        EXPECT_EQ(0, rename(renamed.c_str(), (m_dir / "etc/keld/host.conf").c_str()));
    }
    isDone = true;
    for (std::thread& thread : threads) thread.join();
}

TEST_F(Shares, OfTwoFoldersOfOneNameTheOneOnTheLowerVolumeIsTheShare) {
    m_dir.MakeDir("volume9/photos");
    m_dir.MakeDir("volume10/photos");
    const LogCapture log;
    EXPECT_EQ((Texts{"photos"}), Names());
    EXPECT_EQ((Texts{"photos"}), Names());
    EXPECT_EQ("(none)", Holding(m_dir / "volume10/photos/x"));
    EXPECT_EQ("photos " + (m_dir / "volume9/photos"), Holding(m_dir / "volume9/photos/x"));
    EXPECT_EQ(Texts{"[WARN] '" + (m_dir / "volume10/photos") +
                    "' is no share: another volume has a share of that name"},
              log.Lines());
}

TEST_F(Shares, WithSectionsOnlyTheseAreShares) {
    m_dir.MakeDir("volume1/photos");
    m_dir.MakeDir("volume1/other");
    Conf("[share x]\npath = $/volume1/photos\n");
    EXPECT_EQ((Texts{"photos"}), Names());
    EXPECT_EQ("(none)", Holding(m_dir / "volume1/other/f"));
}

TEST_F(Shares, WithVolumeSectionsOnlyTheirFoldersAreShares) {
    m_dir.MakeDir("volume1/photos");
    m_dir.MakeDir("pool/music");
    Conf("[volume $/pool]\n");
    EXPECT_EQ((Texts{"music"}), Names());
    EXPECT_EQ(m_dir / "pool", VolumeOf(m_dir / "pool/music/x"));
}

TEST_F(Shares, AnEditOfTheConfigurationNeedsNoRestart) {
    Conf("[share a]\npath = $/a\n");
    EXPECT_EQ((Texts{"a"}), Names());
    Conf("[share b]\npath = $/b\n");
    EXPECT_EQ((Texts{"b"}), Names());
}

TEST_F(Shares, TheLongestRootWinsComponentByComponent) {
    Conf(
        "[share a]\npath = $/v/photos\n[share b]\npath = $/v/photos/inner\n[share c]\npath = "
        "$/v/pho\n");
    const std::string v = m_dir / "v";
    EXPECT_EQ("photos " + v + "/photos", Holding(v + "/photos"));
    EXPECT_EQ("photos " + v + "/photos", Holding(v + "/photos/"));
    EXPECT_EQ("photos " + v + "/photos", Holding(v + "/photos/x/y"));
    EXPECT_EQ("photos " + v + "/photos", Holding(v + "//photos//x"));
    EXPECT_EQ("inner " + v + "/photos/inner", Holding(v + "/photos/inner/x"));
    EXPECT_EQ("photos " + v + "/photos", Holding(v + "/photos/inner2"));
    EXPECT_EQ("pho " + v + "/pho", Holding(v + "/pho/x"));
    EXPECT_EQ("(none)", Holding(v + "/photos2/x"));
    EXPECT_EQ("(none)", Holding(v));
    EXPECT_EQ("(none)", Holding("photos/x"));
    EXPECT_EQ("(none)", Holding(""));
}

TEST_F(Shares, NamesAreBytes) {
    const std::string name = "we ird\n\"%s\xff";
    m_dir.MakeDir("volume1/" + name);
    EXPECT_EQ((Texts{name}), Names());
    EXPECT_EQ(name + " " + (m_dir / ("volume1/" + name)),
              Holding(m_dir / ("volume1/" + name + "/x")));
}

TEST_F(Shares, ABufferThatIsTooSmallIsAFailure) {
    Conf("[share a]\npath = $/photos\n");
    char name[6];
    char root[4095];
    const std::string path = m_dir / "photos/x";
    EXPECT_GT(0, KELDShareNamePathGet(path.c_str(), name, sizeof(name), root, sizeof(root)));
    EXPECT_EQ(KELDERR_INVALID_ARGUMENT, KLIBCErrGet());
    char exact[7];
    EXPECT_EQ(0, KELDShareNamePathGet(path.c_str(), exact, sizeof(exact), root, sizeof(root)));
    char small[4];
    EXPECT_GT(0, KELDShareNamePathGet(path.c_str(), exact, sizeof(exact), small, sizeof(small)));
    EXPECT_GT(0, KELDShareBinPathGet(path.c_str(), small, sizeof(small)));
    EXPECT_GT(0, VolumePathParseEx(path.c_str(), small, sizeof(small)));
}

TEST_F(Shares, ARecordHoldsNameAndPath) {
    Conf("[share a]\npath = $/photos\n");
    const ShareOwner share("photos");
    ASSERT_EQ(0, share.Result());
    EXPECT_STREQ("photos", share.Get()->name);
    EXPECT_EQ(m_dir / "photos", share.Get()->path);
}

TEST_F(Shares, AnUnknownNameGivesNoRecord) {
    for (const char* name : {"none", "", "a/b"}) {
        const ShareOwner share(name);
        EXPECT_GT(0, share.Result());
        EXPECT_EQ(nullptr, share.Get());
    }
    EXPECT_GT(0, KELDShareGet("x", nullptr));
    KELDShareFree(nullptr);
}

TEST_F(Shares, TheRecycleBinFollowsTheConfiguration) {
    Conf(
        "[share a]\npath = $/a\nrecycle_bin = yes\n[share b]\npath = $/b\nrecycle_bin = "
        "yes\nrecycle_bin_admin_only = yes\n[share c]\npath = $/c\n");
    const ShareOwner a("a");
    const ShareOwner b("b");
    const ShareOwner c("c");
    EXPECT_EQ(1, StatusOf(KLIBShareRecycleStatusGet, a.Get()));
    EXPECT_EQ(0, StatusOf(KLIBShareRecycleAdminOnlyStatusGet, a.Get()));
    EXPECT_EQ(1, StatusOf(KLIBShareRecycleStatusGet, b.Get()));
    EXPECT_EQ(1, StatusOf(KLIBShareRecycleAdminOnlyStatusGet, b.Get()));
    EXPECT_EQ(0, StatusOf(KLIBShareRecycleStatusGet, c.Get()));
    char bin[256];
    EXPECT_EQ(0, KELDShareBinPathGet((m_dir / "a/x/y").c_str(), bin, sizeof(bin)));
    EXPECT_EQ(m_dir / "a/#recycle", bin);
    EXPECT_GT(0, KELDShareBinPathGet((m_dir / "d/x").c_str(), bin, sizeof(bin)));
}

TEST_F(Shares, AStatusOfAShareThatHasGoneIsAFailure) {
    Conf("[share a]\npath = $/a\n");
    const ShareOwner share("a");
    ASSERT_EQ(0, share.Result());
    Conf("[share b]\npath = $/b\n");
    int status = 0;
    EXPECT_GT(0, KLIBShareRecycleStatusGet(share.Get(), &status));
    EXPECT_GT(0, KLIBShareIsEncryptedGet(share.Get(), &status));
    EXPECT_GT(0, KLIBShareIsEncryptedGet(nullptr, &status));
    EXPECT_GT(0, KLIBShareIsEncryptedGet(share.Get(), nullptr));
}

TEST_F(Shares, AMountPointShareIsLockedWhileNothingIsMountedThere) {
    m_dir.MakeDir("a");
    m_dir.MakeDir("b");
    Conf(
        "[share a]\npath = $/a\nmount_point = yes\n[share b]\npath = $/b\n[share p]\npath = "
        "/proc\nmount_point = yes\n");
    const ShareOwner a("a");
    const ShareOwner b("b");
    const ShareOwner proc("proc");
    EXPECT_EQ(1, StatusOf(KLIBShareIsEncryptedGet, a.Get()));
    EXPECT_EQ(0, StatusOf(KLIBShareIsEncryptedGet, b.Get()));
    EXPECT_EQ(0, StatusOf(KLIBShareIsEncryptedGet, proc.Get()));
    EXPECT_EQ(0, StatusOf(KLIBShareIsEncryptionGet, a.Get()));
    EXPECT_EQ(1, StatusOf(KLIBShareIsEncryptionGet, b.Get()));
}

TEST_F(Shares, TheVolumeOfAShareIsTheParentOfItsPath) {
    m_dir.MakeDir("volume1/photos");
    EXPECT_EQ(m_dir / "volume1", VolumeOf(m_dir / "volume1/photos"));
    EXPECT_EQ(m_dir / "volume1", VolumeOf(m_dir / "volume1/photos/a/b"));
    EXPECT_EQ(m_dir / "volume1", VolumeOf(m_dir / "volume1/@Ferrix/db"));
    EXPECT_EQ(m_dir / "volume1", VolumeOf(m_dir / "volume1"));
    EXPECT_EQ("(none)", VolumeOf(m_dir / "volume11/x"));
    EXPECT_EQ("(none)", VolumeOf("volume1"));
    Conf("[share x]\npath = $/deep/folder/x\n[share y]\npath = /y\n");
    EXPECT_EQ(m_dir / "deep/folder", VolumeOf(m_dir / "deep/folder/x/1"));
    EXPECT_EQ("/", VolumeOf("/y/1"));
}

TEST_F(Shares, ShareRootOfGivesTheRootOrNothing) {
    Conf("[share a]\npath = $/a\n");
    EXPECT_EQ(m_dir / "a", keld_host::ShareRootOf(m_dir / "a/b/c"));
    EXPECT_EQ(m_dir / "a", keld_host::ShareRootOf(m_dir / "a"));
    EXPECT_EQ(std::nullopt, keld_host::ShareRootOf(m_dir / "b"));
}

TEST_F(Shares, DisplayPathsAreResolvedThroughTheirShare) {
    Conf("[share a]\npath = $/v/photos\n");
    char full[4095];
    EXPECT_EQ(0, KELDPathResolve("/photos/2024/x", full, sizeof(full)));
    EXPECT_EQ(m_dir / "v/photos/2024/x", full);
    EXPECT_EQ(0, KELDPathResolve("/photos", full, sizeof(full)));
    EXPECT_EQ(m_dir / "v/photos", full);
    EXPECT_GT(0, KELDPathResolve("/music/x", full, sizeof(full)));
    EXPECT_GT(0, KELDPathResolve("photos", full, sizeof(full)));
    EXPECT_GT(0, KELDPathResolve("/", full, sizeof(full)));
}

TEST_F(Shares, TheRightOfAUserFollowsTheModeBitsOfTheRoot) {
    const std::string path = m_dir.MakeDir("a");
    Conf("[share a]\npath = $/a\n");
    const ShareOwner share("a");
    int right = -1;
    EXPECT_EQ(0, KLIBShareUserRightGet(share.Get(), "root", &right));
    EXPECT_EQ(KELD_SHARE_RIGHT_READ | KELD_SHARE_RIGHT_WRITE, right);
    ASSERT_EQ(0, chmod(path.c_str(), 0705));
    EXPECT_EQ(0, KLIBShareUserRightGet(share.Get(), "nobody", &right));
    EXPECT_EQ(KELD_SHARE_RIGHT_READ, right);
    ASSERT_EQ(0, chmod(path.c_str(), 0700));
    EXPECT_EQ(0, KLIBShareUserRightGet(share.Get(), "nobody", &right));
    EXPECT_EQ(KELD_SHARE_RIGHT_NONE, right);
    EXPECT_GT(0, KLIBShareUserRightGet(share.Get(), "no such user", &right));
}

TEST_F(Shares, NothingMakesAShareReadOnlyHere) {
    Conf("[share a]\npath = $/a\n");
    EXPECT_EQ(0, KELDShareAttrReadOnlyIsRegBy("a", "dhub", "share_replica_demote"));
    EXPECT_GT(0, KELDShareAttrReadOnlyIsRegBy("b", "dhub", "share_replica_demote"));
}

TEST_F(Shares, VolumesAreListedWithTheirState) {
    m_dir.MakeDir("volume1");
    Conf("[volume $/volume1]\ninternal = no\n[volume $/missing]\n");
    KELDMountVolInfo* list = KELDMountVolAllEnum(0, KELD_MOUNT_VOL_INTERNAL);
    ASSERT_NE(nullptr, list);
    EXPECT_EQ(m_dir / "missing", list->mount_path);
    EXPECT_EQ(0, list->is_mounted);
    EXPECT_EQ(0, list->is_writable);
    EXPECT_EQ(1, list->is_internal);
    ASSERT_NE(nullptr, list->next);
    EXPECT_EQ(m_dir / "volume1", list->next->mount_path);
    EXPECT_EQ(1, list->next->is_mounted);
    EXPECT_EQ(1, list->next->is_writable);
    EXPECT_EQ(0, list->next->is_internal);
    EXPECT_EQ(nullptr, list->next->next);
    KELDMountVolInfoFree(list);

    KELDMountVolInfo* one = KELDMountVolInfoGet((m_dir / "volume1/").c_str());
    ASSERT_NE(nullptr, one);
    EXPECT_EQ(m_dir / "volume1", one->mount_path);
    EXPECT_EQ(nullptr, one->next);
    KELDMountVolInfoFree(one);
    EXPECT_EQ(nullptr, KELDMountVolInfoGet((m_dir / "volume1/x").c_str()));
    EXPECT_EQ(KELDERR_SRC_MISS, KLIBCErrGet());
}

TEST_F(Shares, AnEmptyListOfVolumesIsNoFailure) {
    EXPECT_GT(0, KELDPathResolve("bad", nullptr, 0));
    EXPECT_NE(KELDERR_SUCCESS, KLIBCErrGet());
    EXPECT_EQ(nullptr, KELDMountVolAllEnum(0, KELD_MOUNT_VOL_INTERNAL));
    EXPECT_EQ(KELDERR_SUCCESS, KLIBCErrGet());
    KELDMountVolInfoFree(nullptr);
}

TEST_F(Shares, AFolderThatIsNoMountPointHasNoDevice) {
    char device[64];
    EXPECT_GT(0, KELDVolPathToDevPath(m_dir.Path().c_str(), device, sizeof(device)));
    EXPECT_GT(0, KELDVolPathToDevPath("/proc", device, sizeof(device)));
    EXPECT_EQ(0, KELDFSHasMountPoint(m_dir.Path().c_str()));
    EXPECT_EQ(1, KELDFSHasMountPoint("/proc"));
    EXPECT_EQ(1, KELDFSHasMountPoint("/proc/"));
}

TEST_F(Shares, TheFileSystemOfAPathIsFound) {
    KELDFSInfo* info = nullptr;
    ASSERT_EQ(0, FSInfoGet("/proc/self", &info));
    EXPECT_STREQ("/proc", info->mount_path);
    EXPECT_STREQ("proc", info->type);
    FSInfoFree(info);
    EXPECT_GT(0, FSInfoGet((m_dir / "none").c_str(), &info));
    EXPECT_EQ(nullptr, info);
    EXPECT_EQ(KELDERR_SRC_MISS, KLIBCErrGet());
}
