#include "platform/keld-recycle.h"

#include <keld/recycle.h>

#include "platform/sdk-mutex.h"

namespace SDK {

int RecycleFile(const std::string& share_path, const std::string& relative_path,
                PlatformError& error) {
    const ReentrantLock lock;
    if (KELDRecycleUnlinkFileWithSharePath(share_path.c_str(), relative_path.c_str()) >= 0)
        return 0;
    error = GetLastError();
    return -1;
}

int RecycleDir(const std::string& share_path, const std::string& relative_path, bool is_admin_only,
               PlatformError& error) {
    const ReentrantLock lock;
    if (KELDRecycleRmDirWithSharePath(share_path.c_str(), relative_path.c_str(), 0,
                                      is_admin_only ? 1 : 0) >= 0) {
        return 0;
    }
    error = GetLastError();
    return -1;
}

}  // namespace SDK
