// A repository on the first of two volumes, to be moved to the second one.
#pragma once

#include <fstream>

#include "service/repo-move.h"
#include "service/repository.h"
#include "service/service-fixture.h"

class RepoMoveTest : public ServiceTest {
protected:
    RepoMoveTest() {
        Restore();
        m_log.Clear();
    }

    // The repository on the first volume, the second one empty.
    void Restore() {
        FakeKeld::Reset().RunProgramsForReal();
        for (const std::string& volume : {m_v1, m_v2}) {
            std::filesystem::remove_all(volume);
            std::filesystem::create_directory(volume);
        }
        EXPECT_EQ(0, MakeRepo(m_v1));
        m_dir.Write("v1/@Ferrix/db/task-db.sqlite", "tasks");
        m_dir.Write("v1/@Ferrix/db/task-db.sqlite-wal", "late tasks");
        m_dir.Write("v1/@Ferrix/task/7/file-db.sqlite", std::string(300000, 'f'));
        EXPECT_EQ(0, RegisterVolume(m_v1));
    }
    static bool IsWhole(const std::string& volume) {
        const std::string repository = volume + "/@Ferrix/";
        return std::filesystem::exists(repository + "task/7/file-db.sqlite") &&
               ReadWholeFile(repository + "db/task-db.sqlite") == "tasks" &&
               ReadWholeFile(repository + "db/task-db.sqlite-wal") == "late tasks" &&
               ReadWholeFile(repository + "task/7/file-db.sqlite") == std::string(300000, 'f');
    }
    // The service has been started there meanwhile.
    static void UseRegistered() { std::ofstream(GetRepoVolPath() + "/@Ferrix/used") << "used"; }
    static bool IsUsed(const std::string& volume) {
        return std::filesystem::exists(volume + "/@Ferrix/used");
    }
    // What the next start finds.
    void ExpectWholeWhereRegistered() const {
        EXPECT_TRUE(GetRepoVolPath() == m_v1 || GetRepoVolPath() == m_v2) << GetRepoVolPath();
        EXPECT_TRUE(IsWhole(GetRepoVolPath())) << GetRepoVolPath();
    }
    static std::filesystem::perms Mode(const std::string& path) {
        return std::filesystem::status(path).permissions();
    }
    [[nodiscard]] bool HasFailure(const std::string& text) const {
        return HasPlaced("ERR", "FAIL: " + text);
    }
};
