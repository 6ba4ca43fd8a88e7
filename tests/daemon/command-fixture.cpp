#include "command-fixture.h"

#include <keld/keyfile.h>
#include <sqlite3.h>
#include <sys/stat.h>

#include <map>

#include "daemon/usb-matcher.h"
#include "db/log-db.h"
#include "db/log-info.h"
#include "db/task-db.h"
#include "event/event-manager.h"
#include "filter/file-filter.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "platform/utility.h"
#include "processor/task-entry-handler.h"
#include "processor/task-event-manager.h"

// The unit tests' way in to the application object.
class FerrixdPeer {
public:
    static int Act(Ferrixd& app, const std::string& action, const PObject& request,
                   PObject& response) {
        return (app.*app.m_actions.at(action))(request, response);
    }
    static int Notify(Ferrixd& app, const std::string& hook, const PObject& request) {
        return (app.*app.m_hooks.at(hook))(request);
    }
    static int Open(Ferrixd& app) { return app.InitEnvironment() < 0 ? -1 : app.InitProcessors(); }
    static void Start(Ferrixd& app) { app.StartAll(); }
    static int LoadDefault(Ferrixd& app, const std::string& path, const std::string& uuid) {
        return app.LoadDefaultTaskEntry(path, uuid);
    }
    static int Load(Ferrixd& app) { return app.LoadUSBTaskEntries(); }
    static void Forget(Ferrixd& app) { app.DropAllEntries(); }
    static void Close(Ferrixd& app) { app.StopProcessors(); }
};

namespace {

constexpr char SYSTEM_FILTER[] = "[Version]\nmajor = 1\nminor = 0\n";

}  // namespace

CommandTest::CommandTest() : m_fake(FakeKeld::Reset()), m_volume(m_dir / "v1") {
    m_fake.SetCapability("ferrix");
    InitDeviceSupport();
    SetPackageFolderForTest(m_dir / "pkg");
    m_dir.MakeDir("pkg/etc");
    m_dir.Write("pkg/target/etc/ferrix_system.filter", SYSTEM_FILTER);
    EXPECT_TRUE(SetRepoVolPath(m_volume));
    EXPECT_EQ(m_volume, GetRepoVolPath());
    m_dir.MakeDir("v1/@Ferrix/db");
    m_dir.MakeDir("v1/@Ferrix/task");
    AddShare("photos");
    EXPECT_EQ(0, FerrixdPeer::Open(m_app));
    m_fake.ForgetCalls();
    m_log.Clear();
}

CommandTest::~CommandTest() {
    FerrixdPeer::Forget(m_app);
    FerrixdPeer::Close(m_app);
    TaskDB::GetInstance().Close();
    LogDB::GetInstance().Close();
    SetPackageFolderForTest("");
}

void CommandTest::StartWorkers() { FerrixdPeer::Start(m_app); }

PObject CommandTest::Send(const std::string& action, PObject request) {
    PObject response;
    const int result = FerrixdPeer::Act(m_app, action, request, response);
    // A response without an error may come with a failure, never the reverse but for "remove_task".
    EXPECT_TRUE(result != 0 || action == "remove_task" || !response.HasMember("error")) << action;
    return response;
}

int CommandTest::Notify(const std::string& hook, const std::string& mount_path,
                        const std::string& device_path) {
    PObject request;
    request["mountpoint"] = mount_path;
    request["device"] = device_path;
    return Notify(hook, request);
}

int CommandTest::Notify(const std::string& hook, const PObject& request) {
    return FerrixdPeer::Notify(m_app, hook, request);
}

void CommandTest::AddShare(const std::string& name) {
    m_fake.AddShare({.name = name, .path = m_dir.MakeDir("v1/" + name), .volume = m_volume});
}

std::string CommandTest::MountPath(const std::string& name) const { return m_dir / ("m/" + name); }

std::string CommandTest::DevicePath(const std::string& name) const { return m_dir / ("d/" + name); }

