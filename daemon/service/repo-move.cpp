#include "service/repo-move.h"

#include <sys/stat.h>

#include "platform/sdk-service.h"
#include "service/repository.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

constexpr char CP[] = "/bin/cp";
constexpr char MV[] = "/bin/mv";
constexpr char RM[] = "/bin/rm";

bool IsFolder(const std::string& path) {
    struct stat info = {};
    return stat(path.c_str(), &info) == 0 && S_ISDIR(info.st_mode);
}

std::string ScratchPath(const std::string& volume) { return volume + "/@tmp"; }

// Makes sure that there is a folder for `path`, and nothing under that name: the programs would put
// what they move into a folder that they find there.
bool ClearPlace(const std::string& path) {
    return FSRemove(path) == 0 && FSMKDirP(PathDirName(path), FS_KEEP_UID, FS_KEEP_GID) == 0;
}

void RemoveInBackground(const std::string& path) {
    if (SDK::StartProgram(RM, {"-rf", path}) == 0) return;
    SLOG_ERR("%s:%d FAIL: rm -rf %s", __FILE__, __LINE__, path.c_str());
}

// The copy is on the disk when this is true: all that follows builds on it.
bool Copy(const std::string& source, const std::string& staging, const std::string& volume) {
    if (!IsFolder(volume) || !ClearPlace(staging)) return false;
    return SDK::RunProgram(CP, {"-rf", source, staging}) == 0 && FSSyncFileSystem(volume) == 0;
}

// A repository of former times, perhaps with tasks that nothing else knows: it is not thrown away.
bool SetAside(const std::string& target, const std::string& volume) {
    if (!FSExists(target)) return true;
    const std::string aside = ScratchPath(volume) + "/@Ferrix.replaced";
    if (!ClearPlace(aside) || FSRename(target, aside) < 0) return false;
    SLOG_NOTICE("The repository '%s' is kept as '%s'\n", target.c_str(), aside.c_str());
    return true;
}

bool Move(const std::string& from, const std::string& to) {
    if (SDK::RunProgram(MV, {from, to}) == 0) return true;
    SLOG_ERR("%s:%d FAIL: mv %s %s", __FILE__, __LINE__, from.c_str(), to.c_str());
    return false;
}

}  // namespace

bool MoveRepoData(const std::string& from, const std::string& to) {
    const std::string source = RepositoryPath(from);
    const std::string old_copy = RepositoryPath(ScratchPath(from));
    const std::string target = RepositoryPath(to);
    const std::string staging = RepositoryPath(ScratchPath(to));
    if (!Copy(source, staging, to)) {
        RemoveInBackground(staging);
        SLOG_ERR("%s:%d FAIL: cp -rf %s %s", __FILE__, __LINE__, source.c_str(), staging.c_str());
        return false;
    }
    if (!SetAside(target, to)) {
        SLOG_ERR("%s:%d FAIL: mv %s %s", __FILE__, __LINE__, staging.c_str(), target.c_str());
        return false;
    }
    if (!Move(staging, target) || FSSyncFileSystem(to) < 0 || RegisterVolume(to) < 0) {
        (void)!RegisterVolume(from);
        return false;
    }
    if (!ClearPlace(old_copy) || !Move(source, old_copy)) {
        // Both are whole; the one that stays in use is the one that the caller knows.
        (void)!RegisterVolume(from);
        return false;
    }
    RemoveInBackground(old_copy);
    return true;
}
