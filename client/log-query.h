// What a person wants to see of the log.
#pragma once

#include <cstdint>
#include <string>

#include "client/log-keyword.h"
#include "db/log-db.h"

class LogInfo;

class LogQuery {
public:
    struct Wish {
        uint64_t task_id = 0;    // 0: any
        uint32_t from_time = 0;  // seconds since the epoch, both included; 0: open
        uint32_t to_time = 0;
        int log_type = 0;    // LogDB::LOG_TYPE; 0: any
        std::string text{};  // client/log-keyword.h
    };

    // EXIT_USAGE (CommandError) for a text that no name can hold.
    explicit LogQuery(Wish wish);

    [[nodiscard]] bool Fits(const LogInfo& row) const;
    // Selects all rows that fit, and with a text perhaps others; without a limit.
    [[nodiscard]] LogFilter Filter() const;
    // Selects every row.
    [[nodiscard]] static LogFilter Everything();

private:
    Wish m_wish;
    LogKeyword m_keyword;
};
