// The application object: it runs every action and hook, one at a time, on a thread of its own, and
// owns the two processors of the queues.
//
// Threads: ProcessMessage, StartAppThread and StopAppThread belong to the thread of the socket
// loop. Handlers and the control operations run on the application thread, with no lock held.
// Ownership: a posted message is borrowed until its barrier is reached; the processors are owned
// from "link" to "stop". When "stop" never ran, the threads that "link" started may still be at
// work: the destructor then leaves everything they use alone. Results: handlers give 0 or -1, which
// nobody looks at; a command reports a failure through SetResponseError, a hook through the log.
#pragma once

#include <pthread.h>

#include <cstddef>
#include <cstdint>
#include <deque>
#include <list>
#include <map>
#include <memory>
#include <string>

#include "db/log-description.h"

class Barrier;
class FileProcessor;
class PObject;
class Processor;
struct TaskInfo;
struct USBInfo;

// The vocabulary of SetResponseError, known to clients; 7 is not used.
enum ResponseCode : int {
    RESPONSE_BAD_REQUEST = 1,
    RESPONSE_DATABASE = 2,
    RESPONSE_DEVICE_KNOWN = 3,
    RESPONSE_TASK_KNOWN = 4,
    RESPONSE_NO_SUCH_DEVICE = 5,
    RESPONSE_NO_SUCH_TASK = 6,
    RESPONSE_TASK_NOT_LOADED = 8,
    RESPONSE_DESTINATION_IN_USE = 9,
    RESPONSE_DESTINATION_MISSING = 10,
    RESPONSE_OTHER = 11,
};

// One message on its way to the application thread; the poster owns all three.
struct MessageItem {
    const PObject* request = nullptr;
    PObject* response = nullptr;
    Barrier* barrier = nullptr;  // null when nobody waits
};

class Ferrixd {
public:
    Ferrixd();
    Ferrixd(const Ferrixd&) = delete;
    Ferrixd& operator=(const Ferrixd&) = delete;
    ~Ferrixd();

    // Returns 0, or -1 when no thread could be made.
    int StartAppThread();
    // Has "stop" run, unless a client's "stop" already did, and joins the thread.
    void StopAppThread();
    // Hands a message to the application thread and waits until it is done. Returns 0.
    int ProcessMessage(const PObject& request, PObject& response);

    // Clears the response and makes it an error: "error_code" and "error".
    static void SetResponseError(int code, const std::string& text, PObject& response);

private:
    friend class FerrixdPeer;  // the unit tests' way in

    using ActionHandler = int (Ferrixd::*)(const PObject& request, PObject& response);
    using HookHandler = int (Ferrixd::*)(const PObject& request);

    // --- Messages: app-message.cpp
    static void* RunThread(void* self);
    int AppLoop();
    void HandleMessage(const PObject& request, PObject& response);
    void PushMessage(const MessageItem& item);
    MessageItem PopMessage();

    // --- "link" and "stop": app-link.cpp
    int DoLink(const PObject& request, PObject& response);
    int DoUnlink(const PObject& request, PObject& response);
    int InitEnvironment();
    int InitProcessors();
    void DropAllEntries();
    void StopProcessors();

    // --- The workers: app-processors.cpp
    void StartAll();
    void PauseAll();
    void ResumeAll();
    void PauseProcessors();
    void ResumeProcessors();
    // Returns when no worker is inside this task's work any more. The processors must be paused.
    void AbortTask(uint64_t task_id);
    // Aborts the task and forgets what is queued of it. The processors must be paused.
    void DropTaskWork(uint64_t task_id);

    // --- What many commands need: app-request.cpp. False with the error set.
    static bool ReadTaskId(const PObject& request, uint64_t& task_id, PObject& response);
    static bool FindTask(uint64_t task_id, TaskInfo& task_info, PObject& response);
    static bool FindUSB(uint64_t usb_id, USBInfo& usb_info, PObject& response);
    // Adds a log row of a description that takes the task's name alone.
    static bool LogTask(const TaskInfo& task_info, LogDescription::ID id, PObject& response);

    // --- Tasks: app-task.cpp
    int AddTask(const PObject& request, PObject& response);
    int RemoveTask(const PObject& request, PObject& response);
    int ListTask(const PObject& request, PObject& response);
    int ListEntry(const PObject& request, PObject& response);
    int GetTaskProgress(const PObject& request, PObject& response);
    // `file_processor` may be null. Returns 0, or -1 with the error set when the device has no row.
    int GetTaskResponse(const TaskInfo& task_info, FileProcessor* file_processor,
                        PObject& response);
    // True when an import may use this folder; else false with the error set.
    bool CheckImportDestPath(int task_type, const std::string& share_name,
                             const std::string& folder_path, uint64_t own_task_id,
                             PObject& response);
    bool CheckImportDestPath(const PObject& request, uint64_t own_task_id, PObject& response);
    // True when no other enabled import has this folder, one above it or one below it.
    bool IsImportPathFree(const std::string& share_name, const std::string& folder_path,
                          uint64_t own_task_id, PObject& response);
    int InitTaskEnv(uint64_t task_id);
    int RemoveUSBInfo(uint64_t usb_id, PObject& response);
    // The stages of AddTask. 0, or -1 with the error set; what was done before stays.
    int AddTaskRows(const PObject& request, TaskInfo& task_info, PObject& response);
    int SetUpTask(const PObject& request, const TaskInfo& task_info, PObject& response);
    int ScheduleTask(const PObject& request, TaskInfo& task_info, PObject& response);
    // The stages of RemoveTask. The first goes on after a failure and only sets the error.
    void RemoveTaskTraces(const TaskInfo& task_info, PObject& response);
    int OfferToDefaultTask(const std::string& usb_share_path, PObject& response);
    // Null until "link".
    [[nodiscard]] FileProcessor* FirstFileProcessor() const;

