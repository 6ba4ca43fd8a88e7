#include "copy-fixture.h"

#include <dirent.h>
#include <sys/stat.h>

#include <algorithm>
#include <cerrno>
#include <random>

#include "utils/unique-fd.h"

std::vector<std::string> NamesIn(const std::string& folder) {
    std::vector<std::string> names;
    const UniqueDir dir(opendir(folder.c_str()));
    if (!dir) {
        ADD_FAILURE() << "no folder " << folder;
        return names;
    }
    while (const dirent* entry = readdir(dir.get())) {
        const std::string name = entry->d_name;
        if (name != "." && name != ".." && name != "lost+found") names.push_back(name);
    }
    std::sort(names.begin(), names.end());
    return names;
}

std::string TestBytes(size_t size, unsigned seed) {
    std::mt19937 generator(seed);
    std::string bytes(size, '\0');
    for (char& byte : bytes) byte = static_cast<char>(generator());
    return bytes;
}

struct stat StatOf(const std::string& path) {
    struct stat info {};
    if (lstat(path.c_str(), &info) != 0) ADD_FAILURE() << "no file " << path;
    return info;
}

bool Exists(const std::string& path) {
    struct stat info {};
    return lstat(path.c_str(), &info) == 0 || errno != ENOENT;
}

int CopyOnce(const std::string& from, const std::string& to, int overwrite) {
    const KELDCopyOptions options = CopyOptions(overwrite);
    if (KELDFileCopy_r(from.c_str(), to.c_str(), &options, nullptr) == 0) return KELDERR_SUCCESS;
    return KLIBCErrGet();
}
