#include "strategy/rotation-rules.h"

#include <algorithm>

#include "utils/error-code.h"
#include "utils/log.h"

namespace {

constexpr uint32_t HOUR = 3600;
constexpr uint32_t DAY = 86400;
constexpr uint32_t MONTH = 30 * DAY;
constexpr uint32_t WEEK = 7 * DAY;

// Bad versions have no place in a spread.
void ReserveSpan(std::vector<VersionInfo>& versions, size_t start, size_t end) {
    for (size_t at = start; at < end; ++at) {
        if (!versions[at].is_bad) versions[at].reserve = true;
    }
}

}  // namespace

RotationRules::RotationRules(uint32_t now, uint64_t task_id, uint64_t max_version_count,
                             const std::atomic<int>* abort_flag)
    : m_now(now),
      m_task_id(task_id),
      m_max_version_count(max_version_count),
      m_abort_flag(abort_flag) {}

bool RotationRules::IsAborted() const {
    return m_abort_flag != nullptr && m_abort_flag->load() != 0;
}

void RotationRules::OldestRotation(std::vector<VersionInfo>& versions) const {
    if (versions.empty()) {
        SLOG_INFO("version info list is empty for task '%llu'", Llu(m_task_id));
        return;
    }
    versions.front().reserve = true;
    uint64_t count = 1;
    for (size_t at = 1; at < versions.size() && count < m_max_version_count; ++at) {
        if (versions[at].is_bad) continue;
        versions[at].reserve = true;
        ++count;
    }
    SLOG_INFO("OldestRotation: count = '%llu', max_version_count = '%llu'", Llu(count),
              Llu(m_max_version_count));
}

std::vector<RotationBucket> RotationRules::SetConditionalBuckets() const {
    return {
        {DAY,   HOUR, 1},
        {MONTH, DAY,  1},
        {m_now, WEEK, 1},
    };
}

int RotationRules::ConditionalMark(std::vector<VersionInfo>& versions) const {
    if (versions.empty()) {
        SLOG_INFO("version info list is empty for task '%llu'", Llu(m_task_id));
        return ERR_SUCCESS;
    }
    versions.front().reserve = true;
    for (const RotationBucket& bucket : SetConditionalBuckets()) {
        if (const int result = MarkBucket(bucket, versions); result < 0) return result;
    }
    return LimitReserved(versions);
}

// The span from `start` up to `cur` ends up holding the oldest versions of its slot.
int RotationRules::MarkBucket(const RotationBucket& bucket,
                              std::vector<VersionInfo>& versions) const {
    SLOG_INFO("ConditionalMark '%u', '%u', '%llu', '%u'", bucket.range, bucket.interval,
              Llu(bucket.count), m_now);
    const auto slot_of = [&](size_t at) {
        return (m_now - versions[at].timestamp) / bucket.interval;
    };
    const uint32_t oldest = m_now - bucket.range;
    size_t start = 0;
    size_t cur = 0;
    uint64_t kept = 0;
    for (; cur < versions.size(); ++cur) {
        if (IsAborted()) {
            SLOG_WARN("ConditionalMark: user stopped");
            return ERR_INTERRUPTED;
        }
        if (versions[cur].timestamp < oldest) break;
        if (slot_of(cur) != slot_of(start)) {
            ReserveSpan(versions, start, cur);
            start = cur;
            kept = 1;
        } else if (kept >= bucket.count || versions[cur].is_bad) {
            ++start;
        } else {
            ++kept;
        }
    }
    ReserveSpan(versions, start, cur);
    return ERR_SUCCESS;
}

int RotationRules::LimitReserved(std::vector<VersionInfo>& versions) const {
    // The newest stays in any case.
    const uint64_t limit = std::max<uint64_t>(m_max_version_count, 1);
    uint64_t count = 0;
    for (VersionInfo& version : versions) {
        if (IsAborted()) {
            SLOG_WARN("ConditionalMark: user stopped");
            return ERR_INTERRUPTED;
        }
        if (version.reserve && ++count > limit) version.reserve = false;
        SLOG_INFO("reserve_count = '%llu', max_version_count = '%llu'", Llu(count),
                  Llu(m_max_version_count));
        SLOG_INFO("vinfo path = '%s', reserve = '%d'", version.path.c_str(), version.reserve);
    }
    return ERR_SUCCESS;
}

int RotationRules::DeleteVersionList(const std::vector<VersionInfo>& versions,
                                     const Remover& remove) const {
    std::vector<const VersionInfo*> from_oldest;
    for (auto version = versions.rbegin(); version != versions.rend(); ++version) {
        from_oldest.push_back(&*version);
    }
    size_t left = versions.size();
    std::vector<const VersionInfo*> rest;
    const int result = DeletePass(from_oldest, true, left, remove, &rest);
    if (result < 0 || left <= m_max_version_count) return result;
    return DeletePass(rest, false, left, remove, nullptr);
}

int RotationRules::DeletePass(const std::vector<const VersionInfo*>& versions, bool is_bad_pass,
                              size_t& left, const Remover& remove,
                              std::vector<const VersionInfo*>* rest) const {
    for (const VersionInfo* version : versions) {
        if (IsAborted()) {
            SLOG_WARN("DeleteVersionList: user stopped");
            return ERR_INTERRUPTED;
        }
        if (left <= m_max_version_count) return ERR_SUCCESS;
        if (!version->reserve && (version->is_bad || !is_bad_pass)) {
            if (const int result = remove(*version); result < 0) {
                SLOG_ERR("faile to DeleteVersionList '%s'", version->path.c_str());
                return result;
            }
            --left;
        } else if (rest != nullptr) {
            rest->push_back(version);
        }
    }
    return ERR_SUCCESS;
}
