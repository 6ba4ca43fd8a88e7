#include "client/share-tasks.h"

#include <gtest/gtest.h>

#include "db/task-info.h"

namespace {

PObject Task(uint64_t id, int type, const char* source, const char* destination) {
    PObject task;
    task["id"] = id;
    task["type"] = type;
    task["task_name"] = "Task";
    task["source_path"] = source;
    task["destination_path"] = destination;
    return task;
}

std::string Found(const PObject::array_type& tasks, const std::string& share) {
    return TaskLabels(TasksOfShare(tasks, share));
}

}  // namespace

TEST(ShareTasksTest, ATaskIsOnTheShareThatItsFolderBeginsWith) {
    const PObject::array_type tasks = {
        Task(1, TASK_TYPE_IMPORT_GENERAL, "/DCIM", "/photos"),
        Task(2, TASK_TYPE_IMPORT_PHOTO, "/photos", "/photos/in/box"),
        Task(3, TASK_TYPE_EXPORT_GENERAL, "/photos/out", "/music"),
        Task(4, TASK_TYPE_IMPORT_GENERAL, "/photos", "/photos2"),
        Task(5, TASK_TYPE_IMPORT_GENERAL, "/photos", "/music/photos"),
    };
    EXPECT_EQ("1 Task, 2 Task, 3 Task", Found(tasks, "photos"));
    EXPECT_EQ("4 Task", Found(tasks, "photos2"));
    EXPECT_EQ("5 Task", Found(tasks, "music"));
    EXPECT_EQ("", Found(tasks, "Photos"));
    EXPECT_EQ("", Found(tasks, "photo"));
}

TEST(ShareTasksTest, ADefaultTaskWithoutAShareIsOnNone) {
    const PObject::array_type tasks = {Task(1, TASK_TYPE_IMPORT_GENERAL, "/", "/"),
                                       Task(2, TASK_TYPE_IMPORT_GENERAL, "/", ""), PObject()};
    EXPECT_EQ("", Found(tasks, ""));
    EXPECT_EQ("", Found(tasks, "photos"));
}

TEST(ShareTasksTest, NamesAreMadeSafeToShow) {
    PObject task = Task(7, TASK_TYPE_IMPORT_GENERAL, "/", "/photos");
    task["task_name"] = "\033[2J";
    EXPECT_EQ("7 \\x1b[2J", Found({task}, "photos"));
}
