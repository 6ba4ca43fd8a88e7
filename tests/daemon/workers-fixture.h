// The box with its workers at work, and a gate that holds them up in the middle of a copy.
#pragma once

#include <atomic>
#include <functional>
#include <memory>
#include <string>

#include "command-fixture.h"

void WaitUntil(const std::function<bool()>& is_true);

// Holds the worker up at its next copy until the test has seen it there. It is shared with the
// worker, which may come by later than the end of the test.
class Gate {
public:
    void Hold(const std::function<bool()>& may_go_on);
    void WaitForWorker() const;
    void Open() { m_is_open = true; }

private:
    std::atomic<bool> m_is_reached = false;
    std::atomic<bool> m_is_open = false;
};

class WorkersTest : public CommandTest {
protected:
    WorkersTest();
    // A gate at the platform's copy call, which opens by itself when a task is aborted.
    std::shared_ptr<Gate> HoldCopies();
    // A device with twenty files, and its task; it runs when the device is plugged in.
    uint64_t AddRunningTask(const std::string& name = "a", const std::string& folder = "/");
    // The description of the one task there is.
    PObject OnlyTask();
    std::string Status(uint64_t task_id);
    // Runs a task and waits for its end.
    void RunToTheEnd(uint64_t task_id);
    // The number of files of a folder of the share "photos".
    [[nodiscard]] size_t CountFiles(const std::string& folder = "") const;
};
