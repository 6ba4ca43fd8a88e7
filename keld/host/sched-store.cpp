#include "host/sched-store.h"

#include <dirent.h>
#include <fcntl.h>
#include <json/value.h>
#include <keld/error.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <climits>
#include <cstring>
#include <string>
#include <string_view>

#include "host/host-error.h"
#include "host/host-paths.h"
#include "host/replace-file.h"
#include "host/sched-cron.h"
#include "host/sched-folder.h"
#include "utils/log.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

constexpr mode_t ENTRY_MODE = 0600;
constexpr size_t FILE_MAX = size_t{1} << 20;
constexpr std::string_view ENTRY_SUFFIX = ".json";

std::string EntryPath(int id) {
    return Paths().schedFolder + "/" + std::to_string(id) + std::string(ENTRY_SUFFIX);
}
// The highest id that was ever given.
std::string LastIdPath() { return Paths().schedFolder + "/last-id"; }

// Held for the length of a change. Serves threads as well as processes: each opens the file anew.
class StoreLock {
public:
    // 0 or an errno.
    [[nodiscard]] int Take() {
        if (const int error = MakeFolders(Paths().schedFolder); error != 0) return error;
        const std::string path = Paths().schedFolder + "/lock";
        m_file.Reset(open(path.c_str(), O_RDWR | O_CREAT | O_NOFOLLOW | O_CLOEXEC, ENTRY_MODE));
        if (!m_file.IsValid()) return errno;
        while (flock(m_file.Get(), LOCK_EX) != 0) {
            if (errno != EINTR) return errno;
        }
        return 0;
    }

private:
    UniqueFd m_file;
};

// A positive number and nothing else, as this module writes it; 0 for any other text.
int ParseId(std::string_view text) {
    int id = 0;
    const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), id);
    const bool is_whole = error == std::errc() && end == text.data() + text.size();
    return is_whole && id > 0 && text == std::to_string(id) ? id : 0;
}

// The ids of all stored entries, rising. Returns 0 or an errno; no folder is no entry.
int StoredIds(std::vector<int>* ids) {
    const UniqueDir dir(opendir(Paths().schedFolder.c_str()));
    if (!dir) return errno == ENOENT ? 0 : errno;
    for (;;) {
        errno = 0;
        const dirent* found = readdir(dir.get());
        if (found == nullptr) break;
        std::string_view name = found->d_name;
        if (!name.ends_with(ENTRY_SUFFIX)) continue;
        name.remove_suffix(ENTRY_SUFFIX.size());
        if (const int id = ParseId(name); id > 0) ids->push_back(id);
    }
    const int error = errno;
    std::sort(ids->begin(), ids->end());
    return error;
}

enum class ReadResult { OK, MISSING, DAMAGED, FAILED };

// FAILED leaves errno.
ReadResult ReadEntry(int id, SchedEntry* entry) {
    std::string text;
    if (const int error = ReadFile(EntryPath(id), FILE_MAX, text); error != 0) {
        errno = error;
        return error == ENOENT ? ReadResult::MISSING : ReadResult::FAILED;
    }
    Json::Value json;
    SchedEntry found;
    if (!ParseJson(text, &json) || !found.FromJson(json) || found.Id() != id) {
        SLOG_ERR("entry %d of the scheduler is damaged: '%s'", id, EntryPath(id).c_str());
        return ReadResult::DAMAGED;
    }
    *entry = std::move(found);
    return ReadResult::OK;
}

// Returns 0 or an errno.
int ReadAll(std::vector<SchedEntry>* entries) {
    std::vector<int> ids;
    if (const int error = StoredIds(&ids); error != 0) return error;
    for (const int id : ids) {
        SchedEntry entry;
        switch (ReadEntry(id, &entry)) {
            case ReadResult::OK:
                entries->push_back(std::move(entry));
                break;
            case ReadResult::FAILED:
                return errno;
            case ReadResult::MISSING:  // removed meanwhile
            case ReadResult::DAMAGED:
                break;
        }
    }
    return 0;
}

// Brings cron's file to what is stored, without the entry `left_out`. Returns 0 or an errno.
int FollowWithCron(int left_out = 0) {
    std::vector<SchedEntry> entries;
    if (const int error = ReadAll(&entries); error != 0) return error;
    std::erase_if(entries, [left_out](const SchedEntry& entry) { return entry.Id() == left_out; });
    const int error = WriteCronFile(CronFileText(entries));
    if (error != 0) {
        SLOG_ERR("the timetable '%s' cannot be written: %s", Paths().cronFile.c_str(),
                 strerror(error));
    }
    return error;
}

