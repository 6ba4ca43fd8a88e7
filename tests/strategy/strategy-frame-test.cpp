// The factory of the strategies, the record of the event in hand, and the questions of the
// handlers.
#include <gmock/gmock.h>

#include "db/task-info.h"
#include "strategy-fixture.h"
#include "strategy/copy-handler.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/create-handler.h"
#include "strategy/mirror-copy-handler.h"
#include "strategy/mirror-create-handler.h"
#include "strategy/mirror-handler.h"
#include "strategy/mirror-remove-handler.h"
#include "strategy/mirror-scan-handler.h"
#include "strategy/mirror-task-handler.h"
#include "strategy/remove-handler.h"
#include "strategy/scan-handler.h"
#include "strategy/task-handler.h"

namespace {

TEST(CopyStrategyHandler, TheBaseHasNoHandlers) {
    const CopyStrategyHandler base;
    EXPECT_EQ(nullptr, base.GetTaskHandler());
    EXPECT_EQ(nullptr, base.GetScanHandler());
    EXPECT_EQ(nullptr, base.GetRemoveHandler());
    EXPECT_EQ(nullptr, base.GetCreateHandler());
    EXPECT_EQ(nullptr, base.GetCopyHandler());
}

TEST(CopyStrategyHandler, AMirrorHasAHandlerOfItsOwnForEachPieceOfWork) {
    const auto mirror = CreateCopyStrategyHandler(COPY_STRATEGY_MIRROR);
    ASSERT_NE(nullptr, dynamic_cast<MirrorHandler*>(mirror.get()));
    EXPECT_NE(nullptr, dynamic_cast<MirrorTaskHandler*>(mirror->GetTaskHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<MirrorScanHandler*>(mirror->GetScanHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<MirrorRemoveHandler*>(mirror->GetRemoveHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<MirrorCreateHandler*>(mirror->GetCreateHandler().get()));
    EXPECT_NE(nullptr, dynamic_cast<MirrorCopyHandler*>(mirror->GetCopyHandler().get()));
    EXPECT_NE(mirror->GetCopyHandler(), mirror->GetCopyHandler()) << "a new one for each event";
}

TEST(CopyStrategyHandler, AnUnknownStrategyHasNoHandler) {
    for (const int strategy : {0, 4, -1, 1000}) {
        EXPECT_EQ(nullptr, CreateCopyStrategyHandler(strategy)) << strategy;
    }
}

TEST(FileEventContext, TheRootLandsAtTheRootsAndAllElseBelowThem) {
    FileEventContext context;
    TaskRunInfo task;
    task.task_id = 7;
    task.src_dir_path = "/volumeUSB1/DCIM";
    task.dst_dir_path = "/volume1/photos";
    context.event.path = "/";
    context.SetTask(task);
    EXPECT_EQ("/volumeUSB1/DCIM", context.src_full_path);
    EXPECT_EQ("/volume1/photos", context.dst_full_path);
    context.event.path = "/a/b \n%s";
    context.SetTask(task);
    EXPECT_EQ("/volumeUSB1/DCIM/a/b \n%s", context.src_full_path);
    EXPECT_EQ("/volume1/photos/a/b \n%s", context.dst_full_path);
    EXPECT_EQ(7U, context.task.task_id);
}

TEST(FileEventContext, ResettingEmptiesTheEventAndLetsTheTaskGo) {
    FileEventContext context;
    TaskRunInfo task;
    task.strategy_handler = CreateCopyStrategyHandler(COPY_STRATEGY_MIRROR);
    const std::weak_ptr<CopyStrategyHandler> object = task.strategy_handler;
    context.event.path = "/a";
    context.event.task_id = 7;
    context.event.type = EV_COPY;
    context.SetTask(task);
    task = TaskRunInfo();
    EXPECT_FALSE(object.expired());
    context.Reset();
    EXPECT_TRUE(object.expired());
    EXPECT_TRUE(context.event.IsEmpty());
    EXPECT_EQ("", context.src_full_path);
    EXPECT_EQ("", context.dst_full_path);
}

class Questions final : public FileEventHandler {
public:
    using FileEventHandler::IsAborted;
    using FileEventHandler::IsOverwritePolicy;
    using FileEventHandler::IsSourceRemoved;
};

TEST(FileEventHandler, OnlyIncrementalTasksRenameAndRemoveTheirSource) {
    const struct {
        int strategy;
        int conflict_policy;
        bool remove_src_file;
        bool is_overwrite;
        bool is_source_removed;
    } cases[] = {
        {COPY_STRATEGY_VERSION,     CONFLICT_POLICY_RENAME,    true,  true,  false},
        {COPY_STRATEGY_MIRROR,      CONFLICT_POLICY_RENAME,    true,  true,  false},
        {COPY_STRATEGY_INCREMENTAL, CONFLICT_POLICY_RENAME,    true,  false, true },
        {COPY_STRATEGY_INCREMENTAL, CONFLICT_POLICY_RENAME,    false, false, false},
        {COPY_STRATEGY_INCREMENTAL, CONFLICT_POLICY_OVERWRITE, true,  true,  true },
        {COPY_STRATEGY_INCREMENTAL, 0,                         false, true,  false},
        {COPY_STRATEGY_INCREMENTAL, -1,                        false, true,  false},
        {COPY_STRATEGY_INCREMENTAL, 77,                        false, true,  false},
    };
    for (const auto& row : cases) {
        FileEventContext context;
        context.task.copy_strategy = row.strategy;
        context.task.conflict_policy = row.conflict_policy;
        context.task.remove_src_file = row.remove_src_file;
        Questions handler;
        handler.SetContext(&context);
        EXPECT_EQ(row.is_overwrite, handler.IsOverwritePolicy())
            << row.strategy << " " << row.conflict_policy;
        EXPECT_EQ(row.is_source_removed, handler.IsSourceRemoved())
            << row.strategy << " " << row.remove_src_file;
    }
}

TEST(FileEventHandler, ItIsAbortedWhenItsFlagIsSet) {
    Questions handler;
    EXPECT_FALSE(handler.IsAborted());
    std::atomic<int> flag{0};
    handler.SetAbortFlag(&flag);
    EXPECT_FALSE(handler.IsAborted());
    flag = 1;
    EXPECT_TRUE(handler.IsAborted());
}

}  // namespace
