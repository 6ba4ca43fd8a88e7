// Tells which rows of the log are new.
//
// Rows have no number here, and many may be equal (files of one name that fail in the same second).
// So the newest rows that were seen are remembered, down to one of another second, and what stands
// before them in the log is new. This holds too when the clock is set back, when old rows have been
// rotated away, and when another log takes the place of this one: all of its rows are new then,
// unless it is a copy. Only a log so short that all its rows are equal hides how many are new.
#pragma once

#include <vector>

#include "client/log-reader.h"

class LogTail {
public:
    // Begins after the newest of these rows: as many as LongEnough() asks for.
    void Begin(const NewestRows& newest);
    // True when the rows, newest first, reach down to another second.
    [[nodiscard]] static bool LongEnough(const std::vector<LogInfo>& rows);

    // The rows that were added since the last call or Begin(), newest first. EXIT_REFUSED
    // (CommandError) when the log cannot be read.
    [[nodiscard]] std::vector<LogInfo> NewRows(LogDB& db);

private:
    // Where the remembered rows stand among these; their number when they do not. `are_all`: the
    // log has no other rows.
    [[nodiscard]] size_t Find(const std::vector<LogInfo>& rows, bool are_all) const;
    [[nodiscard]] bool IsAt(const std::vector<LogInfo>& rows, bool are_all, size_t place) const;

    std::vector<LogInfo> m_seen;  // newest first
    bool m_has_seen_all = true;   // m_seen was the whole log
};
