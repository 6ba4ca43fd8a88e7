// A box for tests of commands and hooks: a scratch repository and package folder, the scripted
// platform, real databases, and an application object without running workers.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <list>
#include <map>
#include <string>
#include <vector>

#include "daemon/app.h"
#include "db/task-info.h"
#include "fake/fake-keld.h"
#include "ipc/pobject.h"
#include "strategy/task-run-info.h"
#include "support/log-capture.h"
#include "support/temp-dir.h"

class CommandTest : public testing::Test {
protected:
    CommandTest();
    ~CommandTest() override;

    // The workers stand still until this; they are stopped at the end.
    void StartWorkers();

    // --- Messages, as a client and the mount service send them
    PObject Send(const std::string& action, PObject request = PObject());
    int Notify(const std::string& hook, const std::string& mount_path,
               const std::string& device_path);
    int Notify(const std::string& hook, const PObject& request);

    // --- The box
    // Makes the share's folder on the volume, and the share.
    void AddShare(const std::string& name);
    // Makes a device with a uuid in its key file, and mounts it; gives its mount path.
    std::string PlugIn(const std::string& name, const std::string& uuid, int location = 0,
                       int partitions = 1);
    [[nodiscard]] std::string MountPath(const std::string& name) const;
    [[nodiscard]] std::string DevicePath(const std::string& name) const;
    // Posts the hook of a device that PlugIn() made.
    int PostMount(const std::string& name);
    // The copy button.
    int PressButton();
    int PreUnmount(const std::string& name);
    // Loads what is mounted, as "link" does; and forgets all entries, as "stop" does.
    int LoadEntries();
    void ForgetEntries();
    // Loads the default task for a device, as a removal of its own task does.
    int LoadDefaultTask(const std::string& path, const std::string& uuid);
    // Writes the rows and the files of a default task, as the installer does.
    uint64_t AddDefaultTask(const char* uuid, bool is_enable = true);

    // --- Tasks
    // A request that succeeds for a device from PlugIn(): a mirror of it into "photos".
    [[nodiscard]] PObject AddRequest(const std::string& device, const std::string& uuid) const;
    // Sends it; the id of the new task, 0 on failure.
    uint64_t AddTask(const std::string& device, const std::string& uuid);
    [[nodiscard]] static PObject ForTask(uint64_t task_id);
    // A setting of an import, with the three keys that each has to send: for the root of "photos".
    [[nodiscard]] static PObject ImportSetting(uint64_t task_id,
                                               const std::map<std::string, PObject>& keys);
    [[nodiscard]] static PObject List(const std::vector<std::string>& texts);
    [[nodiscard]] std::string TaskFolder(uint64_t task_id) const;
    [[nodiscard]] static std::list<TaskInfo> Tasks();
    [[nodiscard]] static std::list<USBInfo> Devices();
    [[nodiscard]] static TaskInfo Task(uint64_t task_id);
    [[nodiscard]] static bool IsLoaded(uint64_t task_id);
    [[nodiscard]] static TaskRunInfo Entry(uint64_t task_id);
    // The number of log rows of a description.
    [[nodiscard]] static uint64_t LogRows(int description_id);
    // Their parameters, newest first.
    [[nodiscard]] static std::vector<std::string> LogTexts(int description_id);
    // Makes every INSERT, UPDATE or DELETE of rows of a table fail; it stays readable.
    void BreakTable(const std::string& table, const std::string& what);
    // Makes every access to a table fail.
    void DropTable(const std::string& table);

    FakeKeld& m_fake;
    TempDir m_dir;
    LogCapture m_log;
    std::string m_volume;  // holds the repository and the shares
    Ferrixd m_app;

private:
    void Execute(const std::string& table, const std::string& sql);
};

// Matches a response that reports this failure, and nothing else.
testing::Matcher<const PObject&> IsError(int code, const std::string& text);
// Matches a response without an error.
testing::Matcher<const PObject&> IsSuccess();
