#include "platform/global-setting.h"

#include <keld/error.h>
#include <keld/keyfile.h>
#include <strings.h>

#include <climits>

#include "platform/keld-sdk-wrapper.h"
#include "platform/package-paths.h"
#include "utils/log.h"

namespace {

constexpr char kRepoVolPathKey[] = "repo_vol_path";
constexpr char kBeepKey[] = "beep";
constexpr size_t kRepoVolPathSize = 64;  // with the NUL at the end
constexpr size_t kBeepSize = 5;

// 1 when the key is there, 0 when it is missing, negative on an error. A value that needs more than
// `size` bytes is cut. A platform may refuse it instead, so it gets room enough for any path.
int ReadSetting(const char* key, size_t size, std::string& value) {
    const SDK::ReentrantLock lock;
    char buffer[PATH_MAX] = "";
    const int found = KLIBCFileGetKeyValue(SettingPath().c_str(), key, buffer, sizeof(buffer), 0);
    value.clear();
    if (found > 0) value = std::string(buffer).substr(0, size - 1);
    return found;
}

int WriteSetting(const char* key, const char* value) {
    const SDK::ReentrantLock lock;
    return KLIBCFileSetKeyValue(SettingPath().c_str(), key, value, KELD_KEY_VALUE_FORMAT);
}

int ReadBeep(std::string& value) {
    const int found = ReadSetting(kBeepKey, kBeepSize, value);
    if (found < 0) {
        SLOG_ERR("%s:%d KLIBCFileGetKeyValue() failed[0x%04X %s:%d]", __FILE__, __LINE__,
                 static_cast<unsigned>(KLIBCErrGet()), KLIBCErrorGetFile(), KLIBCErrorGetLine());
    }
    return found;
}

}  // namespace

std::string GetRepoVolPath() {
    std::string path;
    return ReadSetting(kRepoVolPathKey, kRepoVolPathSize, path) > 0 ? path : "";
}

bool SetRepoVolPath(const std::string& path) {
    if (WriteSetting(kRepoVolPathKey, path.c_str()) >= 0) return true;
    SLOG_ERR("%s:%d KLIBCFileSetKeyValue() failed, path=[%s],[0x%04X %s:%d]", __FILE__, __LINE__,
             path.c_str(), static_cast<unsigned>(KLIBCErrGet()), KLIBCErrorGetFile(),
             KLIBCErrorGetLine());
    return false;
}

bool GetBeep() {
    std::string value;
    return ReadBeep(value) > 0 && strcasecmp(value.c_str(), "yes") == 0;
}

bool SetBeep(bool is_on) {
    if (WriteSetting(kBeepKey, is_on ? "yes" : "no") >= 0) return true;
    SLOG_ERR("%s:%d KLIBCFileSetKeyValue() failed, beep=[%d],[0x%04X %s:%d]", __FILE__, __LINE__,
             is_on, static_cast<unsigned>(KLIBCErrGet()), KLIBCErrorGetFile(), KLIBCErrorGetLine());
    return false;
}

bool InitBeep() {
    std::string value;
    const int found = ReadBeep(value);
    if (found < 0) return false;
    return found > 0 || SetBeep(true);
}
