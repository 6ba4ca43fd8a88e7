// The scheduler, with its store in memory.
#include <json/json.h>
#include <keld/sched.h>

#include <memory>
#include <sstream>

#include "fake/fake-state.h"

struct KELDSchedTask {
    FakeSchedEntry entry;
    KELDSchedTask* next = nullptr;
};

namespace {

// Sets one text or number of an entry.
int SetText(const char* call, KELDSchedTask* task, std::string FakeSchedEntry::*field,
            const char* value) {
    if (FakeFails(call, {FakeText(value)})) return -1;
    if (task == nullptr) return FakeError(KELDERR_INVALID_ARGUMENT);
    task->entry.*field = FakeText(value);
    return 0;
}

int SetNumber(const char* call, KELDSchedTask* task, int FakeSchedEntry::*field, int value) {
    if (FakeFails(call, {std::to_string(value)})) return -1;
    if (task == nullptr) return FakeError(KELDERR_INVALID_ARGUMENT);
    task->entry.*field = value;
    return 0;
}

bool IsTimetable(const std::string& text) {
    Json::Value json;
    std::string errors;
    std::istringstream stream(text);
    return Json::parseFromStream(Json::CharReaderBuilder(), stream, &json, &errors) &&
           json.isObject() && json["schedule"].isObject();
}

}  // namespace

