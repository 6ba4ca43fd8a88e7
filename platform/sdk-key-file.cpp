#include "platform/sdk-key-file.h"

#include <keld/keyfile.h>

#include <climits>

#include "platform/sdk-mutex.h"

namespace SDK {

int GetKeyValue(const std::string& file, const std::string& key, size_t size, std::string& value) {
    const ReentrantLock lock;
    // A platform may refuse a value that does not fit instead of cutting it.
    char buffer[PATH_MAX] = "";
    const int found = KLIBCFileGetKeyValue(file.c_str(), key.c_str(), buffer, sizeof(buffer), 0);
    value.clear();
    if (found > 0) value = std::string(buffer).substr(0, size - 1);
    return found;
}

int CheckKeyValue(const std::string& file, const std::string& key, const std::string& value) {
    const ReentrantLock lock;
    return KLIBCFileCheckKeyValue(file.c_str(), key.c_str(), value.c_str());
}

int RemoveKey(const std::string& file, const std::string& key) {
    const ReentrantLock lock;
    return KLIBCFileRemoveKey(file.c_str(), key.c_str());
}

}  // namespace SDK
