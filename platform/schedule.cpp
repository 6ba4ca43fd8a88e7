#include "platform/schedule.h"

#include <json/value.h>
#include <json/writer.h>
#include <keld/sched.h>

#include <cstring>
#include <memory>

#include "db/task-info.h"
#include "platform/json-util.h"
#include "platform/keld-sdk-wrapper.h"
#include "platform/package-paths.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

constexpr char kApplication[] = "KELD.KDS.Ferrix.Application";
constexpr char kApplicationName[] = "#common:app_name#";
constexpr size_t kApplicationSize = 512;

using UniqueEntry = std::unique_ptr<KELDSchedTask, FreeWith<KELDSchedTaskFree>>;
using UniqueEntryList = std::unique_ptr<KELDSchedTask, FreeWith<KELDSchedTaskListFree>>;

struct KeyRow {
    const char* of_client;
    const char* of_scheduler;
};
constexpr KeyRow kKeys[] = {
    {"minute",      "min"      },
    {"week_day",    "week_name"},
    {"repeat_date", "repeat"   },
};

const char* ActionOf(int task_type) {
    switch (task_type) {
        case TASK_TYPE_EXPORT_GENERAL:
            return "#type:icon_export_general#";
        case TASK_TYPE_IMPORT_PHOTO:
            return "#type:icon_import_photo#";
        case TASK_TYPE_IMPORT_GENERAL:
            return "#type:icon_import_general#";
        default:
            return "";
    }
}

// Sets every field but the timetable. An entry that lacks one would run wrongly or not be found
// again, so the first failure counts.
bool SetFields(KELDSchedTask* entry, uint64_t task_id, int task_type, const std::string& task_name,
               bool enabled) {
    const std::string command = NotifierPath() + " --execute-task " + std::to_string(task_id);
    return KELDSchedCTaskSetApp(entry, kApplication) >= 0 &&
           KELDSchedCTaskSetAppName(entry, kApplicationName) >= 0 &&
           KELDSchedCTaskSetName(entry, task_name.c_str()) >= 0 &&
           KELDSchedCTaskSetAction(entry, ActionOf(task_type)) >= 0 &&
           KELDSchedCTaskSetCommand(entry, command.c_str()) >= 0 &&
           KELDSchedCTaskSetState(entry, enabled) >= 0 &&
           KELDSchedCTaskSetCanRunAppSameTime(entry, 1) >= 0 &&
           KELDSchedCTaskSetCanRunTaskSameTime(entry, 1) >= 0 &&
           KELDSchedCTaskSetCanRunFromUI(entry, 1) >= 0 && KELDSchedCTaskSetOwner(entry, 0) >= 0 &&
           KELDSchedCTaskSetCanEditName(entry, 0) >= 0 &&
           KELDSchedCTaskSetCanEditOwner(entry, 0) >= 0 &&
           KELDSchedCTaskSetCanDeleteFromUI(entry, 0) >= 0;
}

// The stored entry, to be changed and saved; null on failure.
UniqueEntry LoadEntry(int64_t schedule_id) {
    UniqueEntry entry(KELDSchedTaskAlloc());
    if (!entry) {
        SLOG_ERR("KELDSchedTaskAlloc() failed.\n");
        return nullptr;
    }
    // An id that is cut to an int would be that of another entry.
    const int id = static_cast<int>(schedule_id);
    if (id != schedule_id || KELDSchedTaskLoad(id, entry.get()) < 0) {
        SLOG_ERR("KELDSchedTaskLoad() failed.\n");
        return nullptr;
    }
    return entry;
}

bool SaveEntry(KELDSchedTask* entry) {
    if (KELDSchedTaskSave(entry) >= 0) return true;
    SLOG_ERR("KELDSchedTaskSave() failed.\n");
    return false;
}

int IsOfApplication(const KELDSchedTask* entry) {
    char application[kApplicationSize] = "";
    return KELDSchedCTaskGetApp(application, sizeof(application), entry) >= 0 &&
           strcmp(application, kApplication) == 0;
}

// Does `work` on every entry of the application, and goes on after a failure.
bool ForEachEntry(bool (*work)(KELDSchedTask* entry)) {
    const SDK::ReentrantLock lock;
    KELDSchedTask* first = nullptr;
    const int count = KELDSchedTaskListGet(&first, IsOfApplication);
    const UniqueEntryList list(first);
    if (count < 0) {
        SLOG_ERR("KELDSchedTaskListGet() failed\n");
        return false;
    }
    bool is_done = true;
    for (KELDSchedTask* entry = first; entry != nullptr; entry = KELDSchedTaskNext(entry)) {
        if (!work(entry)) is_done = false;
    }
    return is_done;
}

