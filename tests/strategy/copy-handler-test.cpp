#include "strategy/copy-handler.h"

#include <gmock/gmock.h>
#include <sys/stat.h>
#include <unistd.h>

#include <filesystem>

#include "db/task-info.h"
#include "filter/file-filter.h"
#include "strategy-fixture.h"
#include "utils/error-code.h"
#include "utils/log.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;
using testing::MatchesRegex;

// The base class, with a place for a record and a say about overwriting.
class PlainCopy : public CopyHandler {
public:
    void ForbidOverwrite() { m_overwrite_allowed = false; }
    int m_path_result = 0;
    int m_db_result = 0;
    int m_db_calls = 0;

protected:
    int SetCopyToFullPath() override {
        return m_path_result < 0 ? m_path_result : CopyHandler::SetCopyToFullPath();
    }
    int UpdateDB() override {
        ++m_db_calls;
        return m_db_result < 0 ? m_db_result : CopyHandler::UpdateDB();
    }
};

class CopyHandlerTest : public StrategyFixture {
protected:
    int Copy(const std::string& path) { return Handle(m_copy, EV_COPY, path); }
    // An incremental task that renames, and a handler that may not overwrite.
    void RenamePolicy() {
        m_task.copy_strategy = COPY_STRATEGY_INCREMENTAL;
        m_task.conflict_policy = CONFLICT_POLICY_RENAME;
        m_copy.ForbidOverwrite();
    }
    int CopyCalls() const { return m_fake.CallCount("KELDFileCopy_r"); }

    PlainCopy m_copy;
};

TEST_F(CopyHandlerTest, ANewFileArrivesWithItsBytesAndItsDate) {
    WriteSrc("/a/b.txt", "bytes", 123456);
    EXPECT_EQ(0, Copy("/a/b.txt"));
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/a/", "/a/b.txt=bytes@123456"));
    EXPECT_TRUE(m_log.Has("[INFO] CopyHandler: SetCopyFromFullPath = " + Src("/a/b.txt")));
    EXPECT_TRUE(m_log.Has("[INFO] File size matched '5', '5'."));
    EXPECT_TRUE(m_log.Has("[INFO] Handle copy file '" + Src("/a/b.txt") + "' -> '" +
                          Dst("/a/b.txt") + "', [suc = 1, err = 0]"));
    EXPECT_EQ(1, m_copy.m_db_calls);
}

TEST_F(CopyHandlerTest, ThePlatformIsAskedToOverwriteAndToldTheOwner) {
    WriteSrc("/b.txt", "bytes");
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_THAT(m_fake.CallsOf("KELDFileCopy_r"),
                ElementsAre(ElementsAre(Src("/b.txt"), Dst("/b.txt"), "1", "1024", "100")));
    EXPECT_EQ(1, m_fake.CallCount("KELDCopyTHRArgsFree"));
}

TEST_F(CopyHandlerTest, AnExistingFileIsOverwritten) {
    WriteSrc("/b.txt", "new bytes", 2000);
    WriteDst("/b.txt", "old");
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/b.txt=new bytes@2000"));
}

TEST_F(CopyHandlerTest, AnEmptyFilePassesTheCheck) {
    WriteSrc("/empty", "");
    EXPECT_EQ(0, Copy("/empty"));
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/empty=@1000"));
}

TEST_F(CopyHandlerTest, DatesBefore1970AndAfter2106AreKept) {
    WriteSrc("/old", "x", -86400);
    WriteSrc("/late", "x", 5000000000);
    EXPECT_EQ(0, Copy("/old"));
    EXPECT_EQ(0, Copy("/late"));
    EXPECT_EQ(MtimeOf(Src("/old")), MtimeOf(Dst("/old")));
    EXPECT_EQ(MtimeOf(Src("/late")), MtimeOf(Dst("/late")));
}

TEST_F(CopyHandlerTest, NamesOf255BytesAndAnyBytesAreCopied) {
    const std::string names[] = {"/" + std::string(255, 'n'), "/line\nfeed", "/100%s%n",
                                 "/\xff\xfe", "/it's \"quoted\""};
    for (const std::string& name : names) {
        WriteSrc(name, "bytes");
        EXPECT_EQ(0, Copy(name)) << name;
        EXPECT_EQ("bytes", ReadWholeFile(Dst(name)));
    }
}

