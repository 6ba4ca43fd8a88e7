#include "strategy-fixture.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <algorithm>
#include <filesystem>

#include "db/task-info.h"
#include "event/event-manager.h"
#include "filter/file-filter.h"
#include "platform/error-handler.h"
#include "platform/global-setting.h"
#include "platform/keld-sdk-wrapper.h"
#include "platform/package-paths.h"
#include "strategy/copy-handler.h"
#include "strategy/copy-strategy-handler.h"
#include "strategy/create-handler.h"
#include "strategy/remove-handler.h"
#include "strategy/scan-handler.h"
#include "utils/confined-path.h"
#include "utils/error-code.h"

namespace fs = std::filesystem;

namespace {

constexpr uint32_t SCAN_FLAGS = EVENT_FLAG_DIR | EVENT_FLAG_SCAN;
constexpr int RETRIES = 3;

std::string ReadText(const fs::path& path) { return ReadWholeFile(path.string()); }

}  // namespace

StrategyFixture::StrategyFixture() : m_fake(FakeKeld::Reset()) {
    m_usb = m_dir.MakeDir("usb");
    m_share = m_dir.MakeDir("volume1/photos");
    m_dir.MakeDir("usb/data");
    m_dir.MakeDir("volume1/photos/copy");
    m_dir.MakeDir("volume1/@Ferrix/task/" + std::to_string(TASK_ID));
    m_dir.MakeDir("package/etc");
    SetPackageFolderForTest(m_dir / "package");
    EXPECT_TRUE(SetRepoVolPath(m_dir / "volume1"));
    m_fake.AddShare({.name = "photos", .path = m_share});
    m_fake.AddDevice({.mount_path = m_usb, .dev_path = "/dev/sdb1"});

    m_task.task_id = TASK_ID;
    m_task.usb_id = USB_ID;
    m_task.task_name = "holiday";
    m_task.status = TASK_RUN_STATE_RUNNING;
    m_task.copy_strategy = COPY_STRATEGY_MIRROR;
    m_task.hub_share_name = "photos";
    m_task.src_dir_path = m_usb + "/data";
    m_task.dst_dir_path = m_share + "/copy";
    m_task.strategy_handler = CreateCopyStrategyHandler(COPY_STRATEGY_MIRROR);
    m_task.system_filter = std::make_shared<FileFilter>();
    m_task.task_filter = std::make_shared<FileFilter>();
    m_task.device_mount_path = m_usb;
    EXPECT_EQ(0, SDK::GetDeviceIdentity(m_usb, m_task.device_identity));
    m_task.src_root = std::make_shared<ConfinedRoot>(m_usb);
    m_task.dst_root = std::make_shared<ConfinedRoot>(m_share);

    USBRunInfo usb;
    usb.usb_id = USB_ID;
    usb.usb_share_path = m_usb;
    TaskEntryHandler::GetInstance().AddUSBEntry(usb);
    TaskEntryHandler::GetInstance().AddTaskEntry(m_task);
    Ferrix::ErrorHandler::GetInstance().Clear(TASK_ID);
    m_log.Clear();
    m_fake.ForgetCalls();
}

StrategyFixture::~StrategyFixture() {
    EventManager::GetInstance().RemoveTask(TASK_ID);
    TaskEntryHandler::GetInstance().RemoveTaskEntry(TASK_ID);
    TaskEntryHandler::GetInstance().RemoveUSBEntry(USB_ID);
    SetPackageFolderForTest("");
}

std::string StrategyFixture::Src(const std::string& path) const {
    return m_task.src_dir_path + path;
}

std::string StrategyFixture::Dst(const std::string& path) const {
    return m_task.dst_dir_path + path;
}

void StrategyFixture::WriteSrc(const std::string& path, const std::string& content,
                               time_t mtime) const {
    SetMtime(m_dir.Write(Src(path).substr(m_dir.Path().size() + 1), content), mtime);
}

void StrategyFixture::WriteDst(const std::string& path, const std::string& content,
                               time_t mtime) const {
    SetMtime(m_dir.Write(Dst(path).substr(m_dir.Path().size() + 1), content), mtime);
}

void StrategyFixture::MakeSrcDir(const std::string& path) const {
    fs::create_directories(Src(path));
}

void StrategyFixture::MakeDstDir(const std::string& path) const {
    fs::create_directories(Dst(path));
}

void StrategyFixture::MakeExport() {
    std::swap(m_task.src_dir_path, m_task.dst_dir_path);
    std::swap(m_task.src_root, m_task.dst_root);
    m_task.is_export = true;
    TaskEntryHandler::GetInstance().AddTaskEntry(m_task);
}

void StrategyFixture::SetTaskFilterNames(const std::vector<std::string>& black_names) {
    const std::string file = m_dir / "blacklist.filter";
    ASSERT_EQ(0, FileFilter::WriteBlackList(file, black_names, {}));
    ASSERT_EQ(0, m_task.task_filter->LoadBlackList(file));
}

