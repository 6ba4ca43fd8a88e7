// Tasks are started and cancelled, by a command or by the copy button.
#include <list>

#include "daemon/app.h"
#include "ipc/pobject.h"
#include "processor/hardware-controller.h"
#include "processor/task-entry-handler.h"
#include "utils/log.h"

namespace {

// A task that is queued or runs already is runnable too: the queue deals with the repeated request.
bool IsRunnable(uint64_t task_id) {
    uint64_t usb_id = 0;
    std::string share_name;
    std::string path;
    return IsTaskRunnable(IsTaskUSBMounted(task_id, usb_id, share_name, path), task_id);
}

}  // namespace

int Ferrixd::RunTask(const PObject& request, PObject& response) {
    uint64_t task_id = 0;
    if (!ReadTaskId(request, task_id, response)) return -1;
    if (!IsRunnable(task_id)) {
        SLOG_ERR("Task '%llu' is not runnable\n", Llu(task_id));
        SetResponseError(RESPONSE_OTHER, "Task is not runnable", response);
        return -1;
    }
    EnqueueTask(task_id);
    SLOG_INFO("Run Task '%llu'\n", Llu(task_id));
    return 0;
}

int Ferrixd::CancelTask(const PObject& request, PObject& response) {
    uint64_t task_id = 0;
    if (!ReadTaskId(request, task_id, response)) return -1;
    TaskRunInfo entry;
    if (TaskEntryHandler::GetInstance().GetTaskEntry(task_id, entry) < 0) {
        SLOG_ERR("Task '%llu' does not match\n", Llu(task_id));
        SetResponseError(RESPONSE_TASK_NOT_LOADED, "Task does not match", response);
        return -1;
    }
    PauseProcessors();
    DropTaskWork(task_id);
    HardwareController::GetInstance().NotifyHWController();
    ResumeProcessors();
    SLOG_INFO("Cancel Task '%llu'\n", Llu(task_id));
    return 0;
}

int Ferrixd::HandleFerrix(const PObject& /*request*/) {
    SLOG_INFO("HandleFerrix: ferrix button press\n");
    std::list<TaskRunInfo> tasks;
    TaskEntryHandler::GetInstance().ListTaskEntries(tasks);
    for (const TaskRunInfo& task : tasks) {
        PObject request;
        PObject response;
        request["task_id"] = task.task_id;
        RunTask(request, response);
    }
    return 0;
}