std::string CommandTest::PlugIn(const std::string& name, const std::string& uuid, int location,
                                int partitions) {
    m_dir.Write("d/" + name, std::string(1 << 16, '\0'));  // no file system, so no uuid of its own
    m_dir.MakeDir("m/" + name + "/@eaDir");
    if (!uuid.empty()) {
        const std::string file = MountPath(name) + "/@eaDir/.KeldoranFerrix.config";
        EXPECT_EQ(0,
                  KLIBCFileSetKeyValue(file.c_str(), "uuid", uuid.c_str(), KELD_KEY_VALUE_FORMAT));
    }
    m_fake.AddDevice({.mount_path = MountPath(name),
                      .dev_path = DevicePath(name),
                      .location = location,
                      .partitions = partitions});
    return MountPath(name);
}

int CommandTest::PostMount(const std::string& name) {
    return Notify("post_mount", MountPath(name), DevicePath(name));
}

int CommandTest::PressButton() { return FerrixdPeer::Notify(m_app, "post_ferrix", PObject()); }

int CommandTest::PreUnmount(const std::string& name) {
    return Notify("pre_unmount", MountPath(name), DevicePath(name));
}

int CommandTest::LoadEntries() { return FerrixdPeer::Load(m_app); }

int CommandTest::LoadDefaultTask(const std::string& path, const std::string& uuid) {
    return FerrixdPeer::LoadDefault(m_app, path, uuid);
}

void CommandTest::ForgetEntries() { FerrixdPeer::Forget(m_app); }

uint64_t CommandTest::AddDefaultTask(const char* uuid, bool is_enable) {
    USBInfo usb;
    usb.uuid = uuid;
    usb.producer = "FERRIX_DEFAULT_PRODUCER";
    usb.product = "FERRIX_DEFAULT_PRODUCT";
    TaskInfo task;
    EXPECT_EQ(0, TaskDB::GetInstance().AddUSBInfo(usb, task.usb_id));
    task.is_enable = is_enable;
    task.task_name = "Default Ferrix";
    task.task_type = TASK_TYPE_IMPORT_GENERAL;
    task.usb_folder_path = "/";
    task.hub_share_name = "photos";
    task.hub_folder_path = "/";
    task.copy_strategy = COPY_STRATEGY_MIRROR;
    EXPECT_EQ(0, TaskDB::GetInstance().AddTaskInfo(task, task.id));
    m_dir.MakeDir("v1/@Ferrix/task/" + std::to_string(task.id));
    m_dir.Write("v1/@Ferrix/task/" + std::to_string(task.id) + "/user.config",
                R"({"user_defined_extensions":[],"user_defined_names":[]})");
    const std::string folder = TaskFolder(task.id);
    EXPECT_EQ(0, FileFilter::WriteBlackList(folder + "/blacklist.filter",
                                            {".KeldoranFerrix.config"}, {}));
    EXPECT_EQ(0, FileFilter::WriteWhiteList(folder + "/whitelist.filter", {"*"}, {"*"}));
    return task.id;
}

PObject CommandTest::AddRequest(const std::string& device, const std::string& uuid) const {
    PObject request;
    request["usb_share_path"] = MountPath(device);
    request["uuid"] = uuid;
    request["run_when_plug_in"] = false;
    request["eject_when_task_done"] = true;
    request["producer"] = "Maker";
    request["product"] = "Stick";
    request["task_name"] = "My task";
    request["task_type"] = static_cast<int>(TASK_TYPE_IMPORT_GENERAL);
    request["usb_folder_path"] = "/";
    request["hub_folder_path"] = "/";
    request["hub_share_name"] = "photos";
    request["copy_strategy"] = static_cast<int>(COPY_STRATEGY_MIRROR);
    request["keep_dir_structure"] = true;
    request["smart_create_date_dir"] = false;
    request["rename_photo_video"] = false;
    request["remove_src_file"] = false;
    request["conflict_policy"] = 2;
    request["enable_rotation"] = false;
    request["max_version_count"] = 256;
    request["rotation_policy"] = 1;
    request["schedule_enabled"] = false;
    request["schedule_json_str"] = "{}";
    for (const char* key : {"custom_name", "custom_ext", "black_name", "black_ext"}) {
        request[key] = List({});
    }
    request["white_name"] = List({"*"});
    request["white_ext"] = List({"*"});
    return request;
}

uint64_t CommandTest::AddTask(const std::string& device, const std::string& uuid) {
    const PObject response = Send("add_task", AddRequest(device, uuid));
    EXPECT_THAT(response, IsSuccess());
    return response["task_id"].AsUInt64();
}

