// A task's filter setting: what its filter applies, and what the user named himself, as one setting
// of six lists.
#include <fcntl.h>
#include <json/value.h>
#include <unistd.h>

#include <cerrno>

#include "daemon/app.h"
#include "daemon/task-folder.h"
#include "filter/file-filter.h"
#include "ipc/pobject.h"
#include "platform/durable-file.h"
#include "platform/json-util.h"
#include "platform/utility.h"
#include "processor/task-entry-handler.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace {

using Texts = std::vector<std::string>;

constexpr const char* LIST_KEYS[] = {"custom_name", "custom_ext", "black_name",
                                     "black_ext",   "white_name", "white_ext"};
constexpr char CUSTOM_NAMES[] = "user_defined_names";
constexpr char CUSTOM_EXTENSIONS[] = "user_defined_extensions";

// Writable by its owner alone, whatever the umask.
constexpr mode_t CONFIG_MODE = 0644;

// All six are sent, and each is a list (nothing is an empty one): a slip of a client must not turn
// a list that protects files into none.
bool HasAllLists(const PObject& request) {
    for (const char* key : LIST_KEYS) {
        if (!request.HasMember(key)) return false;
        if (!request[key].IsArray() && !request[key].IsNull()) return false;
    }
    return true;
}

Texts ToTexts(const PObject& array) {
    Texts texts;
    for (const PObject& element : array.AsArray()) texts.push_back(element.AsString());
    return texts;
}

PObject ToArray(const Texts& texts) {
    PObject array;
    array = PObject::empty_array;
    for (const std::string& text : texts) array.AsArray().emplace_back(text);
    return array;
}

int ReadAll(int fd, std::string& text) {
    char buffer[16384];
    for (;;) {
        const ssize_t got = read(fd, buffer, sizeof(buffer));
        if (got == 0) return 0;
        if (got < 0 && errno == EINTR) continue;
        if (got < 0) return -1;
        text.append(buffer, static_cast<size_t>(got));
    }
}

int SetUserConfig(const std::string& path, const PObject& names, const PObject& extensions) {
    Json::Value config(Json::objectValue);
    PObjectArrayToJson(names, CUSTOM_NAMES, config);
    PObjectArrayToJson(extensions, CUSTOM_EXTENSIONS, config);
    if (WriteDurableFile(path, WriteJson(config) + "\n", CONFIG_MODE) == 0) return 0;
    SLOG_ERR("Failed to open file '%s'\n", path.c_str());
    return -1;
}

int GetUserConfig(const std::string& path, PObject& names, PObject& extensions) {
    const UniqueFd file(open(path.c_str(), O_RDONLY | O_NOFOLLOW | O_CLOEXEC));
    if (!file.IsValid()) {
        SLOG_ERR("Failed to open file '%s'\n", path.c_str());
        return -1;
    }
    std::string text;
    Json::Value config;
    if (ReadAll(file.Get(), text) < 0 || ParseJson(text, config) < 0) {
        SLOG_ERR("Failed to parse user config '%s'\n", path.c_str());
        return -1;
    }
    JsonToPObjectArray(config, CUSTOM_NAMES, names);
    JsonToPObjectArray(config, CUSTOM_EXTENSIONS, extensions);
    return 0;
}

// Reads the task's lists into its live filter, in place. The text of what failed, null for success.
const char* ReloadFilter(uint64_t task_id, FileFilter& filter) {
    const std::string black_list = BlackListPath(task_id);
    if (filter.LoadBlackList(black_list) < 0) {
        SLOG_ERR("Failed to load black list at '%s'\n", black_list.c_str());
        return "Failed to load black list";
    }
    const std::string white_list = WhiteListPath(task_id);
    if (filter.LoadWhiteList(white_list) < 0) {
        SLOG_ERR("Failed to load white list at '%s'\n", white_list.c_str());
        return "Failed to load white list";
    }
    return nullptr;
}

}  // namespace

