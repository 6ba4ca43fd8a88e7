#include "processor/worker-processor.h"

#include <sched.h>

#include "processor/barrier.h"
#include "utils/confined-path.h"
#include "utils/error-code.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

WorkerProcessor::WorkerProcessor() { pthread_mutex_init(&m_hand_mutex, nullptr); }

WorkerProcessor::~WorkerProcessor() { pthread_mutex_destroy(&m_hand_mutex); }

int WorkerProcessor::Stop() {
    SetAbortFlag(true);
    Processor::Stop();
    // Again: the worker may have cleared it just before it took work up, with the status as it was.
    return SetAbortFlag(true);
}

int WorkerProcessor::SetAbortFlag(bool is_set) {
    m_abort_flag = is_set ? 1 : 0;
    return 0;
}

void WorkerProcessor::Abort(uint64_t task_id, Barrier* barrier) {
    const MutexLock lock(m_hand_mutex);
    if (GetCurrentTaskId() != task_id) return;
    SetAbortFlag(true);
    m_barrier.Put(barrier, GetID());
}

void WorkerProcessor::Run() {
    SLOG_INFO("%s (%d) up.\n", Name(), GetID());
    m_barrier.Open();
    for (;;) {
        ReachBarrier();
        sched_yield();
        const int status = GetStatus();
        if (status == PROCESSOR_STOPPED) break;
        if (status == PROCESSOR_PAUSED) {
            SleepOneStep();
        } else {
            RunOnce();
        }
    }
    m_barrier.Close(GetID());
    SLOG_INFO("%s (%d) down.\n", Name(), GetID());
}

void WorkerProcessor::RunOnce() {
    SetAbortFlag(false);
    switch (TakeWork()) {
        case Taken::NOT_RUNNING:
            return;
        case Taken::NOTHING:
            Wait(IdleSeconds());
            return;
        case Taken::WORK:
            break;
    }
    if (Prepare() < 0) {
        Wait(FailedPrepareSeconds());
        return;
    }
    int action = HandleError(Work());
    if (action < 0) {
        SLOG_CRIT("%s (%d): Failed to handler error.\n", Name(), GetID());
        action = ERROR_ACTION_DONE;
    }
    HandleAction(action);
}

WorkerProcessor::Taken WorkerProcessor::TakeWork() {
    const MutexLock lock(m_hand_mutex);
    if (GetStatus() != PROCESSOR_RUNNING) return Taken::NOT_RUNNING;
    return GetEvent() < 0 ? Taken::NOTHING : Taken::WORK;
}

void WorkerProcessor::ReachBarrier() {
    Barrier* const barrier = m_barrier.Take();
    if (barrier == nullptr) return;
    PathPlaceScope::CloseKept();  // whoever waits here may be about to unmount the device
    if (GetCurrentTaskId() != 0) RedoEvent();
    barrier->Reach(GetID());
}

int WorkerProcessor::NoteOutcome(int code) const {
    if (!IsErrorCode(code)) {
        SLOG_CRIT("%s (%d): unknown error code [%d] -> set errror code [%d].\n", Name(), GetID(),
                  code, ERR_SYSTEM);
        code = ERR_SYSTEM;
    }
    SLOG_INFO("%s (%d): HandleError: %s.\n", Name(), GetID(), ErrorText(code));
    return code;
}

void WorkerProcessor::CarryOut(int action, const ActionSeconds& seconds) {
    switch (action) {
        case ERROR_ACTION_DONE:
            DoneEvent();
            break;
        case ERROR_ACTION_RETRY:
            Wait(seconds.retry);
            break;
        case ERROR_ACTION_REDO:
            RedoEvent();
            Wait(seconds.redo);
            break;
        case ERROR_ACTION_NONE:
            break;
        default:
            SLOG_WARN("unknown action [%d]\n", action);
            RedoEvent();
            Wait(seconds.unknown);
            break;
    }
}
