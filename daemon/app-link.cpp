// "link" and "stop": how the application is set up and taken down.
#include <list>
#include <string>

#include "daemon/app.h"
#include "daemon/usb-matcher.h"
#include "db/log-db.h"
#include "db/task-db.h"
#include "ipc/pobject.h"
#include "platform/global-setting.h"
#include "processor/file-processor.h"
#include "processor/hardware-controller.h"
#include "processor/task-entry-handler.h"
#include "processor/task-processor.h"
#include "utils/log.h"

namespace {

constexpr char kVersion[] = "0037";
constexpr char kDbFolder[] = "/@Ferrix/db";
constexpr size_t kProcessorCount = 2;

}  // namespace

int Ferrixd::DoLink(const PObject& /*request*/, PObject& response) {
    if (m_processor_count != 0) {
        SLOG_DBG("daemon is linked already\n");
        return 0;
    }
    SLOG_INFO("link daemon, version: %s\n", kVersion);
    if (InitEnvironment() < 0) {
        SLOG_ERR("failed to initialize environment\n");
        SetResponseError(RESPONSE_OTHER, "failed to initialize environment", response);
        return -1;
    }
    if (InitProcessors() < 0) {
        SetResponseError(RESPONSE_OTHER, "failed to initialize processors", response);
        return -1;
    }
    StartAll();
    if (LoadUSBTaskEntries() < 0) {
        SetResponseError(RESPONSE_OTHER, "failed to load usb entries and task entries", response);
        return -1;
    }
    SLOG_INFO("Link Daemon\n");
    return 0;
}

int Ferrixd::InitEnvironment() {
    const std::string folder = GetRepoVolPath() + kDbFolder;
    const std::string task_db = folder + "/" + "task-db.sqlite";
    if (TaskDB::GetInstance().Init(task_db) < 0) {
        SLOG_ERR("Failed to init task db at '%s'\n", task_db.c_str());
        return -1;
    }
    const std::string log_db = folder + "/" + "log-db.sqlite";
    if (LogDB::GetInstance().Init(log_db) < 0) {
        SLOG_ERR("Failed to init log db at '%s'\n", log_db.c_str());
        return -1;
    }
    return 0;
}

int Ferrixd::InitProcessors() {
    m_processors = std::make_unique<Processor*[]>(kProcessorCount);
    m_processors[0] = new TaskProcessor;
    m_processors[1] = new FileProcessor;
    m_processor_count = kProcessorCount;
    SLOG_DBG("totally %zu processors\n", m_processor_count);
    return 0;
}

int Ferrixd::DoUnlink(const PObject& /*request*/, PObject& /*response*/) {
    m_running = 0;
    DropAllEntries();
    StopProcessors();
    TaskDB::GetInstance().Close();
    LogDB::GetInstance().Close();
    SLOG_INFO("Unlink Daemon\n");
    return 0;
}

void Ferrixd::DropAllEntries() {
    TaskEntryHandler& registry = TaskEntryHandler::GetInstance();
    std::list<TaskRunInfo> tasks;
    registry.ListTaskEntries(tasks);
    PauseProcessors();
    for (const TaskRunInfo& task : tasks) DropTaskWork(task.task_id);
    for (const TaskRunInfo& task : tasks) registry.RemoveTaskEntry(task.task_id);
    std::list<USBRunInfo> devices;
    registry.ListUSBEntries(devices);
    for (const USBRunInfo& device : devices) RemoveUSB(device.usb_id);
    USBMatcher::GetInstance().Clear();
}

void Ferrixd::StopProcessors() {
    HardwareController& hardware = HardwareController::GetInstance();
    for (size_t i = 0; i < m_processor_count; ++i) m_processors[i]->Stop();
    hardware.Stop();
    for (size_t i = 0; i < m_processor_count; ++i) m_processors[i]->Join();
    hardware.Join();
    for (size_t i = 0; i < m_processor_count; ++i) delete m_processors[i];
    m_processors.reset();
    m_processor_count = 0;
}
