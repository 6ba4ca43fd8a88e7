#include "updater/default-task.h"

#include <json/value.h>
#include <sys/stat.h>

#include <algorithm>

#include "db/side-files.h"
#include "db/sqlite-util.h"
#include "filter/file-filter.h"
#include "platform/durable-file.h"
#include "platform/json-util.h"
#include "platform/sdk-key-file.h"
#include "updater/database-file.h"
#include "updater/updater-utils.h"
#include "utils/file-op.h"
#include "utils/log.h"

// One kind of front port.
struct DefaultTasks::Kind {
    const char* key;             // of the model's capabilities
    const char* old_folder_key;  // of the older release's setting
    const char* uuid;
    const char* name;
    const char* failure;
};

const DefaultTasks::Kind DefaultTasks::KINDS[] = {
    {"ferrix",   "ferrixfolder",   DEFAULT_USB_UUID, "Default Ferrix",
     "Failed to prepare Ferrix default task\n"  },
    {"sdferrix", "sdferrixfolder", DEFAULT_SD_UUID,  "Default SDFerrix",
     "Failed to prepare SDFerrix default task\n"},
};

namespace {

constexpr size_t OLD_FOLDER_SIZE = 492;  // with the NUL at the end
constexpr uint64_t MAX_VERSION_COUNT = 256;
constexpr mode_t CONFIG_MODE = 0644;

// "photos/in/box" is the folder "/in/box" of the share "photos", and "photos" all of that share.
void SplitOldFolder(const std::string& value, std::string& share, std::string& folder) {
    const size_t begin = value.find_first_not_of('/');
    const std::string path =
        begin == std::string::npos ? "" : PathWithoutTrailingSlashes(value.substr(begin));
    const size_t end = path.find('/');
    share = path.substr(0, end);
    const size_t rest = end == std::string::npos ? end : path.find_first_not_of('/', end);
    folder = rest == std::string::npos ? "/" : "/" + path.substr(rest);
}

int AddText(const SqlQuery& row, void* context) {
    static_cast<std::vector<std::string>*>(context)->push_back(row.Text(0));
    return 0;
}

// The lists of names and extensions of the user's own, both empty.
int WriteUserConfig(const std::string& path) {
    Json::Value config(Json::objectValue);
    config["user_defined_names"] = Json::Value(Json::arrayValue);
    config["user_defined_extensions"] = Json::Value(Json::arrayValue);
    if (WriteDurableFile(path, WriteJson(config) + "\n") == 0 &&
        chmod(path.c_str(), CONFIG_MODE) == 0) {
        return 0;
    }
    SLOG_ERR("Failed to open file '%s'\n", path.c_str());
    return -1;
}

int MakeTaskFolder(const std::string& folder) {
    constexpr mode_t mode = 0755;  // whatever the umask: others may not put files there
    if (FSMKDirP(folder, FS_KEEP_UID, FS_KEEP_GID) == 0 && chmod(folder.c_str(), mode) == 0) {
        return 0;
    }
    SLOG_ERR("Failed to create task folder '%s'\n", folder.c_str());
    return -1;
}

}  // namespace

DefaultTasks::DefaultTasks(std::string repository, const BoxConfigPaths& paths)
    : m_repository(std::move(repository)),
      m_paths(paths),
      m_db_path(m_repository + "/db/" + "task-db.sqlite"),
      m_new_path(m_db_path + ".new") {}

int DefaultTasks::Prepare(bool replaces_empty) {
    m_is_clear = RemoveDatabase(m_new_path) == 0;
    int result = 0;
    for (const Kind& kind : KINDS) {
        if (result == 0) result = PrepareRows(kind);
    }
    m_db.Close();
    if (result == 0 && m_has_rows) result = PutInPlace(replaces_empty);
    (void)!RemoveDatabase(m_new_path);
    return result == 0 ? RemoveOldKeys() : -1;
}

void DefaultTasks::RemoveLeftKeys() {
    std::vector<std::string> uuids;
    if (QueryEach(m_db_path, "SELECT uuid FROM usb_info_table;", AddText, &uuids) < 0) return;
    for (const Kind& kind : KINDS) {
        if (std::ranges::find(uuids, kind.uuid) != uuids.end()) RemoveLeftKey(kind);
    }
}

int DefaultTasks::PrepareRows(const Kind& kind) {
    const int is_supported = SDK::CheckKeyValue(m_paths.capabilities, kind.key, "yes");
    if (is_supported == 0) {
        SLOG_DBG("Not support '%s'\n", kind.key);
        return 0;
    }
    if (is_supported > 0 && PrepareOne(kind) == 0) return 0;
    SLOG_ERR("%s", kind.failure);
    return -1;
}

int DefaultTasks::PrepareOne(const Kind& kind) {
    if (!m_is_clear || m_db.Init(m_new_path) < 0) {
        SLOG_ERR("Failed to init task db at '%s'\n", m_new_path.c_str());
        return -1;
    }
    USBInfo known;
    const int found = m_db.GetUSBInfoByUUID(kind.uuid, known);
    if (found < 0) {
        SLOG_ERR("Failed to get deault usb info '%s'\n", kind.uuid);
        return -1;
    }
    if (found > 0) {
        SLOG_DBG("default task '%s' already exist\n", kind.uuid);
        return 0;
    }
    std::string old_folder;
    if (SDK::GetKeyValue(m_paths.settings, kind.old_folder_key, OLD_FOLDER_SIZE, old_folder) < 0) {
        SLOG_ERR("Failed to get old copy folder for key '%s'\n", kind.old_folder_key);
        return -1;
    }
    return CreateFrom(kind, old_folder);
}

