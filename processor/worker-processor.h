// The loop that the task worker and the file worker share: get work, check it, do it, turn its
// outcome into an action; and how a control thread takes a task out of a worker's hands.
//
// Threads: the loop and all that it calls run on the worker's thread. Abort(), the control
// operations and GetCurrentTaskId() may be called from any other. One control thread at a time
// aborts.
//
// Aborting a task. The control thread pauses the worker, then calls Abort() with a barrier, then
// waits at the barrier; after that the worker is not in that task's work, does not have it in hand,
// and does not take it up before it is resumed. Why no order of events breaks this:
//  - Taking work is one step under m_hand_mutex: test that the status is "running", pull, note the
//    task. Abort() compares the task under the same mutex. If it comes first, the pause came before
//    it, and the worker takes nothing. If the worker comes first, Abort() finds the task in hand
//    and registers the barrier.
//  - The abort flag is cleared before that test of the status. A flag set before the clearing is
//    lost, but its pause came before it too, so the test fails and the worker goes back to the head
//    of the loop, where the barrier is. A flag set later stays until the work has seen it.
//  - Work that waits for a retry is in hand without being worked on. When a barrier is found at the
//    head of the loop it is given back first: what the control thread then drops is all there is,
//    and a later resume does not start it again.
//  - The barrier is looked at on every pass, also while paused, and once more at the end of the
//    thread; after that none is accepted.
#pragma once

#include <pthread.h>

#include <atomic>
#include <cstdint>

#include "processor/barrier-slot.h"
#include "processor/processor.h"
#include "processor/retry-counter.h"

class WorkerProcessor : public Processor {
public:
    WorkerProcessor();
    ~WorkerProcessor() override;

    int Stop() override;
    int SetAbortFlag(bool is_set) override;
    void Run() override;

    // If the worker has this task in hand: sets its abort flag and registers the barrier (unless it
    // is null). The worker must be paused.
    void Abort(uint64_t task_id, Barrier* barrier);
    // 0 when the worker has nothing in hand.
    [[nodiscard]] virtual uint64_t GetCurrentTaskId() const = 0;

protected:
    // For log lines: "TaskProcessor".
    [[nodiscard]] virtual const char* Name() const = 0;
    [[nodiscard]] virtual int IdleSeconds() const = 0;
    [[nodiscard]] virtual int FailedPrepareSeconds() const = 0;
    // Takes work in hand, unless some is already. 0, or negative when there is none. Called with
    // m_hand_mutex held, which is taken before all other locks.
    [[nodiscard]] virtual int GetEvent() = 0;
    // 0, or negative when the work in hand is not to be done; then it is not in hand any more.
    [[nodiscard]] virtual int Prepare() = 0;
    // Does the work; an ErrorCode.
    [[nodiscard]] virtual int Work() = 0;
    // Records the outcome; the ErrorAction that follows.
    [[nodiscard]] virtual int HandleError(int code) = 0;
    virtual void HandleAction(int action) = 0;
    // Ends the work in hand.
    virtual void DoneEvent() = 0;
    // Gives the work in hand back, to be done later.
    virtual void RedoEvent() = 0;

    // For HandleError: logs the outcome; a code that is none becomes "System error".
    [[nodiscard]] int NoteOutcome(int code) const;
    // For HandleAction: how long a worker waits after each action, and the actions themselves.
    struct ActionSeconds {
        int retry;
        int redo;
        int unknown;
    };
    void CarryOut(int action, const ActionSeconds& seconds);

    // The two halves of a pass of the loop, while running: what is done at its head, and the work.
    void ReachBarrier();
    void RunOnce();

    std::atomic<int> m_abort_flag{0};  // read by handlers
    RetryCounter m_retry_count;
    // Guards which task is in hand: see above.
    mutable pthread_mutex_t m_hand_mutex;

private:
    enum class Taken { WORK, NOTHING, NOT_RUNNING };
    Taken TakeWork();

    BarrierSlot m_barrier;
};
