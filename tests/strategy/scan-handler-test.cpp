#include "strategy/scan-handler.h"

#include <fcntl.h>
#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>

#include "event/event-manager.h"
#include "filter/file-filter.h"
#include "listing-faults.h"
#include "platform/unproven-run.h"
#include "strategy-fixture.h"
#include "utils/error-code.h"
#include "utils/file-list.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::UnorderedElementsAre;

class ScanHandlerTest : public StrategyFixture {
protected:
    // The system filter as it is shipped: recycle bins have no part in anything.
    void HideRecycleBins() {
        const std::string file = m_dir / "system.filter";
        ASSERT_EQ(0, FileFilter::WriteBlackList(file, {"#recycle"}, {}));
        ASSERT_EQ(0, m_task.system_filter->LoadBlackList(file));
    }
    void EnableBin() { m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = true}); }
};

// One side of a pair: nothing, a folder, or a file with content and date.
struct Side {
    enum Kind { NONE, FOLDER, FILE } kind = NONE;
    const char* content = "";
    time_t mtime = 1000;
};
struct PairCase {
    const char* what;
    Side src;
    Side dst;
    std::vector<std::string> issued;
    const char* log_line;
};

TEST_F(ScanHandlerTest, EachPairOfEntriesGivesItsEvents) {
    const Side none;
    const Side folder{Side::FOLDER};
    const Side file{Side::FILE, "1234", 1000};
    const PairCase cases[] = {
        {"new file",                             file,   none,                       {"copy /n"},              "[INFO] IssueCopy: /n, 0"  },
        {"new folder",                           folder, none,                       {"create /n", "scan /n"}, "[INFO] IssueCopy: /n, 1"  },
        {"file has gone",                        none,   file,                       {"remove /n"},            "[INFO] IssueRemove: /n, 0"},
        {"folder has gone",                      none,   folder,                     {"remove /n/"},           "[INFO] IssueRemove: /n, 1"},
        {"both folders",
         folder,                                         folder,
         {"scan /n"},
         "[INFO] GenerateEvent: both dir '/n', issue scan"                                                                                },
        {"folder became a file",
         file,                                           folder,
         {"remove /n/", "copy /n"},
         "[WARN] GenerateEvent: type change src(/n, 0), dst(/n, 1)"                                                                       },
        {"file became a folder",
         folder,                                         file,
         {"remove /n", "create /n", "scan /n"},
         "[WARN] GenerateEvent: type change src(/n, 1), dst(/n, 0)"                                                                       },
        {"equal files",
         file,                                           file,
         {},
         "[INFO] GenerateEvent: both file '/n', size and mtime are equal, skipping"                                                       },
        {"other bytes with equal size and date",
         {Side::FILE, "abcd", 1000},
         file,                                                                       {},
         "[INFO] GenerateEvent: both file '/n', size and mtime are equal, skipping"                                                       },
        {"source is newer",
         {Side::FILE, "1234", 1001},
         file,                                                                       {"remove /n", "copy /n"},
         "[INFO] GenerateEvent: file modify src(4, 1001), dst(4, 1000)"                                                                   },
        {"destination is newer",
         file,                                           {Side::FILE, "1234", 2000},
         {"remove /n", "copy /n"},
         "[INFO] GenerateEvent: file modify src(4, 1000), dst(4, 2000)"                                                                   },
        {"source is longer",
         {Side::FILE, "12345", 1000},
         file,                                                                       {"remove /n", "copy /n"},
         "[INFO] GenerateEvent: file modify src(5, 1000), dst(4, 1000)"                                                                   },
        {"date before 1970",
         {Side::FILE, "1234", -1},
         {Side::FILE, "1234", -1},
         {},
         "[INFO] GenerateEvent: both file '/n', size and mtime are equal, skipping"                                                       },
        {"both missing",                         none,   none,                       {},                       nullptr                    },
    };
    for (const PairCase& row : cases) {
        ASSERT_EQ(0, system(("rm -rf " + Src("/n") + " " + Dst("/n")).c_str()));
        if (row.src.kind == Side::FOLDER) MakeSrcDir("/n");
        if (row.src.kind == Side::FILE) WriteSrc("/n", row.src.content, row.src.mtime);
        if (row.dst.kind == Side::FOLDER) MakeDstDir("/n");
        if (row.dst.kind == Side::FILE) WriteDst("/n", row.dst.content, row.dst.mtime);
        EXPECT_EQ(0, HandleScan("/")) << row.what;
        EXPECT_TRUE(row.log_line == nullptr || m_log.Has(row.log_line)) << row.what;
        EXPECT_EQ(row.issued, TakeIssued()) << row.what;
    }
}

