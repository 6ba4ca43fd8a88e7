// The scan of a mirror task: the only strategy that reads the destination folder.
//
// Where the destination ignores case, it also gives an entry there the spelling that the source has
// now. An entry that cannot get it keeps the old one and is compared all the same.
#pragma once

#include <optional>

#include "platform/unproven-run.h"
#include "strategy/scan-handler.h"

class MirrorScanHandler final : public ScanHandler {
protected:
    [[nodiscard]] int GetDstList(FileList& list) override;
    void IssueRemove(const FileListEntry& entry) override;
    // Removes the old entry first, also for a changed file, so that it reaches the recycle bin.
    void IssueModify(const FileListEntry& src, const FileListEntry& dst) override;
    // Those of a destination that ignores case. They get the spelling of the source there.
    [[nodiscard]] SpellingPairs FindSpellingPairs(const FileList& src_list,
                                                  const FileList& dst_list) override;
    [[nodiscard]] bool IsUnproven(const FileListEntry& dst) override;

private:
    // The destination's entry that is found there under the source's name; null for none.
    [[nodiscard]] FileListEntry* ChooseEntry(const FileListEntry& src,
                                             std::vector<FileListEntry>& dst) const;
    // Gives the entry the spelling of the source, where that can be done without a removal.
    void Respell(const FileListEntry& src, const FileListEntry& dst) const;

    std::optional<UnprovenRun> m_unproven_run;  // read when the first pair of equal files is met
};
