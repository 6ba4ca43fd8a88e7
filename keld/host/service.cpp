// What services the box runs, as far as plain Linux has them, and its event log.
#include <glob.h>
#include <keld/service.h>

#include <cerrno>
#include <string>
#include <string_view>

#include "host/host-error.h"
#include "host/host-paths.h"
#include "host/replace-file.h"
#include "host/share-table.h"
#include "host/text.h"
#include "utils/log.h"

using keld_host::Fail;

namespace {

// Whether the system asks `source` for users, by the "passwd" line of nsswitch.conf.
int HasUserSource(std::string_view source) {
    std::string text;
    const int error = keld_host::ReadFile(keld_host::Paths().nsswitch, size_t{1} << 20, text);
    if (error == ENOENT) return 0;
    if (error != 0) return keld_host::FailErrno(error);
    std::string_view rest = text;
    while (!rest.empty()) {
        const size_t end = rest.find('\n');
        std::string line(rest.substr(0, end));
        rest.remove_prefix(end == std::string_view::npos ? rest.size() : end + 1);
        line = line.substr(0, line.find('#'));
        constexpr std::string_view key = "passwd:";
        if (keld_host::Trim(line).substr(0, key.size()) != key) continue;
        const std::string words = " " + line.substr(line.find(':') + 1) + " ";
        return words.find(" " + std::string(source) + " ") != std::string::npos ? 1 : 0;
    }
    return 0;
}

}  // namespace

int KLIBServiceIsEnabled(const char* service) {
    const std::string name = service == nullptr ? "" : service;
    if (name.empty() || name.find_first_of("/*?[\\") != std::string::npos) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    // A unit is enabled when a target wants it.
    const std::string pattern = keld_host::Paths().systemdFolder + "/*.wants/" + name + ".service";
    glob_t found{};
    const int result = glob(pattern.c_str(), GLOB_NOSORT, nullptr, &found);
    globfree(&found);
    if (result == GLOB_NOMATCH) return 0;
    return result == 0 ? 1 : Fail(KELDERR_SYSTEM);
}

int KELDLDAPIsBinded(void) { return HasUserSource("ldap"); }

int KELDWinsIsJoined(void) { return HasUserSource("winbind"); }

int KELDServiceUserHomeIsEnabled(void) {
    return keld_host::CurrentShares()->FindByName("homes") != nullptr ? 1 : 0;
}

int KELDLogSet1(int type, int level, unsigned code, const char* text1, const char* text2,
                const char* text3, const char* text4) {
    static_cast<void>(type);
    static_cast<void>(level);
    if (text1 == nullptr || text2 == nullptr || text3 == nullptr || text4 == nullptr) {
        return Fail(KELDERR_INVALID_ARGUMENT);
    }
    const char* event = "event";
    if (code == KELD_LOG_FERRIX_STARTED) event = "started";
    if (code == KELD_LOG_FERRIX_STOPPED) event = "stopped";
    SLOG_NOTICE("%s: %s (0x%08x) %s %s %s\n", text1, event, code, text2, text3, text4);
    return 0;
}
