// The box is an appliance with a system of its own for shares and timetables.
#include "client/box-admin.h"
#include "client/exit-status.h"

namespace {

[[noreturn]] void Refuse() {
    throw CommandError(EXIT_REFUSED, "shares of this box are managed by the box itself");
}

}  // namespace

// Which shares there are can always be told: the platform knows them.
void CheckShares() {}

std::string AddShare(const std::string&) { Refuse(); }

std::string RemoveShare(const std::string&) { Refuse(); }

void CheckRemoveShare(const std::string&) { Refuse(); }

std::string RenameShare(const std::string&, const std::string&) { Refuse(); }

void CheckRenameShare(const std::string&, const std::string&) { Refuse(); }

std::optional<Timetable> ReadTimetable(int64_t) { return std::nullopt; }
