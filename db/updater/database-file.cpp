#include "updater/database-file.h"

#include <fcntl.h>
#include <sqlite3.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>

#include "db/side-files.h"
#include "updater/database-connection.h"
#include "utils/file-op.h"
#include "utils/log.h"

namespace {

int RenameToFreePlace(const char* from, const char* to) {
    if (renameat2(AT_FDCWD, from, AT_FDCWD, to, RENAME_NOREPLACE) == 0) return 0;
    // An older kernel, or a file system that cannot do it.
    if ((errno != ENOSYS && errno != EINVAL) || !IsMissing(to)) return -1;
    return rename(from, to);
}

int Move(const std::string& from, const std::string& to, Place place) {
    if (place == Place::TAKEN) return FSRename(from, to) < 0 ? -1 : 0;
    if (RenameToFreePlace(from.c_str(), to.c_str()) == 0) return 0;
    SLOG_ERR("'%s' cannot become '%s': %s (%d)\n", from.c_str(), to.c_str(), std::strerror(errno),
             errno);
    return -1;
}

int SyncFolderOf(const std::string& path) {
    const UniqueFd folder(open(PathDirName(path).c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
    return folder.IsValid() && fsync(folder.Get()) == 0 ? 0 : -1;
}

// Reading comes first: it is what rolls a journal back. A write-ahead log is written into the file
// and removed when the journal's mode is changed.
constexpr char GATHER[] = "SELECT COUNT(*) FROM sqlite_master; PRAGMA journal_mode = DELETE;";

}  // namespace

int MakeSingleFile(const std::string& path) {
    {
        DatabaseConnection connection;
        if (connection.Open(path, SQLITE_OPEN_READWRITE) < 0) return -1;
        if (connection.RunScript(GATHER) < 0) return -1;
    }
    if (IsSingleFile(path)) return 0;
    SLOG_ERR("The journal of '%s' cannot be taken in\n", path.c_str());
    return -1;
}

int PutInPlace(const std::string& from, const std::string& to, Place place, bool& is_moved) {
    is_moved = false;
    if (!IsSingleFile(from) || !IsSingleFile(to)) {
        SLOG_ERR("A journal lies beside '%s' or '%s'\n", from.c_str(), to.c_str());
        return -1;
    }
    if (Move(from, to, place) < 0) return -1;
    is_moved = true;
    if (SyncFolderOf(to) == 0) return 0;
    SLOG_ERR("The folder of '%s' cannot be flushed: %s (%d)\n", to.c_str(), std::strerror(errno),
             errno);
    return -1;
}

DatabaseCopy::DatabaseCopy(std::string original, unsigned version)
    : m_original(std::move(original)), m_copy(m_original + ".bkp_v" + std::to_string(version)) {}

DatabaseCopy::~DatabaseCopy() { (void)!RemoveDatabase(m_copy); }

int DatabaseCopy::Make() {
    if (RemoveDatabase(m_copy) < 0 || MakeSingleFile(m_original) < 0) return -1;
    return CopyFile(m_original, m_copy, false) < 0 ? -1 : 0;
}

int DatabaseCopy::ReplaceOriginal() {
    if (MakeSingleFile(m_copy) < 0) return -1;
    return PutInPlace(m_copy, m_original, Place::TAKEN, m_has_replaced);
}