PObject CommandTest::ForTask(uint64_t task_id) {
    PObject request;
    request["task_id"] = task_id;
    return request;
}

PObject CommandTest::ImportSetting(uint64_t task_id, const std::map<std::string, PObject>& keys) {
    PObject request = ForTask(task_id);
    request["task_type"] = static_cast<int>(TASK_TYPE_IMPORT_GENERAL);
    request["hub_share_name"] = "photos";
    request["hub_folder_path"] = "/";
    for (const auto& [key, value] : keys) request[key] = value;
    return request;
}

PObject CommandTest::List(const std::vector<std::string>& texts) {
    PObject list;
    list = PObject::empty_array;
    for (const std::string& text : texts) list.AsArray().emplace_back(text);
    return list;
}

std::string CommandTest::TaskFolder(uint64_t task_id) const {
    return m_volume + "/@Ferrix/task/" + std::to_string(task_id);
}

std::list<TaskInfo> CommandTest::Tasks() {
    std::list<TaskInfo> tasks;
    EXPECT_EQ(0, TaskDB::GetInstance().ListAllTaskInfo(tasks));
    return tasks;
}

std::list<USBInfo> CommandTest::Devices() {
    std::list<USBInfo> devices;
    EXPECT_EQ(0, TaskDB::GetInstance().ListUSBInfo(devices));
    return devices;
}

TaskInfo CommandTest::Task(uint64_t task_id) {
    TaskInfo task;
    EXPECT_EQ(1, TaskDB::GetInstance().GetTaskInfo(task_id, task)) << task_id;
    return task;
}

bool CommandTest::IsLoaded(uint64_t task_id) {
    TaskRunInfo entry;
    return TaskEntryHandler::GetInstance().GetTaskEntry(task_id, entry) == 0;
}

TaskRunInfo CommandTest::Entry(uint64_t task_id) {
    TaskRunInfo entry;
    EXPECT_EQ(0, TaskEntryHandler::GetInstance().GetTaskEntry(task_id, entry)) << task_id;
    return entry;
}

uint64_t CommandTest::LogRows(int description_id) {
    LogFilter filter;
    filter.description_ids = {description_id};
    uint64_t count = 0;
    EXPECT_EQ(0, LogDB::GetInstance().CountLogInfo(filter, count));
    return count;
}

std::vector<std::string> CommandTest::LogTexts(int description_id) {
    LogFilter filter;
    filter.description_ids = {description_id};
    std::vector<LogInfo> rows;
    EXPECT_EQ(0, LogDB::GetInstance().ListLogInfo(filter, rows));
    std::vector<std::string> texts;
    for (const LogInfo& row : rows) texts.push_back(row.description_param);
    return texts;
}

void CommandTest::Execute(const std::string& table, const std::string& sql) {
    sqlite3* db = nullptr;
    const bool is_log = table == "log_info_table";
    const std::string path =
        m_volume + "/@Ferrix/db/" + (is_log ? "log-db.sqlite" : "task-db.sqlite");
    ASSERT_EQ(SQLITE_OK, sqlite3_open(path.c_str(), &db));
    EXPECT_EQ(SQLITE_OK, sqlite3_exec(db, sql.c_str(), nullptr, nullptr, nullptr))
        << sqlite3_errmsg(db);
    sqlite3_close(db);
}

void CommandTest::BreakTable(const std::string& table, const std::string& what) {
    Execute(table, "CREATE TRIGGER broken_" + what + "_" + table + " BEFORE " + what + " ON " +
                       table + " BEGIN SELECT RAISE(ABORT, 'broken'); END;");
}

void CommandTest::DropTable(const std::string& table) {
    Execute(table, "DROP TABLE " + table + ";");
}

testing::Matcher<const PObject&> IsError(int code, const std::string& text) {
    return testing::ResultOf(
        "the text of the response", [](const PObject& response) { return response.ToText(); },
        testing::StrEq("{\"error\": \"" + text + "\", \"error_code\": " + std::to_string(code) +
                       "}"));
}

testing::Matcher<const PObject&> IsSuccess() {
    return testing::ResultOf(
        "the error of the response",
        [](const PObject& response) { return response["error"].AsString(); }, testing::StrEq(""));
}
