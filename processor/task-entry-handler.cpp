#include "processor/task-entry-handler.h"

#include <initializer_list>
#include <utility>

#include "db/task-info.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

// One line of a dump: what stands before the label, the label, the value.
struct Field {
    Field(const char* name, const std::string& text, const char* start = "\t")
        : label(name), value(text), indent(start) {}
    template <typename Number>
    Field(const char* name, Number number, const char* start = "\t")
        : Field(name, std::to_string(number), start) {}

    const char* label;
    std::string value;
    const char* indent;
};

std::string RecordText(std::initializer_list<Field> fields) {
    std::string out = "{";
    const char* end_of_line = "\n";
    for (const Field& field : fields) {
        out.append(end_of_line).append(field.indent).append(field.label);
        out.append(": ").append(field.value);
        end_of_line = ",\n";
    }
    return out + "\n}\n";
}

std::string EntryText(const USBRunInfo& entry) {
    return RecordText({
        {"usb_id",               entry.usb_id              },
        {"usb_share_path",       entry.usb_share_path      },
        {"uuid",                 entry.uuid                },
        {"run_when_plug_in",     entry.run_when_plug_in    },
        {"eject_when_task_done", entry.eject_when_task_done},
    });
}

std::string EntryText(const TaskRunInfo& entry) {
    return RecordText({
        {"task_id",            entry.task_id           },
        {"usb_id",             entry.usb_id            },
        {"task_name",          entry.task_name         },
        {"status",             entry.status            },
        {"copy_strategy",      entry.copy_strategy     },
        {"hub_share_name",     entry.hub_share_name    },
        {"dst_dir_path",       entry.dst_dir_path      },
        {"src_dir_path",       entry.src_dir_path      },
        {"keep_dir_structure", entry.keep_dir_structure, "\n\t"}, // behind an empty line
        {"smart_create_date_dir",                    entry.smart_create_date_dir                     },
        {"rename_photo_video",                    entry.rename_photo_video   },
        {"remove_src_file",                    entry.remove_src_file                        },
        {"conflict_policy",                    entry.conflict_policy   },
        {"version_dir",                    entry.version_dir                            },
        {"enable_rotation",                    entry.enable_rotation},
        {"max_version_count",                    entry.max_version_count                          },
        {"rotation_policy",                    entry.rotation_policy },
    });
}

// Copies the entry of this id out of a map. 0, or -1 when there is none.
template <typename Entry>
int CopyEntry(const std::map<uint64_t, Entry>& entries, uint64_t id, Entry& out) {
    const auto found = entries.find(id);
    if (found == entries.end()) return -1;
    out = found->second;
    return 0;
}

}  // namespace

TaskEntryHandler& TaskEntryHandler::GetInstance() {
    static TaskEntryHandler instance;
    return instance;
}

TaskEntryHandler::~TaskEntryHandler() { pthread_mutex_destroy(&m_mutex); }

int TaskEntryHandler::GetUSBEntry(uint64_t usb_id, USBRunInfo& entry) const {
    const MutexLock lock(m_mutex);
    return CopyEntry(m_usb_entries, usb_id, entry);
}

int TaskEntryHandler::GetTaskEntry(uint64_t task_id, TaskRunInfo& entry) const {
    // What the out was the last to hold is destroyed after the mutex is released.
    TaskRunInfo copy;
    const MutexLock lock(m_mutex);
    if (CopyEntry(m_task_entries, task_id, copy) < 0) return -1;
    std::swap(entry, copy);
    return 0;
}

int TaskEntryHandler::GetUSBEntryByPath(const std::string& usb_share_path,
                                        USBRunInfo& entry) const {
    const MutexLock lock(m_mutex);
    for (const auto& [id, usb] : m_usb_entries) {
        if (usb.usb_share_path != usb_share_path) continue;
        entry = usb;
        return 0;
    }
    return -1;
}

bool TaskEntryHandler::IsUSBEntryEmpty() const {
    const MutexLock lock(m_mutex);
    return m_usb_entries.empty();
}

bool TaskEntryHandler::IsTaskEntryEmpty() const {
    const MutexLock lock(m_mutex);
    return m_task_entries.empty();
}

void TaskEntryHandler::AddUSBEntry(const USBRunInfo& entry) {
    const MutexLock lock(m_mutex);
    m_usb_entries[entry.usb_id] = entry;
}