TEST_F(ScanHandlerTest, TheWalkRunsFromTheGreatestNameToTheSmallest) {
    WriteSrc("/a/x.txt", "changed");
    MakeSrcDir("/a/new");
    WriteDst("/a/x.txt", "old");
    WriteDst("/a/old.txt", "gone");
    EXPECT_EQ(0, HandleScan("/a"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /a/x.txt", "copy /a/x.txt", "remove /a/old.txt",
                                          "create /a/new", "scan /a/new"));
}

TEST_F(ScanHandlerTest, WhatIsLeftOnOneSideComesLast) {
    for (const char* name : {"/b", "/d", "/f"}) WriteSrc(name, "s");
    for (const char* name : {"/e", "/f", "/g"}) WriteDst(name, "s");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /g", "remove /e", "copy /d", "copy /b"));
    ASSERT_EQ(0,
              system(("rm -rf " + Dst("/*") + "; touch " + Dst("/0") + " " + Dst("/1")).c_str()));
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(),
                ElementsAre("copy /f", "copy /d", "copy /b", "remove /1", "remove /0"));
}

TEST_F(ScanHandlerTest, NamesAreComparedAsBytesAndALongerOneIsGreater) {
    WriteSrc("/ab", "s");
    WriteSrc("/a", "s");
    WriteSrc("/\xff\xfe", "s");
    WriteSrc("/line\nfeed %s '\"", "s");
    WriteDst("/a ", "s");
    WriteDst("/line\nfeed %s '\"", "s");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("copy /\xff\xfe", "copy /ab", "remove /a ", "copy /a"));
}

TEST_F(ScanHandlerTest, ANameThatDiffersOnlyInCaseIsTwoEntries) {
    WriteSrc("/Photo.JPG", "s");
    WriteDst("/photo.jpg", "s");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /photo.jpg", "copy /Photo.JPG"));
}

