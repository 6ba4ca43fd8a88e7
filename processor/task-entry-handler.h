// The registry of what is plugged in and can run now: an entry for each mounted device and for each
// task of such a device. The database holds what is configured; this holds the run state, the
// resolved paths and the live objects.
//
// Threads: any. Every operation holds the one mutex for its whole length and calls nobody with it;
// records are handed out as full copies, whose objects live on when the entry goes. A missing entry
// is a normal result: it tells a worker that the task was removed behind its back.
#pragma once

#include <pthread.h>

#include <cstdint>
#include <list>
#include <map>
#include <string>

#include "processor/task-mounts.h"
#include "processor/usb-run-info.h"
#include "strategy/task-run-info.h"

class TaskEntryHandler {
public:
    static TaskEntryHandler& GetInstance();

    TaskEntryHandler() = default;
    ~TaskEntryHandler();
    TaskEntryHandler(const TaskEntryHandler&) = delete;
    TaskEntryHandler& operator=(const TaskEntryHandler&) = delete;

    // 0, or -1 when there is no such entry and the out is unchanged.
    [[nodiscard]] int GetUSBEntry(uint64_t usb_id, USBRunInfo& entry) const;
    [[nodiscard]] int GetTaskEntry(uint64_t task_id, TaskRunInfo& entry) const;
    // The first device, in id order, that is mounted on exactly this path. 0 or -1 as above.
    [[nodiscard]] int GetUSBEntryByPath(const std::string& usb_share_path, USBRunInfo& entry) const;

    [[nodiscard]] bool IsUSBEntryEmpty() const;
    [[nodiscard]] bool IsTaskEntryEmpty() const;

    // Insert, or replace the entry of the same id.
    void AddUSBEntry(const USBRunInfo& entry);
    void AddTaskEntry(const TaskRunInfo& entry);
    // Silent when there is no such entry. The tasks of a removed device stay.
    void RemoveUSBEntry(uint64_t usb_id);
    void RemoveTaskEntry(uint64_t task_id);

    // Change an entry in place. 0, or -1 with a warning when there is no such entry.
    int SetTaskState(uint64_t task_id, int state);
    int SetTaskVersionDir(uint64_t task_id, const std::string& version_dir);
    // Replaces the entry of the same id, but for what belongs to a run: its state and the version
    // folder. A worker may have set them since the caller read the entry.
    int SetTaskSettings(const TaskRunInfo& entry);

    // A run goes by what the task's settings were when it began, on both workers: half of a mirror
    // in one folder and half in another would be none. StartRun() begins one, or begins it anew,
    // and gives the entry; GetRunEntry() gives that entry again with the present state, or the
    // task's own when no run has begun. It ends when the task becomes idle or is removed. 0 or -1
    // as above.
    [[nodiscard]] int StartRun(uint64_t task_id, TaskRunInfo& entry);
    [[nodiscard]] int GetRunEntry(uint64_t task_id, TaskRunInfo& entry) const;

    // Empty the list first, then fill it in id order.
    void ListUSBEntries(std::list<USBRunInfo>& entries) const;
    void ListTaskEntries(std::list<TaskRunInfo>& entries) const;
    void ListTaskEntriesByUSB(uint64_t usb_id, std::list<TaskRunInfo>& entries) const;

    // A dump for the log: all devices, an empty line, all tasks.
    [[nodiscard]] std::string ToString() const;

private:
    // Applies `change` to the entry under the mutex; false, with a warning, when there is none.
    template <typename Change>
    bool ChangeTask(uint64_t task_id, const Change& change);

    mutable pthread_mutex_t m_mutex = PTHREAD_MUTEX_INITIALIZER;
    std::map<uint64_t, USBRunInfo> m_usb_entries;
    std::map<uint64_t, TaskRunInfo> m_task_entries;
    std::map<uint64_t, TaskRunInfo> m_run_entries;  // of tasks whose settings a run goes by
};
