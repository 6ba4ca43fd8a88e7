#include "db/file-db.h"

#include <sqlite3.h>

#include "file-db-state.h"
#include "utils/log.h"

namespace {

int LogSchemaFailure(const std::string& path, int code, const char* message) {
    SLOG_ERR("Failed to create file db table at '%s'. [%d] %s", path.c_str(), code, message);
    return -1;
}

int GetRow(FileDBState* state, SqlQuery FileDBState::*statement, const std::string& path,
           FileInfo& info) {
    if (state == nullptr) return -1;
    SqlQuery& query = state->*statement;
    const StatementUse use(query);
    query.Bind(1, path);
    const int found = query.Step();
    if (found == 1) ReadFileInfo(query, info);
    return found;
}

void BindRow(SqlQuery& statement, const FileInfo& info) {
    statement.Bind(1, info.source_path);
    statement.Bind(2, info.destination_path);
    statement.Bind(3, int64_t{info.file_type});
    statement.Bind(4, static_cast<int64_t>(info.size));
    statement.Bind(5, int64_t{info.mtime});
}

int WriteRow(FileDBState& state, const FileInfo& info) {
    BindRow(state.insert_row, info);
    if (state.insert_row.Execute() < 0) return -1;
    if (sqlite3_changes(state.db) == 0) {  // the row is there
        BindRow(state.update_row, info);
        if (state.update_row.Execute() < 0) return -1;
        state.free_numbers.clear();  // its old name may have come free
    }
    if (info.file_type == FILE_INFO_FILE && state.unproven++ == 0) {
        state.unproven_since = std::chrono::steady_clock::now();
    }
    return 0;
}

}  // namespace

FileDB::FileDB() = default;

FileDB::~FileDB() { Close(); }

int FileDB::Init(const std::string& path) {
    const DbLock lock(m_mutex);
    if (m_state != nullptr) {
        SLOG_INFO("File DB has been inited");
        return 0;
    }
    const DatabaseOpenResult result = OpenDatabase(path, FILE_DB_SCHEMA);
    switch (result.failed_step) {
        case DatabaseOpenResult::OPEN:
            SLOG_ERR("Failed to create file db at '%s'. [%d] %s", path.c_str(), result.code,
                     result.message.c_str());
            return -1;
        case DatabaseOpenResult::SCHEMA:
            return LogSchemaFailure(path, result.code, result.message.c_str());
        case DatabaseOpenResult::DONE:
            break;
    }
    auto state = std::make_unique<FileDBState>(result.db);
    if (state->Prepare() < 0) {
        LogSchemaFailure(path, sqlite3_errcode(result.db), sqlite3_errmsg(result.db));
        state.reset();
        sqlite3_close_v2(result.db);
        return -1;
    }
    m_state = std::move(state);
    SLOG_INFO("File db is initialized successfully at location '%s'", path.c_str());
    return 0;
}

void FileDB::Close() {
    const DbLock lock(m_mutex);
    if (m_state == nullptr) return;
    static_cast<void>(m_state->EndBatch());
    sqlite3* const db = m_state->db;
    m_state.reset();  // the statements before their connection
    if (const int code = sqlite3_close_v2(db); code != SQLITE_OK) {
        SLOG_ERR("File db cannot be closed. [%d] at <%p>", code, static_cast<void*>(db));
    }
}

int FileDB::SetFileInfoBySourcePath(const FileInfo& info) {
    const DbLock lock(m_mutex);
    if (m_state == nullptr || m_state->Begin() < 0) return -1;
    return m_state->End(WriteRow(*m_state, info));
}

int FileDB::SetFileInfoInBatch(const FileInfo& info) {
    const DbLock lock(m_mutex);
    if (m_state == nullptr || m_state->BeginInBatch() < 0) return -1;
    return m_state->EndInBatch(WriteRow(*m_state, info));
}

int FileDB::EndBatch() {
    const DbLock lock(m_mutex);
    return m_state == nullptr ? -1 : m_state->EndBatch();
}

int FileDB::GetFileInfoBySourcePath(const std::string& path, FileInfo& info) {
    const DbLock lock(m_mutex);
    return GetRow(m_state.get(), &FileDBState::row_by_source, path, info);
}

int FileDB::GetFileInfoByDestinationPath(const std::string& path, FileInfo& info) {
    const DbLock lock(m_mutex);
    return GetRow(m_state.get(), &FileDBState::row_by_destination, path, info);
}

int FileDB::RemoveFileInfoBySourcePath(const std::string& path) {
    if (path.empty()) {
        SLOG_ERR("RemoveFileInfoBySourcePath: src_path is empty");
        return -1;
    }
    const DbLock lock(m_mutex);
    return m_state == nullptr ? -1 : m_state->RemoveRows(path);
}

int FileDB::DstPathFormatChanged(const std::string& src, const std::string& dst, bool& changed) {
    FileInfo info;
    const int found = GetFileInfoBySourcePath(src, info);
    if (found < 0) return -1;
    changed = found == 0 || !IsVariant(info.destination_path, dst);
    return 0;
}