TEST_F(ScanHandlerTest, TwoEmptyFoldersGiveNoEvents) {
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, LinksDevicesAndPipesAreNeverListedOnEitherSide) {
    for (const std::string& root : {Src(), Dst()}) {
        ASSERT_EQ(0,
                  symlink("/etc/passwd", (root + "/link-" + std::to_string(root.size())).c_str()));
        ASSERT_EQ(0, mkfifo((root + "/pipe-" + std::to_string(root.size())).c_str(), 0600));
    }
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, TheAttributeFolderIsInvisibleOnBothSides) {
    MakeSrcDir("/@eaDir");
    WriteDst("/sub/@eaDir/x", "x");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /sub/"));
    MakeSrcDir("/sub");
    EXPECT_EQ(0, HandleScan("/sub"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, WhatTheSystemFilterHidesIsNeitherCopiedNorRemoved) {
    HideRecycleBins();
    WriteSrc("/#recycle/x", "s");
    WriteDst("/sub/#recycle/x", "s");
    WriteDst("/#recycle/y", "s");
    MakeSrcDir("/sub");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("scan /sub"));
    EXPECT_EQ(0, HandleScan("/sub"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, TheTaskFilterIsNotAskedWhileListing) {
    SetTaskFilterNames({"secret"});
    WriteSrc("/secret", "s");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("copy /secret"));
}

TEST_F(ScanHandlerTest, OnlyTheChildrenOfTheFolderAreLooked) {
    WriteSrc("/a/b/c", "s");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("create /a", "scan /a"));
    EXPECT_EQ(0, HandleScan("/a"));
    EXPECT_THAT(TakeIssued(), ElementsAre("create /a/b", "scan /a/b"));
}

TEST_F(ScanHandlerTest, BothListingsAreTold) {
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_TRUE(m_log.Has("[INFO] ScanHandler: get src file list path '" + Src() + "', [task: 7]"));
    EXPECT_TRUE(
        m_log.Has("[INFO] MirrorScanHandler: get dst file list path '" + Dst() + "', [task: 7]"));
}

TEST_F(ScanHandlerTest, ASourceFolderThatIsNotThereRemovesItsCopies) {
    WriteDst("/a/1", "s");
    WriteDst("/a/2", "s");
    EXPECT_EQ(0, HandleScan("/a"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /a/2", "remove /a/1"));
}

TEST_F(ScanHandlerTest, AMissingDestinationIsAnEmptyOne) {
    m_task.dst_dir_path += "/not/yet";
    WriteSrc("/a", "s");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("copy /a"));
}

TEST_F(ScanHandlerTest, AFolderThatWasSwappedForALinkIsNotFollowed) {
    m_dir.Write("elsewhere/private", "x");
    ASSERT_EQ(0, symlink((m_dir / "elsewhere").c_str(), Src("/a").c_str()));
    EXPECT_EQ(0, HandleScan("/a"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, AnAbortWhileListingInterruptsTheScan) {
    WriteSrc("/a", "s");
    m_abort = 1;
    EXPECT_EQ(ERR_INTERRUPTED, HandleScan("/"));
    EXPECT_TRUE(m_log.Has("[ERR] interrupted while get src file list '" + Src() + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] ScanHandler: Failed to get src list '" + Src() + "'"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, AnAbortWhileListingTheDestinationInterruptsTheScan) {
    WriteDst("/a", "s");
    m_abort = 1;  // the source has nothing to be interrupted at
    EXPECT_EQ(ERR_INTERRUPTED, HandleScan("/"));
    EXPECT_TRUE(m_log.Has("[ERR] interrupted while get dst file list '" + Dst() + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] ScanHandler: Failed to get dst list '" + Src() + "'"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, AnAbortBetweenListingAndComparingIssuesNothing) {
    WriteSrc("/a", "s");
    WriteDst("/b", "s");
    m_fake.OnCall("KELDDevIsPresent", [this] { m_abort = 1; });
    EXPECT_EQ(ERR_INTERRUPTED, HandleScan("/"));
    EXPECT_TRUE(m_log.Has("[WARN] GenerateEvent: user stopped"));
    EXPECT_TRUE(m_log.Has("[ERR] ScanHandler: Failed to generate event for '" + Src() + "'"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, AFolderThatBreaksInTheMiddleOfItsListingIssuesNothing) {
    for (const char* name : {"/a", "/b", "/c"}) {
        WriteSrc(name, "s");
        WriteDst(name, "s");
    }
    WriteDst("/d", "s");
    // Each side lists ".", ".." and its entries, and the end: 6 calls for the source, 7 for the
    // rest.
    for (int n = 0; n < 13; ++n) {
        const BreakListing broken(n);
        EXPECT_EQ(ERR_IO, HandleScan("/")) << "at entry " << n;
        EXPECT_THAT(TakeIssued(), IsEmpty()) << "at entry " << n;
    }
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /d"));
}

TEST_F(ScanHandlerTest, AFolderThatTheSystemCannotOpenNowIssuesNothing) {
    for (const char* name : {"/a", "/b"}) WriteDst(name, "s");
    WriteSrc("/b", "s");
    for (const int error : {EIO, EMFILE, ENFILE, ENOMEM, ESTALE, EINTR, ENODEV}) {
        for (const int side : {0, 1}) {  // the source is listed first
            const CloseFolder closed(side, error);
            EXPECT_EQ(ERR_IO, HandleScan("/")) << side << " " << error;
            EXPECT_THAT(TakeIssued(), IsEmpty()) << side << " " << error;
        }
    }
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /a"));
}

TEST_F(ScanHandlerTest, AFolderThatIsGoneOrClosedToUsIsAnEmptyOne) {
    WriteSrc("/a", "s");
    WriteDst("/a", "s");
    for (const int error : {ENOENT, ENOTDIR, ELOOP, EACCES, EPERM}) {
        for (const int side : {0, 1}) {
            const CloseFolder closed(side, error);
            EXPECT_EQ(0, HandleScan("/")) << side << " " << error;
            EXPECT_THAT(TakeIssued(), ElementsAre(side == 0 ? "remove /a" : "copy /a"))
                << side << " " << error;
        }
    }
}

// Gives the comparison two lists that no folder would, and sees what it asks for.
class ListScan final : public ScanHandler {
public:
    using ScanHandler::GenerateEvent;
    using ScanHandler::GetDstList;
    using ScanHandler::IssueScan;
    using ScanHandler::JoinEntryPath;
    std::vector<std::string> m_asked;
    std::atomic<int>* m_abort_after_first = nullptr;

protected:
    void IssueRemove(const FileListEntry& entry) override { Note("remove " + entry.path); }
    void IssueModify(const FileListEntry& src, const FileListEntry& dst) override {
        Note("modify " + src.path + " " + dst.path);
    }

private:
    void Note(const std::string& text) {
        m_asked.push_back(text);
        if (m_abort_after_first != nullptr) *m_abort_after_first = 1;
    }
};

TEST_F(ScanHandlerTest, TheAbortFlagIsAskedBeforeEachStepOnEachSide) {
    NamePool pool;
    FileList empty(pool);
    FileList two(pool);
    ASSERT_EQ(0, two.AddFile(FileList::ROOT, "a", 1, 1));
    ASSERT_EQ(0, two.AddFile(FileList::ROOT, "b", 1, 1));
    ListScan scan;
    PrepareContext(EV_CREATE, "/", EVENT_FLAG_DIR | EVENT_FLAG_SCAN);
    GiveContext(scan);
    scan.m_abort_after_first = &m_abort;
    EXPECT_EQ(ERR_INTERRUPTED, scan.GenerateEvent(empty, two));
    EXPECT_THAT(scan.m_asked, ElementsAre("remove /b"));
    EXPECT_EQ(ERR_INTERRUPTED, scan.GenerateEvent(two, empty));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, AnAbortAfterTheLastStepComesTooLate) {
    NamePool pool;
    const FileList empty(pool);
    ListScan scan;
    PrepareContext(EV_CREATE, "/", EVENT_FLAG_DIR | EVENT_FLAG_SCAN);
    GiveContext(scan);
    m_abort = 1;
    EXPECT_EQ(0, scan.GenerateEvent(empty, empty));
}

TEST_F(ScanHandlerTest, TheBaseHasAnEmptyDestination) {
    NamePool pool;
    FileList list(pool);
    WriteDst("/a", "s");
    ListScan scan;
    PrepareContext(EV_CREATE, "/", EVENT_FLAG_DIR | EVENT_FLAG_SCAN);
    GiveContext(scan);
    EXPECT_EQ(0, scan.GetDstList(list));
    EXPECT_EQ(list.end(), list.begin());
}

TEST_F(ScanHandlerTest, AScanOfAFileIsNotIssued) {
    ListScan scan;
    PrepareContext(EV_CREATE, "/a", EVENT_FLAG_DIR | EVENT_FLAG_SCAN);
    GiveContext(scan);
    FileListEntry entry;
    entry.path = "/f";
    scan.IssueScan(entry);
    EXPECT_TRUE(m_log.Has("[INFO] IssueScan: /f, 0"));
    EXPECT_TRUE(m_log.Has("[WARN] IssueScan: current event '/f' is not dir, skipping"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, EventPathsAreJoinedExactly) {
    const struct {
        const char* folder;
        const char* entry;
        const char* joined;
    } cases[] = {
        {"",     "/x",  "/x"    },
        {"/",    "/x",  "/x"    },
        {"/a",   "/",   "/a"    },
        {"/",    "/",   "/"     },
        {"/a/b", "/c",  "/a/b/c"},
        {"/a ",  "/%s", "/a /%s"}
    };
    for (const auto& row : cases) {
        ListScan scan;
        PrepareContext(EV_CREATE, row.folder, EVENT_FLAG_DIR | EVENT_FLAG_SCAN);
        GiveContext(scan);
        EXPECT_EQ(row.joined, scan.JoinEntryPath(row.entry)) << row.folder << " " << row.entry;
    }
}

// --- A device that is gone is not an empty device ---

TEST_F(ScanHandlerTest, AGoneSourceDeviceThatListsEmptyRemovesNothing) {
    WriteDst("/a", "s");
    WriteDst("/b/c", "s");
    m_fake.Pull(m_usb);
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, ADevicePulledAfterTheListingStillIssuesNothing) {
    WriteSrc("/a", "s");
    WriteDst("/b", "s");
    // The check is the first thing that is asked after the listings.
    m_fake.OnCall("KELDDevIsPresent", [this] { m_fake.Pull(m_usb); });
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    EXPECT_TRUE(
        m_log.Has("[INFO] MirrorScanHandler: get dst file list path '" + Dst() + "', [task: 7]"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, AListingThatBreaksOffBecauseTheDeviceIsGoneIsNotRetried) {
    WriteSrc("/a", "s");
    WriteDst("/b", "s");
    m_fake.Pull(m_usb);
    // At the source, and at the destination behind the whole source: ".", "..", "a" and the end.
    for (const int n : {0, 4}) {
        const BreakListing broken(n);
        EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/")) << "at entry " << n;
    }
    EXPECT_TRUE(m_log.Has("[ERR] ScanHandler: Failed to get src list '" + Src() + "'"));
    EXPECT_TRUE(m_log.Has("[ERR] ScanHandler: Failed to get dst list '" + Src() + "'"));
    EXPECT_EQ(ERROR_ACTION_DONE, ErrorActionOf(ERR_SRC_ROOT_MISS));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, AnotherDeviceInItsPlaceCountsAsGone) {
    WriteDst("/a", "s");
    m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdc1"});
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, ADeviceThatNobodyCanTellAboutCountsAsGone) {
    WriteDst("/a", "s");
    m_fake.FailCall("KELDDevIsPresent");
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    m_task.device_identity.clear();
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, ASourceRootThatIsGoneOrNoFolderRemovesNothing) {
    WriteDst("/a", "s");
    ASSERT_EQ(0, rmdir(Src().c_str()));
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    EXPECT_TRUE(m_log.Has("[ERR] Source root folder miss '" + Src() + "'"));
    m_dir.Write("usb/data", "a file in its place");
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    ASSERT_EQ(0, unlink(Src().c_str()));
    ASSERT_EQ(0, symlink(m_dir.MakeDir("empty").c_str(), Src().c_str()));
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, AGoneDestinationDeviceOfAnExportIssuesNothing) {
    MakeExport();
    WriteSrc("/a", "s");
    m_fake.Pull(m_usb);
    EXPECT_EQ(ERR_DST_ROOT_MISS, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(ScanHandlerTest, ALockedShareThatListsEmptyIssuesNothing) {
    MakeExport();
    WriteDst("/a", "on the device");
    m_fake.LockShare("photos");
    EXPECT_EQ(ERR_SHARE_NOT_MOUNTED, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

// --- Copies that may not be on the disk ---

TEST_F(ScanHandlerTest, EqualFilesFromARunThatCameToNoGoodEndAreCopiedAgainWithoutARemoval) {
    EnableBin();
    UnprovenRun crashed(TASK_ID);
    ASSERT_EQ(0, crashed.Begin());
    WriteSrc("/a", "s");
    WriteDst("/a", "s");  // put there now: after the crashed run began, before the next one
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty()) << "the present run trusts what it copies itself";
    // The next run begins later than the copy was made; the wall clock is not waited for.
    m_dir.Write("volume1/@Ferrix/task/7/unproven-run", "1 99999999999 99999999999\n");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_TRUE(
        m_log.Has("[NOTICE] GenerateEvent: both file '/a', size and mtime are equal, not "
                  "proven, copy again"));
    EXPECT_THAT(TakeIssued(), ElementsAre("copy /a"));
}

}  // namespace