template <bool IsListable>
bool SetListable(KELDSchedTask* entry) {
    if ((KELDSchedTaskIsListable(entry) != 0) == IsListable) return true;
    if (KELDSchedCTaskSetListable(entry, IsListable) < 0) {
        SLOG_ERR("KELDSchedCTaskSetListable() failed\n");
        return false;
    }
    return SaveEntry(entry);
}

bool RemoveEntry(KELDSchedTask* entry) {
    int id = 0;
    if (KELDSchedCTaskGetID(&id, entry) < 0) {
        SLOG_ERR("KELDSchedCTaskGetID() failed\n");
        return false;
    }
    if (id > 0 && KELDSchedTaskRemove(id) < 0) {
        SLOG_ERR("KELDSchedTaskRemove() failed, id[%d]\n", id);
        return false;
    }
    return true;
}

}  // namespace

bool ConvertScheduleJson(const std::string& schedule_json, KELDSchedTask* entry) {
    Json::Value parsed;
    if (ParseJson(schedule_json, parsed) < 0 || !parsed.isObject()) {
        SLOG_ERR("parse json[%s] failed\n", schedule_json.c_str());
        return false;
    }
    Json::Value converted(Json::objectValue);
    Json::Value& schedule = converted["schedule"] = parsed;
    for (const KeyRow& key : kKeys) schedule[key.of_scheduler] = parsed[key.of_client];
    for (const KeyRow& key : kKeys) schedule.removeMember(key.of_client);
    Json::FastWriter writer;  // ASCII alone, so the text is UTF-8 whatever the client has sent
    writer.omitEndingLineFeed();
    const std::string text = writer.write(converted);
    const SDK::ReentrantLock lock;
    if (!KELDSchedTaskConvertFromJson_Schedule(text.c_str(), entry)) {
        SLOG_ERR("KELDSchedTaskConvertFromJson_Schedule() failed, converted_json[%s]\n",
                 text.c_str());
        return false;
    }
    return true;
}

bool CreateSchedule(uint64_t task_id, int task_type, const std::string& task_name, bool enabled,
                    const std::string& schedule_json, int64_t& schedule_id) {
    const SDK::ReentrantLock lock;
    const UniqueEntry entry(KELDSchedTaskAlloc());
    if (!entry) {
        SLOG_ERR("KELDSchedTaskAlloc() failed\n");
        return false;
    }
    if (!ConvertScheduleJson(schedule_json, entry.get())) {
        SLOG_ERR("ConvertScheduleJson() failed\n");
        return false;
    }
    if (!SetFields(entry.get(), task_id, task_type, task_name, enabled)) {
        SLOG_ERR("Failed to set the fields of the schedule of task '%llu'\n", Llu(task_id));
        return false;
    }
    if (KELDSchedTaskSave(entry.get()) < 0) {
        SLOG_ERR("KELDSchedTaskSave() failed\n");
        return false;
    }
    int id = -1;
    if (KELDSchedCTaskGetID(&id, entry.get()) < 0) {
        SLOG_ERR("KELDSchedCTaskGetID() failed\n");
        return false;
    }
    schedule_id = id;
    return true;
}

bool UpdateSchedule(int64_t schedule_id, bool enabled, const std::string& schedule_json) {
    const SDK::ReentrantLock lock;
    const UniqueEntry entry = LoadEntry(schedule_id);
    if (!entry) return false;
    if (KELDSchedCTaskSetState(entry.get(), enabled) < 0) {
        SLOG_ERR("KELDSchedCTaskSetState() failed.\n");
        return false;
    }
    if (!ConvertScheduleJson(schedule_json, entry.get())) {
        SLOG_ERR("ConvertScheduleJson() failed.\n");
        return false;
    }
    return SaveEntry(entry.get());
}

bool UpdateScheduleName(int64_t schedule_id, const std::string& name) {
    const SDK::ReentrantLock lock;
    const UniqueEntry entry = LoadEntry(schedule_id);
    if (!entry) return false;
    if (KELDSchedCTaskSetName(entry.get(), name.c_str()) < 0) {
        SLOG_ERR("KELDSchedCTaskSetName() failed.\n");
        return false;
    }
    return SaveEntry(entry.get());
}

bool ShowAllSchedule() { return ForEachEntry(SetListable<true>); }

bool HideAllSchedule() { return ForEachEntry(SetListable<false>); }

bool RemoveAllSchedule() { return ForEachEntry(RemoveEntry); }