void StrategyFixture::PrepareContext(EventType type, const std::string& path, uint32_t flags) {
    m_context.event = Event();
    m_context.event.type = type;
    m_context.event.task_id = TASK_ID;
    m_context.event.path = path;
    m_context.event.flags = flags;
    m_context.SetTask(m_task);
}

void StrategyFixture::GiveContext(FileEventHandler& handler) {
    handler.SetContext(&m_context);
    handler.SetProcessor(&m_processor);
    handler.SetAbortFlag(&m_abort);
}

int StrategyFixture::HandleCopy(const std::string& path) {
    return Handle(*m_task.strategy_handler->GetCopyHandler(), EV_COPY, path);
}

int StrategyFixture::HandleCreate(const std::string& path) {
    return Handle(*m_task.strategy_handler->GetCreateHandler(), EV_CREATE, path, EVENT_FLAG_DIR);
}

int StrategyFixture::HandleRemove(const std::string& path, bool is_dir) {
    return Handle(*m_task.strategy_handler->GetRemoveHandler(), EV_REMOVE, path,
                  is_dir ? uint32_t{EVENT_FLAG_DIR} : 0);
}

int StrategyFixture::HandleScan(const std::string& path) {
    return Handle(*m_task.strategy_handler->GetScanHandler(), EV_CREATE, path, SCAN_FLAGS);
}

std::vector<std::string> StrategyFixture::TakeIssued() {
    // "[DBG] Event Genetator: PushCopyFileEvent at [7], ev=[Event<EV_COPY> (WAITTING): [7] /a
    // (file_op,file)]"
    std::vector<std::string> issued;
    for (const std::string& line : m_log.Lines()) {
        if (line.find("Event Genetator: ") == std::string::npos) continue;
        const size_t start = line.find("[7] ") + 4;
        const size_t end = line.rfind(" (");
        const std::string path = line.substr(start, end - start);
        const bool is_dir = line.find(",dir)", end) != std::string::npos;
        if (line.find(": PushScanEvent") != std::string::npos) {
            issued.push_back("scan " + path);
        } else if (line.find(": PushCreateDirEvent") != std::string::npos) {
            issued.push_back("create " + path);
        } else if (line.find(": PushCopyFileEvent") != std::string::npos) {
            issued.push_back("copy " + path);
        } else {
            issued.push_back("remove " + path + (is_dir ? "/" : ""));
        }
    }
    EventManager::GetInstance().RemoveTask(TASK_ID);
    m_log.Clear();
    return issued;
}

int StrategyFixture::Dispatch(const Event& event) {
    if (event.IsScan()) return HandleScan(event.path);
    if (event.type == EV_REMOVE) return HandleRemove(event.path, event.IsDir());
    if (event.type == EV_CREATE) return HandleCreate(event.path);
    return HandleCopy(event.path);
}

std::vector<std::string> StrategyFixture::DrainEvents() {
    std::vector<std::string> failures;
    EventManager& events = EventManager::GetInstance();
    Event event;
    while (events.GetEventCount(TASK_ID) > 0) {
        if (events.PullEvent(&m_processor, event) != 1) {
            ADD_FAILURE() << "events are left, and none can run";
            break;
        }
        int code = Dispatch(event);
        for (int n = 0; n < RETRIES && ErrorActionOf(code) == ERROR_ACTION_RETRY; ++n) {
            code = Dispatch(event);
        }
        Ferrix::ErrorHandler::GetInstance().Set(TASK_ID, code);
        if (code != ERR_SUCCESS) failures.push_back(event.path + ": " + std::to_string(code));
        if (ErrorActionOf(code) == ERROR_ACTION_REDO) break;  // an aborted run
        EXPECT_EQ(0, events.DoneEvent(&m_processor));
    }
    return failures;
}

std::vector<std::string> TreeOf(const std::string& root) {
    std::vector<std::string> tree;
    for (auto it = fs::recursive_directory_iterator(root); it != fs::end(it); ++it) {
        const std::string path = it->path().string().substr(root.size());
        if (it->path().filename() == "#recycle") {
            it.disable_recursion_pending();
        } else if (it->is_directory() && !it->is_symlink()) {
            tree.push_back(path + "/");
        } else {
            tree.push_back(path + "=" + ReadText(it->path()) + "@" +
                           std::to_string(MtimeOf(it->path().string())));
        }
    }
    std::sort(tree.begin(), tree.end());
    return tree;
}

std::vector<std::string> NamesOf(const std::string& root) {
    std::vector<std::string> names = TreeOf(root);
    for (std::string& name : names) name.resize(std::min(name.size(), name.rfind('@')));
    return names;
}

void SetMtime(const std::string& path, time_t mtime) {
    const timespec times[2] = {
        {mtime, 0},
        {mtime, 0}
    };
    ASSERT_EQ(0, utimensat(AT_FDCWD, path.c_str(), times, AT_SYMLINK_NOFOLLOW)) << path;
}

time_t MtimeOf(const std::string& path) {
    struct stat info {};
    EXPECT_EQ(0, lstat(path.c_str(), &info)) << path;
    return info.st_mtime;
}

bool IsThere(const std::string& path) {
    struct stat info {};
    return lstat(path.c_str(), &info) == 0;
}
