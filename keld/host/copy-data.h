// Moves the content of one open file into another, new and empty one.
#pragma once

#include <keld/copy.h>
#include <sys/stat.h>

namespace keld_host {

// The caller's question whether to stop; a null callback never stops.
struct CopyCancel {
    KELDCopyIsCancel callback = nullptr;
    void* userData = nullptr;

    [[nodiscard]] bool IsAsked() const { return callback != nullptr && callback(userData) != 0; }
};

// Copies all of `from` (open for reading, `source` its stat of just now) to `to` (empty, open for
// writing). Holes of the source stay holes. Inside one file system data is cloned or moved by the
// kernel where it can.
// Returns 0, or the KELDERR value: KELDERR_CANCELLED, KELDERR_FILE_OPERATION when the source's
// size or date of change is no longer that of `source`, or what reading or writing met. What `to`
// holds after a failure is of no use.
[[nodiscard]] int CopyData(int from, int to, const struct stat& source, const CopyCancel& cancel);

}  // namespace keld_host
