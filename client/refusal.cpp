#include "client/refusal.h"

#include <algorithm>
#include <iterator>
#include <string_view>

namespace {

struct Advice {
    std::string_view action;  // empty: any
    int code;
    std::string_view text;  // empty: any of this action and code
    std::string_view advice;

    [[nodiscard]] bool Fits(std::string_view what, int number, std::string_view said) const {
        return (action.empty() || action == what) && code == number &&
               (text.empty() || text == said);
    }
};

// Of a task that stands although its making broke off.
constexpr std::string_view HALF_MADE =
    "the task stands nevertheless, but not whole: \"ferrixctl task list\" shows its id, "
    "\"ferrixctl task remove\" takes it, and then it can be added again; the system log says what "
    "went wrong, a full volume perhaps";
constexpr std::string_view MAYBE_REMOVED =
    "look with \"ferrixctl task list\" whether the task is gone, and remove it again if not; the "
    "system log says what went wrong, a full volume perhaps";
constexpr std::string_view NOT_OFFERED =
    "the tasks that come with the box cannot serve its device before that is plugged in again; "
    "\"ferrixctl task list\" shows whether the task is gone";
constexpr std::string_view ADD_ANEW =
    "the device of this task is not known any more: remove the task (\"ferrixctl task remove\"), "
    "and add it anew";

// The first that fits counts. An option without its command is one of the command that was refused.
constexpr Advice ADVICE[] = {
    {"",                 1,                      "Failed to PrepareTaskInfo",
     "the database gave the device no number, and no task was added; the system log says why"                                                        },
    {"",                 1,                      "",
     "this program and the daemon do not understand each other: is the daemon one of an older "
     "release? \"ferrixctl service stop\" and \"ferrixctl service start\" start the one that is "
     "installed"                                                                                                                                     },

    {"add_task",         2,                      "Failed to AddTaskInfo to DB",
     "the system log says why. The device is noted now, but without a task, and takes no other: "
     "give its file system another uuid or format it, and add the task again"                                                                        },
    {"add_task",         2,                      "Failed to update task info",                 HALF_MADE                                             },
    {"remove_task",      2,                      "Failed to RemoveUSBInfo from DB",
     "look with \"ferrixctl task list\" whether the task is gone, and remove it again if not. If "
     "the device takes no new task then, it is still noted: give its file system another uuid or "
     "format it"                                                                                                                                     },
    {"remove_task",      2,                      "",                                           MAYBE_REMOVED                                         },
    {"enable_task",      2,                      "Failed to add log info to log db",
     "the task is switched on, but not made ready: plug the device in again. Is the volume of the "
     "repository full?"                                                                                                                              },
    {"",                 2,                      "Failed to add log info to log db",
     "what was asked for is done, and only its line in the log is missing: is the volume of the "
     "repository full?"                                                                                                                              },
    {"disable_task",     2,                      "Failed to update task info",
     "the task is off only until its device is plugged in again: switch it off once more when the "
     "database can be written; the system log says why it cannot"                                                                                    },
    {"",                 2,                      "",
     "a database of the repository cannot be read or written, and nothing was changed: is its "
     "volume full or read-only? The system log says more"                                                                                            },

    {"",                 3,                      "",
     "a task for this device exists, and each has one at most: \"ferrixctl task list\" shows it, "
     "\"ferrixctl task set\" changes it, \"ferrixctl task remove\" makes room"                                                                       },
    {"",                 4,                      "",
     "a task for this device exists: \"ferrixctl task list\" shows it, \"ferrixctl task remove\" "
     "makes room"                                                                                                                                    },
    {"",                 5,                      "",                                           ADD_ANEW                                              },
    {"",                 6,                      "",                                           "\"ferrixctl task list\" shows the ids that there are"},
    {"",                 8,                      "",
     "its device is not plugged in, or its share is gone, so there is no run to break off: "
     "\"ferrixctl task list\" shows how it stands"                                                                                                   },

    {"enable_task",      9,                      "",
     "another import copies into its folder, one above it or one below it: give one of the two "
     "another folder (\"ferrixctl task set TASK --to SHARE/FOLDER\")"                                                                                },
    {"",                 9,                      "",
     "another import copies into this folder, one above it or one below it: choose another folder "
     "with --to, or change the other task (\"ferrixctl task list\")"                                                                                 },
    {"add_task",         REFUSED_NO_DESTINATION, "",                                           "make the folder first, or add --make-folder"         },
    {"set_task_setting", REFUSED_NO_DESTINATION, "",
     "make the folder first, or name another one with --to"                                                                                          },
    {"",                 REFUSED_NO_DESTINATION, "",
     "make the folder first (\"ferrixctl task show\" tells which), or give the task another one "
     "(\"ferrixctl task set TASK --to SHARE/FOLDER\")"                                                                                               },

    {"",                 11,                     "Failed to resolve import destination path.",
     "there is no such share: \"ferrixctl share list\" shows those that there are, \"ferrixctl "
     "share add\" makes one"                                                                                                                         },
    {"",                 11,                     "FSStat import path failed.",
     "the folder cannot be looked at: is its disk in trouble, is its share locked (\"ferrixctl "
     "share list\" tells), or does a link lead to it?"                                                                                               },
    {"add_task",         11,                     "Failed to InitTaskEnv",                      HALF_MADE                                             },
    {"add_task",         11,                     "Failed to WriteFilterSetting",
     "the task stands nevertheless, but without a filter: is one of the filter's names too long, "
     "or "
     "the volume of the repository full? Remove the task (\"ferrixctl task list\" shows its id, "
     "\"ferrixctl task remove\" takes it) and add it again"                                                                                          },
    {"add_task",         11,                     "Failed to LoadUSBTaskEntryByUSBID",          HALF_MADE                                             },
    {"enable_task",      11,                     "Failed to LoadUSBTaskEntryByUSBID",
     "the task is switched on, but could not be made ready: plug the device in again"                                                                },
    {"",                 11,                     "Failed to CreateSchedule",                   HALF_MADE                                             },

    {"",                 11,                     "Default Task can not be removed",
     "it comes with the box: \"ferrixctl task disable\" switches it off"                                                                             },
    {"",                 11,                     "Failed to remove schedule",
     "the task is removed, but not its timetable, which will call for it in vain: remove that from "
     "the box's own scheduler; the system log tells its number"                                                                                      },
    {"",                 11,                     "Failed to remove task folder",
     "the task is removed, but not all of its folder in the repository: remove that by hand; the "
     "system log tells where it is"                                                                                                                  },
    {"",                 11,                     "Failed to get device path",                  NOT_OFFERED                                           },
    {"",                 11,                     "Failed to get uuid for device",              NOT_OFFERED                                           },
    {"",                 11,                     "Failed to register usb for device",          NOT_OFFERED                                           },

    {"",                 11,                     "Task is not runnable",
     "its device is not plugged in, its share is locked, or it is switched off: \"ferrixctl task "
     "show\" tells which"                                                                                                                            },
    {"",                 11,                     "Failed to UpdateScheduleName",
     "all that was said is set, but the box's scheduler shows the old name until the task gets yet "
     "another one"                                                                                                                                   },
    {"",                 11,                     "Failed to get task response",                ADD_ANEW                                              },
    {"",                 11,                     "Failed to UpdateScheduleContent",
     "the timetable was not accepted and stays as it was; all else that was said is set. Give the "
     "timetable again, with --at; the system log says what went wrong"                                                                               },

    {"",                 11,                     "Failed to WriteFilterSetting",
     "the filter may still be the old one: is one of its names too long, or the volume of the "
     "repository full? Set it again then"                                                                                                            },
    {"",                 11,                     "Failed to set filter setting",
     "the filter is stored, but not in use before the device is plugged in again"                                                                    },
    {"",                 11,                     "Failed to load black list",
     "the filter is stored, but what it keeps back is copied for now: set it again, or plug the "
     "device in again; the system log says what went wrong"                                                                                          },
    {"",                 11,                     "Failed to load white list",
     "the filter is stored, but what it does not name is copied as well for now: set it again, or "
     "plug the device in again; the system log says what went wrong"                                                                                 },
    {"",                 11,                     "Failed to ReadFilterSetting",
     "a filter file of this task is missing or damaged; \"ferrixctl task filter set\" writes it "
     "anew"                                                                                                                                          },
};

}  // namespace

std::string ExplainRefusal(const std::string& action, int code, const std::string& text) {
    const auto* found = std::ranges::find_if(
        ADVICE, [&](const Advice& item) { return item.Fits(action, code, text); });
    if (found == std::end(ADVICE)) return text + " (" + action + ")";
    return text + ": " + std::string(found->advice);
}