TEST_F(CopyHandlerTest, AFolderEventIsIgnored) {
    MakeSrcDir("/d");
    EXPECT_EQ(ERR_IGNORE, Handle(m_copy, EV_COPY, "/d", EVENT_FLAG_DIR));
    EXPECT_TRUE(m_log.Has("[ERR] current event '/d' is folder"));
    EXPECT_EQ(0, CopyCalls());
}

TEST_F(CopyHandlerTest, ASourceThatVanishedIsMissing) {
    EXPECT_EQ(ERR_SRC_MISS, Copy("/gone"));
    EXPECT_TRUE(m_log.Has("[ERR] Source file does not exist '" + Src("/gone") + "'."));
    EXPECT_EQ(0, CopyCalls());
}

TEST_F(CopyHandlerTest, ASourceThatCannotBeAskedForIsAFileError) {
    const std::string name = "/" + std::string(300, 'n');
    EXPECT_EQ(ERR_FILE_OPERATION, Copy(name));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to FSStat '" + Src(name) + "'."));
}

TEST_F(CopyHandlerTest, ATaskWithoutAFilterIsASystemError) {
    WriteSrc("/b.txt", "x");
    m_task.task_filter.reset();
    EXPECT_EQ(ERR_SYSTEM, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] File Filter is NULL [task: 7]"));
}

TEST_F(CopyHandlerTest, AFileThatFailsTheFilterIsIgnored) {
    WriteSrc("/secret", "x");
    SetTaskFilterNames({"secret"});
    EXPECT_EQ(ERR_IGNORE, Copy("/secret"));
    EXPECT_TRUE(m_log.Has("[WARN] file '/secret' fail to pass filter [reason: -261]"));
    EXPECT_FALSE(IsThere(Dst("/secret")));
}

TEST_F(CopyHandlerTest, AMissingSourceIsToldBeforeTheFilterIsAsked) {
    SetTaskFilterNames({"gone"});
    EXPECT_EQ(ERR_SRC_MISS, Copy("/gone"));
}

