#include "utils/per-device-value.h"

#include <fcntl.h>
#include <keld/keyfile.h>
#include <sys/stat.h>

#include <cerrno>

#include "platform/sdk-mutex.h"
#include "utils/confined-path.h"
#include "utils/log.h"

namespace {

constexpr char kKeyFile[] = "/@eaDir/.KeldoranFerrix.config";
constexpr size_t kValueRoom = 64;

// A device is anybody's: a link in place of the file or its folder would take a write elsewhere.
bool IsLinkInTheWay(const std::string& root, const std::string& file) {
    const PathPlace place(root, file);
    if (!place.IsReached()) return place.Error() == ELOOP;
    struct stat st {};
    return fstatat(place.DirFd(), place.Name(), &st, AT_SYMLINK_NOFOLLOW) == 0 &&
           S_ISLNK(st.st_mode);
}

}  // namespace

bool SetPerDeviceValue(const std::string& device_root, const std::string& key,
                       const std::string& value) {
    if (device_root.empty() || key.empty() || value.empty()) return false;
    const std::string file = device_root + kKeyFile;
    const SDK::ReentrantLock lock;
    if (!IsLinkInTheWay(device_root, file) &&
        KLIBCFileSetKeyValue(file.c_str(), key.c_str(), value.c_str(), KELD_KEY_VALUE_FORMAT) ==
            0) {
        return true;
    }
    SLOG_ERR("KLIBCFileSetKeyValue() failed, path=[%s], key = %s, value = %s\n", file.c_str(),
             key.c_str(), value.c_str());
    return false;
}

bool GetPerDeviceValue(const std::string& device_root, const std::string& key, std::string& value) {
    value.clear();
    if (device_root.empty() || key.empty()) return false;
    const std::string file = device_root + kKeyFile;
    char buffer[kValueRoom] = "";
    if (IsLinkInTheWay(device_root, file)) return false;
    const SDK::ReentrantLock lock;
    if (KLIBCFileGetKeyValue(file.c_str(), key.c_str(), buffer, sizeof(buffer), 0) <= 0)
        return false;
    value = buffer;
    return !value.empty();
}
