#include "client/log-tail.h"

#include <algorithm>

#include "client/log-query.h"

namespace {

bool AreEqual(const LogInfo& left, const LogInfo& right) {
    return left.task_id == right.task_id && left.log_type == right.log_type &&
           left.timestamp == right.timestamp && left.description_id == right.description_id &&
           left.description_param == right.description_param && left.error == right.error;
}

// The first row of another second than the newest; the end when there is none.
auto Boundary(const std::vector<LogInfo>& rows) {
    return std::ranges::find_if(
        rows, [&rows](const LogInfo& row) { return row.timestamp != rows.front().timestamp; });
}

}  // namespace

bool LogTail::LongEnough(const std::vector<LogInfo>& rows) { return Boundary(rows) != rows.end(); }

void LogTail::Begin(const NewestRows& newest) {
    const auto boundary = Boundary(newest.rows);
    m_has_seen_all = boundary == newest.rows.end();
    m_seen.assign(newest.rows.begin(), m_has_seen_all ? boundary : boundary + 1);
}

// Where the log ends before the remembered rows do, the rest of them was rotated away. Where they
// end, so does the log if they were all of it.
bool LogTail::IsAt(const std::vector<LogInfo>& rows, bool are_all, size_t place) const {
    const size_t left = rows.size() - place;
    if (left < m_seen.size() && !are_all) return false;
    if (left > m_seen.size() && m_has_seen_all) return false;
    if (left == m_seen.size() && m_has_seen_all && !are_all) return false;
    const auto from = rows.begin() + static_cast<std::ptrdiff_t>(place);
    const auto common = static_cast<std::ptrdiff_t>(std::min(left, m_seen.size()));
    return std::equal(from, from + common, m_seen.begin(), AreEqual);
}

size_t LogTail::Find(const std::vector<LogInfo>& rows, bool are_all) const {
    size_t place = 0;
    while (place < rows.size() && !IsAt(rows, are_all, place)) ++place;
    return place;
}

std::vector<LogInfo> LogTail::NewRows(LogDB& db) {
    NewestRows newest =
        ReadNewest(db, LogQuery::Everything(), [this](const std::vector<LogInfo>& rows) {
            return LongEnough(rows) && Find(rows, false) < rows.size();
        });
    const size_t place = Find(newest.rows, newest.are_all);
    Begin(newest);
    newest.rows.resize(place);
    return std::move(newest.rows);
}
