#include "service/repo-finder.h"

#include <sys/stat.h>

#include <cerrno>

#include "platform/global-setting.h"
#include "service/repo-move.h"
#include "service/repository.h"
#include "service/usable-volume.h"
#include "utils/log.h"

namespace {

// Also when it cannot be told.
bool MayBeThere(const std::string& path) {
    struct stat info = {};
    return lstat(path.c_str(), &info) == 0 || (errno != ENOENT && errno != ENOTDIR);
}

int MakeFirst(const std::string& volume) {
    if (MakeRepo(volume) < 0) return -1;
    SLOG_NOTICE("%s:%d Repo volume was empty, create default repo volume as [%s].", __FILE__,
                __LINE__, volume.c_str());
    return 0;
}

int Replace(const std::string& old_volume, const std::string& volume) {
    // Only where nothing is left does the service go on with a repository that has no tasks yet.
    if (!MoveRepoData(old_volume, volume) && MayBeThere(RepositoryPath(old_volume))) return -1;
    SLOG_NOTICE("%s:%d Repo volume [%s] was not valid, create new repo volume as [%s].", __FILE__,
                __LINE__, old_volume.c_str(), volume.c_str());
    return 0;
}

int PrepareOther(const std::string& old_volume, const std::string& volume) {
    if (old_volume.empty()) return MakeFirst(volume);
    // It has come up meanwhile, or the settings have another name for it.
    if (IsSameFolder(old_volume, volume)) return 0;
    return Replace(old_volume, volume);
}

}  // namespace

int FindRepository(std::string& volume) {
    volume = GetRepoVolPath();
    const int mounted = LookUpVolume(volume);
    if (mounted > 0) UpdateVolumeList(volume);
    if (mounted != 0) return mounted;
    SLOG_INFO("%s:%d Ferrix Copy repo NOT mounted '%s'", __FILE__, __LINE__, volume.c_str());
    const std::string old_volume = volume;
    const int found = FindUsableVolume(volume);
    if (found <= 0) return found;
    return PrepareOther(old_volume, volume) < 0 || RegisterVolume(volume) < 0 ? -1 : 1;
}
