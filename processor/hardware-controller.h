// Shows the daemon's state by the front LED and a beep: busy while a task is queued or running,
// idle while a device with a task is there, else off. On a thread of its own, so that slow calls
// into the platform never delay a worker. The state is worked out from the queues: whoever may have
// changed something calls NotifyHWController().
//
// Threads: NotifyHWController(), SetBeepEnabled() and the control operations from any thread, and
// with no lock held that this thread needs; it takes only its own and calls only the platform.
#pragma once

#include <pthread.h>

#include <atomic>

#include "processor/barrier-slot.h"
#include "processor/processor.h"

class HardwareController : public Processor {
public:
    // The object of the daemon, made on first use. It is never destroyed, so that a thread that
    // still runs while the process exits finds it whole.
    static HardwareController& GetInstance();

    // For tests; everyone else asks GetInstance(). Reads the beep setting.
    HardwareController();
    ~HardwareController() override;

    // Works the state out anew and makes the thread act when it has changed. Waits until the thread
    // is between two passes, a tenth of a second at most and the length of a platform call.
    void NotifyHWController();
    void SetBeepEnabled(bool is_enabled) { m_beep_enabled = is_enabled; }
    void Abort(Barrier* barrier);

    int Stop() override;
    int SetAbortFlag(bool is_set) override;
    void Run() override;

private:
    struct State {
        int led = 0;            // LedStatus
        int beep = 0;           // 1: a beep is due
        bool is_dirty = false;  // the LED must be sent even though it is not busy
    };

    [[nodiscard]] static int GetNewLedStatus();
    [[nodiscard]] State GetState() const;
    void SetLedStatus(int led);
    void ReachBarrier();
    void HandleHardwareControl();

    State m_state;  // guarded by m_status_lock
    mutable pthread_rwlock_t m_status_lock;
    BarrierSlot m_barrier;
    std::atomic<int> m_abort_flag{0};
    pthread_mutex_t m_notify_mutex;  // callers of NotifyHWController take turns
    std::atomic<bool> m_beep_enabled;
};
