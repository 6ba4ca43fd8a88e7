// An incremental task whose flushes are counted and can fail.
#pragma once

#include <cerrno>
#include <string>

#include "flush-faults.h"
#include "inc-backup-fixture.h"

class RecordProofTest : public IncBackupFixture {
protected:
    // Counts the flushes of a file system, which fail from the nth on.
    int CountFlush(const std::string& what) {
        if (!what.starts_with("fs:")) return 0;
        return ++m_flushes >= m_first_failure && m_flushes <= m_last_failure ? EIO : 0;
    }
    void WriteFiles(int count) {
        for (int n = 0; n < count; ++n) WriteSrc("/f" + std::to_string(n), "s");
    }
    // How many files have a record, also after a restart.
    int Records(int count) {
        int records = 0;
        for (int n = 0; n < count; ++n) records += Recorded("/f" + std::to_string(n)) != "-";
        return records;
    }

    int m_flushes = 0;
    int m_first_failure = 1000000;
    int m_last_failure = 1000000;
    const OnFlush m_faults{[this](const std::string& what) { return CountFlush(what); }};
};
