// The entries of one folder that are the same on both sides though each side spells the name in its
// own way.
//
// exFAT and FAT find a file under every spelling of its name, and list it under one. What was
// copied to /A.txt is then also what stands under /a.txt: a comparison of names alone would copy
// /a.txt over it and remove /A.txt, and with it the new copy.
// Threads: an object belongs to one thread.
#pragma once

#include <functional>
#include <string>
#include <unordered_map>
#include <unordered_set>
#include <vector>

#include "utils/file-list.h"

class SpellingPairs {
public:
    // Which of these entries (there is one at least) the source's name leads to at the destination,
    // with its time and size brought up to date; null for none.
    using Choose =
        std::function<FileListEntry*(const FileListEntry& src, std::vector<FileListEntry>& dst)>;

    SpellingPairs() = default;
    // Asks for each name of the source that the destination does not list, if the destination has
    // names that the source does not list and that may be spellings of it. Linear in the names.
    SpellingPairs(const FileList& src_list, const FileList& dst_list, const Choose& choose);

    // The other half of an entry of the source, under the source's name; null without one.
    [[nodiscard]] const FileListEntry* OtherHalf(const std::string& src_path) const;
    // Whether an entry of the destination is the other half of one of the source.
    [[nodiscard]] bool HasDst(const std::string& dst_path) const;

private:
    std::unordered_map<std::string, FileListEntry> m_by_src_path;
    std::unordered_set<std::string> m_dst_paths;
};
