#include "host/sched-cron.h"

#include <pwd.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <vector>

#include "host/host-paths.h"
#include "host/replace-file.h"
#include "host/sched-folder.h"
#include "utils/log.h"

namespace keld_host {
namespace {

// cron cuts a command at 1,000 bytes; the date test comes before it.
constexpr size_t COMMAND_MAX = 900;
constexpr size_t NAME_SHOWN_MAX = 200;
// cron does not read a file that others may write.
constexpr mode_t CRON_MODE = 0644;
constexpr mode_t MODE_BITS = 07777;

constexpr const char* HEADER =
    "# Made from the entries of the task scheduler, and replaced when one changes.\n"
    "SHELL=/bin/sh\n"
    "PATH=/usr/local/sbin:/usr/local/bin:/usr/sbin:/usr/bin:/sbin:/bin\n";

bool IsControl(char c) { return static_cast<unsigned char>(c) < 0x20 || c == 0x7F; }

// cron ends the command at a percent sign that has no backslash.
std::string EscapePercent(const std::string& text) {
    std::string escaped;
    for (const char c : text) {
        if (c == '%') escaped += '\\';
        escaped += c;
    }
    return escaped;
}

std::string DateTest(const CronTime& time) {
    if (time.dateFormat.empty()) return {};
    return "[ \"$(date +" + EscapePercent(time.dateFormat) + ")\" " + time.dateOperator + " " +
           time.dateValue + " ] || exit 0; ";
}

// For the reader of the file: a name may hold anything.
std::string Comment(const SchedEntry& entry) {
    std::string name = entry.Text(SCHED_NAME).substr(0, NAME_SHOWN_MAX);
    std::replace_if(name.begin(), name.end(), IsControl, '?');
    return "# " + std::to_string(entry.Id()) + ": " + name + "\n";
}

bool HasWork(const SchedEntry& entry) {
    return entry.Number(SCHED_STATE) != 0 && entry.Number(SCHED_LISTABLE) != 0 &&
           entry.Schedule() &&
           entry.Text(SCHED_COMMAND).find_first_not_of(" \t") != std::string::npos;
}

std::string EntryLines(const SchedEntry& entry) {
    const std::string user = CronUserName(entry.Number(SCHED_OWNER));
    const std::string& command = entry.Text(SCHED_COMMAND);
    if (user.empty() || !IsCronCommand(command)) {
        SLOG_WARN("entry %d of the scheduler cannot run: its owner or its command is not valid",
                  entry.Id());
        return {};
    }
    std::string lines = Comment(entry);
    for (const CronTime& time : entry.Schedule()->CronTimes()) {
        lines += time.fields + " " + user + " " + DateTest(time) + EscapePercent(command) + "\n";
    }
    return lines;
}

bool IsUpToDate(const std::string& path, const std::string& text) {
    struct stat file {};
    std::string content;
    return lstat(path.c_str(), &file) == 0 && S_ISREG(file.st_mode) &&
           (file.st_mode & MODE_BITS) == CRON_MODE && ReadFile(path, text.size(), content) == 0 &&
           content == text;
}

}  // namespace

bool IsCronCommand(const std::string& command) {
    const auto is_refused = [](char c) { return (IsControl(c) && c != '\t') || c == '\\'; };
    return std::none_of(command.begin(), command.end(), is_refused) &&
           EscapePercent(command).size() <= COMMAND_MAX;
}

std::string CronUserName(int uid) {
    if (uid == 0) return "root";
    std::vector<char> buffer(1024);
    passwd record{};
    passwd* found = nullptr;
    while (getpwuid_r(static_cast<uid_t>(uid), &record, buffer.data(), buffer.size(), &found) ==
           ERANGE) {
        buffer.resize(buffer.size() * 2);
    }
    if (found == nullptr) return {};
    const std::string name = record.pw_name;
    const auto is_bad = [](unsigned char c) { return std::isgraph(c) == 0; };
    return std::any_of(name.begin(), name.end(), is_bad) ? std::string() : name;
}

std::string CronFileText(const std::vector<SchedEntry>& entries) {
    std::string text = HEADER;
    for (const SchedEntry& entry : entries) {
        if (HasWork(entry)) text += EntryLines(entry);
    }
    return text;
}

int WriteCronFile(const std::string& text) {
    const std::string& path = Paths().cronFile;
    if (IsUpToDate(path, text)) return 0;
    // A box without cron has no such folder: what is written counts when cron comes.
    if (const int error = MakeFolders(path.substr(0, path.rfind('/'))); error != 0) return error;
    return ReplaceFile(path, text, CRON_MODE);
}

}  // namespace keld_host
