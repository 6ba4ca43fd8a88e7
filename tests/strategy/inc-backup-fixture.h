// An incremental task on scratch folders, and verbs for its runs and records.
#pragma once

#include <gmock/gmock.h>

#include <string>
#include <vector>

#include "db/file-db.h"
#include "strategy-fixture.h"

class IncBackupFixture : public StrategyFixture {
protected:
    IncBackupFixture();
    ~IncBackupFixture() override;

    // Each option of the task that says where files land.
    void SetNaming(bool keep_dir_structure, bool smart_create_date_dir, bool rename_photo_video);
    void SetRenamePolicy();
    // Local time for everything that follows; the fixture starts and ends with UTC.
    static void SetTimeZone(const char* name);

    // A whole run as the workers make it, with its outcome. The failures of single events are in
    // m_failures.
    int RunTask();
    // A run in which nothing may fail.
    void RunWell();
    // How many files the platform copied since the last call.
    int TakeCopies();
    // As after a restart of the daemon.
    void ReopenFileDB();
    // The destination of the row, or "-" without one.
    std::string Recorded(const std::string& source_path);
    [[nodiscard]] std::string FileDBPath() const;

    std::vector<std::string> m_failures;
};
