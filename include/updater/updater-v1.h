// Lifts a repository of version 1: tasks had no timetable, no rotation and no removal of the
// source; the databases of incremental tasks had indexes under other names.
//
// No file is changed in place: each database is changed in a copy beside it that then takes its
// place in one step. The databases of the tasks go first, because the list of these tasks is read
// from the old task database. Each task gets a disabled entry of the platform's scheduler.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "updater/updater-base.h"

class UpdaterV1 : public UpdaterBase {
public:
    using UpdaterBase::UpdaterBase;

    [[nodiscard]] int Run() override;

private:
    int UpdateFileDBs();
    int UpdateFileDB(uint64_t task_id);
    int ChangeFileDB(const std::string& path);
    int UpdateTaskDB(const std::string& path);
    // On the copy of the task database. The ids of the entries made are added to `schedule_ids`,
    // also when it fails.
    int ChangeTaskDB(const std::string& copy, std::vector<int64_t>& schedule_ids);
    int AddSchedules(const std::string& copy, std::vector<int64_t>& schedule_ids);
};
