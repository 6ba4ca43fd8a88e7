// A box for tests of the updater: the scripted platform, a scratch repository, the box's key files.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <filesystem>
#include <string>
#include <vector>

#include "db/raw-database.h"
#include "fake/fake-keld.h"
#include "platform/package-paths.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"
#include "updater/old-repository.h"
#include "updater/updater-core.h"

class UpdaterTest : public testing::Test {
protected:
    UpdaterTest() : m_fake(FakeKeld::Reset()) {
        m_dir.MakeDir("v1/@Ferrix/db");
        m_dir.MakeDir("v1/@Ferrix/task");
        m_dir.MakeDir("etc");
    }

    // The box's key files, as texts.
    void SetCapabilities(const std::string& text) const { m_dir.Write("etc/caps", text); }
    void SetSettings(const std::string& text) const { m_dir.Write("etc/settings", text); }
    [[nodiscard]] std::string Settings() const { return ReadWholeFile(m_dir / "etc/settings"); }
    [[nodiscard]] BoxConfigPaths Paths() const {
        return {m_dir / "etc/caps", m_dir / "etc/settings"};
    }

    int Run() { return UpdaterCore(Paths()).Run(m_repository); }

    [[nodiscard]] std::string InRepository(const std::string& relative) const {
        return m_repository + "/" + relative;
    }
    [[nodiscard]] std::string Read(const std::string& sql) const {
        return RawDatabase(m_task_db).Read(sql);
    }
    // What lies in the repository that is no part of one at rest.
    [[nodiscard]] std::vector<std::string> Leftovers() const {
        std::vector<std::string> found;
        for (const std::string& path : FilesIn(m_repository)) {
            if (path.find(".sqlite") != std::string::npos && !path.ends_with(".sqlite")) {
                found.push_back(path);
            }
        }
        return found;
    }

    FakeKeld& m_fake;
    TempDir m_dir;
    std::string m_repository = m_dir / "v1/@Ferrix";
    std::string m_task_db = m_repository + "/db/task-db.sqlite";
    LogCapture m_log;
};
