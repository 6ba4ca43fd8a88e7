// Which versions a rotation keeps, and in which order the others go. Knows nothing of files.
//
// The lists are sorted, the newest version first, and hold none from the future. All times are
// unsigned 32-bit seconds, and differences wrap as such. An object belongs to one thread.
#pragma once

#include <atomic>
#include <cstdint>
#include <functional>
#include <vector>

#include "strategy/version-info.h"

class RotationRules {
public:
    // `abort_flag` may be null; it is looked at before each version.
    RotationRules(uint32_t now, uint64_t task_id, uint64_t max_version_count,
                  const std::atomic<int>* abort_flag);

    // Each policy marks what stays with `reserve`; the newest version always does, bad or not.
    // Oldest first: the newest good versions up to the count stay.
    void OldestRotation(std::vector<VersionInfo>& versions) const;
    // A spread over time stays: for the last day one version of each hour, for the last 30 days one
    // of each day, before that one of each week; of these the newest up to the count. 0, or
    // "Interrupted".
    [[nodiscard]] int ConditionalMark(std::vector<VersionInfo>& versions) const;

    // Calls `remove` for what goes, the oldest first and bad versions before good ones, until no
    // more than the count is left. 0, "Interrupted", or the first negative result of `remove`.
    using Remover = std::function<int(const VersionInfo&)>;
    [[nodiscard]] int DeleteVersionList(const std::vector<VersionInfo>& versions,
                                        const Remover& remove) const;

private:
    [[nodiscard]] bool IsAborted() const;
    [[nodiscard]] std::vector<RotationBucket> SetConditionalBuckets() const;
    [[nodiscard]] int MarkBucket(const RotationBucket& bucket,
                                 std::vector<VersionInfo>& versions) const;
    [[nodiscard]] int LimitReserved(std::vector<VersionInfo>& versions) const;
    // One pass; it ends early once enough are gone.
    [[nodiscard]] int DeletePass(const std::vector<const VersionInfo*>& versions, bool is_bad_pass,
                                 size_t& left, const Remover& remove,
                                 std::vector<const VersionInfo*>* rest) const;

    uint32_t m_now;
    uint64_t m_task_id;
    uint64_t m_max_version_count;
    const std::atomic<int>* m_abort_flag;
};
