// The copy of one regular file: prepares the parent folder, has the platform copy it, settles
// conflicts, checks the result, sets the time stamps and disposes of the source.
//
// The outcome is an ErrorCode; some outcomes ("Destination file exists", "Destination file type
// conflict", "File operation error") make the worker run the event again, and that is how a cleared
// conflict leads to a copy. What an interrupted copy leaves at the destination is the platform's.
#pragma once

#include <string>

#include "strategy/file-event-handler.h"
#include "utils/file-proof.h"
#include "utils/fs-info.h"

class CopyHandler : public FileEventHandler {
public:
    // Returns 0 or a negative ErrorCode; "Ignore this error" for an event that is none of ours.
    [[nodiscard]] int Handle();

    // Given to the platform's copy, with a `const std::atomic<int>*`: 1 when it is set, else 0.
    static int CancelFuncCallBack(void* flag);

protected:
    // Chooses where the file lands: the destination root followed by the event path.
    [[nodiscard]] virtual int SetCopyToFullPath();
    // Records the copy; the base keeps no record.
    [[nodiscard]] virtual int UpdateDB();
    // Notes a copy whose source is about to be removed; the base keeps no note.
    [[nodiscard]] virtual int NoteMove();

    std::string m_copy_to_full_path;
    std::string m_copy_from_full_path;
    FSInfo m_src_info;
    bool m_overwrite_allowed = true;
    bool m_must_keep_existing = false;  // what is there moves aside under any policy

private:
    [[nodiscard]] int RunSteps();
    [[nodiscard]] int StatSource();
    [[nodiscard]] int CreateParentFolder();
    [[nodiscard]] int RunCopy();
    [[nodiscard]] int CheckCopied() const;
    // Reads what stands where the copy goes: ERR_SUCCESS, or the error to report.
    [[nodiscard]] int LookAtDestination(FSInfo& info, int error_when_gone) const;
    [[nodiscard]] bool CheckFileIntegrity() const;
    [[nodiscard]] int HandleCopyError(int keld_error, int overwrite);
    [[nodiscard]] int HandleDstExists();
    [[nodiscard]] int HandleDstTypeConflict();
    [[nodiscard]] int Finish();
    // Removes the source, once the copy is known to be on the disk and to equal it.
    [[nodiscard]] int MoveSource();
    // "File operation error", with which the event copies anew, if it is not as it was before the
    // copy.
    [[nodiscard]] int CheckSourceUnchanged() const;
    [[nodiscard]] int ProveCopy();
    [[nodiscard]] int HandleDifference();
    void DiscardCopy() const;

    FileIdentity m_source;     // taken before the copy, only if the source is to be removed
    bool m_is_merged = false;  // what stands at the destination was there before
};
