// The scan of a version task: the folder of the run is new, so that the destination is always empty
// and everything is copied. The two other operations are guards; they do nothing but complain.
#pragma once

#include "strategy/scan-handler.h"

class VersionScanHandler final : public ScanHandler {
protected:
    void IssueRemove(const FileListEntry& entry) override;
    void IssueModify(const FileListEntry& src, const FileListEntry& dst) override;
};
