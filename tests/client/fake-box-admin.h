// Stands in for what a program does to the box itself: tests say what happens and read what was
// asked. Threads: belongs to one thread.
#pragma once

#include <functional>
#include <map>
#include <string>

#include "client/timetable.h"

struct FakeBoxAdmin {
    // Called with "check rename photos pictures", "add films" and the like before it is done; what
    // it throws is thrown.
    std::function<void(const std::string& what)> on_call;
    std::map<int64_t, Timetable> timetables;

    static FakeBoxAdmin& Get();
    // As at first: everything succeeds.
    static FakeBoxAdmin& Reset();
};
