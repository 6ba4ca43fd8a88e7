// Reads rows of the log. EXIT_REFUSED (CommandError) when it cannot be read.
#pragma once

#include <cstdint>
#include <functional>
#include <vector>

#include "db/log-info.h"

class LogDB;
class LogQuery;
struct LogFilter;

// The newest rows that a filter selects, newest first, as one look at the log finds them: at least
// so many that `is_enough` is true for them, or all. `is_enough` is asked about longer and longer
// lists.
struct NewestRows {
    std::vector<LogInfo> rows;
    bool are_all = false;
};
[[nodiscard]] NewestRows ReadNewest(
    LogDB& db, LogFilter filter, const std::function<bool(const std::vector<LogInfo>&)>& is_enough);

// Those of the rows, which come newest first, that fit: the newest `limit` of them (0: all), oldest
// first.
[[nodiscard]] std::vector<LogInfo> FittingRows(const std::vector<LogInfo>& newest_first,
                                               const LogQuery& query, uint32_t limit);
// The same out of the whole log.
[[nodiscard]] std::vector<LogInfo> ReadLog(LogDB& db, const LogQuery& query, uint32_t limit);
// True when the rows hold `limit` rows that fit; never for the limit 0.
[[nodiscard]] bool HoldEnough(const std::vector<LogInfo>& rows, const LogQuery& query,
                              uint32_t limit);
