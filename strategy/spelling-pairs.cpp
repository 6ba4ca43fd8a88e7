#include "strategy/spelling-pairs.h"

#include <algorithm>

#include "strategy/spelling-key.h"

namespace {

using Visit = std::function<void(const FileListEntry& entry)>;

// Visits what only `list` has, and not `other`.
void VisitUnlisted(const FileList& list, const FileList& other, const Visit& visit) {
    FileListIterator at = list.begin();
    FileListIterator beside = other.begin();
    const FileListIterator end = list.end();
    const FileListIterator other_end = other.end();
    for (; at != end; ++at) {
        while (beside != other_end && beside->path > at->path) ++beside;
        if (beside == other_end || beside->path != at->path) visit(*at);
    }
}

}  // namespace

SpellingPairs::SpellingPairs(const FileList& src_list, const FileList& dst_list,
                             const Choose& choose) {
    std::unordered_map<std::string, std::vector<FileListEntry>> by_key;
    VisitUnlisted(dst_list, src_list, [&by_key](const FileListEntry& dst) {
        by_key[SpellingKey(dst.path)].push_back(dst);
    });
    if (by_key.empty()) return;
    VisitUnlisted(src_list, dst_list, [&](const FileListEntry& src) {
        const auto found = by_key.find(SpellingKey(src.path));
        if (found == by_key.end() || found->second.empty()) return;
        std::vector<FileListEntry>& entries = found->second;
        FileListEntry* chosen = choose(src, entries);
        if (chosen == nullptr) return;
        m_dst_paths.insert(chosen->path);
        chosen->path = src.path;
        m_by_src_path[src.path] = *chosen;
        entries.erase(entries.begin() + (chosen - entries.data()));
    });
}

const FileListEntry* SpellingPairs::OtherHalf(const std::string& src_path) const {
    const auto found = m_by_src_path.find(src_path);
    return found == m_by_src_path.end() ? nullptr : &found->second;
}

bool SpellingPairs::HasDst(const std::string& dst_path) const {
    return m_dst_paths.contains(dst_path);
}
