#include "strategy/task-handler.h"

#include <unistd.h>

#include <ctime>
#include <string>

#include "db/task-info.h"
#include "event/event-generator.h"
#include "event/event-manager.h"
#include "platform/error-handler.h"
#include "platform/unproven-run.h"
#include "processor/processor.h"
#include "processor/task-mounts.h"
#include "strategy/destination-flush.h"
#include "strategy/record-proof.h"
#include "strategy/root-check.h"
#include "strategy/rotation-handler.h"
#include "strategy/task-run-info.h"
#include "strategy/version-end.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr unsigned POLL_STEP_US = 100000;
constexpr int POLL_STEPS = 10;  // one second

// The run was broken off: what is on the disk by now need not be copied again. A file may still be
// under way, so that the record stays, from the start of the flush on.
void KeepInterruptedRun(const TaskRunInfo& task) {
    const int64_t flush_start = time(nullptr);
    RecordProof records(task);
    const bool is_on_disk =
        FlushDestination(task) == 0 && CheckTaskDestination(task) == ERR_SUCCESS;
    static_cast<void>(records.Settle(is_on_disk));  // the files are there, whatever the rows say
    if (TakeFlushFailure(task) || !is_on_disk) return;
    if (UnprovenRun(task.task_id).KeepSince(flush_start) < 0) {
        SLOG_WARN("Copies of task '%llu' will be made again", Llu(task.task_id));
    }
}

// All events are done. The run is good only when its copies are on the disk, and came from a device
// that was there to the end: one that is gone lists as an empty folder.
int FinishRun(const TaskRunInfo& task) {
    RecordProof records(task);
    const bool is_flushed = FlushDestination(task) == 0;
    const int roots = CheckTaskRoots(task);
    // A flush that was reported good has not reached the disk when the destination is gone.
    const bool is_there = roots == ERR_SUCCESS || CheckTaskDestination(task) == ERR_SUCCESS;
    const int settled = records.Settle(is_flushed && is_there);
    if (TakeFlushFailure(task) || !is_flushed) return roots < 0 ? roots : ERR_IO;
    if (!is_there) return roots;
    const int outcome = Ferrix::ErrorHandler::GetInstance().Get(task.task_id);
    const bool is_all_copied =
        roots == ERR_SUCCESS && settled == ERR_SUCCESS && outcome == ERR_SUCCESS;
    if (UnprovenRun(task.task_id).End(is_all_copied) < 0) {
        SLOG_WARN("Copies of task '%llu' will be made again", Llu(task.task_id));
    } else if (is_all_copied) {
        EndRecords(task);  // last: with the record of the run the names are still needed
    }
    return roots < 0 ? roots : settled;
}

bool IsRootMiss(int outcome) {
    return outcome == ERR_SRC_ROOT_MISS || outcome == ERR_DST_ROOT_MISS ||
           outcome == ERR_SHARE_NOT_MOUNTED;
}

}  // namespace

TaskHandler::~TaskHandler() = default;

int TaskHandler::Run() {
    if (const int result = PreHandle(); result < 0) {
        SLOG_ERR("TaskHandler: failed to pre-handle task '%llu'", Llu(m_task->task_id));
        return result;
    }
    tzset();  // names are told in local time, and the zone may have been changed
    const DestinationFlush flush(*m_task);
    DoHandle();
    if (const int result = PostHandle(); result < 0) {
        SLOG_ERR("TaskHandler: failed to post-handle task '%llu'", Llu(m_task->task_id));
        return result;
    }
    return ERR_SUCCESS;
}

int TaskHandler::GetProcessorId() const { return m_processor->GetID(); }

int TaskHandler::GetProcessorStatus() const { return m_processor->GetStatus(); }

