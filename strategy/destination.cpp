#include "strategy/destination.h"

#include "strategy/conflict-rename.h"
#include "strategy/recycle-bin.h"
#include "strategy/root-check.h"
#include "utils/error-code.h"
#include "utils/file-op.h"
#include "utils/file-proof.h"
#include "utils/log.h"

namespace {

bool HasEntry(const std::string& folder, const std::string& name) {
    FSDir dir;
    if (FSOpenDir(folder, 0, dir) < 0) return false;
    FSDirEntry entry;
    while (FSReadDir(dir, entry) == 1) {
        if (entry.name == name) return true;
    }
    return false;
}

}  // namespace

int RenameConflict(const std::string& path, const char* reason, int code) {
    // The codes of a failed rename are negative: it goes the way of a successful one, and the next
    // attempt meets the same conflict again.
    if (ConflictRename(path, "Ferrix", reason) > 0) {
        SLOG_ERR("Failed to rename file '%s', should retry.", path.c_str());
        return ERR_SYSTEM;
    }
    SLOG_INFO("Rename Destination file success, try copy again");
    return code;
}

int ClearTypeConflict(const TaskRunInfo& task, const std::string& path, bool is_dir,
                      bool is_overwrite) {
    SLOG_INFO("File '%s' conflict, apply conflict policy %s", path.c_str(),
              is_overwrite ? "OVERWRITE" : "RENAME");
    if (!is_overwrite) return RenameConflict(path, "TypeConflict", ERR_DST_TYPE_CONFLICT);
    if (const int result = CheckTaskRoots(task); result < 0) return result;
    // Not looked at: what is still in the way shows when the event runs again.
    static_cast<void>(RecycleBin().RemoveFile(path, is_dir));
    SLOG_INFO("Conflict Policy is overwrite, remove '%s', try copy again.", path.c_str());
    return ERR_DST_TYPE_CONFLICT;
}

int RespellEntry(const std::string& from, const std::string& to) {
    FileIdentity entry;
    if (entry.Take(from) < 0) return -1;
    // Where each spelling has an inode number of its own, the file system sees two names. Where
    // they share one, the system takes a rename to the same file for done: it needs a name between.
    if (!entry.IsAt(to)) return FSRename(from, to) == 0 ? 0 : -1;
    const std::string between = PathDirName(to) + "/.ferrix-respelled";
    if (FSExists(between) || FSRename(from, between) < 0) return -1;
    if (FSRename(between, to) == 0) return 0;
    if (FSRename(between, from) < 0) SLOG_ERR("'%s' is now '%s'", from.c_str(), between.c_str());
    return -1;
}

bool IsSpelledOtherwise(const std::string& root, const std::string& path) {
    if (!FSExists(path)) return false;
    for (std::string at = path; at.size() > root.size(); at = PathDirName(at)) {
        if (!HasEntry(PathDirName(at), PathBaseName(at))) return true;
    }
    return false;
}
