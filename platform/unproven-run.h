// Remembers, across a crash, which files at a task's destination may not be on the disk.
//
// A copied file has its size and its date long before its bytes are on the disk: after a power cut,
// or after a flush that failed, the next run would find it equal and skip it for ever. So a small
// file in the task's folder tells from when on copies were made that no good flush has covered. It
// is on the disk before a run makes its first copy, and goes when a flush after the last has
// succeeded. A run that finds one treats files that were changed in that time as not copied.
//
// Times are whole seconds of the wall clock; the record is made a little too wide rather than too
// narrow. One object belongs to one thread; one run of a task at a time writes.
#pragma once

#include <cstdint>
#include <string>

class UnprovenRun {
public:
    // Reads the record of the task from its folder below the repository. One that cannot be read or
    // understood makes everything unproven.
    explicit UnprovenRun(uint64_t task_id);

    // A run begins now: what an earlier run has left unproven stays on the record, and what is
    // copied from now on is put there. On the disk when it returns 0; -1 when it cannot be written.
    [[nodiscard]] int Begin();
    // All that was changed before `flush_start` is on the disk, but the run was broken off.
    [[nodiscard]] int KeepSince(int64_t flush_start);
    // All copies of the finished run are on the disk. With `is_all_copied` nothing of earlier runs
    // is left either, and the record goes.
    [[nodiscard]] int End(bool is_all_copied);

    // True when an earlier run left something unproven: then files have to be asked about.
    [[nodiscard]] bool HasUnproven() const { return m_from < m_until; }
    // Whether this file was put there in the unproven time, or that cannot be told.
    [[nodiscard]] bool IsUnproven(const std::string& path) const;

private:
    [[nodiscard]] int Write() const;

    std::string m_folder;
    int64_t m_from = 0;   // earlier runs: unproven from here ...
    int64_t m_until = 0;  // ... to before this; nothing when both are equal
    int64_t m_open = 0;   // the present or last run: unproven from here on; 0 for none
};
