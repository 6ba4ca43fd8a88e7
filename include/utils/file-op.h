// The file layer: every access to users' files goes through these operations.
//
// Below a registered root (utils/confined-path.h) no operation follows a symbolic link, neither on
// the way nor at the end of a path: a link counts as itself, and a path that leads through one is
// not reached. Elsewhere the system's usual rules hold.
// Results are 0, or the negative codes of each operation, which callers turn into ErrorCode values.
// An empty path is refused everywhere. Failures are logged where they happen.
//
// Threads: no state and no locks; every operation may be called from any thread.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>

#include "utils/fs-info.h"
#include "utils/path-util.h"
#include "utils/per-device-value.h"
#include "utils/unique-fd.h"

class FileFilter;
class FileList;

// --- Asking ---

// lstat. 0, -1 on failure. A path that does not exist is a success with `exist` false, the present
// time, type 1 and size, uid and gid 0.
[[nodiscard]] int FSStatNoFollow(const std::string& path, FSInfo& info);
// 0; -1 for an empty path, -2 on failure. Test `exist` for existence.
[[nodiscard]] int FSStat(const std::string& path, FSInfo& info);
// Whether there is something under the path. Below a root a link counts, wherever it leads.
[[nodiscard]] bool FSExists(const std::string& path);

// --- Folders ---

constexpr uid_t FS_KEEP_UID = static_cast<uid_t>(-1);
constexpr gid_t FS_KEEP_GID = static_cast<gid_t>(-1);

// Makes a folder with mode 0777 and gives it to uid and gid. An existing folder is left as it is.
// 0; -1 for an empty path, something else in its place or a failed stat; -2 when making it fails.
[[nodiscard]] int FSMKDir(const std::string& path, bool recursive, uid_t uid, gid_t gid);
// Makes each missing folder of the path; only those it made change hands. 0, -1 on failure. Below a
// root the root itself has to be there: what is not mounted is not made.
[[nodiscard]] int FSMKDirP(const std::string& path, uid_t uid, gid_t gid);

constexpr uint32_t FS_DIR_STAT = 1u << 0;  // stat each entry

// An open folder.
struct FSDir {
    std::string path;
    uint32_t flags = 0;
    UniqueDir stream;
};

// 0; -1 with errno on failure.
[[nodiscard]] int FSOpenDir(const std::string& path, uint32_t flags, FSDir& handle);
// 1 for an entry ("." and ".." among them), 0 at the end, -1 on failure: the rest of the folder is
// then unknown. An entry that vanishes under way comes with the present time and size 0.
[[nodiscard]] int FSReadDir(FSDir& handle, FSDirEntry& entry);
void FSCloseDir(FSDir& handle);

// --- Changing ---

// Sets both times, in whole seconds. 0, -1 on failure.
[[nodiscard]] int FSUtime(const std::string& path, int64_t atime, int64_t mtime);
// Renames, over what is there; across file systems copies and removes, without time stamps.
// 0; -1 for an empty path, -2 when `from` is missing, -100 for a name too long, -3 for the rest.
// Across file systems links and special files stay where they are.
[[nodiscard]] int FSRename(const std::string& from, const std::string& to);
constexpr int FS_RENAME_NAME_TOO_LONG = -100;
// Copies the bytes and the permission bits, and flushes. 0; -1 on failure, -2 when the disk is
// full. With `remove_source` the source goes once the whole copy is on the disk.
[[nodiscard]] int CopyFile(const std::string& from, const std::string& to, bool remove_source);
// Removes a file, or a folder with all it holds, and the attributes that the platform keeps for
// each. Links are removed, never followed. 0, also when there is nothing; -1 for an empty path or a
// failed stat; -3 when something could not be removed: the rest is gone nevertheless.
[[nodiscard]] int FSRemove(const std::string& path);
// Flushes the file system that holds the path. 0, -1 on failure.
[[nodiscard]] int FSSyncFileSystem(const std::string& path);

// A new empty file with mode 0644, a new folder with mode 0777, under a fresh name in `dir`; `out`
// is its path. 0, -1 on failure.
[[nodiscard]] int FSMakeTempFile(const std::string& dir, std::string& out);
[[nodiscard]] int FSMakeTempDir(const std::string& dir, std::string& out, uid_t uid, gid_t gid);

// --- Walking ---

// A nonzero result ends the walk.
using FSWalkCallback = int (*)(const std::string& path, void* arg);
using FSWalkTypedCallback = int (*)(const std::string& full_path, bool is_dir, void* arg);

// Visits the folder `path`, and then all that it holds, a folder before its contents. Links are
// visited, not followed. 0; -1 when a folder cannot be read or `path` is none; -2 when ended.
[[nodiscard]] int FSWalk(const std::string& path, FSWalkCallback callback, void* arg);
// The same over one level: the folder itself and its entries.
[[nodiscard]] int FSWalkTyped(const std::string& path, FSWalkTypedCallback callback, void* arg);

constexpr unsigned FS_EACH_DIR_LAST = 1u << 0;  // a folder is added after its contents
constexpr unsigned FS_EACH_STAT = 1u << 1;      // fetch times and sizes

// Where FSForEachEntry() puts what it finds.
struct FSVisitor {
    FileList* list = nullptr;      // not owned
    int dir_index = 0;             // the folder of the list that takes the entries
    size_t prefix_length = 0;      // how much of a full path the filter does not see
    int worker_id = 0;             // for log lines
    FileFilter* filter = nullptr;  // not owned; may be null
};

constexpr int FS_EACH_ABORTED = -1;   // the abort flag was set
constexpr int FS_EACH_IO_ERROR = -2;  // a folder could not be listed to its end; equals ERR_IO

// Lists the regular files and folders in `path` that pass the filter; "@eaDir" and all other kinds
// are left out. A folder that is missing or cannot be there, no folder, behind a link or closed to
// us is an empty one; any other failure to open it is an I/O error, and so is a list without room.
// `abort_flag` may be null.
// 0, FS_EACH_ABORTED or FS_EACH_IO_ERROR; after these the list is not the whole folder.
[[nodiscard]] int FSForEachEntry(const std::string& path, const FSVisitor& visitor, unsigned flags,
                                 const std::atomic<int>* abort_flag, bool recursive);
// Whether the filter refuses the entry. It sees `full_path` from `prefix_length` on, or "/".
[[nodiscard]] bool IsIgnored(const FSDirEntry& entry, const std::string& full_path,
                             size_t prefix_length, FileFilter* filter);
