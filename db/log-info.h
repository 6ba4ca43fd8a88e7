// One row of the log database, filled in by whoever reports an event:
//
//     LogInfo log;
//     log.SetTaskId(task_id);
//     log.SetDescription(LogDescription::LOG_DESC_TASK_RENAMED, old_name, new_name);
//     if (AddLog(log) < 0) ...                     // db/log-wrapper.h
//
// A plain value; not thread-safe.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>

#include "db/log-description.h"

class LogInfo {
public:
    uint64_t task_id = 0;
    int log_type = 0;               // LogDB::LOG_TYPE
    uint32_t timestamp = 0;         // seconds since the epoch; AddLog() sets it
    int description_id = 0;         // LogDescription::ID
    std::string description_param;  // a JSON array of strings
    int error = 0;                  // outcome code, 0 when none

    // Back to all zero and an empty text.
    void Clear();
    void SetTaskId(uint64_t id) { task_id = id; }
    void SetError(int code) { error = code; }

    // Sets the id, the log type that belongs to it and the parameters, texts of any kind (a name
    // may hold any bytes; what is no UTF-8 is stored as U+FFFD). As many parameters as the id takes
    // are read, further ones are not looked at. Returns 0, or -1 with an unchanged record when the
    // id is unknown or a parameter is missing; AddLog() refuses a record without a description.
    template <typename... Texts>
    int SetDescription(LogDescription::ID id, const Texts&... parameters) {
        return SetDescriptionTexts(id, {std::string_view(parameters)...});
    }

private:
    int SetDescriptionTexts(LogDescription::ID id, std::initializer_list<std::string_view> texts);
};
