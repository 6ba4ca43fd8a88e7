// A plugged-in device that waits for a task, and requests for it.
#pragma once

#include <functional>
#include <string>

#include "command-fixture.h"

class AddTaskTest : public CommandTest {
protected:
    AddTaskTest() { PlugIn("a", "u-1"); }

    PObject Add(const std::function<void(PObject&)>& change = [](PObject&) {}) {
        PObject request = AddRequest("a", "u-1");
        change(request);
        return Send("add_task", request);
    }
    // As Add(), for another device.
    PObject AddOther(const std::string& name, const std::function<void(PObject&)>& change) {
        PlugIn(name, "u-" + name);
        PObject request = AddRequest(name, "u-" + name);
        change(request);
        return Send("add_task", request);
    }
};
