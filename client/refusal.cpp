#include "client/refusal.h"

#include <string_view>

namespace {

struct Advice {
    int code;
    std::string_view text;  // empty: any text of this code
    std::string_view advice;
};

// The first that fits counts.
constexpr Advice ADVICE[] = {
    {2,  "",                                           "a database of the repository cannot be read or written; the system log says why" },
    {3,  "",
     "a task for this device exists, and each device has one at most: \"ferrixctl task list\" "
     "shows "
     "it, \"ferrixctl task set\" changes it, \"ferrixctl task remove\" makes room"                                                       },
    {4,  "",                                           "a task for this device exists: \"ferrixctl task list\" shows it"                 },
    {5,  "",                                           "the device of this task is not known any more: remove the task and add it anew"  },
    {6,  "",                                           "\"ferrixctl task list\" shows the ids that there are"                            },
    {8,  "",                                           "its device is not plugged in, or its share is gone: there is nothing to act upon"},
    {9,  "",
     "another import copies into this folder, one above it or one below it: choose another folder "
     "with --to, or change the other task (\"ferrixctl task list\")"                                                                     },
    {10, "",                                           "make the folder first, or add --make-folder"                                     },
    {11, "Failed to resolve import destination path.",
     "there is no such share: \"ferrixctl share list\" shows those that there are"                                                       },
    {11, "FSStat import path failed.",
     "the folder cannot be read: is its share locked or its disk in trouble?"                                                            },
    {11, "Task is not runnable",
     "its device is not plugged in, or its share is locked: \"ferrixctl device list\" and "
     "\"ferrixctl share list\" show which"                                                                                               },
    {11, "Default Task can not be removed",
     "it comes with the box: \"ferrixctl task disable\" switches it off"                                                                 },
    {11, "Failed to CreateSchedule",
     "the timetable was not accepted, but the task stands, without one: remove it and add it "
     "again"                                                                                                                             },
    {11, "Failed to UpdateScheduleContent",            "the timetable was not accepted and stays as it was"                              },
    {11, "Failed to ReadFilterSetting",
     "a filter file of this task is missing or damaged; \"ferrixctl task filter set\" writes it "
     "anew"                                                                                                                              },
    {11, "Failed to LoadUSBTaskEntryByUSBID",
     "the task stands, but could not be made ready: plug the device in again"                                                            },
};

}  // namespace

std::string ExplainRefusal(const std::string& action, int code, const std::string& text) {
    for (const Advice& item : ADVICE) {
        if (item.code == code && (item.text.empty() || item.text == text)) {
            return text + ": " + std::string(item.advice);
        }
    }
    return text + " (" + action + ")";
}
