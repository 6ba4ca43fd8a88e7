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
// was broken off is followed by another one. The older settings are removed after that, by a later
// start when this one is broken off.
class DefaultTasks {
public:
    DefaultTasks(std::string repository, const BoxConfigPaths& paths);
    DefaultTasks(const DefaultTasks&) = delete;
    DefaultTasks& operator=(const DefaultTasks&) = delete;

    // With `replaces_empty` a database without tables was seen in the place; otherwise nothing is
    // there, and nothing is replaced. 0 or -1 (logged).
    [[nodiscard]] int Prepare(bool replaces_empty);

    // In a repository that is in use: removes the older settings that live on in its default tasks
    // by now. The database is only read. What fails is logged, and is for the next start.
    void RemoveLeftKeys();

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
    int PutInPlace(bool replaces_empty);
    int RemoveOldKeys();
    int RemoveOldKey(const Kind& kind);
    void RemoveLeftKey(const Kind& kind);

    std::string m_repository;
    BoxConfigPaths m_paths;
    std::string m_db_path;   // where the database will be
    std::string m_new_path;  // where it is made
    TaskDB m_db;
    bool m_is_clear = false;  // nothing of an earlier attempt is where it is made
    bool m_has_rows = false;
    std::vector<const Kind*> m_taken_over;  // those whose older setting is no longer needed
};
