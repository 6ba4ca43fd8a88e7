#include "client/log-reader.h"

#include <algorithm>
#include <limits>

#include "client/exit-status.h"
#include "client/log-query.h"

NewestRows ReadNewest(LogDB& db, LogFilter filter,
                      const std::function<bool(const std::vector<LogInfo>&)>& is_enough) {
    constexpr uint32_t FIRST_LIMIT = 256;
    constexpr uint32_t GROWTH = 8;
    // Each look begins anew: with an offset, rows that are added meanwhile would be met twice.
    for (filter.limit = FIRST_LIMIT;;) {
        NewestRows found;
        if (db.ListLogInfo(filter, found.rows) < 0) {
            throw CommandError(EXIT_REFUSED, "the log cannot be read");
        }
        found.are_all = filter.limit == 0 || found.rows.size() < filter.limit;
        if (found.are_all || is_enough(found.rows)) return found;
        const bool is_last = filter.limit > std::numeric_limits<uint32_t>::max() / GROWTH;
        filter.limit = is_last ? 0 : filter.limit * GROWTH;
    }
}

std::vector<LogInfo> FittingRows(const std::vector<LogInfo>& newest_first, const LogQuery& query,
                                 uint32_t limit) {
    std::vector<LogInfo> fitting;
    for (const LogInfo& row : newest_first) {
        if (limit != 0 && fitting.size() == limit) break;
        if (query.Fits(row)) fitting.push_back(row);
    }
    std::ranges::reverse(fitting);
    return fitting;
}

bool HoldEnough(const std::vector<LogInfo>& rows, const LogQuery& query, uint32_t limit) {
    return limit != 0 && std::ranges::count_if(rows, [&query](const LogInfo& row) {
                             return query.Fits(row);
                         }) >= static_cast<int64_t>(limit);
}

std::vector<LogInfo> ReadLog(LogDB& db, const LogQuery& query, uint32_t limit) {
    const NewestRows newest =
        ReadNewest(db, query.Filter(), [&query, limit](const std::vector<LogInfo>& rows) {
            return HoldEnough(rows, query, limit);
        });
    return FittingRows(newest.rows, query, limit);
}
