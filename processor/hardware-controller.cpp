#include "processor/hardware-controller.h"

#include <sched.h>

#include "platform/global-setting.h"
#include "platform/keld-sdk-wrapper.h"
#include "platform/utility.h"
#include "processor/barrier.h"
#include "processor/rwlock-guard.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

enum LedStatus : int { LED_OFF = 0, LED_BUSY = 1, LED_IDLE = 2 };

// The busy pattern is sent again at least this often.
constexpr int kPassSeconds = 50;

constexpr int kBeepCommands[] = {0x5302, 0x5301};

struct LedRow {
    int status;
    int code_with_button;  // models with a copy button have an LED of their own for it
    int code_without;
};
constexpr LedRow kLedRows[] = {
    {LED_BUSY, 66, 64},
    {LED_IDLE, 10, 65},
    {LED_OFF,  12, 65},
};

int LedCode(int status) {
    const LedRow* found = &kLedRows[2];
    for (const LedRow& row : kLedRows) {
        if (row.status == status) found = &row;
    }
    return IsDeviceSupported() ? found->code_with_button : found->code_without;
}

}  // namespace

HardwareController& HardwareController::GetInstance() {
    static HardwareController* const instance = new HardwareController();
    return *instance;
}

HardwareController::HardwareController() : m_beep_enabled(GetBeep()) {
    pthread_rwlock_init(&m_status_lock, nullptr);
    pthread_mutex_init(&m_notify_mutex, nullptr);
}

HardwareController::~HardwareController() {
    pthread_mutex_destroy(&m_notify_mutex);
    pthread_rwlock_destroy(&m_status_lock);
}

int HardwareController::Stop() {
    SetAbortFlag(true);
    return Processor::Stop();
}

int HardwareController::SetAbortFlag(bool is_set) {
    m_abort_flag = is_set ? 1 : 0;
    return 0;
}

void HardwareController::Abort(Barrier* barrier) {
    SetAbortFlag(true);
    m_barrier.Put(barrier, GetID());
}

int HardwareController::GetNewLedStatus() {
    const bool no_entries = TaskEntryHandler::GetInstance().IsTaskEntryEmpty();
    const bool queue_empty = TaskEventManager::GetInstance().IsReadyQueueEmpty();
    const bool set_empty = TaskEventManager::GetInstance().IsProcessingSetEmpty();
    if (!queue_empty || !set_empty) return LED_BUSY;
    return no_entries ? LED_OFF : LED_IDLE;
}

HardwareController::State HardwareController::GetState() const {
    const ReadLock lock(m_status_lock);
    return m_state;
}

void HardwareController::NotifyHWController() {
    const int seen_status = GetNewLedStatus();
    const int cur_status = GetState().led;
    SLOG_DBG("NotifyHWController: cur_led_status = %d, new_led_status = %d\n", cur_status,
             seen_status);
    if (seen_status == cur_status) return;

    const MutexLock notify_lock(m_notify_mutex);
    // Another caller may have been here since: what was seen then must not undo what it has set.
    const int new_status = GetNewLedStatus();
    if (new_status == GetState().led) return;

    // The pause first: a thread that reached the barrier before it would go on into its pass, and
    // at the end of that forget the change as one that has been shown.
    Barrier barrier;
    Pause();
    Abort(&barrier);
    barrier.Wait();
    SetLedStatus(new_status);
}

void HardwareController::SetLedStatus(int led) {
    const WriteLock lock(m_status_lock);
    SLOG_DBG("NotifyHWController: cur_led_status = %d, cur_beep_status = %d\n", m_state.led,
             m_state.beep);
    // Entering and leaving busy is told by a beep; between off and idle the change is silent.
    if (led == LED_BUSY || m_state.led == LED_BUSY) m_state.beep = 1;
    m_state.led = led;
    m_state.is_dirty = true;
    SLOG_DBG("NotifyHWController: cur_led_status = %d, cur_beep_status = %d\n", m_state.led,
             m_state.beep);
    Resume();
}

void HardwareController::ReachBarrier() {
    Barrier* const barrier = m_barrier.Take();
    if (barrier != nullptr) barrier->Reach(GetID());
    sched_yield();
}

void HardwareController::Run() {
    SLOG_INFO("HardwareController (%d) up.\n", GetID());
    m_barrier.Open();
    for (;;) {
        ReachBarrier();
        const int status = GetStatus();
        if (status == PROCESSOR_STOPPED) break;
        if (status == PROCESSOR_PAUSED) {
            SleepOneStep();
            continue;
        }
        SetAbortFlag(false);
        HandleHardwareControl();
        SLOG_DBG("HardwareController (%d): sleep begin\n", GetID());
        // No pause is missed by the flag that was cleared above: the wait looks at the status.
        Wait(kPassSeconds);
        SLOG_DBG("HardwareController (%d): sleep end\n", GetID());
    }
    {
        const WriteLock lock(m_status_lock);
        m_state.led = LED_OFF;
        SLOG_INFO("HardwareController (%d): turn off LED.\n", GetID());
    }
    HandleHardwareControl();
    // Last: who has left a barrier is not let go in the middle of the calls above, but is let go.
    m_barrier.Close(GetID());
    SLOG_INFO("HardwareController (%d) down.\n", GetID());
}

void HardwareController::HandleHardwareControl() {
    const State state = GetState();
    SLOG_DBG("HandleHardwareControl: cur_led_status = %d, cur_beep_status = %d\n", state.led,
             state.beep);
    if (state.is_dirty || state.led == LED_BUSY) {
        const int code = LedCode(state.led);
        if (SDK::NotifyLed(code) < 0) {
            SLOG_ERR("HandleHardwareControl: Failed to send scemd notify [%d]\n", code);
        }
    }
    if (state.beep == 1) {
        if (m_beep_enabled) {
            for (const int command : kBeepCommands) SDK::HardwareControl(command);
        }
        const WriteLock lock(m_status_lock);
        m_state.beep = 0;
    }
    const WriteLock lock(m_status_lock);
    // What came meanwhile, with somebody else's resume, is for the next pass.
    if (m_state.led == state.led) m_state.is_dirty = false;
    SLOG_DBG("HandleHardwareControl: cur_led_status = %d, cur_beep_status = %d\n", m_state.led,
             m_state.beep);
}
