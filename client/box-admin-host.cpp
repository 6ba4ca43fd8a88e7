// The box is plain Linux: shares stand in host.conf or are folders, timetables in our own store.
#include "client/box-admin.h"
#include "client/exit-status.h"
#include "client/text.h"
#include "host/sched-read.h"
#include "host/share-admin.h"
#include "platform/json-util.h"

namespace {

std::string Expect(const keld_host::ShareOutcome& outcome) {
    if (outcome.IsDone()) return outcome.text;
    const bool is_wrong = outcome.kind == keld_host::ShareOutcome::WRONG_REQUEST;
    throw CommandError(is_wrong ? EXIT_USAGE : EXIT_REFUSED, Printable(outcome.text));
}

}  // namespace

void CheckShares() { Expect(keld_host::CheckShareConf()); }

std::string AddShare(const std::string& name_or_path) {
    return Expect(keld_host::AddShare(name_or_path));
}

std::string RemoveShare(const std::string& name) { return Expect(keld_host::RemoveShare(name)); }

void CheckRemoveShare(const std::string& name) { Expect(keld_host::CheckRemoveShare(name)); }

std::string RenameShare(const std::string& name, const std::string& new_name) {
    return Expect(keld_host::RenameShare(name, new_name));
}

void CheckRenameShare(const std::string& name, const std::string& new_name) {
    Expect(keld_host::CheckRenameShare(name, new_name));
}

std::optional<Timetable> ReadTimetable(int64_t schedule_id) {
    keld_host::SchedReading reading;
    Timetable timetable;
    if (keld_host::ReadSchedule(schedule_id, reading) != 0 ||
        ParseJson(reading.json, timetable.schedule) < 0) {
        return std::nullopt;
    }
    timetable.is_enabled = reading.isEnabled;
    return timetable;
}
