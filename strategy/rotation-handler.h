// Thins the version folders of a task to its greatest number of versions. The newest version is
// never removed, and bad ones go before good ones. A version that a run is filling at the moment is
// none yet. One from the future is left alone and does not count; while the clock is not set and
// there is a good one from the future, nothing is removed at all: the clock tells nothing about
// which versions are old.
//
// Removal goes through the recycle bin of the share. While it is under way the versions that are to
// go are on record (strategy/version-mark.h): one that is half removed does not pass for good. The
// record of what was removed goes when that is on the disk.
//
// Used for one rotation, on one thread: Init(), SetAbortFlag(), Run(). There is one rotation at a
// time in the process; another waits for it.
#pragma once

#include <atomic>
#include <cstdint>
#include <ctime>
#include <string>
#include <vector>

#include "strategy/task-run-info.h"
#include "strategy/version-info.h"

class RotationRules;
struct VersionMark;

class RotationHandler {
public:
    // Versions that begin after `now` are left alone. A run takes it before it waits for its files.
    explicit RotationHandler(uint32_t now = static_cast<uint32_t>(time(nullptr))) : m_now(now) {}
    RotationHandler(const RotationHandler&) = delete;
    RotationHandler& operator=(const RotationHandler&) = delete;

    void Init(const TaskRunInfo& task) { m_task = task; }
    // Looked at while waiting and between versions, not while one is being removed. May be null.
    void SetAbortFlag(const std::atomic<int>* abort_flag) { m_abort_flag = abort_flag; }

    // 0 or a negative ErrorCode; what has been removed by then stays removed.
    [[nodiscard]] int Run();

private:
    [[nodiscard]] bool IsAborted() const;
    [[nodiscard]] int RunInTurn();
    [[nodiscard]] int SetVersionList();
    [[nodiscard]] int AddVersion(const std::string& entry_path);
    [[nodiscard]] int Rotate();
    [[nodiscard]] int DeleteVersions(const RotationRules& rules);
    void DropSettled(const std::vector<VersionMark>& marks) const;
    // What is to go, as marks in the order of removal.
    [[nodiscard]] std::vector<VersionMark> Victims() const;
    // False when nothing can be removed, and when the recycle bin takes a version over as a whole.
    [[nodiscard]] bool IsRemovedInPieces() const;
    [[nodiscard]] int RemoveVersion(const VersionInfo& version);
    [[nodiscard]] bool IsGoneOrBad(const std::string& path) const;

    uint32_t m_now;
    const std::atomic<int>* m_abort_flag = nullptr;
    TaskRunInfo m_task;
    std::vector<std::string> m_unfinished;  // paths of versions that are being filled
    std::vector<VersionInfo> m_versions;    // the newest first
    bool m_has_later_version = false;       // a good one that begins after `now`
    std::vector<std::string> m_begun;       // names of the good ones whose removal has begun
    std::string m_half;                     // the one that stands there in part, with a good name
};
