// The names that a file database has given away at the destination.
#include <sqlite3.h>

#include <algorithm>
#include <vector>

#include "db/file-db.h"
#include "file-db-state.h"
#include "utils/path-util.h"

namespace {

// How many names are remembered; with more, all are forgotten and looked up again.
constexpr size_t kFreeNumbers = 4096;
constexpr size_t kMaxDigits = 19;  // of a number that fits

int IsTaken(FileDBState& state, const std::string& path) {
    const StatementUse use(state.is_taken);
    state.is_taken.Bind(1, path);
    return state.is_taken.Step();
}

std::string TailOf(const std::string& extension) {
    return extension.empty() ? ")" : ")." + extension;
}

int AddMoved(FileDBState& state, const FileInfo& info) {
    if (state.RemoveRows(info.source_path) < 0) return -1;
    SqlQuery& query = state.add_moved;
    query.Bind(1, info.source_path);
    query.Bind(2, info.destination_path);
    query.Bind(3, static_cast<int64_t>(info.size));
    query.Bind(4, int64_t{info.mtime});
    return query.Execute();
}

// The number of a name that NumberedPath() would give, 0 for any other.
uint64_t NumberOf(const std::string& path, size_t start, const std::string& tail) {
    uint64_t number = 0;
    size_t at = start;
    for (; at < path.size() && path[at] >= '0' && path[at] <= '9'; ++at) {
        if (at - start >= kMaxDigits) return 0;
        number = number * 10 + static_cast<uint64_t>(path[at] - '0');
    }
    const bool is_plain = at > start && path[start] != '0';
    return is_plain && path.compare(at, std::string::npos, tail) == 0 ? number : 0;
}

// The lowest number that no name has, from one look at all of them. 0 or -1.
int FindFreeNumber(FileDBState& state, const std::string& stem, const std::string& extension,
                   uint64_t& number) {
    const std::string start = stem + " (";
    const std::string end = EndOfPrefix(start);
    const std::string tail = TailOf(extension);
    std::vector<uint64_t> taken;
    const StatementUse use(state.numbered);
    state.numbered.Bind(1, start);
    state.numbered.Bind(2, end);
    int found = 0;
    while ((found = state.numbered.Step()) == 1) {
        if (const uint64_t n = NumberOf(state.numbered.Text(0), start.size(), tail); n != 0) {
            taken.push_back(n);
        }
    }
    std::sort(taken.begin(), taken.end());
    number = 1;
    for (const uint64_t n : taken) {
        if (n == number) ++number;
    }
    return found;
}

}  // namespace

std::string FileDB::EscapeGlob(const std::string& text) {
    std::string pattern;
    pattern.reserve(text.size());
    for (const char c : text) {
        if (c == '*' || c == '?' || c == '[') {
            pattern += {'[', c, ']'};
        } else {
            pattern += c;
        }
    }
    return pattern;
}

bool FileDB::IsVariant(const std::string& path, const std::string& wanted) {
    if (path == wanted) return true;
    const std::string extension = PathExtension(wanted);
    std::string pattern = EscapeGlob(PathStem(wanted)) + " (*)";
    if (!extension.empty()) pattern += "." + EscapeGlob(extension);
    return sqlite3_strglob(pattern.c_str(), path.c_str()) == 0;
}

std::string FileDB::NumberedPath(const std::string& stem, const std::string& extension,
                                 uint64_t number) {
    return stem + " (" + std::to_string(number) + TailOf(extension);
}

int FileDB::AddMovedFile(const FileInfo& info) {
    const DbLock lock(m_mutex);
    if (m_state == nullptr) return -1;
    m_state->has_moved_files = true;
    const int result = m_state->BeginDurable() < 0 ? -1 : AddMoved(*m_state, info);
    return m_state->EndDurable(result);
}

int FileDB::GetMovedFile(FileInfo& info) {
    const DbLock lock(m_mutex);
    if (m_state == nullptr) return -1;
    if (!m_state->has_moved_files) return 0;
    SqlQuery& query = m_state->get_moved;
    const StatementUse use(query);
    query.Bind(1, info.source_path);
    query.Bind(2, static_cast<int64_t>(info.size));
    query.Bind(3, int64_t{info.mtime});
    const int found = query.Step();
    if (found == 1) info.destination_path = query.Text(0);
    return found;
}

int FileDB::ForgetMovedFiles() {
    const DbLock lock(m_mutex);
    if (m_state == nullptr || m_state->EndBatch() < 0) return -1;
    m_state->free_numbers.clear();
    const int result = ExecSql(m_state->db, "DELETE FROM moved_table;");
    if (result == 0) m_state->has_moved_files = false;
    return result;
}

int FileDB::IsDestinationTaken(const std::string& path) {
    const DbLock lock(m_mutex);
    return m_state == nullptr ? -1 : IsTaken(*m_state, path);
}

int FileDB::GetFreeNumber(const std::string& stem, const std::string& extension, uint64_t& number) {
    const DbLock lock(m_mutex);
    if (m_state == nullptr) return -1;
    auto& free_numbers = m_state->free_numbers;
    const std::string key = stem + '\0' + extension;
    auto known = free_numbers.find(key);
    if (known == free_numbers.end()) {
        uint64_t lowest = 0;
        if (FindFreeNumber(*m_state, stem, extension, lowest) < 0) return -1;
        if (free_numbers.size() >= kFreeNumbers) free_numbers.clear();
        known = free_numbers.emplace(key, lowest).first;
    }
    // Names are given away one after the other: mostly the first look finds it.
    for (;; ++known->second) {
        const int taken = IsTaken(*m_state, NumberedPath(stem, extension, known->second));
        if (taken < 0) return -1;
        if (taken == 0) break;
    }
    number = known->second;
    return 0;
}
