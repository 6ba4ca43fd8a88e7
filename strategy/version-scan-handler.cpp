#include "strategy/version-scan-handler.h"

#include "utils/file-list.h"
#include "utils/log.h"

void VersionScanHandler::IssueRemove(const FileListEntry& entry) {
    SLOG_CRIT("Shall not happen! Ignore current record '%s'", entry.path.c_str());
}

void VersionScanHandler::IssueModify(const FileListEntry& src, const FileListEntry& dst) {
    SLOG_CRIT("Shall not happen! Ignore current record '%s', '%s'", src.path.c_str(),
              dst.path.c_str());
}
