#include "worker-fixture.h"

#include <algorithm>

#include "event/event-manager.h"
#include "filter/file-filter.h"
#include "platform/error-handler.h"
#include "platform/keld-sdk-wrapper.h"
#include "platform/package-paths.h"
#include "processor/processor.h"
#include "processor/task-event-manager.h"
#include "strategy/copy-handler.h"
#include "strategy/create-handler.h"
#include "strategy/remove-handler.h"
#include "strategy/scan-handler.h"

namespace {

// Calls the script from within a file handler.
template <typename Handler>
class Scripted : public Handler {
public:
    explicit Scripted(const ScriptedStrategy& strategy) : m_strategy(strategy) {}

protected:
    int Call(const char* kind) {
        return m_strategy.file_script(
            {kind, this->Context(), this->ProcessorId(), this->AbortFlag()});
    }

private:
    const ScriptedStrategy& m_strategy;
};

class ScriptedScan : public Scripted<ScanHandler> {
public:
    using Scripted::Scripted;

protected:
    int GetSrcList(FileList&) override { return Call("scan"); }
    void IssueRemove(const FileListEntry&) override {}
    void IssueModify(const FileListEntry&, const FileListEntry&) override {}
};

class ScriptedRemove : public Scripted<RemoveHandler> {
public:
    using Scripted::Scripted;

protected:
    int Remove() override { return Call("remove"); }
};

class ScriptedCreate : public Scripted<CreateHandler> {
public:
    using Scripted::Scripted;

protected:
    int RunCreate() override { return Call("create"); }
};

class ScriptedCopy : public Scripted<CopyHandler> {
public:
    using Scripted::Scripted;

protected:
    int SetCopyToFullPath() override { return Call("copy"); }
};

template <typename Handler>
std::unique_ptr<Handler> Make(const ScriptedStrategy& strategy) {
    return strategy.has_handlers ? std::make_unique<Handler>(strategy) : nullptr;
}

}  // namespace

std::unique_ptr<TaskHandler> ScriptedStrategy::GetTaskHandler() const {
    return Make<ScriptedTaskHandler>(*this);
}
std::unique_ptr<ScanHandler> ScriptedStrategy::GetScanHandler() const {
    return Make<ScriptedScan>(*this);
}
std::unique_ptr<RemoveHandler> ScriptedStrategy::GetRemoveHandler() const {
    return Make<ScriptedRemove>(*this);
}
std::unique_ptr<CreateHandler> ScriptedStrategy::GetCreateHandler() const {
    return Make<ScriptedCreate>(*this);
}
std::unique_ptr<CopyHandler> ScriptedStrategy::GetCopyHandler() const {
    return Make<ScriptedCopy>(*this);
}

WorkerFixture::WorkerFixture() : m_fake(FakeKeld::Reset()) {
    Processor::SetWaitStepForTest(0);
    m_usb = m_dir.MakeDir("usb");
    m_share = m_dir.MakeDir("volume1/photos");
    m_dir.MakeDir("package/etc");
    SetPackageFolderForTest(m_dir / "package");
    m_fake.AddShare({.name = "photos", .path = m_share});
    m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1"});
    m_fake.SetHostname("box");
    EXPECT_EQ(0, TaskDB::GetInstance().Init(m_dir / "task-db.sqlite"));
    EXPECT_EQ(0, LogDB::GetInstance().Init(m_dir / "log-db.sqlite"));

    USBRunInfo usb;
    usb.usb_id = USB_ID;
    usb.usb_share_path = m_usb;
    usb.eject_when_task_done = false;
    TaskEntryHandler::GetInstance().AddUSBEntry(usb);
}

WorkerFixture::~WorkerFixture() {
    for (const uint64_t task_id : m_tasks) {
        EventManager::GetInstance().RemoveTask(task_id);
        TaskEventManager::GetInstance().RemoveEvent(task_id);
        TaskEntryHandler::GetInstance().RemoveTaskEntry(task_id);
        Ferrix::ErrorHandler::GetInstance().Clear(task_id);
    }
    TaskEntryHandler::GetInstance().RemoveUSBEntry(USB_ID);
    TaskDB::GetInstance().Close();
    LogDB::GetInstance().Close();
    SetPackageFolderForTest("");
    Processor::SetWaitStepForTest(100000);
}

uint64_t WorkerFixture::AddTask(const std::string& name, int task_type, int copy_strategy) {
    TaskInfo info;
    info.usb_id = USB_ID;
    info.task_name = name;
    info.task_type = task_type;
    info.copy_strategy = copy_strategy;
    info.hub_share_name = "photos";
    info.usb_folder_path = "/" + name;
    info.hub_folder_path = "/" + name;
    uint64_t task_id = 0;
    EXPECT_EQ(0, TaskDB::GetInstance().AddTaskInfo(info, task_id));

    TaskRunInfo entry;
    entry.task_id = task_id;
    entry.usb_id = USB_ID;
    entry.task_name = name;
    entry.copy_strategy = copy_strategy;
    entry.hub_share_name = "photos";
    entry.src_dir_path = m_usb + "/" + name;
    entry.dst_dir_path = m_share + "/" + name;
    entry.device_mount_path = m_usb;
    EXPECT_EQ(0, SDK::GetDeviceIdentity(m_usb, entry.device_identity));
    entry.strategy_handler = m_strategy;
    entry.task_filter = std::make_shared<FileFilter>();
    entry.system_filter = std::make_shared<FileFilter>();
    TaskEntryHandler::GetInstance().AddTaskEntry(entry);
    m_tasks.push_back(task_id);
    return task_id;
}

TaskRunInfo WorkerFixture::Entry(uint64_t task_id) {
    TaskRunInfo entry;
    EXPECT_EQ(0, TaskEntryHandler::GetInstance().GetTaskEntry(task_id, entry));
    return entry;
}

TaskInfo WorkerFixture::Row(uint64_t task_id) {
    TaskInfo info;
    EXPECT_EQ(1, TaskDB::GetInstance().GetTaskInfo(task_id, info));
    return info;
}

std::vector<std::string> WorkerFixture::LogRows() {
    LogFilter filter;
    filter.description_ids = {
        LogDescription::LOG_DESC_TASK_STARTED, LogDescription::LOG_DESC_TASK_DONE,
        LogDescription::LOG_DESC_TASK_STOPPED, LogDescription::LOG_DESC_TASK_FAILED,
        LogDescription::LOG_DESC_FILE_FAILED};
    std::vector<LogInfo> rows;
    EXPECT_EQ(0, LogDB::GetInstance().ListLogInfo(filter, rows));
    std::vector<std::string> texts;
    for (const LogInfo& row : rows) {
        texts.push_back(std::to_string(row.description_id) + " " + std::to_string(row.error) + " " +
                        row.description_param);
    }
    std::reverse(texts.begin(), texts.end());
    return texts;
}
