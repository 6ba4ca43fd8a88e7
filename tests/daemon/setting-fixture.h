// Requests of settings for a task that an import or an export has, in a share with some folders.
#pragma once

#include <gmock/gmock.h>
#include <gtest/gtest.h>

#include <map>
#include <string>
#include <vector>

#include "command-fixture.h"
#include "db/log-description.h"

class SettingTest : public CommandTest {
protected:
    using Keys = std::map<std::string, PObject>;

    SettingTest() {
        for (const char* folder : {"in", "in/deep", "other"}) {
            m_dir.MakeDir(std::string("v1/photos/") + folder);
        }
        PlugIn("a", "u-1");
        m_task_id = AddTask("a", "u-1");
        m_log.Clear();
        m_fake.ForgetCalls();
    }
    // A request of an import with the three keys that every one has to send, changed or not.
    PObject Import(const Keys& keys) const { return ImportSetting(m_task_id, keys); }
    PObject Export(uint64_t task_id, const Keys& keys) const {
        PObject request = ForTask(task_id);
        request["task_type"] = 2;
        for (const auto& [key, value] : keys) request[key] = value;
        return request;
    }
    uint64_t AddExport() {
        PlugIn("x", "u-x");
        PObject request = AddRequest("x", "u-x");
        request["task_type"] = 2;
        const PObject response = Send("add_task", request);
        EXPECT_THAT(response, IsSuccess());
        return response["task_id"].AsUInt64();
    }
    PObject Set(const PObject& request) { return Send("set_task_setting", request); }
    PObject Get() { return Send("get_task_setting", ForTask(m_task_id)); }
    static std::vector<std::string> Changes() {
        return LogTexts(LogDescription::LOG_DESC_TASK_SETTING_CHANGED);
    }

    uint64_t m_task_id = 0;
};
