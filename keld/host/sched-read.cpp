#include "host/sched-read.h"

#include <json/value.h>
#include <json/writer.h>
#include <keld/error.h>

#include "host/sched-entry.h"
#include "host/sched-store.h"

namespace keld_host {
namespace {

struct KeyRow {
    const char* stored;
    const char* ofClient;
};
constexpr KeyRow KEYS[] = {
    {"min",       "minute"     },
    {"week_name", "week_day"   },
    {"repeat",    "repeat_date"},
};

std::string ForClients(Json::Value timetable) {
    for (const KeyRow& row : KEYS) {
        Json::Value value;
        if (timetable.removeMember(row.stored, &value)) timetable[row.ofClient] = value;
    }
    Json::StreamWriterBuilder builder;
    builder["indentation"] = "";
    return Json::writeString(builder, timetable);
}

}  // namespace

int ReadSchedule(int64_t id, SchedReading& reading) {
    // An id that is cut to an int would be that of another entry.
    if (id != static_cast<int>(id)) return KELDERR_SRC_MISS;
    SchedEntry entry;
    if (const int error = LoadSchedEntry(static_cast<int>(id), &entry); error != KELDERR_SUCCESS) {
        return error;
    }
    reading.isEnabled = entry.Number(SCHED_STATE) != 0;
    reading.json =
        ForClients(entry.Schedule() ? entry.Schedule()->ToJson() : Json::Value(Json::objectValue));
    return KELDERR_SUCCESS;
}

}  // namespace keld_host
