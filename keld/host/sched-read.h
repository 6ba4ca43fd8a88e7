// Reading a timetable back in the form that clients of the daemon send, for the box's control
// programs; the daemon calls none of it. Threads: any.
#pragma once

#include <cstdint>
#include <string>

namespace keld_host {

struct SchedReading {
    bool isEnabled = false;
    // A JSON object in one line, "{}" for an entry without a timetable. Its members are those that
    // KELDSchedTaskConvertFromJson_Schedule takes, three under the clients' own names: "minute",
    // "week_day" and "repeat_date".
    std::string json;
};

// The stored entry with this id. 0, or a KELDERR value with `reading` unchanged: KELDERR_SRC_MISS
// when there is none, KELDERR_IO when it is damaged.
[[nodiscard]] int ReadSchedule(int64_t id, SchedReading& reading);

}  // namespace keld_host
