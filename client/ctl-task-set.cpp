#include "client/command.h"
#include "client/ctl-task.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/plugged-device.h"
#include "client/share-folder.h"
#include "client/task-options.h"
#include "client/task-text.h"
#include "db/task-info.h"

namespace {

struct SetOptions {
    std::string task;
    std::string to;
    TaskOptions changes;
};

// Where the task's device is mounted; empty while it is not plugged in.
std::string MountPath(const PObject& task) {
    for (const PluggedDevice& device : ListPluggedDevices()) {
        if (!device.uuid.empty() && task["uuid"].StringView() == device.uuid) {
            return device.mount_path;
        }
    }
    return "";
}

// How many versions to keep was never said, and all beyond the number would be removed at once.
void CheckRotation(const TaskOptions& changes, const PObject& task) {
    if (changes.rotation.empty() || changes.versions || task["enable_rotation"].AsBool()) return;
    throw CommandError(EXIT_USAGE, "task " + TaskLabel(task) +
                                       " keeps all its versions: say with --versions how many it "
                                       "shall keep from now on");
}

void SetTask(const Ctl& ctl, const SetOptions& options) {
    const PObject task = ctl.daemon.FindTask(options.task);
    CheckStrategy(options.changes, task["copy_strategy"].AsInt32());
    CheckRotation(options.changes, task);
    PObject request;
    SetTaskKeys(options.changes, request);
    if (request.IsNull() && options.to.empty()) {
        throw CommandError(EXIT_USAGE,
                           "say what to change; \"ferrixctl task set --help\" tells "
                           "what there is");
    }
    request["task_id"] = task["id"].AsUInt64();
    request["task_type"] = task["type"].AsInt32();
    if (task["type"].AsInt32() == TASK_TYPE_EXPORT_GENERAL) {
        if (!options.to.empty()) {
            request["usb_folder_path"] = ParseDeviceFolder(options.to, MountPath(task));
        }
    } else {
        // The daemon checks the destination of an import with every change, and has to be told it.
        const ShareFolder folder = options.to.empty()
                                       ? SplitDisplayPath(task["destination_path"].AsString())
                                       : ParseShareFolder(options.to);
        request["hub_share_name"] = folder.share;
        request["hub_folder_path"] = folder.folder;
    }
    (void)ctl.daemon.Ask("set_task_setting", std::move(request));
}

}  // namespace

void AddTaskSetCommand(CLI::App& group, const Ctl& ctl) {
    const auto options = std::make_shared<SetOptions>();
    CLI::App* command = AddCommand(
        group, "set",
        "Changes settings of a task; what is not named stays. The device, the source and the "
        "strategy of a task cannot be changed. Fewer --versions remove the surplus at once. To "
        "change --to moves nothing that was copied.",
        "ferrixctl task set Camera --name \"Anna's camera\"\n"
        "ferrixctl task set 3 --to photos/anna --conflict overwrite\n"
        "ferrixctl task set Backup --versions 14 --rotation smart");
    AddTaskArgument(*command, options->task);
    command->add_option("--to", options->to,
                        "The destination: SHARE/FOLDER; of an export a folder of the device");
    AddTaskOptions(*command, options->changes);
    command->callback([options, &ctl] { SetTask(ctl, *options); });
}