TEST_F(CopyHandlerTest, AFailedChoiceOfThePathIsReturned) {
    WriteSrc("/b.txt", "x");
    m_copy.m_path_result = ERR_INVALID_ARGUMENT;
    EXPECT_EQ(ERR_INVALID_ARGUMENT, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to set copy to full path for event '/b.txt' [ret = -4]"));
}

TEST_F(CopyHandlerTest, AFileInTheWayOfTheParentFolderIsAFileError) {
    WriteSrc("/a/b.txt", "x");
    WriteDst("/a", "in the way");
    EXPECT_EQ(ERR_FILE_OPERATION, Copy("/a/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create parent folder '" + Dst("/a") + "' for task '7'"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to create parent folder for event '/a/b.txt' [ret = -10]"));
}

TEST_F(CopyHandlerTest, ALinkInTheWayOfTheParentFolderIsNotFollowed) {
    WriteSrc("/a/b.txt", "x");
    m_dir.MakeDir("elsewhere");
    ASSERT_EQ(0, symlink((m_dir / "elsewhere").c_str(), Dst("/a").c_str()));
    EXPECT_EQ(ERR_FILE_OPERATION, Copy("/a/b.txt"));
    EXPECT_FALSE(IsThere(m_dir / "elsewhere/b.txt"));
}

TEST_F(CopyHandlerTest, EachFailingStepOfThePlatformHasItsLine) {
    WriteSrc("/b.txt", "x");
    m_fake.FailCall("KELDCopyTHRArgsAlloc");
    EXPECT_EQ(ERR_SYSTEM, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] CopyHandler: KELDCopyTHRArgsAlloc() failed"));
    EXPECT_EQ(0, m_fake.CallCount("KELDCopyTHRArgsFree"));

    m_fake.FailCall("KELDCopyTHRSetCallbackIsCancel");
    EXPECT_EQ(ERR_SYSTEM, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] CopyHandler: KELDCopyTHRSetCallbackIsCancel() failed"));
    EXPECT_EQ(1, m_fake.CallCount("KELDCopyTHRArgsFree"));
    EXPECT_EQ(0, CopyCalls());

    m_fake.FailCall("KELDFileCopy_r", KELDERR_NO_PERMISSION);
    EXPECT_EQ(ERR_NO_PERMISSION, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to run copy for event '/b.txt' [ret = -9]"));
    EXPECT_EQ(2, m_fake.CallCount("KELDCopyTHRArgsFree"));
}

struct ErrorCase {
    int keld_error;
    int code;
};
// Those that are not settled further; a value outside the table comes last.
constexpr ErrorCase ERROR_CASES[] = {
    {0x0D00, ERR_INVALID_ARGUMENT},
    {0x0700, ERR_SRC_MISS        },
    {0x0600, ERR_SRC_MISS        },
    {0xA400, ERR_FILE_TOO_LARGE  },
    {0xA500, ERR_FILE_NAME       },
    {0xC300, ERR_FILE_NAME       },
    {0x0300, ERR_NO_PERMISSION   },
    {0x8400, ERR_NO_PERMISSION   },
    {0x2900, ERR_DST_QUOTA_FULL  },
    {0x2400, ERR_DST_QUOTA_FULL  },
    {0xA600, ERR_INTERRUPTED     },
    {0x6C00, ERR_IO              },
    {0x3B00, ERR_FILE_OPERATION  },
    {0x8000, ERR_SYSTEM          },
    {0x1234, ERR_FILE_OPERATION  },
};

TEST_F(CopyHandlerTest, EveryErrorOfThePlatformHasItsCode) {
    WriteSrc("/b.txt", "x");
    for (const ErrorCase& row : ERROR_CASES) {
        m_log.Clear();
        m_fake.FailCall("KELDFileCopy_r", row.keld_error);
        EXPECT_EQ(row.code, Copy("/b.txt")) << std::hex << row.keld_error;
        char line[128];
        snprintf(line, sizeof(line), "GetError: KELDERR = 0x%04x, Ferrix ERROR_CODE = %d",
                 static_cast<unsigned>(row.keld_error), row.code);
        EXPECT_EQ(row.keld_error != 0x1234, m_log.Contains(line)) << line;
        EXPECT_TRUE(m_log.Has("[INFO] overwrite copy argument is = 1"));
        EXPECT_TRUE(m_log.Has("[INFO] Handle copy file '" + Src("/b.txt") + "' -> '" +
                              Dst("/b.txt") + "', [suc = 0, err = " + std::to_string(row.code) +
                              "]"));
    }
}

TEST_F(CopyHandlerTest, AFailureWithoutAReasonIsNoCopy) {
    WriteSrc("/b.txt", "x");
    m_fake.FailCall("KELDFileCopy_r", FakeKeld::NO_REASON);
    EXPECT_EQ(ERR_FILE_OPERATION, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Contains("GetError: KELDERR = 0x0000, Ferrix ERROR_CODE = 0"));
}

TEST_F(CopyHandlerTest, AnAbortDuringTheCopyInterruptsWhateverTheCallSays) {
    WriteSrc("/b.txt", "x");
    for (const int error : {KELDERR_SUCCESS, KELDERR_IO}) {
        m_abort = 0;
        m_fake.OnCall("KELDFileCopy_r", [this] { m_abort = 1; });
        if (error != KELDERR_SUCCESS) m_fake.FailCall("KELDFileCopy_r", error);
        EXPECT_EQ(ERR_INTERRUPTED, Copy("/b.txt"));
        EXPECT_TRUE(m_log.Has("[WARN] CopyHandler: operation aorted"));
        EXPECT_FALSE(IsThere(Dst("/b.txt")));
    }
}

TEST_F(CopyHandlerTest, TheCallbackReadsTheFlag) {
    std::atomic<int> flag{0};
    EXPECT_EQ(0, CopyHandler::CancelFuncCallBack(nullptr));
    EXPECT_EQ(0, CopyHandler::CancelFuncCallBack(&flag));
    flag = 5;
    EXPECT_EQ(1, CopyHandler::CancelFuncCallBack(&flag));
}

TEST_F(CopyHandlerTest, ACopyOfAnotherSizeIsNotTaken) {
    WriteSrc("/b.txt", "bytes");
    m_fake.OnCall("KELDFileCopy_r", [this] { WriteSrc("/b.txt", "more bytes"); });
    EXPECT_EQ(ERR_FILE_OPERATION, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] File size not matched '5', '10'."));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to check file integrity '" + Src("/b.txt") + "' -> '" +
                          Dst("/b.txt") + "'"));
    m_fake.OnCall("KELDFileCopy_r", nullptr);
    EXPECT_EQ(0, Copy("/b.txt")) << "the next attempt";
    EXPECT_EQ("more bytes", ReadWholeFile(Dst("/b.txt")));
}

TEST_F(CopyHandlerTest, ASourceThatChangesItsDateMeanwhileIsFoundChangedByTheNextScan) {
    WriteSrc("/b.txt", "bytes", 1000);
    m_fake.OnCall("KELDFileCopy_r", [this] { WriteSrc("/b.txt", "BYTES", 2000); });
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_EQ(1000, MtimeOf(Dst("/b.txt")));
    EXPECT_EQ(0, HandleScan("/"));
    EXPECT_THAT(TakeIssued(), ElementsAre("remove /b.txt", "copy /b.txt"));
}

// --- A destination that exists and may not be overwritten ---

TEST_F(CopyHandlerTest, OverwritingIsForbiddenOnlyByPolicyAndHandlerTogether) {
    WriteSrc("/b.txt", "x");
    m_copy.ForbidOverwrite();
    EXPECT_EQ(0, Copy("/b.txt"));
    m_task.copy_strategy = COPY_STRATEGY_INCREMENTAL;
    m_task.conflict_policy = CONFLICT_POLICY_OVERWRITE;
    EXPECT_EQ(0, Copy("/b.txt"));
    PlainCopy allowed;
    m_task.conflict_policy = CONFLICT_POLICY_RENAME;
    EXPECT_EQ(0, Handle(allowed, EV_COPY, "/b.txt"));
    std::vector<std::string> words;
    for (const auto& call : m_fake.CallsOf("KELDFileCopy_r")) words.push_back(call.at(2));
    EXPECT_THAT(words, ElementsAre("1", "1", "1"));
    ASSERT_EQ(0, unlink(Dst("/b.txt").c_str()));
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_EQ("-1", m_fake.CallsOf("KELDFileCopy_r").back().at(2));
}

TEST_F(CopyHandlerTest, AnEqualDestinationIsMergedAndStillRecorded) {
    RenamePolicy();
    WriteSrc("/b.txt", "bytes", 1000);
    WriteDst("/b.txt", "other", 1000);
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_EQ("other", ReadWholeFile(Dst("/b.txt"))) << "it is not copied again";
    EXPECT_TRUE(m_log.Has("[INFO] File can be merged '" + Dst("/b.txt") + "', ignore."));
    EXPECT_EQ(1, m_copy.m_db_calls);
    EXPECT_TRUE(m_log.Has("[INFO] overwrite copy argument is = -1"));
}

TEST_F(CopyHandlerTest, AnotherDestinationIsMovedAsideAndTheEventRunsAgain) {
    RenamePolicy();
    for (const int error : {KELDERR_DST_EXISTS, KELDERR_DST_EXISTS_NAME}) {
        WriteSrc("/b.txt", "bytes", 1000);
        WriteDst("/b.txt", "theirs", 1000);
        m_fake.FailCall("KELDFileCopy_r", error);
        EXPECT_EQ(ERR_DST_EXISTS, Copy("/b.txt"));
        EXPECT_TRUE(m_log.Has("[INFO] Rename Destination file success, try copy again"));
        EXPECT_EQ(0, m_copy.m_db_calls);
        EXPECT_THAT(
            NamesOf(Dst()),
            testing::Contains(MatchesRegex("/b_Ferrix_[A-Za-z0-9-]+_Conflict(_1)?\\.txt=theirs")));
        EXPECT_FALSE(IsThere(Dst("/b.txt")));
    }
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_EQ("bytes", ReadWholeFile(Dst("/b.txt")));
}

TEST_F(CopyHandlerTest, AFailedRenameGoesTheWayOfASuccessfulOne) {
    RenamePolicy();
    const std::string name = "/" + std::string(255, 'n');
    WriteSrc(name, "bytes", 1000);
    WriteDst(name, "theirs", 1000);
    EXPECT_EQ(ERR_DST_EXISTS, Copy(name));
    EXPECT_TRUE(m_log.Contains("[ERR] ConflictRename failed."));
    EXPECT_TRUE(m_log.Has("[INFO] Rename Destination file success, try copy again"));
    EXPECT_EQ("theirs", ReadWholeFile(Dst(name)));
}

TEST_F(CopyHandlerTest, AnExistingDestinationThatIsNotThereIsTriedAgain) {
    WriteSrc("/b.txt", "bytes");
    m_fake.FailCall("KELDFileCopy_r", KELDERR_DST_EXISTS);
    EXPECT_EQ(ERR_DST_EXISTS, Copy("/b.txt"));
    EXPECT_TRUE(
        m_log.Has("[ERR] Destination file does not exist '" + Dst("/b.txt") + "', should retry."));
}

// --- A destination of another type ---

TEST_F(CopyHandlerTest, AFolderInTheWayIsRemovedThroughTheRecycleBin) {
    m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = true});
    WriteSrc("/b.txt", "bytes");
    WriteDst("/b.txt/inside", "theirs");
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[INFO] File '" + Dst("/b.txt") +
                          "' conflict, apply conflict policy "
                          "OVERWRITE"));
    EXPECT_TRUE(m_log.Has("[INFO] Conflict Policy is overwrite, remove '" + Dst("/b.txt") +
                          "', try copy again."));
    EXPECT_EQ("theirs", ReadWholeFile(m_share + "/#recycle/copy/b.txt/inside"));
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_EQ("bytes", ReadWholeFile(Dst("/b.txt")));
}