    // --- Runs: app-run.cpp
    int RunTask(const PObject& request, PObject& response);
    int CancelTask(const PObject& request, PObject& response);
    int HandleFerrix(const PObject& request);

    // --- Task settings: app-setting.cpp
    int SetTaskSetting(const PObject& request, PObject& response);
    int GetTaskSetting(const PObject& request, PObject& response);
    int SetGlobalSetting(const PObject& request, PObject& response);
    // What a request changes: the row, and what depends on it while the device is there. 0, or -1
    // with the error set.
    int SetTask(const PObject& request, uint64_t task_id, PObject& response);
    int SetLiveTask(const TaskInfo& task_info, bool is_renamed, PObject& response);

    // --- Triggers: app-trigger.cpp
    int SetTriggerTimeSetting(const PObject& request, PObject& response);
    // The device's half. 0, or -1 with the error set.
    int SetUSB(const PObject& request, uint64_t usb_id, PObject& response);

    // --- Default tasks: app-default-task.cpp
    int EnableDefaultTask(const PObject& request, PObject& response);
    int DisableDefaultTask(const PObject& request, PObject& response);
    // Loads the entries of a default task if a device for it is there.
    int LoadCandidate(uint64_t usb_id, PObject& response);

    // --- Filter settings: app-filter.cpp
    int SetFilterSetting(const PObject& request, PObject& response);
    int GetFilterSetting(const PObject& request, PObject& response);
    int WriteFilterSetting(uint64_t task_id, const PObject& request);
    int ReadFilterSetting(uint64_t task_id, PObject& response);

    // --- Devices: app-mount.cpp
    int HandleVolumeMount(const PObject& request);
    int HandleVolumeUnmount(const PObject& request);
    int LoadUSBTaskEntries();
    int LoadUSBTaskEntryByUSBID(uint64_t usb_id, const std::string& usb_share_path);
    // The processors must be paused.
    void DropTaskEntry(uint64_t usb_id, uint64_t task_id);
    // Pauses the processors and drops every task entry of the device.
    void DropTaskEntries(uint64_t usb_id);
    // Before a device is loaded: drop what is left of it from another time.
    void DropStaleEntries(uint64_t usb_id);
    void DropUnusedUSBEntry(uint64_t usb_id, const std::string& usb_share_path);
    void EnqueueRunnableTasks(uint64_t usb_id);
    void EnqueueTask(uint64_t task_id);
    void RemoveUSB(uint64_t usb_id);
    void ReleaseDefaultTask(const std::string& uuid);
    int LoadDefaultTaskEntry(const std::string& usb_share_path, const std::string& uuid);

    // --- Shares: app-share.cpp
    int HandleShareRemoveEntry(const PObject& request);
    int HandleSharePathChange(const PObject& request);
    int HandleShareReloadEntry(const PObject& request);
    // Drops the entries that were loaded for another share than their rows name now, or for another
    // place of it.
    void DropMovedEntries(const std::list<TaskInfo>& tasks);

    // --- Shares that are deleted: app-share-delete.cpp
    int HandleShareDelete(const PObject& request);
    void RemoveTaskOfShare(const TaskInfo& task);
    void ClearTaskOfShare(const TaskInfo& task);

    // --- Shares that are locked and unlocked: app-share-lock.cpp
    int HandleShareUnmounted(const PObject& request);
    int HandleShareMounted(const PObject& request);

    pthread_mutex_t m_queue_mutex = PTHREAD_MUTEX_INITIALIZER;
    pthread_cond_t m_queue_cond = PTHREAD_COND_INITIALIZER;
    pthread_t m_app_thread{};
    bool m_has_app_thread = false;  // from its creation to its join
    int m_running = 1;              // application thread only
    std::deque<MessageItem> m_queue;
    // Element 0 is the task processor, element 1 the file processor; none until "link".
    std::unique_ptr<Processor*[]> m_processors;
    size_t m_processor_count = 0;
    std::map<std::string, ActionHandler, std::less<>> m_actions;
    std::map<std::string, HookHandler, std::less<>> m_hooks;
};
