// When a task runs, and what becomes of its device afterwards.
#include "daemon/app.h"
#include "daemon/request-text.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/request-setting.h"
#include "platform/schedule.h"
#include "processor/task-entry-handler.h"
#include "utils/log.h"

namespace {

constexpr int64_t NO_SCHEDULE = -1;

}  // namespace

int Ferrixd::SetTriggerTimeSetting(const PObject& request, PObject& response) {
    uint64_t task_id = 0;
    if (!ReadTaskId(request, task_id, response)) return -1;
    TaskInfo task_info;
    if (!FindTask(task_id, task_info, response)) return -1;
    if (SetUSB(request, task_info.usb_id, response) < 0) {
        SLOG_ERR("Failed to set usb info for task '%llu'\n", Llu(task_id));
        return -1;
    }
    const std::string schedule = RequestText(request, "schedule_json_str");
    if (task_info.schedule_id != NO_SCHEDULE &&
        !UpdateSchedule(task_info.schedule_id, request["schedule_enabled"].AsBool(), schedule)) {
        SLOG_ERR("Failed to update schedule [%s]\n", schedule.c_str());
        SetResponseError(RESPONSE_OTHER, "Failed to UpdateScheduleContent", response);
        return -1;
    }
    if (!LogTask(task_info, LogDescription::LOG_DESC_TASK_SETTING_CHANGED, response)) return -1;
    response["schedule_id"] = task_info.schedule_id;
    SLOG_INFO("Set Task '%llu' Trigger Time\n", Llu(task_id));
    return 0;
}

int Ferrixd::SetUSB(const PObject& request, uint64_t usb_id, PObject& response) {
    USBInfo usb_info;
    if (!FindUSB(usb_id, usb_info, response)) {
        SLOG_ERR("Failed to get usb info for usb id '%llu'\n", Llu(usb_id));
        return -1;
    }
    bool runs = false;
    bool ejects = false;
    const bool is_run_changed =
        GetChangedBool(request, "run_when_plug_in", usb_info.run_when_plug_in, runs);
    const bool is_eject_changed =
        GetChangedBool(request, "eject_when_task_done", usb_info.eject_when_task_done, ejects);
    if (!is_run_changed && !is_eject_changed) return 0;
    if (is_run_changed) usb_info.run_when_plug_in = runs;
    if (is_eject_changed) usb_info.eject_when_task_done = ejects;
    if (TaskDB::GetInstance().UpdateUSBInfo(usb_info) < 0) {
        SLOG_ERR("Failed to update usb info for '%llu\n", Llu(usb_id));
        SetResponseError(RESPONSE_DATABASE, "Failed to update usb info", response);
        return -1;
    }
    USBRunInfo entry;
    if (TaskEntryHandler::GetInstance().GetUSBEntry(usb_id, entry) < 0) {
        SLOG_INFO("USB '%llu' dose not mount\n", Llu(usb_id));
        return 0;
    }
    // A flag that was not sent is cleared here while the row keeps it: clients send both, and the
    // row is what the next load goes by.
    entry.run_when_plug_in = runs;
    entry.eject_when_task_done = ejects;
    TaskEntryHandler::GetInstance().AddUSBEntry(entry);
    return 0;
}
