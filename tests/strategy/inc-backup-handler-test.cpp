// The handlers of an incremental task one by one: what they record, and what they refuse.
#include "strategy/inc-backup-handler.h"

#include "db/file-db.h"
#include "inc-backup-fixture.h"
#include "strategy/copy-handler.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/create-handler.h"
#include "strategy/inc-backup-copy-handler.h"
#include "strategy/inc-backup-create-handler.h"
#include "strategy/inc-backup-remove-handler.h"
#include "strategy/inc-backup-scan-handler.h"
#include "strategy/inc-backup-task-handler.h"
#include "utils/error-code.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

class IncBackupHandlerTest : public IncBackupFixture {
protected:
    void Record(const std::string& source, const std::string& destination, uint64_t size,
                uint32_t mtime) {
        EXPECT_EQ(0, m_task.file_db->SetFileInfoBySourcePath(
                         {source, destination, FILE_INFO_FILE, size, mtime}));
    }
    void RecordDir(const std::string& source) {
        EXPECT_EQ(0,
                  m_task.file_db->SetFileInfoBySourcePath({source, source, FILE_INFO_DIR, 0, 0}));
    }
    bool HasNoFileDBLine() const { return m_log.Has("[ERR] File DB is NULL [task: 7]"); }
};

TEST_F(IncBackupHandlerTest, TheFactoryGivesTheFamily) {
    const auto factory = CreateCopyStrategyHandler(3);
    EXPECT_NE(nullptr, dynamic_cast<IncBackupHandler*>(factory.get()));
    EXPECT_NE(nullptr, dynamic_cast<IncBackupTaskHandler*>(factory->GetTaskHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<IncBackupScanHandler*>(factory->GetScanHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<IncBackupRemoveHandler*>(factory->GetRemoveHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<IncBackupCreateHandler*>(factory->GetCreateHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<IncBackupCopyHandler*>(factory->GetCopyHandler().get()));
}

TEST_F(IncBackupHandlerTest, WithoutAFileDatabaseEveryHandlerFails) {
    m_task.file_db.reset();
    WriteSrc("/a", "bytes");
    MakeSrcDir("/d");
    EXPECT_EQ(ERR_SYSTEM, HandleCopy("/a"));
    EXPECT_TRUE(HasNoFileDBLine());
    EXPECT_FALSE(IsThere(Dst("/a")));
    m_log.Clear();
    EXPECT_EQ(ERR_SYSTEM, HandleCreate("/d"));
    EXPECT_TRUE(HasNoFileDBLine());
    EXPECT_TRUE(m_log.Has("[ERR] Failed to update db for path '/d' [ret = -3]"));
    m_log.Clear();
    EXPECT_EQ(ERR_SYSTEM, HandleRemove("/a", false));
    EXPECT_TRUE(HasNoFileDBLine());
    m_log.Clear();
    EXPECT_EQ(ERR_SYSTEM, HandleScan("/"));
    EXPECT_TRUE(HasNoFileDBLine());
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(IncBackupHandlerTest, AFileDatabaseThatFailsFailsEveryHandler) {
    m_task.file_db->Close();
    WriteSrc("/a", "bytes");
    MakeSrcDir("/d");
    EXPECT_EQ(ERR_SYSTEM, HandleCopy("/a"));
    EXPECT_TRUE(
        m_log.Has("[ERR] Failed to check whether dst path format changed, src_ev_path = "
                  "'/a', dst_ev_path = '/a'"));
    EXPECT_FALSE(IsThere(Dst("/a")));
    EXPECT_EQ(ERR_SYSTEM, HandleCreate("/d"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to SetFileInfoBySourcePath from DB '/d'"));
    EXPECT_EQ(ERR_SYSTEM, HandleRemove("/a", false));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to RemoveFileInfoBySourcePath from DB '/a'"));
    EXPECT_EQ(ERR_SYSTEM, HandleScan("/"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to GetFileListBySourcePath from DB '/'"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
}

TEST_F(IncBackupHandlerTest, ARecordThatCannotBeWrittenFailsTheCopy) {
    WriteSrc("/a", "bytes");
    m_fake.OnCall("KELDFileCopy_r", [this] { m_task.file_db->Close(); });
    EXPECT_EQ(ERR_SYSTEM, HandleCopy("/a"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to SetFileInfoBySourcePath from DB '/a'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to update db for event '/a' [ret = -3]"));
}

// --- Scan ---

TEST_F(IncBackupHandlerTest, AScanComparesTheSourceWithTheRecord) {
    WriteSrc("/f/same", "12345", 1000);
    WriteSrc("/f/size", "12345", 1000);
    WriteSrc("/f/time", "12345", 1001);
    WriteSrc("/f/new", "12345", 1000);
    MakeSrcDir("/f/both");
    MakeSrcDir("/f/fresh");
    Record("/f/same", "/wherever", 5, 1000);
    Record("/f/size", "/wherever", 4, 1000);
    Record("/f/time", "/wherever", 5, 1000);
    Record("/f/gone", "/wherever", 5, 1000);
    RecordDir("/f/both");
    RecordDir("/f/goner");
    EXPECT_EQ(0, HandleScan("/f"));
    EXPECT_TRUE(m_log.Has("[INFO] IssueRemove: /goner, 1. Only delete DB record."));
    EXPECT_TRUE(m_log.Has("[INFO] IssueRemove: /gone, 0. Only delete DB record."));
    EXPECT_THAT(TakeIssued(),
                ElementsAre("copy /f/time", "copy /f/size", "copy /f/new", "remove /f/goner/",
                            "remove /f/gone", "create /f/fresh", "scan /f/fresh", "scan /f/both"));
}

TEST_F(IncBackupHandlerTest, AChangeOfTypeForgetsTheOldEntryFirst) {
    WriteSrc("/was-dir", "now a file");
    MakeSrcDir("/was-file");
    RecordDir("/was-dir");
    Record("/was-dir/below", "/x", 1, 1);
    Record("/was-file", "/y", 1, 1);
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /was-file", "create /was-file", "scan /was-file",
                                          "remove /was-dir/", "copy /was-dir"));
}

TEST_F(IncBackupHandlerTest, AScanWithoutTheDeviceIssuesNothing) {
    Record("/a", "/a", 1, 1);
    m_fake.Pull(m_usb);
    EXPECT_EQ(ERR_SRC_ROOT_MISS, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), IsEmpty());
    EXPECT_EQ("/a", Recorded("/a"));
}

// --- Remove ---

TEST_F(IncBackupHandlerTest, ARemovalForgetsTheFolderAndAllBelowAndKeepsTheCopies) {
    WriteDst("/d/a", "copy");
    RecordDir("/d");
    Record("/d/a", "/d/a", 4, 1000);
    Record("/dx", "/dx", 4, 1000);
    EXPECT_EQ(0, HandleRemove("/d", true));
    EXPECT_TRUE(m_log.Has("[INFO] IncBackupRemoveHandler: remove db record '/d', [task: 7]"));
    EXPECT_EQ("-", Recorded("/d"));
    EXPECT_EQ("-", Recorded("/d/a"));
    EXPECT_EQ("/dx", Recorded("/dx"));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/d/", "/d/a=copy"));
}

TEST_F(IncBackupHandlerTest, ARecordThatTheFilterRefusesStays) {
    SetTaskFilterNames({"secret"});
    Record("/secret", "/secret", 1, 1);
    EXPECT_EQ(ERR_IGNORE, HandleRemove("/secret", false));
    EXPECT_EQ("/secret", Recorded("/secret"));
}

// --- Create ---

TEST_F(IncBackupHandlerTest, AKeptFolderIsMadeAndRecorded) {
    MakeSrcDir("/a/b");
    SetMtime(Src("/a/b"), 5000);
    EXPECT_EQ(0, HandleCreate("/a/b"));
    EXPECT_EQ(5000, MtimeOf(Dst("/a/b")));
    FileInfo info;
    EXPECT_EQ(1, m_task.file_db->GetFileInfoBySourcePath("/a/b", info));
    EXPECT_EQ("/a/b", info.destination_path);
    EXPECT_EQ(FILE_INFO_DIR, info.file_type);
    EXPECT_EQ(0U, info.size);
    EXPECT_EQ(0U, info.mtime);
    EXPECT_TRUE(m_log.Has("[INFO] IncBackupCreateHandler: SetCreateFullPath = " + Dst("/a/b")));
}

TEST_F(IncBackupHandlerTest, AFolderThatIsNotKeptIsOnlyRecorded) {
    SetNaming(false, true, false);
    MakeSrcDir("/a");
    EXPECT_EQ(0, HandleCreate("/a"));
    EXPECT_FALSE(IsThere(Dst("/a")));
    EXPECT_EQ("", Recorded("/a"));
    EXPECT_TRUE(m_log.Has("[INFO] Do not keep source folder, commit db for current folder '/a'"));
}

TEST_F(IncBackupHandlerTest, AFolderThatCannotBeMadeIsNotRecorded) {
    SetRenamePolicy();
    MakeSrcDir("/a");
    WriteDst("/a", "in the way");
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, HandleCreate("/a"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to run create for path '" + Dst("/a") + "' [ret = -18]"));
    EXPECT_EQ("-", Recorded("/a"));
    EXPECT_EQ(0, HandleCreate("/a")) << "the file has moved aside";
    EXPECT_EQ("/a", Recorded("/a"));
}

// --- Copy ---

TEST_F(IncBackupHandlerTest, ACopyIsRecordedWithTheSizeAndTimeOfItsSource) {
    WriteSrc("/d/a", "12345", 7777);
    EXPECT_EQ(0, HandleCopy("/d/a"));
    FileInfo info;
    EXPECT_EQ(1, m_task.file_db->GetFileInfoBySourcePath("/d/a", info));
    EXPECT_EQ("/d/a", info.destination_path);
    EXPECT_EQ(FILE_INFO_FILE, info.file_type);
    EXPECT_EQ(5U, info.size);
    EXPECT_EQ(7777U, info.mtime);
}

TEST_F(IncBackupHandlerTest, ACopyThatFailsIsNotRecorded) {
    WriteSrc("/a", "bytes");
    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION);
    EXPECT_EQ(ERR_NO_PERMISSION, HandleCopy("/a"));
    EXPECT_EQ("-", Recorded("/a"));
}

TEST_F(IncBackupHandlerTest, BeforeACopyIsReplacedItsRecordIsDoubted) {
    WriteSrc("/a", "old", 1000);
    RunWell();
    WriteSrc("/a", "newer", 2000);
    m_fake.OnCall("KELDFileCopy_r", [this] {
        FileDB other;  // as after a power cut in the middle of the copy
        ASSERT_EQ(0, other.Init(FileDBPath()));
        FileInfo info;
        EXPECT_EQ(0, other.GetFileInfoBySourcePath("/a", info));
    });
    EXPECT_EQ(0, HandleCopy("/a"));
    EXPECT_EQ("/a", Recorded("/a"));
}

}  // namespace
