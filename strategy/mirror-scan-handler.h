// The scan of a mirror task: the only strategy that reads the destination folder.
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
    [[nodiscard]] bool IsUnproven(const FileListEntry& dst) override;

private:
    std::optional<UnprovenRun> m_unproven_run;  // read when the first pair of equal files is met
};