void TaskEntryHandler::AddTaskEntry(const TaskRunInfo& entry) {
    // What the replaced entry was the last to hold is destroyed after the mutex is released.
    TaskRunInfo replaced = entry;
    const MutexLock lock(m_mutex);
    std::swap(m_task_entries[entry.task_id], replaced);
}

void TaskEntryHandler::RemoveUSBEntry(uint64_t usb_id) {
    const MutexLock lock(m_mutex);
    m_usb_entries.erase(usb_id);
}

void TaskEntryHandler::RemoveTaskEntry(uint64_t task_id) {
    decltype(m_task_entries)::node_type removed;  // destroyed after the mutex is released
    decltype(m_run_entries)::node_type run;
    const MutexLock lock(m_mutex);
    removed = m_task_entries.extract(task_id);
    run = m_run_entries.extract(task_id);
}

template <typename Change>
bool TaskEntryHandler::ChangeTask(uint64_t task_id, const Change& change) {
    {
        const MutexLock lock(m_mutex);
        const auto found = m_task_entries.find(task_id);
        if (found != m_task_entries.end()) {
            change(found->second);
            return true;
        }
    }
    SLOG_WARN("Can not find task entry for task_id '%llu'\n", Llu(task_id));
    return false;
}

int TaskEntryHandler::SetTaskState(uint64_t task_id, int state) {
    decltype(m_run_entries)::node_type run;  // destroyed after the mutex is released
    const bool is_set = ChangeTask(task_id, [&](TaskRunInfo& task) {
        task.status = state;
        if (state == TASK_RUN_STATE_IDLE) run = m_run_entries.extract(task_id);
    });
    if (!is_set) return -1;
    SLOG_DBG("Set task '%llu' state (%d)\n", Llu(task_id), state);
    return 0;
}

int TaskEntryHandler::SetTaskVersionDir(uint64_t task_id, const std::string& version_dir) {
    if (!ChangeTask(task_id, [&](TaskRunInfo& task) { task.version_dir = version_dir; })) return -1;
    SLOG_DBG("Set task '%llu' version dir (%s)\n", Llu(task_id), version_dir.c_str());
    return 0;
}

int TaskEntryHandler::SetTaskSettings(const TaskRunInfo& entry) {
    TaskRunInfo replaced = entry;  // what it was the last to hold is destroyed without the mutex
    const bool is_set = ChangeTask(entry.task_id, [&replaced](TaskRunInfo& task) {
        replaced.status = task.status;
        replaced.version_dir = task.version_dir;
        std::swap(task, replaced);
    });
    return is_set ? 0 : -1;
}

int TaskEntryHandler::StartRun(uint64_t task_id, TaskRunInfo& entry) {
    TaskRunInfo replaced;  // as in GetTaskEntry
    TaskRunInfo copy;
    const MutexLock lock(m_mutex);
    if (CopyEntry(m_task_entries, task_id, copy) < 0) return -1;
    replaced = std::exchange(m_run_entries[task_id], copy);
    std::swap(entry, copy);
    return 0;
}

int TaskEntryHandler::GetRunEntry(uint64_t task_id, TaskRunInfo& entry) const {
    TaskRunInfo copy;  // as in GetTaskEntry
    const MutexLock lock(m_mutex);
    const auto task = m_task_entries.find(task_id);
    if (task == m_task_entries.end()) return -1;
    if (CopyEntry(m_run_entries, task_id, copy) < 0) copy = task->second;
    copy.status = task->second.status;
    std::swap(entry, copy);
    return 0;
}

void TaskEntryHandler::ListUSBEntries(std::list<USBRunInfo>& entries) const {
    entries.clear();
    const MutexLock lock(m_mutex);
    for (const auto& [id, usb] : m_usb_entries) entries.push_back(usb);
}

void TaskEntryHandler::ListTaskEntries(std::list<TaskRunInfo>& entries) const {
    entries.clear();
    const MutexLock lock(m_mutex);
    for (const auto& [id, task] : m_task_entries) entries.push_back(task);
}

void TaskEntryHandler::ListTaskEntriesByUSB(uint64_t usb_id,
                                            std::list<TaskRunInfo>& entries) const {
    entries.clear();
    const MutexLock lock(m_mutex);
    for (const auto& [id, task] : m_task_entries) {
        if (task.usb_id == usb_id) entries.push_back(task);
    }
}

std::string TaskEntryHandler::ToString() const {
    const MutexLock lock(m_mutex);
    std::string out;
    for (const auto& [id, usb] : m_usb_entries) out += EntryText(usb);
    out += "\n";
    for (const auto& [id, task] : m_task_entries) out += EntryText(task);
    return out;
}