TEST_F(CopyHandlerTest, AFolderInTheWayIsDeletedWhereThereIsNoBin) {
    WriteSrc("/b.txt", "bytes");
    WriteDst("/b.txt/inside", "theirs");
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Copy("/b.txt"));
    EXPECT_FALSE(IsThere(Dst("/b.txt")));
}

TEST_F(CopyHandlerTest, ALinkInTheWayIsRemovedAndNeverFollowed) {
    const std::string target = m_dir.Write("elsewhere/target", "untouched");
    WriteSrc("/b.txt", "bytes");
    ASSERT_EQ(0, symlink(target.c_str(), Dst("/b.txt").c_str()));
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Copy("/b.txt"));
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_EQ("untouched", ReadWholeFile(target));
    EXPECT_THAT(TreeOf(Dst()), ElementsAre("/b.txt=bytes@1000"));
}

TEST_F(CopyHandlerTest, AFailedRemovalOfAConflictIsNotLookedAt) {
    m_fake.AddShare({.name = "photos", .path = m_share, .recycle_bin = true});
    m_fake.FailCall("KELDRecycleRmDirWithSharePath");
    WriteSrc("/b.txt", "bytes");
    MakeDstDir("/b.txt");
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Copy("/b.txt"));
    EXPECT_TRUE(IsThere(Dst("/b.txt")));
}

