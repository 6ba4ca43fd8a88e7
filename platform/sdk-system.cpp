#include "platform/sdk-system.h"

#include <keld/error.h>
#include <keld/exec.h>
#include <keld/fs.h>
#include <keld/index.h>
#include <keld/indicator.h>
#include <keld/sched.h>
#include <keld/support.h>
#include <uuid/uuid.h>

#include <climits>
#include <limits>
#include <string_view>

#include "platform/sdk-mutex.h"
#include "platform/sdk-user.h"
#include "utils/log.h"

namespace SDK {
namespace {

constexpr std::string_view HOMES = "/homes";
// What the indexer is told besides the path; the numbers are its own.
constexpr int INDEX_ARGUMENT = 3;

bool IsBelowHomes(std::string_view path) {
    return path.starts_with(HOMES) && (path.size() == HOMES.size() || path[HOMES.size()] == '/');
}

}  // namespace

PlatformError GetLastError() {
    const char* file = KLIBCErrorGetFile();
    return {KLIBCErrGet(), file == nullptr ? "" : file, KLIBCErrorGetLine()};
}

int AddToIndex(const std::string& path) {
    const ReentrantLock lock;
    KLIBKeldIndexAddEx(path.c_str(), 0, INDEX_ARGUMENT, 0, 0);
    return 0;
}

int NotifyLed(int code) {
    const ReentrantLock lock;
    return KLIBScemdNotify(code);
}

void HardwareControl(int command) {
    const ReentrantLock lock;
    KELDHWExternalControl(command, 0, 0);
}

bool HasCapability(const std::string& key) {
    const ReentrantLock lock;
    return KLIBCSupportGet(key.c_str()) > 0;
}

int RunProgram(const std::string& path, const std::string& arg1, const std::string& arg2) {
    const ReentrantLock lock;
    return KLIBCExec(path.c_str(), arg1.c_str(), arg2.c_str(), nullptr);
}

bool HasMountPoint(const std::string& path) {
    const ReentrantLock lock;
    const int result = KELDFSHasMountPoint(path.c_str());
    if (result < 0) {
        SLOG_ERR("KELDFSHasMountPoint(%s): Error code %d\n", path.c_str(), KLIBCErrGet());
    }
    return result > 0;
}

int ResolvePath(const std::string& display_path, std::string& full_path) {
    const ReentrantLock lock;
    if (IsBelowHomes(display_path) && !IsUserHomeEnabled()) {
        SLOG_ERR("ResolvePath(%s): home folders are not enabled\n", display_path.c_str());
        return -1;
    }
    std::string buffer(display_path.size() + PATH_MAX, '\0');
    if (KELDPathResolve(display_path.c_str(), buffer.data(), buffer.size()) < 0) {
        SLOG_ERR("KELDPathResolve(%s): Error code %d\n", display_path.c_str(), KLIBCErrGet());
        return -1;
    }
    full_path = buffer.c_str();
    return 0;
}

int RemoveSchedEntry(int64_t id) {
    if (id <= 0 || id > std::numeric_limits<int>::max()) return -1;
    const ReentrantLock lock;
    return KELDSchedTaskRemove(static_cast<int>(id));
}

std::string NewUUID() {
    uuid_t uuid;
    char text[UUID_STR_LEN] = "";
    uuid_generate(uuid);
    uuid_unparse_lower(uuid, text);
    return text;
}

}  // namespace SDK