int DefaultTasks::CreateFrom(const Kind& kind, const std::string& old_folder) {
    std::string share;
    std::string folder;
    SplitOldFolder(old_folder, share, folder);
    if (share.empty()) {
        if (Create(kind, "", "", false) == 0) return 0;
        SLOG_ERR("Failed to prepare ferrix default task '%s'\n", kind.name);
        return -1;
    }
    if (Create(kind, share, folder, true) < 0) {
        SLOG_ERR("Failed to convert old ferrix config to default task '%s'\n", kind.name);
        return -1;
    }
    m_taken_over.push_back(&kind);
    return 0;
}

int DefaultTasks::Create(const Kind& kind, const std::string& share, const std::string& folder,
                         bool is_enable) {
    TaskInfo task;
    if (AddUSB(kind, task.usb_id) < 0) {
        SLOG_ERR("Failed to set default Ferrix usb info\n");
        return -1;
    }
    task.is_enable = is_enable;
    task.task_name = kind.name;
    task.task_type = TASK_TYPE_IMPORT_GENERAL;
    task.usb_folder_path = "/";
    task.hub_folder_path = folder;
    task.hub_share_name = share;
    task.copy_strategy = COPY_STRATEGY_VERSION;
    task.keep_dir_structure = true;
    task.conflict_policy = CONFLICT_POLICY_RENAME;
    task.max_version_count = MAX_VERSION_COUNT;
    task.rotation_policy = ROTATION_POLICY_OLDEST;
    if (AddTask(task) < 0) {
        SLOG_ERR("Faile to set default Ferrix task info\n");
        return -1;
    }
    m_has_rows = true;
    return 0;
}

int DefaultTasks::AddUSB(const Kind& kind, uint64_t& usb_id) {
    USBInfo usb;
    usb.uuid = kind.uuid;
    usb.run_when_plug_in = false;
    usb.eject_when_task_done = true;
    usb.producer = "FERRIX_DEFAULT_PRODUCER";
    usb.product = "FERRIX_DEFAULT_PRODUCT";
    if (m_db.AddUSBInfo(usb, usb_id) == 0) return 0;
    SLOG_ERR("Failed to add usb info, uuid '%s'\n", kind.uuid);
    return -1;
}

int DefaultTasks::AddTask(const TaskInfo& task) {
    uint64_t task_id = 0;
    if (m_db.AddTaskInfo(task, task_id) < 0) {
        SLOG_ERR("Failed to add task info\n");
        return -1;
    }
    if (WriteTaskFolder(task_id) == 0) return 0;
    SLOG_ERR("Failed to prepare task config '%llu'\n", Llu(task_id));
    return -1;
}

int DefaultTasks::WriteTaskFolder(uint64_t task_id) {
    const std::string folder = m_repository + "/task/" + std::to_string(task_id);
    // The folder may be one that a lost repository has left, and what was copied then is not what
    // this task has copied. Its other files are replaced, or hold for any task.
    if (MakeTaskFolder(folder) < 0 || RemoveDatabase(folder + "/file-db.sqlite") < 0 ||
        WriteUserConfig(folder + "/user.config") < 0) {
        return -1;
    }
    const std::string black_list = folder + "/blacklist.filter";
    if (FileFilter::WriteBlackList(black_list, {".KeldoranFerrix.config"}, {}) < 0) {
        SLOG_ERR("Failed to write black list '%s'\n", black_list.c_str());
        return -1;
    }
    const std::string white_list = folder + "/whitelist.filter";
    if (FileFilter::WriteWhiteList(white_list, {"*"}, {"*"}) < 0) {
        SLOG_ERR("Failed to write white list '%s'\n", white_list.c_str());
        return -1;
    }
    return 0;
}

int DefaultTasks::PutInPlace(bool replaces_empty) {
    const Place place = replaces_empty ? Place::TAKEN : Place::FREE;
    bool is_moved = false;
    // A journal of a database that is gone may lie in the place.
    if ((replaces_empty || IsMissing(m_db_path)) && RemoveSideFiles(m_db_path) == 0 &&
        MakeSingleFile(m_new_path) == 0 && FSSyncFileSystem(m_repository) == 0 &&
        ::PutInPlace(m_new_path, m_db_path, place, is_moved) == 0) {
        return 0;
    }
    SLOG_ERR("Failed to put '%s' in its place\n", m_db_path.c_str());
    return -1;
}

int DefaultTasks::RemoveOldKeys() {
    int result = 0;
    for (const Kind* kind : m_taken_over) {
        if (RemoveOldKey(*kind) == 0) continue;
        SLOG_ERR("%s", kind->failure);
        result = -1;
    }
    return result;
}

int DefaultTasks::RemoveOldKey(const Kind& kind) {
    if (SDK::RemoveKey(m_paths.settings, kind.old_folder_key) >= 0) return 0;
    SLOG_ERR("Failed to remove key'%s'\n", kind.old_folder_key);
    return -1;
}

void DefaultTasks::RemoveLeftKey(const Kind& kind) {
    std::string old_folder;
    const int found =
        SDK::GetKeyValue(m_paths.settings, kind.old_folder_key, OLD_FOLDER_SIZE, old_folder);
    if (found < 0) SLOG_ERR("Failed to get old copy folder for key '%s'\n", kind.old_folder_key);
    std::string share;
    std::string folder;
    SplitOldFolder(old_folder, share, folder);
    if (share.empty()) return;
    // The attempt before may have failed to make its database last.
    if (FSSyncFileSystem(m_repository) == 0) (void)!RemoveOldKey(kind);
}
