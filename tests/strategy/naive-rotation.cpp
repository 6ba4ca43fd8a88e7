#include "naive-rotation.h"

#include <deque>
#include <map>
#include <set>

namespace {

using Kept = std::set<size_t>;  // places in the list

Kept KeepByAge(const std::vector<VersionInfo>& versions, uint64_t max_version_count) {
    Kept kept = {0};
    for (size_t at = 1; at < versions.size(); ++at) {
        if (kept.size() >= max_version_count) break;
        if (!versions[at].is_bad) kept.insert(at);
    }
    return kept;
}

// The last line of the table has the present as its range.
struct Line {
    uint32_t range, interval;
};

// One line of the table. The versions in the range fall into runs of neighbours with the same slot.
// Of each run a queue with room for one goes along; a newcomer pushes the front out when the room
// is taken or the newcomer is bad, and is itself taken in always. A run other than the first begins
// with one place taken by its first version, whatever that is.
Kept KeepByLine(const std::vector<VersionInfo>& versions, uint32_t now, const Line& line) {
    std::vector<std::vector<size_t>> runs;
    uint32_t last_slot = 0;
    for (size_t at = 0; at < versions.size(); ++at) {
        const uint32_t border = now - line.range;
        if (versions[at].timestamp < border) break;
        const uint32_t slot = uint32_t{now - versions[at].timestamp} / line.interval;
        if (runs.empty() || slot != last_slot) runs.emplace_back();
        runs.back().push_back(at);
        last_slot = slot;
    }
    Kept kept;
    for (size_t number = 0; number < runs.size(); ++number) {
        std::deque<size_t> queue;
        int taken = 0;
        for (size_t n = 0; n < runs[number].size(); ++n) {
            const size_t at = runs[number][n];
            queue.push_back(at);
            if (n == 0 && number > 0) {
                taken = 1;
            } else if (taken >= 1 || versions[at].is_bad) {
                queue.pop_front();
            } else {
                taken = 1;
            }
        }
        for (const size_t at : queue) {
            if (!versions[at].is_bad) kept.insert(at);
        }
    }
    return kept;
}

Kept KeepBySpread(const std::vector<VersionInfo>& versions, uint32_t now,
                  uint64_t max_version_count) {
    Kept marked = {0};
    for (const Line& line : {
             Line{86400,   3600  },
             Line{2592000, 86400 },
             Line{now,     604800}
    }) {
        marked.merge(KeepByLine(versions, now, line));
    }
    Kept kept;
    for (const size_t at : marked) {
        if (kept.size() < max_version_count || kept.empty()) kept.insert(at);
    }
    return kept;
}

}  // namespace

std::vector<std::string> NaiveRotation(const std::vector<VersionInfo>& versions, uint32_t now,
                                       uint64_t max_version_count, int policy) {
    std::vector<std::string> removed;
    if (versions.size() <= max_version_count) return removed;
    const Kept kept = policy == 1 ? KeepByAge(versions, max_version_count)
                                  : KeepBySpread(versions, now, max_version_count);
    for (const bool is_bad : {true, false}) {
        for (size_t at = versions.size(); at-- > 0;) {
            if (versions.size() - removed.size() <= max_version_count) return removed;
            if (versions[at].is_bad == is_bad && kept.count(at) == 0) {
                removed.push_back(versions[at].path);
            }
        }
    }
    return removed;
}
