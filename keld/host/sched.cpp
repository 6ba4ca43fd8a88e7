#include <json/value.h>
#include <keld/error.h>
#include <keld/sched.h>

#include <memory>
#include <new>
#include <string>
#include <vector>

#include "host/host-error.h"
#include "host/sched-entry.h"
#include "host/sched-store.h"
#include "host/text.h"

namespace keld_host {
namespace {

int SetText(KELDSchedTask* entry, SchedText field, const char* text) {
    if (entry == nullptr || text == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    entry->entry.SetText(field, text);
    return 0;
}

int SetNumber(KELDSchedTask* entry, SchedNumber field, int number) {
    if (entry == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    entry->entry.SetNumber(field, number);
    return 0;
}

int SetFlag(KELDSchedTask* entry, SchedNumber field, int flag) {
    return SetNumber(entry, field, flag != 0 ? 1 : 0);
}

int Result(int code) { return code == KELDERR_SUCCESS ? 0 : Fail(code); }

}  // namespace
}  // namespace keld_host

using keld_host::Fail;

extern "C" {

KELDSchedTask* KELDSchedTaskAlloc(void) {
    auto* entry = new (std::nothrow) KELDSchedTask;
    if (entry == nullptr) (void)Fail(KELDERR_SYSTEM);
    return entry;
}

void KELDSchedTaskFree(KELDSchedTask* entry) { KELDSchedTaskListFree(entry); }

int KELDSchedTaskLoad(int id, KELDSchedTask* entry) {
    if (entry == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    return keld_host::Result(keld_host::LoadSchedEntry(id, &entry->entry));
}

int KELDSchedTaskSave(KELDSchedTask* entry) {
    if (entry == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    return keld_host::Result(keld_host::SaveSchedEntry(&entry->entry));
}

int KELDSchedTaskRemove(int id) { return keld_host::Result(keld_host::RemoveSchedEntry(id)); }

int KELDSchedTaskListGet(KELDSchedTask** list, KELDSchedFilter filter) {
    if (list == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    *list = nullptr;
    std::vector<keld_host::SchedEntry> entries;
    if (const int code = keld_host::ListSchedEntries(&entries); code != KELDERR_SUCCESS) {
        return Fail(code);
    }
    std::unique_ptr<KELDSchedTask> first;
    std::unique_ptr<KELDSchedTask>* end = &first;
    int count = 0;
    for (keld_host::SchedEntry& entry : entries) {
        auto task = std::make_unique<KELDSchedTask>();
        task->entry = std::move(entry);
        if (filter != nullptr && filter(task.get()) == 0) continue;
        *end = std::move(task);
        end = &(*end)->next;
        ++count;
    }
    *list = first.release();
    return count;
}

KELDSchedTask* KELDSchedTaskNext(const KELDSchedTask* entry) {
    return entry != nullptr ? entry->next.get() : nullptr;
}

void KELDSchedTaskListFree(KELDSchedTask* list) {
    std::unique_ptr<KELDSchedTask> rest(list);
    while (rest) rest = std::move(rest->next);
}

int KELDSchedCTaskSetApp(KELDSchedTask* entry, const char* app) {
    return keld_host::SetText(entry, keld_host::SCHED_APP, app);
}
int KELDSchedCTaskSetAppName(KELDSchedTask* entry, const char* name) {
    return keld_host::SetText(entry, keld_host::SCHED_APP_NAME, name);
}
int KELDSchedCTaskSetName(KELDSchedTask* entry, const char* name) {
    return keld_host::SetText(entry, keld_host::SCHED_NAME, name);
}
int KELDSchedCTaskSetAction(KELDSchedTask* entry, const char* action) {
    return keld_host::SetText(entry, keld_host::SCHED_ACTION, action);
}
int KELDSchedCTaskSetCommand(KELDSchedTask* entry, const char* command) {
    return keld_host::SetText(entry, keld_host::SCHED_COMMAND, command);
}
int KELDSchedCTaskSetState(KELDSchedTask* entry, int enabled) {
    return keld_host::SetFlag(entry, keld_host::SCHED_STATE, enabled);
}
int KELDSchedCTaskSetCanRunAppSameTime(KELDSchedTask* entry, int flag) {
    return keld_host::SetFlag(entry, keld_host::SCHED_CAN_RUN_APP_SAME_TIME, flag);
}
int KELDSchedCTaskSetCanRunTaskSameTime(KELDSchedTask* entry, int flag) {
    return keld_host::SetFlag(entry, keld_host::SCHED_CAN_RUN_TASK_SAME_TIME, flag);
}
int KELDSchedCTaskSetCanRunFromUI(KELDSchedTask* entry, int flag) {
    return keld_host::SetFlag(entry, keld_host::SCHED_CAN_RUN_FROM_UI, flag);
}
int KELDSchedCTaskSetOwner(KELDSchedTask* entry, int uid) {
    return keld_host::SetNumber(entry, keld_host::SCHED_OWNER, uid);
}
int KELDSchedCTaskSetCanEditName(KELDSchedTask* entry, int flag) {
    return keld_host::SetFlag(entry, keld_host::SCHED_CAN_EDIT_NAME, flag);
}
int KELDSchedCTaskSetCanEditOwner(KELDSchedTask* entry, int flag) {
    return keld_host::SetFlag(entry, keld_host::SCHED_CAN_EDIT_OWNER, flag);
}
int KELDSchedCTaskSetCanDeleteFromUI(KELDSchedTask* entry, int flag) {
    return keld_host::SetFlag(entry, keld_host::SCHED_CAN_DELETE_FROM_UI, flag);
}
int KELDSchedCTaskSetListable(KELDSchedTask* entry, int flag) {
    return keld_host::SetFlag(entry, keld_host::SCHED_LISTABLE, flag);
}

int KELDSchedCTaskGetID(int* id, const KELDSchedTask* entry) {
    if (id == nullptr || entry == nullptr || entry->entry.Id() <= 0) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    *id = entry->entry.Id();
    return 0;
}

int KELDSchedCTaskGetApp(char* buffer, size_t size, const KELDSchedTask* entry) {
    if (buffer == nullptr || entry == nullptr ||
        !keld_host::FillBuffer(entry->entry.Text(keld_host::SCHED_APP), buffer, size)) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    return 0;
}

int KELDSchedTaskIsListable(const KELDSchedTask* entry) {
    return entry != nullptr && entry->entry.Number(keld_host::SCHED_LISTABLE) != 0 ? 1 : 0;
}

bool KELDSchedTaskConvertFromJson_Schedule(const char* json, KELDSchedTask* entry) {
    Json::Value root;
    std::optional<keld_host::Timetable> timetable;
    if (json == nullptr || entry == nullptr || !keld_host::ParseJson(json, &root) ||
        !root.isObject() || !keld_host::ParseTimetable(root["schedule"], &timetable)) {
        (void)Fail(KELDERR_INVALID_ARGUMENT);
        return false;
    }
    entry->entry.SetSchedule(timetable);
    return true;
}

}  // extern "C"