TEST_F(CopyHandlerTest, WithThePolicyRenameAFolderInTheWayIsMovedAside) {
    RenamePolicy();
    WriteSrc("/b.txt", "bytes");
    WriteDst("/b.txt/inside", "theirs");
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[INFO] File '" + Dst("/b.txt") +
                          "' conflict, apply conflict policy "
                          "RENAME"));
    EXPECT_TRUE(m_log.Has("[INFO] Rename Destination file success, try copy again"));
    EXPECT_THAT(NamesOf(Dst()),
                ElementsAre(MatchesRegex("/b_Ferrix_[A-Za-z0-9-]+_TypeConflict\\.txt/"),
                            MatchesRegex("/b_Ferrix_.*/inside=theirs")));
}

TEST_F(CopyHandlerTest, AConflictThatIsNotThereIsTriedAgain) {
    WriteSrc("/b.txt", "bytes");
    m_fake.FailCall("KELDFileCopy_r", KELDERR_DST_TYPE_CONFLICT);
    EXPECT_EQ(ERR_DST_TYPE_CONFLICT, Copy("/b.txt"));
    EXPECT_TRUE(
        m_log.Has("[ERR] Destination file does not exist '" + Dst("/b.txt") + "', should retry."));
}

TEST_F(CopyHandlerTest, AConflictIsNotRemovedOnceTheDeviceIsGone) {
    WriteSrc("/b.txt", "bytes");
    WriteDst("/b.txt/inside", "theirs");
    m_fake.OnCall("KELDFileCopy_r", [this] { m_fake.Pull(m_usb); });
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Copy("/b.txt"));
    EXPECT_EQ("theirs", ReadWholeFile(Dst("/b.txt/inside")));
}

// --- After the copy ---

