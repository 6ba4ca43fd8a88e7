// Lists from the rows of a file database.
#include <string_view>

#include "db/file-db.h"
#include "file-db-state.h"
#include "utils/file-list.h"
#include "utils/log.h"
#include "utils/path-util.h"

namespace {

// Adds a row by its path below the listed folder. An entry of that folder itself needs no search
// for the folder that it lies in.
int Add(const FileInfo& info, const std::string& path, bool is_entry, FileList& list) {
    const bool is_dir = info.file_type == FILE_INFO_DIR;
    if (!is_entry) {
        return is_dir ? list.AddDirByPath(path, info.mtime)
                      : list.AddFileByPath(path, info.mtime, info.size);
    }
    const std::string_view name = std::string_view(path).substr(path.starts_with('/') ? 1 : 0);
    if (name.empty()) return -1;
    return is_dir ? list.AddDir(FileList::ROOT, name, info.mtime)
                  : list.AddFile(FileList::ROOT, name, info.mtime, info.size);
}

void AddRow(const FileInfo& info, size_t cut, bool is_entry, FileList& list) {
    const std::string path = info.source_path.substr(cut);
    if (info.file_type == FILE_INFO_DIR) {
        SLOG_DBG("adding directory to file list: %s", path.c_str());
    } else {
        SLOG_DBG("adding file to file list: %s", path.c_str());
    }
    // It counts as an entry that is not known.
    if (Add(info, path, is_entry, list) < 0) {
        SLOG_WARN("Failed to add '%s' to file list", info.source_path.c_str());
    }
}

// Where the names go on after everything below the sub-folder that `path` lies in; empty for an
// entry of the folder itself.
std::string NextName(const std::string& path, size_t prefix_length) {
    const size_t slash = path.find('/', prefix_length);
    return slash == std::string::npos ? std::string() : EndOfPrefix(path.substr(0, slash + 1));
}

}  // namespace

int FileDB::GetFileListBySourcePath(const std::string& path, bool recursive, FileList& list) {
    const std::string prefix = path == "/" ? path : path + "/";
    const size_t cut = path == "/" ? 0 : prefix.size();
    const std::string end = EndOfPrefix(prefix);
    const DbLock lock(m_mutex);
    if (m_state == nullptr || m_state->ForgetIfOwed() < 0) return -1;
    SqlQuery& query = m_state->rows_in_range;
    const StatementUse use(query);
    std::string start = prefix;
    query.Bind(1, start);
    query.Bind(2, end);
    FileInfo info;
    for (;;) {
        const int found = query.Step();
        if (found != 1) return found;
        ReadFileInfo(query, info);
        const std::string next =
            recursive ? std::string() : NextName(info.source_path, prefix.size());
        if (next.empty()) {
            AddRow(info, cut, !recursive, list);
            continue;
        }
        // Over all that lies below the sub-folder, with one look into the index.
        query.Reset();
        start = next;
        query.Bind(1, start);
        query.Bind(2, end);
    }
}
