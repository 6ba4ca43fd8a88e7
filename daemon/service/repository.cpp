#include "service/repository.h"

#include <json/value.h>
#include <json/writer.h>
#include <sys/stat.h>

#include "platform/durable-file.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr mode_t LIST_MODE = 0644;
constexpr size_t MAX_VOLUME_SIZE = 63;  // the settings cut off what is longer

bool IsUsable(const std::string& volume) {
    struct stat info = {};
    return !volume.empty() && volume.front() == '/' && stat(volume.c_str(), &info) == 0 &&
           S_ISDIR(info.st_mode);
}

// Whatever the umask: others may not replace what lies in the repository.
bool MakeFolder(const std::string& path) {
    if (FSMKDirP(path, FS_KEEP_UID, FS_KEEP_GID) < 0) return false;
    struct stat info = {};
    if (stat(path.c_str(), &info) != 0 || !S_ISDIR(info.st_mode)) return false;
    if ((info.st_mode & (S_IWGRP | S_IWOTH)) == 0) return true;
    return chmod(path.c_str(), info.st_mode & 07777 & ~static_cast<mode_t>(S_IWGRP | S_IWOTH)) == 0;
}

// The list that the package manager reads to know which volumes the package needs.
std::string VolumeListPath() { return PackagePath("/etc/keldpkg_conf/reg_volume"); }

std::string VolumeListText(const std::string& volume) {
    Json::Value list(Json::arrayValue);
    if (!volume.empty()) list.append(volume);
    return Json::FastWriter().write(list);
}

int WriteVolumeList(const std::string& volume) {
    const std::string path = VolumeListPath();
    if (MakeFolder(PathDirName(path)) && WriteDurableFile(path, VolumeListText(volume)) == 0 &&
        chmod(path.c_str(), LIST_MODE) == 0) {
        return 0;
    }
    SLOG_ERR("Failed to write '%s'\n", path.c_str());
    return -1;
}

}  // namespace

std::string RepositoryPath(const std::string& volume) { return volume + "/@Ferrix"; }

int MakeRepo(const std::string& volume) {
    if (!IsUsable(volume)) {
        SLOG_ERR("invalid volume path [%s].", volume.c_str());
        return -1;
    }
    const std::string repository = RepositoryPath(volume);
    if (!MakeFolder(repository)) {
        SLOG_ERR("fail to create ferrix copy repo [%s].", repository.c_str());
        return -1;
    }
    const std::string db_folder = repository + "/db";
    if (!MakeFolder(db_folder)) {
        SLOG_ERR("fail to create ferrix copy db folder [%s].", db_folder.c_str());
        return -1;
    }
    const std::string task_folder = repository + "/task";
    if (!MakeFolder(task_folder)) {
        SLOG_ERR("fail to create ferrix copy task folder [%s].", task_folder.c_str());
        return -1;
    }
    return 0;
}

bool CanBeRegistered(const std::string& volume) {
    if (volume.size() <= MAX_VOLUME_SIZE) return true;
    SLOG_ERR("The path of volume '%s' is too long\n", volume.c_str());
    return false;
}

int RegisterVolume(const std::string& volume) {
    if (!CanBeRegistered(volume) || !SetRepoVolPath(volume)) return -1;
    return WriteVolumeList(volume);
}

void UpdateVolumeList(const std::string& volume) {
    std::string text;
    const int found = ReadDurableFile(VolumeListPath(), text);
    if (found <= 0 || text != VolumeListText(volume)) (void)!WriteVolumeList(volume);
}