int Ferrixd::WriteFilterSetting(uint64_t task_id, const PObject& request) {
    if (!HasAllLists(request)) {
        SLOG_ERR("Invalid parameter\n");
        return -1;
    }
    const Texts black_names = ToTexts(request["black_name"]);
    const Texts black_extensions = ToTexts(request["black_ext"]);
    const Texts white_names = ToTexts(request["white_name"]);
    const Texts white_extensions = ToTexts(request["white_ext"]);
    for (const Texts* texts : {&black_names, &black_extensions, &white_names, &white_extensions}) {
        if (!FileFilter::IsWritableList(*texts)) {
            SLOG_ERR("Invalid parameter\n");
            return -1;
        }
    }
    if (SetUserConfig(UserConfigPath(task_id), request["custom_name"], request["custom_ext"]) < 0) {
        SLOG_ERR("Failed to SetUserConfig for task '%llu'\n", Llu(task_id));
        return -1;
    }
    if (FileFilter::WriteBlackList(BlackListPath(task_id), black_names, black_extensions) < 0) {
        SLOG_ERR("Failed to write black list\n");
        SLOG_ERR("Failed to set black list config for task '%llu'\n", Llu(task_id));
        return -1;
    }
    if (FileFilter::WriteWhiteList(WhiteListPath(task_id), white_names, white_extensions) < 0) {
        SLOG_ERR("Failed to write white list\n");
        SLOG_ERR("Failed to set white list config for task '%llu'\n", Llu(task_id));
        return -1;
    }
    return 0;
}

int Ferrixd::ReadFilterSetting(uint64_t task_id, PObject& response) {
    if (!IsValidID(task_id)) {
        SLOG_ERR("Invalid parameter\n");
        return -1;
    }
    PObject custom_names;
    PObject custom_extensions;
    if (GetUserConfig(UserConfigPath(task_id), custom_names, custom_extensions) < 0) return -1;
    Texts black_names;
    Texts black_extensions;
    if (FileFilter::ReadBlackList(BlackListPath(task_id), black_names, black_extensions) < 0) {
        SLOG_ERR("Failed to read black list\n");
        return -1;
    }
    Texts white_names;
    Texts white_extensions;
    if (FileFilter::ReadWhiteList(WhiteListPath(task_id), white_names, white_extensions) < 0) {
        SLOG_ERR("Failed to read white list\n");
        return -1;
    }
    response["custom_name"] = custom_names;
    response["custom_ext"] = custom_extensions;
    response["black_name"] = ToArray(black_names);
    response["black_ext"] = ToArray(black_extensions);
    response["white_name"] = ToArray(white_names);
    response["white_ext"] = ToArray(white_extensions);
    return 0;
}

int Ferrixd::SetFilterSetting(const PObject& request, PObject& response) {
    if (!request.HasMember("task_id")) {
        SetResponseError(RESPONSE_BAD_REQUEST, "Invalid parameter", response);
        return -1;
    }
    const uint64_t task_id = request["task_id"].AsUInt64();
    if (WriteFilterSetting(task_id, request) < 0) {
        SLOG_ERR("Failed to WriteFilterSetting for '%llu'\n", Llu(task_id));
        SetResponseError(RESPONSE_OTHER, "Failed to WriteFilterSetting", response);
        return -1;
    }
    SLOG_INFO("Set Task '%llu' Filter Setting\n", Llu(task_id));
    TaskRunInfo entry;
    if (TaskEntryHandler::GetInstance().GetTaskEntry(task_id, entry) < 0) {
        SLOG_INFO("Task '%llu' does not match\n", Llu(task_id));
        return 0;
    }
    if (!entry.task_filter) {
        SLOG_ERR("Failed to set filter setting for task '%llu'.\n", Llu(task_id));
        SetResponseError(RESPONSE_OTHER, "Failed to set filter setting", response);
        return -1;
    }
    // The entry, and a run in progress, refer to this very filter. The entry is not put back: a
    // copy could undo a run state that the task worker has set in the meantime.
    if (const char* failure = ReloadFilter(task_id, *entry.task_filter); failure != nullptr) {
        SetResponseError(RESPONSE_OTHER, failure, response);
        return -1;
    }
    return 0;
}

int Ferrixd::GetFilterSetting(const PObject& request, PObject& response) {
    if (!request.HasMember("task_id")) {
        SetResponseError(RESPONSE_BAD_REQUEST, "Invalid parameter", response);
        return -1;
    }
    const uint64_t task_id = request["task_id"].AsUInt64();
    if (ReadFilterSetting(task_id, response) < 0) {
        SLOG_ERR("Failed to ReadFilterSetting for '%llu'\n", Llu(task_id));
        SetResponseError(RESPONSE_OTHER, "Failed to ReadFilterSetting", response);
        return -1;
    }
    response["id"] = task_id;
    SLOG_INFO("Get Task '%llu' Filter Setting\n", Llu(task_id));
    return 0;
}
