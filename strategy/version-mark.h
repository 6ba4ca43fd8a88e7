// Remembers, across a crash, which folders of a task are not the good versions that their names
// say: the one that a run is filling, and those that a rotation is about to remove.
//
// The marks of a task are one small file in the task's folder below the repository. They are on the
// disk before the folder is touched, and go when the folder has been settled. Each tells where the
// folder is in a way that holds when the device is mounted elsewhere, or the task has been given
// another folder, by the time it is looked at again.
//
// Threads: any; one lock over each change of a file.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

struct TaskRunInfo;

struct VersionMark {
    enum Kind : char {
        FILLING = 'f',
        REMOVING = 'r',  // several stand in the order of their removal
    };
    Kind kind = FILLING;
    bool is_on_device = false;  // the folder is on the device of the task, else in a share
    std::string share_name;     // of the share of the task at that time
    std::string root;           // the path of the share; for a device it may have changed
    std::string folder;         // below the root: "" or with a leading "/"
    std::string name;           // of the version folder in it

    bool operator==(const VersionMark& other) const = default;
};

// The mark of the folder of the task's present run.
[[nodiscard]] VersionMark MakeVersionMark(const TaskRunInfo& task, VersionMark::Kind kind);
// Where the marked folder is now, without its own name.
[[nodiscard]] std::string MarkedFolder(const VersionMark& mark, const TaskRunInfo& task);

// Reads the marks of the task: 0, or -1 (logged) when they cannot be read.
[[nodiscard]] int ReadVersionMarks(uint64_t task_id, std::vector<VersionMark>& marks);
// Adds marks, or takes away those that equal the given ones. 0, with the change on the disk; -1
// (logged) when the file cannot be written.
[[nodiscard]] int PutVersionMarks(uint64_t task_id, const std::vector<VersionMark>& marks);
[[nodiscard]] int DropVersionMarks(uint64_t task_id, const std::vector<VersionMark>& marks);
