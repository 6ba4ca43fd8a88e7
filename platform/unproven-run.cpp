#include "platform/unproven-run.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cinttypes>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <limits>

#include "platform/durable-file.h"
#include "platform/global-setting.h"
#include "utils/confined-path.h"
#include "utils/log.h"

namespace {

constexpr char RECORD_NAME[] = "/unproven-run";
constexpr int64_t FOREVER = std::numeric_limits<int64_t>::max();
// File systems stamp a file with a clock that lags by up to a tick, some round to 2 seconds.
constexpr int64_t SLACK_SECONDS = 2;

std::string TaskFolder(uint64_t task_id) {
    return GetRepoVolPath() + "/@Ferrix/task/" + std::to_string(task_id);
}

}  // namespace

UnprovenRun::UnprovenRun(uint64_t task_id) : m_folder(TaskFolder(task_id)) {
    std::string text;
    const int found = ReadDurableFile(m_folder + RECORD_NAME, text);
    if (found == 0) return;
    char end = '\0';
    if (found < 0 ||
        std::sscanf(text.c_str(), "%" SCNd64 " %" SCNd64 " %" SCNd64 "%c", &m_from, &m_until,
                    &m_open, &end) != 4 ||
        end != '\n') {
        SLOG_WARN("Failed to read the record of unproven copies in '%s', all copies are unproven",
                  m_folder.c_str());
        m_from = 1;
        m_until = FOREVER;
        m_open = 1;
    }
}

int UnprovenRun::Begin() {
    const int64_t now = time(nullptr);
    const int64_t start = now - SLACK_SECONDS;
    if (m_open != 0) {
        // The last run came to no good end. A clock that was set back says nothing about the end.
        m_until = start < m_open ? FOREVER : std::max(m_until, now + SLACK_SECONDS);
        m_from = std::min(m_from == 0 ? m_open : std::min(m_from, m_open), start);
    }
    m_open = start;
    return Write();
}

int UnprovenRun::KeepSince(int64_t flush_start) {
    m_open = flush_start - SLACK_SECONDS;
    return Write();
}

int UnprovenRun::End(bool is_all_copied) {
    m_open = 0;
    if (!is_all_copied && HasUnproven()) return Write();
    m_from = m_until = 0;
    if (unlink((m_folder + RECORD_NAME).c_str()) == 0 || errno == ENOENT) return 0;
    SLOG_ERR("Failed to remove the record of unproven copies in '%s'", m_folder.c_str());
    return -1;
}

bool UnprovenRun::IsUnproven(const std::string& path) const {
    if (!HasUnproven()) return false;
    const PathPlace place(path);
    struct statx info {};
    if (!place.IsReached() || statx(place.DirFd(), place.Name(), AT_SYMLINK_NOFOLLOW,
                                    STATX_CTIME | STATX_BTIME, &info) != 0) {
        return true;
    }
    // The FAT family keeps no time of change, but one of birth; without either nothing is proven.
    constexpr unsigned BOTH = STATX_CTIME | STATX_BTIME;
    if ((info.stx_mask & BOTH) != BOTH) return true;
    const auto is_inside = [this](int64_t seconds) {
        return seconds >= m_from && seconds < m_until;
    };
    return is_inside(info.stx_ctime.tv_sec) || is_inside(info.stx_btime.tv_sec);
}

int UnprovenRun::Write() const {
    char text[80];
    const int length = std::snprintf(text, sizeof(text), "%" PRId64 " %" PRId64 " %" PRId64 "\n",
                                     m_from, m_until, m_open);
    const std::string record(text, static_cast<size_t>(length));
    if (WriteDurableFile(m_folder + RECORD_NAME, record) == 0) return 0;
    SLOG_ERR("Failed to write the record of unproven copies in '%s': %s", m_folder.c_str(),
             std::strerror(errno));
    return -1;
}
