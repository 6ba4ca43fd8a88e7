// What the handlers of a version task do with one event.
#include "strategy/version-handler.h"

#include <gmock/gmock.h>

#include "db/task-info.h"
#include "event/event-generator.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/version-copy-handler.h"
#include "strategy/version-create-handler.h"
#include "strategy/version-path.h"
#include "strategy/version-remove-handler.h"
#include "strategy/version-scan-handler.h"
#include "strategy/version-task-handler.h"
#include "utils/error-code.h"
#include "utils/file-list.h"
#include "version-fixture.h"

namespace {

using testing::ElementsAre;

class VersionHandlerTest : public VersionFixture {};

// Reaches the operations that only a scan itself calls.
class OpenScan : public ScanHandler {
public:
    static void Remove(ScanHandler& scan, const FileListEntry& entry) {
        (scan.*&OpenScan::IssueRemove)(entry);
    }
    static void Modify(ScanHandler& scan, const FileListEntry& src, const FileListEntry& dst) {
        (scan.*&OpenScan::IssueModify)(src, dst);
    }
};

TEST(VersionHandler, AVersionTaskHasAHandlerOfItsOwnForEachPieceOfWork) {
    const auto version = CreateCopyStrategyHandler(COPY_STRATEGY_VERSION);
    ASSERT_NE(nullptr, dynamic_cast<VersionHandler*>(version.get()));
    EXPECT_NE(nullptr, dynamic_cast<VersionTaskHandler*>(version->GetTaskHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<VersionScanHandler*>(version->GetScanHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<VersionRemoveHandler*>(version->GetRemoveHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<VersionCreateHandler*>(version->GetCreateHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<VersionCopyHandler*>(version->GetCopyHandler().get()));
}

TEST_F(VersionHandlerTest, PathsLandBelowTheFolderOfTheRun) {
    TaskRunInfo task;
    task.dst_dir_path = "/volume1/share/usb";
    task.version_dir = RUN_DIR;
    const std::string folder = "/volume1/share/usb/Ferrix Copy_2024-03-09_141502";
    EXPECT_EQ(folder + "/a/b.txt", VersionGetDstFullPath(task, "/a/b.txt"));
    EXPECT_EQ(folder, VersionGetDstFullPath(task, "/"));
    EXPECT_TRUE(m_log.Has("[INFO] Version: GetDstFullPath = " + folder + "/a/b.txt"));
}

TEST_F(VersionHandlerTest, AFileIsCopiedIntoTheFolderOfTheRun) {
    WriteSrc("/a/b.txt", "bytes", 4711);
    EXPECT_EQ(0, HandleCopy("/a/b.txt"));
    const std::string path = Dst(std::string("/") + RUN_DIR + "/a/b.txt");
    EXPECT_EQ("bytes", ReadWholeFile(path));
    EXPECT_EQ(4711, MtimeOf(path));
    EXPECT_TRUE(m_log.Has("[INFO] VersionCopyHandler: SetCopyToFullPath = " + path));
}

TEST_F(VersionHandlerTest, AFolderIsMadeInTheFolderOfTheRun) {
    MakeSrcDir("/a");
    SetMtime(Src("/a"), 4711);
    EXPECT_EQ(0, HandleCreate("/a"));
    const std::string path = Dst(std::string("/") + RUN_DIR + "/a");
    EXPECT_EQ(4711, MtimeOf(path));
    EXPECT_TRUE(m_log.Has("[INFO] VersionCreateHandler: SetCreateFullPath = " + path));
}

TEST_F(VersionHandlerTest, AConflictIsOverwrittenWhateverThePolicy) {
    for (const int policy : {0, int{CONFLICT_POLICY_RENAME}, int{CONFLICT_POLICY_OVERWRITE}}) {
        m_task.conflict_policy = policy;
        const std::string name = "/f" + std::to_string(policy);
        WriteSrc(name, "new");
        WriteDst(std::string("/") + RUN_DIR + name, "in the way");
        EXPECT_EQ(0, HandleCopy(name));
        EXPECT_EQ("new", ReadWholeFile(Dst(std::string("/") + RUN_DIR + name)));
    }
    EXPECT_THAT(NamesOf(Dst(std::string("/") + RUN_DIR)),
                ElementsAre("/f0=new", "/f1=new", "/f2=new"))
        << "nothing was moved aside";
}

TEST_F(VersionHandlerTest, AScanCopiesEverythingWhateverStandsAtTheDestination) {
    WriteSrc("/same", "1");
    MakeSrcDir("/d");
    WriteDst("/same", "1");
    WriteDst("/surplus", "1");
    WriteDst(std::string("/") + RUN_DIR + "/same", "1");
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("copy /same", "create /d", "scan /d"));
    EXPECT_EQ(0, HandleScan("/d"));
    EXPECT_THAT(TakeIssued(), ElementsAre());
}

TEST_F(VersionHandlerTest, ARemovalIsRefused) {
    WriteDst("/a", "kept");
    EXPECT_EQ(ERR_IGNORE, HandleRemove("/a", false));
    EXPECT_TRUE(m_log.Has("[CRIT] Shall not happen! Ignore current event"));
    EXPECT_TRUE(IsThere(Dst("/a")));
}

TEST_F(VersionHandlerTest, AScanWithADestinationDoesNothingButComplain) {
    VersionScanHandler scan;
    PrepareContext(EV_CREATE, "/", EVENT_FLAG_DIR | EVENT_FLAG_SCAN);
    GiveContext(scan);
    FileListEntry entry;
    entry.path = "/x";
    OpenScan::Remove(scan, entry);
    FileListEntry other;
    other.path = "/y";
    OpenScan::Modify(scan, entry, other);
    EXPECT_TRUE(m_log.Has("[CRIT] Shall not happen! Ignore current record '/x'"));
    EXPECT_TRUE(m_log.Has("[CRIT] Shall not happen! Ignore current record '/x', '/y'"));
    EXPECT_THAT(TakeIssued(), ElementsAre());
}

}  // namespace
