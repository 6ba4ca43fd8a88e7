// The durable store of devices and tasks: one sqlite3 file, one connection, one object in the
// process. It holds configuration and the outcome of each task's last run, and no run state.
//
// Devices and tasks live as pairs: removing a device removes its tasks, removing a device's last
// task removes the device (triggers in the file).
//
// Threads: every operation may be called from any thread; one mutex is held for a whole operation,
// so a list is one snapshot. Reading a row, changing it and writing it back is not one operation.
// Results: writes and lists give 0 or -1; reads of one row give 1 (found, the record is filled), 0
// (no such row, the record is untouched) or -1. Failures are logged. While closed, all give -1.
// A file locked by another process is waited for, up to five minutes.
#pragma once

#include <cstdint>
#include <list>
#include <string>

#include "db/db-mutex.h"
#include "db/task-info.h"

struct sqlite3;

class TaskDB {
public:
    // The object of the daemon, made on first use. It is never destroyed, so that a thread that
    // still runs while the process exits finds it whole.
    static TaskDB& GetInstance();

    // For tests and for programs with a file of their own; everyone else asks GetInstance().
    TaskDB();
    ~TaskDB();
    TaskDB(const TaskDB&) = delete;
    TaskDB& operator=(const TaskDB&) = delete;

    // Opens the file, made with mode 0600 if it is missing, and brings its schema up to date.
    // Open already: 0, and the first file stays. After a failure the object is closed as before.
    [[nodiscard]] int Init(const std::string& path);
    // May be called at any time; Init() may follow.
    void Close();

    // The new row's id goes into `id`; the record's own id is not looked at. A uuid is stored once.
    [[nodiscard]] int AddUSBInfo(const USBInfo& info, uint64_t& id);
    // Writes all columns of the row with the record's id; no such row is no failure.
    [[nodiscard]] int UpdateUSBInfo(const USBInfo& info);
    [[nodiscard]] int GetUSBInfoByID(uint64_t id, USBInfo& info);
    [[nodiscard]] int GetUSBInfoByUUID(const std::string& uuid, USBInfo& info);
    [[nodiscard]] int RemoveUSBInfo(uint64_t id);
    // Lists replace the content of `list`. When the query cannot be prepared the list stays as it
    // was; when reading fails halfway it holds the rows read so far.
    [[nodiscard]] int ListUSBInfo(std::list<USBInfo>& list);

    [[nodiscard]] int AddTaskInfo(const TaskInfo& info, uint64_t& id);
    [[nodiscard]] int UpdateTaskInfo(const TaskInfo& info);
    [[nodiscard]] int SetTaskEnable(uint64_t id, bool is_enable);
    [[nodiscard]] int UpdateHUBShareName(const std::string& old_name, const std::string& new_name);
    [[nodiscard]] int GetTaskInfo(uint64_t id, TaskInfo& info);
    [[nodiscard]] int RemoveTaskInfo(uint64_t id);
    [[nodiscard]] int ListTaskInfoByShare(const std::string& share_name, std::list<TaskInfo>& list);
    [[nodiscard]] int ListTaskInfoByUSB(uint64_t usb_id, std::list<TaskInfo>& list);
    [[nodiscard]] int ListAllTaskInfo(std::list<TaskInfo>& list);
    // Stores the outcome of a run. A time of 0 leaves the time of the last good run in place.
    [[nodiscard]] int SetTaskResult(uint64_t id, int error, uint32_t time);

private:
    DbMutex m_mutex;
    sqlite3* m_db = nullptr;  // guarded by m_mutex; null while closed
};