extern "C" {

KELDSchedTask* KELDSchedTaskAlloc(void) {
    return FakeFails("KELDSchedTaskAlloc") ? nullptr : new KELDSchedTask;
}

void KELDSchedTaskFree(KELDSchedTask* entry) {
    FakeRecord("KELDSchedTaskFree");
    delete entry;
}

int KELDSchedTaskLoad(int id, KELDSchedTask* entry) {
    if (FakeFails("KELDSchedTaskLoad", {std::to_string(id)})) return -1;
    const LockedState state;
    const auto found = state->sched.find(id);
    if (found == state->sched.end()) return FakeError(KELDERR_SRC_MISS);
    entry->entry = found->second;
    return 0;
}

int KELDSchedTaskSave(KELDSchedTask* entry) {
    if (FakeFails("KELDSchedTaskSave", {std::to_string(entry->entry.id)})) return -1;
    if (entry->entry.id == 0) {
        entry->entry.id = FakeKeld::Get().AddSchedEntry(entry->entry);
        return 0;
    }
    const LockedState state;
    if (!state->sched.contains(entry->entry.id)) return FakeError(KELDERR_SRC_MISS);
    state->sched[entry->entry.id] = entry->entry;
    return 0;
}

int KELDSchedTaskRemove(int id) {
    if (FakeFails("KELDSchedTaskRemove", {std::to_string(id)})) return -1;
    return LockedState()->sched.erase(id) == 1 ? 0 : FakeError(KELDERR_SRC_MISS);
}

int KELDSchedTaskListGet(KELDSchedTask** list, KELDSchedFilter filter) {
    *list = nullptr;
    if (FakeFails("KELDSchedTaskListGet")) return -1;
    const std::map<int, FakeSchedEntry> entries = FakeKeld::Get().SchedEntries();
    int count = 0;
    KELDSchedTask** end = list;
    for (const auto& [id, entry] : entries) {
        auto task = std::make_unique<KELDSchedTask>();
        task->entry = entry;
        if (filter != nullptr && filter(task.get()) == 0) continue;
        *end = task.release();
        end = &(*end)->next;
        ++count;
    }
    return count;
}

KELDSchedTask* KELDSchedTaskNext(const KELDSchedTask* entry) { return entry->next; }

void KELDSchedTaskListFree(KELDSchedTask* list) {
    FakeRecord("KELDSchedTaskListFree");
    while (list != nullptr) {
        KELDSchedTask* next = list->next;
        delete list;
        list = next;
    }
}

int KELDSchedCTaskSetApp(KELDSchedTask* entry, const char* app) {
    return SetText("KELDSchedCTaskSetApp", entry, &FakeSchedEntry::app, app);
}
int KELDSchedCTaskSetAppName(KELDSchedTask* entry, const char* name) {
    return SetText("KELDSchedCTaskSetAppName", entry, &FakeSchedEntry::app_name, name);
}
int KELDSchedCTaskSetName(KELDSchedTask* entry, const char* name) {
    return SetText("KELDSchedCTaskSetName", entry, &FakeSchedEntry::name, name);
}
int KELDSchedCTaskSetAction(KELDSchedTask* entry, const char* action) {
    return SetText("KELDSchedCTaskSetAction", entry, &FakeSchedEntry::action, action);
}
int KELDSchedCTaskSetCommand(KELDSchedTask* entry, const char* command) {
    return SetText("KELDSchedCTaskSetCommand", entry, &FakeSchedEntry::command, command);
}
int KELDSchedCTaskSetState(KELDSchedTask* entry, int enabled) {
    return SetNumber("KELDSchedCTaskSetState", entry, &FakeSchedEntry::state, enabled);
}
int KELDSchedCTaskSetCanRunAppSameTime(KELDSchedTask* entry, int flag) {
    return SetNumber("KELDSchedCTaskSetCanRunAppSameTime", entry,
                     &FakeSchedEntry::can_run_app_same_time, flag);
}
int KELDSchedCTaskSetCanRunTaskSameTime(KELDSchedTask* entry, int flag) {
    return SetNumber("KELDSchedCTaskSetCanRunTaskSameTime", entry,
                     &FakeSchedEntry::can_run_task_same_time, flag);
}
int KELDSchedCTaskSetCanRunFromUI(KELDSchedTask* entry, int flag) {
    return SetNumber("KELDSchedCTaskSetCanRunFromUI", entry, &FakeSchedEntry::can_run_from_ui,
                     flag);
}
int KELDSchedCTaskSetOwner(KELDSchedTask* entry, int uid) {
    return SetNumber("KELDSchedCTaskSetOwner", entry, &FakeSchedEntry::owner, uid);
}
int KELDSchedCTaskSetCanEditName(KELDSchedTask* entry, int flag) {
    return SetNumber("KELDSchedCTaskSetCanEditName", entry, &FakeSchedEntry::can_edit_name, flag);
}
int KELDSchedCTaskSetCanEditOwner(KELDSchedTask* entry, int flag) {
    return SetNumber("KELDSchedCTaskSetCanEditOwner", entry, &FakeSchedEntry::can_edit_owner, flag);
}
int KELDSchedCTaskSetCanDeleteFromUI(KELDSchedTask* entry, int flag) {
    return SetNumber("KELDSchedCTaskSetCanDeleteFromUI", entry, &FakeSchedEntry::can_delete_from_ui,
                     flag);
}
int KELDSchedCTaskSetListable(KELDSchedTask* entry, int flag) {
    return SetNumber("KELDSchedCTaskSetListable", entry, &FakeSchedEntry::listable, flag);
}

int KELDSchedCTaskGetID(int* id, const KELDSchedTask* entry) {
    if (FakeFails("KELDSchedCTaskGetID")) return -1;
    if (entry->entry.id == 0) return FakeError(KELDERR_INVALID_ARGUMENT);
    *id = entry->entry.id;
    return 0;
}

int KELDSchedCTaskGetApp(char* buffer, size_t size, const KELDSchedTask* entry) {
    if (FakeFails("KELDSchedCTaskGetApp")) return -1;
    return FakeFill(entry->entry.app, buffer, size) ? 0 : FakeError(KELDERR_INVALID_ARGUMENT);
}

int KELDSchedTaskIsListable(const KELDSchedTask* entry) { return entry->entry.listable; }

bool KELDSchedTaskConvertFromJson_Schedule(const char* json, KELDSchedTask* entry) {
    if (FakeFails("KELDSchedTaskConvertFromJson_Schedule", {FakeText(json)})) return false;
    if (entry == nullptr || !IsTimetable(FakeText(json))) {
        FakeError(KELDERR_INVALID_ARGUMENT);
        return false;
    }
    entry->entry.json = FakeText(json);
    return true;
}

}  // extern "C"