// Gives the next id and notes it, so that it is not given again. Returns 0 or an errno.
int TakeNewId(int* id) {
    std::vector<int> ids;
    if (const int error = StoredIds(&ids); error != 0) return error;
    int last = ids.empty() ? 0 : ids.back();
    std::string text;
    const int error = ReadFile(LastIdPath(), FILE_MAX, text);
    if (error != 0 && error != ENOENT) return error;
    while (text.ends_with('\n')) text.pop_back();
    last = std::max(last, ParseId(text));
    if (last == INT_MAX) return EOVERFLOW;
    *id = last + 1;
    return ReplaceFile(LastIdPath(), std::to_string(*id) + "\n", ENTRY_MODE);
}

int WriteEntry(const SchedEntry& entry) {
    return ReplaceFile(EntryPath(entry.Id()), WriteJson(entry.ToJson()), ENTRY_MODE);
}

// Stores `entry` in place of `before`, which is null for a new one. Returns a KELDERR value.
int Store(const SchedEntry& entry, const SchedEntry* before) {
    int error = WriteEntry(entry);
    if (error != 0) return ErrorFromErrno(error);
    error = FollowWithCron();
    if (error == 0) return KELDERR_SUCCESS;
    // What is stored and what cron does must not part.
    const int undone = before != nullptr                            ? WriteEntry(*before)
                       : unlink(EntryPath(entry.Id()).c_str()) == 0 ? 0
                                                                    : errno;
    if (undone != 0) SLOG_ERR("entry %d cannot be restored: %s", entry.Id(), strerror(undone));
    return ErrorFromErrno(error);
}

// What was set has to be valid; an owner that has gone since must not stop the other changes.
bool AreChangesValid(const SchedEntry& entry) {
    if (entry.IsSet(SCHED_COMMAND) && !IsCronCommand(entry.Text(SCHED_COMMAND))) return false;
    return !entry.IsSet(SCHED_OWNER) || !CronUserName(entry.Number(SCHED_OWNER)).empty();
}

int LoadResult(ReadResult result) {
    switch (result) {
        case ReadResult::OK:
            return KELDERR_SUCCESS;
        case ReadResult::MISSING:
            return KELDERR_SRC_MISS;
        case ReadResult::FAILED:
            return ErrorFromErrno(errno);
        case ReadResult::DAMAGED:
            break;
    }
    return KELDERR_IO;
}

int SaveNew(SchedEntry* entry) {
    int id = 0;
    if (const int error = TakeNewId(&id); error != 0) return ErrorFromErrno(error);
    SchedEntry stored = *entry;
    stored.SetId(id);
    stored.Settle();
    if (const int code = Store(stored, nullptr); code != KELDERR_SUCCESS) return code;
    *entry = std::move(stored);
    return KELDERR_SUCCESS;
}

int SaveChanges(SchedEntry* entry) {
    SchedEntry before;
    if (const int code = LoadResult(ReadEntry(entry->Id(), &before)); code != KELDERR_SUCCESS) {
        return code;
    }
    SchedEntry stored = before;
    stored.TakeChangesOf(*entry);
    stored.Settle();
    if (const int code = Store(stored, &before); code != KELDERR_SUCCESS) return code;
    *entry = std::move(stored);
    return KELDERR_SUCCESS;
}

}  // namespace

int LoadSchedEntry(int id, SchedEntry* entry) {
    return id > 0 ? LoadResult(ReadEntry(id, entry)) : KELDERR_SRC_MISS;
}

int ListSchedEntries(std::vector<SchedEntry>* entries) {
    const int error = ReadAll(entries);
    return error == 0 ? KELDERR_SUCCESS : ErrorFromErrno(error);
}

int SaveSchedEntry(SchedEntry* entry) {
    if (!AreChangesValid(*entry)) return KELDERR_INVALID_ARGUMENT;
    StoreLock lock;
    if (const int error = lock.Take(); error != 0) return ErrorFromErrno(error);
    return entry->Id() > 0 ? SaveChanges(entry) : SaveNew(entry);
}

int RemoveSchedEntry(int id) {
    if (id <= 0) return KELDERR_SRC_MISS;
    StoreLock lock;
    if (const int error = lock.Take(); error != 0) return ErrorFromErrno(error);
    if (access(EntryPath(id).c_str(), F_OK) != 0) return ErrorFromErrno(errno);
    // cron first: a line without an entry would go on running.
    if (const int error = FollowWithCron(id); error != 0) return ErrorFromErrno(error);
    if (unlink(EntryPath(id).c_str()) == 0) return KELDERR_SUCCESS;
    const int error = errno;
    (void)FollowWithCron();
    return ErrorFromErrno(error);
}

}  // namespace keld_host
