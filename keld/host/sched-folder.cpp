#include "host/sched-folder.h"

#include <sys/stat.h>

#include <cerrno>

namespace keld_host {

int MakeFolders(const std::string& path) {
    constexpr mode_t MODE = 0755;
    for (size_t end = path.find('/', 1);; end = path.find('/', end + 1)) {
        const std::string folder = path.substr(0, end);
        if (mkdir(folder.c_str(), MODE) == 0) {
            if (chmod(folder.c_str(), MODE) != 0) return errno;
        } else if (errno != EEXIST) {
            return errno;
        }
        if (end == std::string::npos) return 0;
    }
}

}  // namespace keld_host
