// The scan of an incremental task: compares the source with the record of what was copied, and does
// not look at the destination.
#pragma once

#include "strategy/scan-handler.h"

class IncBackupScanHandler final : public ScanHandler {
protected:
    [[nodiscard]] int GetDstList(FileList& list) override;
    void IssueRemove(const FileListEntry& entry) override;
    // Forgets the old entry first only when a file became a folder or the other way round.
    void IssueModify(const FileListEntry& src, const FileListEntry& dst) override;
};
