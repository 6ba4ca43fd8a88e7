// The scan of one folder: lists its children on both sides, compares them by name, and issues an
// event for each difference and for each folder that both sides have. A scan never goes down into a
// folder itself: the scan events that it issues carry the walk on.
//
// Nothing is issued unless both listings were complete and the roots of the task stood behind them
// (strategy/root-check.h): a device that is gone would list as an empty folder.
#pragma once

#include <string>

#include "strategy/file-event-handler.h"
#include "strategy/spelling-pairs.h"

class ScanHandler : public FileEventHandler {
public:
    // Returns 0 or a negative ErrorCode. Events issued before a failure stay.
    [[nodiscard]] int Handle();

protected:
    // Fill a list with the children of the event's folder on one side. 0 or a negative ErrorCode;
    // a folder that is gone or closed to us gives an empty list. The base has an empty destination.
    [[nodiscard]] virtual int GetSrcList(FileList& list);
    [[nodiscard]] virtual int GetDstList(FileList& list);
    // What to do about an entry that only the destination has, and about one that differs.
    virtual void IssueRemove(const FileListEntry& entry) = 0;
    virtual void IssueModify(const FileListEntry& src, const FileListEntry& dst) = 0;
    // The entries that both sides have under names that differ. The base has none.
    [[nodiscard]] virtual SpellingPairs FindSpellingPairs(const FileList& src_list,
                                                          const FileList& dst_list);
    // Whether a pair of files with equal size and time may still hold different bytes.
    [[nodiscard]] virtual bool IsUnproven(const FileListEntry& dst);

    // Issues the differences of the two lists, from the greatest name to the smallest. An entry
    // with two names has its turn at the source's. 0, or "Interrupted" when the run is aborted
    // before a step.
    [[nodiscard]] int GenerateEvent(const FileList& src_list, const FileList& dst_list);
    void IssueCopy(const FileListEntry& entry);
    void IssueScan(const FileListEntry& entry);

    // The event path of an entry of the scanned folder.
    [[nodiscard]] std::string JoinEntryPath(const std::string& entry_path) const;
    // Lists `path`, which both sides do alike. 0, "Interrupted" or "I/O error".
    [[nodiscard]] int ListFolder(const std::string& path, FileList& list);

private:
    void IssuePair(const FileListEntry& src, const FileListEntry& dst);
};
