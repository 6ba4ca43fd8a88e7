#include "client/log-query.h"

#include <numeric>
#include <utility>

#include "db/log-info.h"

namespace {

// The log gives only descriptions that are asked for by number. Beside those that we know, a later
// version may have written others, near them: they are numbered by subject, from 0, 100 and 1000.
// Not simply every number: sqlite takes 1000 of them at most, and each costs a little.
std::vector<int> Descriptions() {
    std::vector<int> ids(300);
    const auto thousands = ids.begin() + 200;
    std::iota(ids.begin(), thousands, 0);
    std::iota(thousands, ids.end(), 1000);
    return ids;
}

}  // namespace

LogQuery::LogQuery(Wish wish) : m_wish(std::move(wish)), m_keyword(m_wish.text) {}

bool LogQuery::Fits(const LogInfo& row) const {
    return (m_wish.task_id == 0 || row.task_id == m_wish.task_id) &&
           (m_wish.from_time == 0 || row.timestamp >= m_wish.from_time) &&
           (m_wish.to_time == 0 || row.timestamp <= m_wish.to_time) &&
           (m_wish.log_type == 0 || row.log_type == m_wish.log_type) && m_keyword.Fits(row);
}

LogFilter LogQuery::Filter() const {
    LogFilter filter = Everything();
    filter.task_id = m_wish.task_id;
    filter.from_time = m_wish.from_time;
    filter.to_time = m_wish.to_time;
    filter.keyword = m_keyword.PlainPart();
    filter.log_type = m_wish.log_type;
    return filter;
}

LogFilter LogQuery::Everything() {
    LogFilter filter;
    filter.description_ids = Descriptions();
    return filter;
}
