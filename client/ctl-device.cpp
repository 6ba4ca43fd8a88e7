#include <json/value.h>

#include <iostream>
#include <optional>

#include "client/command.h"
#include "client/ctl.h"
#include "client/json-output.h"
#include "client/plugged-device.h"
#include "client/table.h"
#include "client/task-text.h"
#include "client/text.h"
#include "platform/sdk-share.h"

namespace {

// A default task has no device of its own: it is the task of the one that it is loaded for.
bool IsLoadedFor(const PObject& task, const std::string& share_name) {
    return task["is_default_task"].AsBool() && !share_name.empty() &&
           task["usb_share_name"].StringView() == share_name;
}

const PObject* TaskOf(const PluggedDevice& device, const PObject::array_type& tasks) {
    for (const PObject& task : tasks) {
        if (!device.uuid.empty() && task["uuid"].StringView() == device.uuid) return &task;
    }
    std::string share_name;
    std::string share_path;
    if (SDK::GetShareNameByPath(device.mount_path, share_name, share_path) < 0) return nullptr;
    for (const PObject& task : tasks) {
        if (IsLoadedFor(task, share_name)) return &task;
    }
    return nullptr;
}

void ListDevices(const Ctl& ctl, bool as_json) {
    // What is plugged in can be told without the daemon.
    const std::optional<PObject::array_type> known = ctl.daemon.TasksIfReachable();
    const bool is_reachable = known.has_value();
    const PObject::array_type tasks = known.value_or(PObject::array_type());
    const std::vector<PluggedDevice> devices = ListPluggedDevices();
    Json::Value list(Json::arrayValue);
    Table table({"MOUNTED ON", "DEVICE", "UUID", "TASK", "STATUS"});
    for (const PluggedDevice& device : devices) {
        const PObject* task = TaskOf(device, tasks);
        Json::Value entry;
        entry["mountpoint"] = JsonText(device.mount_path);
        entry["device"] = JsonText(device.device_path);
        entry["uuid"] = JsonText(device.uuid);
        // Without the daemon it is not known, which is not the same as none.
        if (is_reachable) {
            entry["task_id"] =
                task == nullptr ? Json::Value()
                                : Json::Value(static_cast<Json::UInt64>((*task)["id"].AsUInt64()));
        }
        list.append(entry);
        table.Add({Printable(device.mount_path), Printable(device.device_path),
                   device.uuid.empty() ? "none" : Printable(device.uuid),
                   task == nullptr ? (is_reachable ? "none" : "?") : TaskLabel(*task),
                   task == nullptr ? Table::Cell("-") : StatusCell(*task)});
    }
    if (as_json) return PrintJson(list);
    if (devices.empty()) {
        std::cout << "No device is plugged in and mounted: mount it first.\n";
        return;
    }
    std::cout << table.Text(ctl.output);
    if (!is_reachable) std::cout << "The daemon does not run: tasks are not known.\n";
}

}  // namespace

void AddDeviceCommands(CLI::App& program, const Ctl& ctl) {
    CLI::App* group = AddCommandGroup(program, "device", "The devices that are plugged in.",
                                      "ferrixctl device list");
    const auto as_json = std::make_shared<bool>(false);
    CLI::App* list = AddCommand(*group, "list",
                                "Lists what is plugged in and mounted, with its uuid and its task.",
                                "ferrixctl device list");
    AddJsonOption(*list, *as_json);
    list->callback([as_json, &ctl] { ListDevices(ctl, *as_json); });
}
