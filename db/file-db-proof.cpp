// Which rows of a file database are unproven: no flush of the destination has covered their files.
//
// The order of the writes is what counts. A row and its note come in one transaction; the note is
// struck out in a later one, after the flush. A power cut takes away the end of what was written:
// then the row may be lost, or the striking out, which loses the row too. It cannot happen that the
// row stays without the note and without the file.
#include <utility>

#include "db/file-db.h"
#include "file-db-state.h"

namespace {

int CountUnproven(FileDBState& state) {
    const StatementUse use(state.unproven_count);
    if (state.unproven_count.Step() != 1) return -1;
    state.unproven = state.unproven_count.UInt64(0);
    state.unproven_since = std::chrono::steady_clock::now();
    return 0;
}

int Doubt(FileDBState& state, const std::string& source_path) {
    state.doubt_forget.Bind(1, source_path);
    if (state.doubt_forget.Execute() < 0) return -1;
    state.doubt_add.Bind(1, source_path);
    return state.doubt_add.Execute();
}

}  // namespace

int FileDB::DoubtFileInfo(const std::string& source_path) {
    const DbLock lock(m_mutex);
    if (m_state == nullptr) return -1;
    // Before the file is touched.
    const int result = m_state->BeginDurable() < 0 ? -1 : Doubt(*m_state, source_path);
    return m_state->EndDurable(result);
}

int FileDB::GetUnprovenMark(int64_t& mark) {
    const DbLock lock(m_mutex);
    if (m_state == nullptr || m_state->ForgetIfOwed() < 0) return -1;
    static_cast<void>(m_state->EndBatch());  // TakeRowLoss() tells; the other rows can be proven
    mark = 0;
    {
        const StatementUse use(m_state->unproven_mark);
        const int found = m_state->unproven_mark.Step();
        if (found != 1) return found;
        mark = m_state->unproven_mark.Int64(0);
    }
    return ExecSql(m_state->db, "UPDATE flush_table SET flush = flush + 1;");
}

int FileDB::ProveFileInfo(int64_t mark) {
    const DbLock lock(m_mutex);
    if (m_state == nullptr || m_state->ForgetIfOwed() < 0 || m_state->EndBatch() < 0) return -1;
    m_state->prove.Bind(1, mark);
    return m_state->prove.Execute() < 0 ? -1 : CountUnproven(*m_state);
}

int FileDB::ForgetUnproven() {
    const DbLock lock(m_mutex);
    if (m_state == nullptr) return -1;
    m_state->has_flush_failed = true;
    m_state->must_forget = true;  // stays until it is done: a later good flush says nothing
    return m_state->ForgetIfOwed();
}

bool FileDB::TakeFlushFailure() {
    const DbLock lock(m_mutex);
    return m_state != nullptr && std::exchange(m_state->has_flush_failed, false);
}

bool FileDB::TakeRowLoss() {
    const DbLock lock(m_mutex);
    return m_state != nullptr && std::exchange(m_state->has_lost_rows, false);
}

uint64_t FileDB::UnprovenCount() {
    const DbLock lock(m_mutex);
    return m_state == nullptr ? 0 : m_state->unproven;
}

int64_t FileDB::UnprovenSeconds() {
    const DbLock lock(m_mutex);
    if (m_state == nullptr || m_state->unproven == 0) return 0;
    const auto age = std::chrono::steady_clock::now() - m_state->unproven_since;
    return std::chrono::duration_cast<std::chrono::seconds>(age).count();
}