TEST_F(CopyHandlerTest, AFailedRecordIsReturned) {
    WriteSrc("/b.txt", "x");
    m_copy.m_db_result = ERR_SYSTEM;
    EXPECT_EQ(ERR_SYSTEM, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to update db for event '/b.txt' [ret = -3]"));
}

TEST_F(CopyHandlerTest, AMovedFileLeavesNoRecord) {
    m_task.copy_strategy = COPY_STRATEGY_INCREMENTAL;
    m_task.remove_src_file = true;
    WriteSrc("/b.txt", "x");
    EXPECT_EQ(0, Copy("/b.txt"));
    EXPECT_FALSE(IsThere(Src("/b.txt")));
    EXPECT_TRUE(IsThere(Dst("/b.txt")));
    EXPECT_EQ(0, m_copy.m_db_calls);
}

TEST_F(CopyHandlerTest, ASourceThatCannotBeRemovedIsAFileError) {
    m_task.copy_strategy = COPY_STRATEGY_INCREMENTAL;
    m_task.remove_src_file = true;
    WriteSrc("/b.txt", "x");
    m_fake.FailCall("KELDShareNamePathGet");
    EXPECT_EQ(ERR_FILE_OPERATION, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] Failed to remove file '" + Src("/b.txt") + "'"));
    EXPECT_TRUE(IsThere(Src("/b.txt")));
}

TEST_F(CopyHandlerTest, OtherStrategiesNeverRemoveTheSource) {
    m_task.remove_src_file = true;
    for (const int strategy : {COPY_STRATEGY_VERSION, COPY_STRATEGY_MIRROR}) {
        m_task.copy_strategy = strategy;
        WriteSrc("/b.txt", "x");
        EXPECT_EQ(0, Copy("/b.txt"));
        EXPECT_TRUE(IsThere(Src("/b.txt")));
    }
}

// Takes the log's lines, and loses the copy right after its size has been checked.
std::string g_vanishing_path;
std::string g_seen_lines;
void LoseCheckedFile(int /*priority*/, std::string_view line) {
    g_seen_lines.append(line).append("\n");
    if (line.find("File size matched") != line.npos) unlink(g_vanishing_path.c_str());
}

TEST_F(CopyHandlerTest, AFailedTimeStampIsNoFailure) {
    WriteSrc("/b.txt", "x");
    g_vanishing_path = Dst("/b.txt");
    LogSetSink(LoseCheckedFile);
    const int result = Copy("/b.txt");
    LogSetSink(nullptr);
    EXPECT_EQ(0, result);
    EXPECT_NE(std::string::npos, g_seen_lines.find("Failed to change file atime and mtime '" +
                                                   Dst("/b.txt") + "' for task '7', ignore"));
}

// --- A device that is gone ---

TEST_F(CopyHandlerTest, AFileOfAGoneDeviceIsNotCalledMissing) {
    m_fake.Pull(m_usb);
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Copy("/b.txt"));
    EXPECT_TRUE(m_log.Has("[ERR] Device of task '7' is gone from '" + m_usb + "'"));
}

TEST_F(CopyHandlerTest, AReadErrorOfAGoneDeviceIsNotRetried) {
    WriteSrc("/b.txt", "bytes");
    m_fake.OnCall("KELDFileCopy_r", [this] { m_fake.Pull(m_usb); });
    m_fake.FailCall("KELDFileCopy_r", KELDERR_IO);
    EXPECT_EQ(ERR_SRC_ROOT_MISS, Copy("/b.txt"));
    EXPECT_EQ(ERROR_ACTION_DONE, ErrorActionOf(ERR_SRC_ROOT_MISS));
}

TEST_F(CopyHandlerTest, MirrorCopiesLandAtTheEventsOwnPath) {
    WriteSrc("/a/b.txt", "x");
    EXPECT_EQ(0, HandleCopy("/a/b.txt"));
    EXPECT_TRUE(m_log.Has("[INFO] Mirror: GetDstFullPath = " + Dst("/a/b.txt")));
    EXPECT_TRUE(m_log.Has("[INFO] MirrorCopyHandler: SetCopyToFullPath = " + Dst("/a/b.txt")));
    EXPECT_TRUE(IsThere(Dst("/a/b.txt")));
}

TEST_F(CopyHandlerTest, TheConflictPolicyPlaysNoPartForAMirror) {
    m_task.conflict_policy = CONFLICT_POLICY_RENAME;
    WriteSrc("/b.txt", "new");
    WriteDst("/b.txt", "old");
    EXPECT_EQ(0, HandleCopy("/b.txt"));
    EXPECT_THAT(NamesOf(Dst()), ElementsAre("/b.txt=new"));
}

}  // namespace
