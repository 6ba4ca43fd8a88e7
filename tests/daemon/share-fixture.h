// A box whose shares move: what the share service does, and the hooks that it sends about it.
#pragma once

#include <cstdio>
#include <list>
#include <string>
#include <vector>

#include "command-fixture.h"
#include "processor/task-entry-handler.h"

// On top of a fixture of commands, with or without workers.
template <typename Base>
class OnShares : public Base {
protected:
    static PObject ShareRequest(const std::string& share, const std::string& origin = "") {
        PObject request;
        request["type"] = "share_hook";
        request["share_name"] = share;
        if (!origin.empty()) request["origin_share_name"] = origin;
        return request;
    }
    int ShareHook(const std::string& hook, const std::string& share,
                  const std::string& origin = "") {
        return this->Notify(hook, ShareRequest(share, origin));
    }
    // The folder and the share get another name; the hooks around it are not sent.
    void MoveShare(const std::string& from, const std::string& to) {
        this->m_fake.RemoveShare(from);
        ASSERT_EQ(
            0, rename((this->m_volume + "/" + from).c_str(), (this->m_volume + "/" + to).c_str()));
        this->AddShare(to);
    }
    void RenameShare(const std::string& from, const std::string& to) {
        EXPECT_EQ(0, ShareHook("pre_path_change", from));
        MoveShare(from, to);
        EXPECT_EQ(0, ShareHook("post_path_change", to, from));
    }
    // A device with a task on a folder of its own, which is made.
    uint64_t AddOn(const std::string& share, const std::string& device, int location = 0) {
        this->m_dir.MakeDir("v1/" + share + "/" + device);
        this->PlugIn(device, "u-" + device, location);
        PObject request = this->AddRequest(device, "u-" + device);
        request["hub_share_name"] = share;
        request["hub_folder_path"] = "/" + device;
        request["eject_when_task_done"] = false;
        const PObject response = this->Send("add_task", request);
        EXPECT_THAT(response, IsSuccess());
        this->m_log.Clear();
        return response["task_id"].AsUInt64();
    }
    std::string Status(uint64_t task_id) {
        return this->Send("get_task_setting", this->ForTask(task_id))["task_status"].AsString();
    }
    static size_t LoadedDevices() {
        std::list<USBRunInfo> devices;
        TaskEntryHandler::GetInstance().ListUSBEntries(devices);
        return devices.size();
    }
    // The lines above the level of debugging.
    std::vector<std::string> Told() const {
        std::vector<std::string> lines;
        for (const std::string& line : this->m_log.Lines()) {
            if (line.rfind("[DBG]", 0) != 0) lines.push_back(line);
        }
        return lines;
    }
    // Those of them that contain one of the parts.
    std::vector<std::string> Told(const std::vector<std::string>& parts) const {
        std::vector<std::string> lines;
        for (const std::string& line : Told()) {
            for (const std::string& part : parts) {
                if (line.find(part) == std::string::npos) continue;
                lines.push_back(line);
                break;
            }
        }
        return lines;
    }
};
