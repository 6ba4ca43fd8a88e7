#include "processor/hardware-controller.h"

#include <thread>

#include "platform/global-setting.h"
#include "platform/utility.h"
#include "processor/task-event-manager.h"
#include "worker-fixture.h"

namespace {

using testing::ElementsAre;
using testing::IsEmpty;

constexpr int kBeepOn = 0x5302;
constexpr int kBeepOff = 0x5301;

class HardwareControllerTest : public WorkerFixture {
protected:
    HardwareControllerTest() {
        Processor::SetWaitStepForTest(200);
        m_controller.SetBeepEnabled(true);
    }
    ~HardwareControllerTest() override {
        m_controller.Stop();
        m_controller.Join();
        m_fake.SetCapability("sdferrix", false);
        m_fake.SetCapability("ferrix", false);
        InitDeviceSupport();
    }
    void StartWith(bool has_copy_button) {
        m_fake.SetCapability("sdferrix", has_copy_button);
        InitDeviceSupport();
        ASSERT_EQ(0, m_controller.Start());
    }
    void Notify() { m_controller.NotifyHWController(); }
    // Waits until the thread has sent `code` last.
    void AwaitLed(int code) {
        while (m_fake.LedCodes().empty() || m_fake.LedCodes().back() != code) sched_yield();
    }
    void AwaitBeeps(size_t count) {
        while (m_fake.HardwareCommands().size() < 2 * count) sched_yield();
    }
    void AwaitLine(const char* text) {
        while (!m_log.Contains(text)) sched_yield();
    }
    // Until the thread has made a whole pass.
    void AwaitPass() {
        m_log.Clear();
        while (!m_log.Contains("sleep begin")) sched_yield();
    }
    // The codes without repetitions: the busy pattern is sent again at every pass.
    std::vector<int> Codes() const {
        std::vector<int> codes;
        for (const int code : m_fake.LedCodes()) {
            if (codes.empty() || codes.back() != code) codes.push_back(code);
        }
        return codes;
    }

