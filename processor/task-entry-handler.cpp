#include "processor/task-entry-handler.h"

#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

// One line of a dump: the label behind a tab, the value, and what ends the line.
void AddField(std::string& out, const char* label, const std::string& value,
              const char* end = ",\n") {
    out.append("\t").append(label).append(": ").append(value).append(end);
}

template <typename Number>
void AddField(std::string& out, const char* label, Number value, const char* end = ",\n") {
    AddField(out, label, std::to_string(value), end);
}

std::string EntryText(const USBRunInfo& entry) {
    std::string out = "{\n";
    AddField(out, "usb_id", entry.usb_id);
    AddField(out, "usb_share_path", entry.usb_share_path);
    AddField(out, "uuid", entry.uuid);
    AddField(out, "run_when_plug_in", entry.run_when_plug_in);
    AddField(out, "eject_when_task_done", entry.eject_when_task_done, "\n");
    return out + "}\n";
}

std::string EntryText(const TaskRunInfo& entry) {
    std::string out = "{\n";
    AddField(out, "task_id", entry.task_id);
    AddField(out, "usb_id", entry.usb_id);
    AddField(out, "task_name", entry.task_name);
    AddField(out, "status", entry.status);
    AddField(out, "copy_strategy", entry.copy_strategy);
    AddField(out, "hub_share_name", entry.hub_share_name);
    AddField(out, "dst_dir_path", entry.dst_dir_path);
    AddField(out, "src_dir_path", entry.src_dir_path, ",\n\n");
    AddField(out, "keep_dir_structure", entry.keep_dir_structure);
    AddField(out, "smart_create_date_dir", entry.smart_create_date_dir);
    AddField(out, "rename_photo_video", entry.rename_photo_video);
    AddField(out, "remove_src_file", entry.remove_src_file);
    AddField(out, "conflict_policy", entry.conflict_policy);
    AddField(out, "version_dir", entry.version_dir);
    AddField(out, "enable_rotation", entry.enable_rotation);
    AddField(out, "max_version_count", entry.max_version_count);
    AddField(out, "rotation_policy", entry.rotation_policy, "");
    return out + "\n}\n";
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
    const MutexLock lock(m_mutex);
    removed = m_task_entries.extract(task_id);
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
    if (!ChangeTask(task_id, [state](TaskRunInfo& task) { task.status = state; })) return -1;
    SLOG_DBG("Set task '%llu' state (%d)\n", Llu(task_id), state);
    return 0;
}

int TaskEntryHandler::SetTaskVersionDir(uint64_t task_id, const std::string& version_dir) {
    if (!ChangeTask(task_id, [&](TaskRunInfo& task) { task.version_dir = version_dir; })) return -1;
    SLOG_DBG("Set task '%llu' version dir (%s)\n", Llu(task_id), version_dir.c_str());
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
