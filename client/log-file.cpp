#include "client/log-file.h"

#include <unistd.h>

#include <cerrno>
#include <cstring>

#include "client/exit-status.h"
#include "client/text.h"
#include "platform/global-setting.h"

namespace {

std::string LogPath() {
    const std::string volume = GetRepoVolPath();
    return volume.empty() ? std::string() : volume + "/@Ferrix/db/log-db.sqlite";
}

[[noreturn]] void RefuseMissingLog(const std::string& path) {
    throw CommandError(
        EXIT_REFUSED,
        "there is no log yet: " +
            (path.empty() ? "the service has no repository" : Printable(path) + " is not there") +
            "; \"ferrixctl service start\" starts the service, which makes both");
}

bool IsRecent(const timespec& changed) {
    constexpr time_t CLOCK_STEP_S = 2;  // times of files are coarser than writes
    return changed.tv_sec >= time(nullptr) - CLOCK_STEP_S;
}

}  // namespace

bool LogFile::State::IsSameFile(const State& other) const {
    return device == other.device && inode == other.inode;
}

bool LogFile::State::operator==(const State& other) const {
    return IsSameFile(other) && size == other.size && changed.tv_sec == other.changed.tv_sec &&
           changed.tv_nsec == other.changed.tv_nsec;
}

// All zero when there is no such file.
LogFile::State LogFile::StateOf(const std::string& path) {
    struct stat info {};
    if (path.empty() || stat(path.c_str(), &info) != 0) return {};
    return {info.st_dev, info.st_ino, info.st_mtim, info.st_size};
}

LogFile::LogFile() : m_path(LogPath()) {
    if (m_path.empty() || (access(m_path.c_str(), F_OK) != 0 && errno != EACCES)) {
        RefuseMissingLog(m_path);
    }
    Open();
}

void LogFile::Open() {
    if (access(m_path.c_str(), R_OK | W_OK) != 0) {
        throw CommandError(EXIT_REFUSED, "the log " + Printable(m_path) +
                                             " cannot be read: " + strerror(errno) +
                                             (errno == EACCES ? "; run this as root" : ""));
    }
    m_file = StateOf(m_path);
    m_journal = StateOf(m_path + "-wal");
    if (m_db.Init(m_path) < 0) {
        throw CommandError(EXIT_REFUSED, "the log " + Printable(m_path) + " cannot be opened");
    }
}

bool LogFile::HasNews() {
    const std::string path = LogPath();
    const State file = StateOf(path);
    if (file == State()) return false;
    if (!file.IsSameFile(m_file)) {
        m_db.Close();
        m_path = path;
        Open();
        return true;
    }
    const State journal = StateOf(path + "-wal");
    const bool is_changed = !(file == m_file) || !(journal == m_journal);
    m_file = file;
    m_journal = journal;
    return is_changed || IsRecent(file.changed) || IsRecent(journal.changed);
}
