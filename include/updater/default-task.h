// The default tasks of a new repository: they serve devices at the front ports that have no task of
// their own. An older release kept one copy folder in the box's settings; it lives on in them.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "db/task-db.h"

// The box's own key files.
struct BoxConfigPaths {
    std::string capabilities = "/etc.defaults/keldinfo.conf";
    std::string settings = "/etc/keldinfo.conf";
};

// Makes the task database of a new repository, unless the model has no front ports. It appears in
// its place whole, with its rows and their folders on the disk, or not at all: so an attempt that
// was broken off is followed by another one. The older settings are removed after that.
class DefaultTasks {
public:
    DefaultTasks(std::string repository, const BoxConfigPaths& paths);
    DefaultTasks(const DefaultTasks&) = delete;
    DefaultTasks& operator=(const DefaultTasks&) = delete;

    // 0 or -1 (logged).
    [[nodiscard]] int Prepare();

private:
    struct Kind;
    static const Kind KINDS[];

    int PrepareRows(const Kind& kind);
    int PrepareOne(const Kind& kind);
    int CreateFrom(const Kind& kind, const std::string& old_folder);
    int Create(const Kind& kind, const std::string& share, const std::string& folder,
               bool is_enable);
    int AddUSB(const Kind& kind, uint64_t& usb_id);
    int AddTask(const TaskInfo& task);
    int WriteTaskFolder(uint64_t task_id);
    int PutInPlace();
    int RemoveOldKeys();

    std::string m_repository;
    BoxConfigPaths m_paths;
    std::string m_db_path;   // where the database will be
    std::string m_new_path;  // where it is made
    TaskDB m_db;
    std::vector<const Kind*> m_taken_over;  // those whose older setting is no longer needed
};