    LogCapture m_log;
    HardwareController m_controller;
};

TEST_F(HardwareControllerTest, ATaskPushedAndFinishedWithoutEntriesBeepsTwice) {
    StartWith(true);
    TaskEventManager::GetInstance().PushEvent(900);
    Notify();
    AwaitLed(66);
    AwaitBeeps(1);
    uint64_t task_id = 0;
    ASSERT_EQ(1, TaskEventManager::GetInstance().PullEvent(task_id));
    Notify();  // from queued to running: still busy
    TaskEventManager::GetInstance().DoneEvent(900);
    Notify();
    AwaitLed(12);
    AwaitBeeps(2);
    AwaitPass();
    EXPECT_THAT(Codes(), ElementsAre(66, 12));
    EXPECT_THAT(m_fake.HardwareCommands(), ElementsAre(kBeepOn, kBeepOff, kBeepOn, kBeepOff));
}

TEST_F(HardwareControllerTest, AnEntryShowsIdleAndItsEndOffWithoutABeep) {
    StartWith(true);
    const uint64_t task_id = AddTask("holiday");
    Notify();
    AwaitLed(10);
    TaskEntryHandler::GetInstance().RemoveTaskEntry(task_id);
    Notify();
    AwaitLed(12);
    AwaitPass();
    EXPECT_THAT(m_fake.LedCodes(), ElementsAre(10, 12));  // each once
    EXPECT_THAT(m_fake.HardwareCommands(), IsEmpty());
}

TEST_F(HardwareControllerTest, WithoutACopyButtonIdleAndOffLookTheSame) {
    StartWith(false);
    const uint64_t task_id = AddTask("holiday");
    Notify();
    AwaitLed(65);
    TaskEventManager::GetInstance().PushEvent(task_id);
    Notify();
    AwaitLed(64);
    TaskEventManager::GetInstance().RemoveEvent(task_id);
    TaskEntryHandler::GetInstance().RemoveTaskEntry(task_id);
    Notify();
    AwaitLed(65);
    EXPECT_THAT(Codes(), ElementsAre(65, 64, 65));
}

TEST_F(HardwareControllerTest, ASecondNoticeWithoutAChangeDoesNothing) {
    StartWith(true);
    AddTask("holiday");
    Notify();
    AwaitLed(10);
    AwaitPass();
    Notify();
    EXPECT_TRUE(m_log.Has("[DBG] NotifyHWController: cur_led_status = 2, new_led_status = 2"));
    EXPECT_FALSE(m_log.Contains("register barrier"));
    EXPECT_THAT(m_fake.LedCodes(), ElementsAre(10));
}

TEST_F(HardwareControllerTest, NothingIsSentWhileNothingHasChanged) {
    StartWith(true);
    AwaitPass();
    AwaitPass();
    EXPECT_THAT(m_fake.LedCodes(), IsEmpty());
}

TEST_F(HardwareControllerTest, ASwitchedOffBeepIsForgottenAndNotMadeUpFor) {
    m_controller.SetBeepEnabled(false);
    StartWith(true);
    TaskEventManager::GetInstance().PushEvent(900);
    Notify();
    AwaitLed(66);
    AwaitLine("HandleHardwareControl: cur_led_status = 1, cur_beep_status = 0");
    m_controller.SetBeepEnabled(true);
    AwaitPass();
    EXPECT_THAT(m_fake.HardwareCommands(), IsEmpty());
    TaskEventManager::GetInstance().RemoveEvent(900);
}

TEST_F(HardwareControllerTest, AFailedBusyPatternIsSentAgainByTheNextPass) {
    Processor::SetWaitStepForTest(0);
    m_fake.FailCall("KLIBScemdNotify", KELDERR_SYSTEM, 1);
    StartWith(true);
    TaskEventManager::GetInstance().PushEvent(900);
    Notify();
    while (m_fake.CallCount("KLIBScemdNotify") < 3) sched_yield();
    EXPECT_TRUE(m_log.Has("[ERR] HandleHardwareControl: Failed to send scemd notify [66]"));
    TaskEventManager::GetInstance().RemoveEvent(900);
}

TEST_F(HardwareControllerTest, TheBeepSettingIsReadAtTheStart) {
    ASSERT_TRUE(SetBeep(true));
    HardwareController controller;
    TaskEventManager::GetInstance().PushEvent(900);
    ASSERT_EQ(0, controller.Start());
    controller.NotifyHWController();
    AwaitBeeps(1);
    TaskEventManager::GetInstance().RemoveEvent(900);
    controller.Stop();
    EXPECT_EQ(0, controller.Join());
}

TEST_F(HardwareControllerTest, ItsEndSendsOffOnlyWhenAChangeIsPending) {
    StartWith(true);
    AddTask("holiday");
    Notify();
    AwaitLed(10);
    AwaitPass();
    m_controller.Stop();
    EXPECT_EQ(0, m_controller.Join());
    EXPECT_THAT(m_fake.LedCodes(), ElementsAre(10));
    EXPECT_TRUE(m_log.Contains("turn off LED."));
    EXPECT_TRUE(m_log.Contains(") down."));
}

TEST_F(HardwareControllerTest, NobodyWaitsForAThreadThatDoesNotRun) {
    AddTask("holiday");
    Notify();  // never started
    StartWith(true);
    AwaitLed(10);  // the change was kept for it
    m_controller.Stop();
    EXPECT_EQ(0, m_controller.Join());
    TaskEventManager::GetInstance().PushEvent(900);
    Notify();  // has ended
    TaskEventManager::GetInstance().RemoveEvent(900);
}

TEST_F(HardwareControllerTest, AChangeWhilePausedReachesTheBarrier) {
    StartWith(true);
    m_controller.Pause();
    AddTask("holiday");
    Notify();
    AwaitLed(10);
}

// Pauses only once the test lets it.
class LatePauseController final : public HardwareController {
public:
    int Pause() override {
        if (m_before_pause) m_before_pause();
        return HardwareController::Pause();
    }
    std::function<void()> m_before_pause;
};

TEST_F(HardwareControllerTest, AChangeThatComesInTheMiddleOfAPassIsNotForgotten) {
    Processor::SetWaitStepForTest(1);
    std::atomic<int> sent{0};
    m_fake.OnCall("KLIBScemdNotify", [&sent] {
        ++sent;
        usleep(20000);
    });
    InitDeviceSupport();
    LatePauseController controller;
    ASSERT_EQ(0, controller.Start());
    TaskEventManager::GetInstance().PushEvent(904);
    controller.NotifyHWController();
    controller.m_before_pause = [&sent] {
        for (const int before = sent; sent == before;) sched_yield();
    };
    TaskEventManager::GetInstance().RemoveEvent(904);
    controller.NotifyHWController();
    AwaitLed(65);
    EXPECT_THAT(Codes(), ElementsAre(64, 65));
    controller.Stop();
    controller.Join();
    m_fake.OnCall("KLIBScemdNotify", nullptr);
}

// The end of the daemon: the task worker may still tell of its last task.
TEST_F(HardwareControllerTest, AStopNeverHangsWithNotifiersAtWork) {
    Processor::SetWaitStepForTest(100);
    std::atomic<bool> is_over{false};
    std::vector<std::thread> notifiers;
    for (uint64_t id = 901; id <= 903; ++id) {
        notifiers.emplace_back([this, id, &is_over] {
            while (!is_over) {
                TaskEventManager::GetInstance().PushEvent(id);
                Notify();
                TaskEventManager::GetInstance().RemoveEvent(id);
                Notify();
            }
        });
    }
    for (int i = 0; i < 300; ++i) {
        ASSERT_EQ(0, m_controller.Start());
        for (int spin = 0; spin < i % 7; ++spin) usleep(100);
        m_controller.Stop();
        ASSERT_EQ(0, m_controller.Join());
    }
    is_over = true;
    for (std::thread& notifier : notifiers) notifier.join();
}

}  // namespace
