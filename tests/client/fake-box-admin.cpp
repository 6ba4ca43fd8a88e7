#include "client/fake-box-admin.h"

#include "client/box-admin.h"

namespace {

void Note(const std::string& what) {
    if (FakeBoxAdmin::Get().on_call) FakeBoxAdmin::Get().on_call(what);
}

}  // namespace

FakeBoxAdmin& FakeBoxAdmin::Get() {
    static FakeBoxAdmin fake;
    return fake;
}

FakeBoxAdmin& FakeBoxAdmin::Reset() { return Get() = {}; }

void CheckShares() { Note("check shares"); }

std::string AddShare(const std::string& name_or_path) {
    Note("add " + name_or_path);
    return "/volume1/" + name_or_path;
}

std::string RemoveShare(const std::string& name) {
    Note("remove " + name);
    return "/volume1/" + name;
}

void CheckRemoveShare(const std::string& name) { Note("check remove " + name); }

std::string RenameShare(const std::string& name, const std::string& new_name) {
    Note("rename " + name + " " + new_name);
    return "/volume1/" + new_name;
}

void CheckRenameShare(const std::string& name, const std::string& new_name) {
    Note("check rename " + name + " " + new_name);
}

std::optional<Timetable> ReadTimetable(int64_t schedule_id) {
    const auto& timetables = FakeBoxAdmin::Get().timetables;
    const auto found = timetables.find(schedule_id);
    if (found == timetables.end()) return std::nullopt;
    return found->second;
}