int TaskHandler::PreHandle() {
    uint64_t usb_id = 0;
    std::string share_name;
    std::string share_path;
    const bool is_mounted = IsTaskUSBMounted(m_task->task_id, usb_id, share_name, share_path);
    if (!IsTaskRunnable(is_mounted, m_task->task_id)) {
        SLOG_WARN("Current Task '%llu' is not runnable", Llu(m_task->task_id));
        return ERR_WAIT_NOTIFY;
    }
    const std::string& source = m_task->src_dir_path;
    FSInfo info;
    if (FSStat(source, info) < 0) {
        SLOG_ERR("Failed to FSStat '%s'.", source.c_str());
        return ERR_FILE_OPERATION;
    }
    if (!info.exist) {
        SLOG_ERR("Source root folder miss '%s'", source.c_str());
        return ERR_SRC_ROOT_MISS;
    }
    return ERR_SUCCESS;
}

int TaskHandler::DoHandle() {
    // Before the first copy. Without the record a crash may leave files that later runs take for
    // good; refusing the run for it would help nobody.
    if (UnprovenRun(m_task->task_id).Begin() < 0) {
        SLOG_WARN("Copies of task '%llu' will not be proven after a crash", Llu(m_task->task_id));
    }
    EventGenerator(m_task->task_id).PushScanEvent("/");
    return ERR_SUCCESS;
}

int TaskHandler::PostHandle() {
    const TaskRunInfo task = *m_task;
    RotationHandler rotation;
    int result = WaitForFileProcessors();
    if (result >= 0) {
        result = FinishRun(task);
    } else {
        SLOG_ERR("TaskHandler: interrupted while waiting events being done ...");
        KeepInterruptedRun(task);
    }
    if (task.copy_strategy != COPY_STRATEGY_VERSION) return result;
    return EndVersion(task, result, rotation);
}

int TaskHandler::EndVersion(const TaskRunInfo& task, int result, RotationHandler& rotation) const {
    // A device that was gone in the middle and is back has left gaps.
    const int outcome = Ferrix::ErrorHandler::GetInstance().Get(task.task_id);
    if (result >= 0 && IsRootMiss(outcome)) result = outcome;
    if (result < 0) {
        EndBadVersion(task);
        return result;
    }
    EndGoodVersion(task);
    if (!task.enable_rotation) return ERR_SUCCESS;
    // The new version may hold next to nothing: no whole one must go for it.
    if (outcome == ERR_DST_QUOTA_FULL) {
        SLOG_WARN("The destination of task '%llu' is full, no version is removed",
                  Llu(task.task_id));
        return ERR_SUCCESS;
    }
    rotation.Init(task);
    rotation.SetAbortFlag(m_abort_flag);
    result = rotation.Run();
    if (result < 0) {
        SLOG_ERR("TaskHandler: Failed to handle rotation for task '%llu'", Llu(task.task_id));
    }
    return result;
}

int TaskHandler::WaitForFileProcessors() {
    while (true) {
        const size_t pending = EventManager::GetInstance().GetEventCount(m_task->task_id);
        if (pending == 0) return ERR_SUCCESS;
        if (GetProcessorStatus() == PROCESSOR_STOPPED) {
            SLOG_WARN("Process stopped while copying files ...");
            return ERR_PROCESS_STOPPED;
        }
        if (GetProcessorStatus() == PROCESSOR_PAUSED) {
            SLOG_WARN("Process pause while copying files ...");
        }
        if (IsAborted()) {
            SLOG_WARN("TaskProcessor '%d' abort flag is set ...", GetProcessorId());
            return ERR_INTERRUPTED;
        }
        SLOG_INFO("Wait for file processor (still %zu pending events).", pending);
        SleepOneSecond();
    }
}

bool TaskHandler::IsAborted() const { return m_abort_flag != nullptr && m_abort_flag->load() != 0; }

void TaskHandler::SleepOneSecond() const {
    for (int step = 0; step < POLL_STEPS; ++step) {
        if (GetProcessorStatus() == PROCESSOR_STOPPED || IsAborted()) return;
        usleep(POLL_STEP_US);
    }
}
