#include <json/value.h>

#include <algorithm>
#include <iostream>

#include "client/command.h"
#include "client/ctl-task.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/filter-lists.h"
#include "client/json-output.h"
#include "client/plugged-device.h"
#include "client/refusal.h"
#include "client/share-folder-maker.h"
#include "client/share-folder.h"
#include "client/task-options.h"
#include "client/text.h"
#include "client/timetable.h"
#include "db/task-info.h"
#include "platform/task-utils.h"
#include "utils/path-util.h"

namespace {

constexpr uint64_t VERSION_COUNT = 256;

struct AddOptions {
    std::string device;
    std::string from;
    std::string to;
    std::string strategy = "incremental";
    bool is_export = false;
    bool makes_folder = false;
    bool stays_quiet = false;  // when the device is plugged in
    bool ejects = false;
    bool runs_now = false;
    bool as_json = false;
    std::string time;
    std::vector<std::string> days;
    TaskOptions task;
    FilterOptions filter;
};

int StrategyNumber(const std::string& text) {
    if (text == "version") return COPY_STRATEGY_VERSION;
    if (text == "mirror") return COPY_STRATEGY_MIRROR;
    return COPY_STRATEGY_INCREMENTAL;
}

void SetFolders(const AddOptions& options, const PluggedDevice& device, PObject& request) {
    const std::string& share_side = options.is_export ? options.from : options.to;
    const std::string& device_side = options.is_export ? options.to : options.from;
    if (share_side.empty()) {
        throw CommandError(
            EXIT_USAGE, options.is_export ? "--export needs the folder to copy: --from SHARE/FOLDER"
                                          : "where to? --to SHARE/FOLDER");
    }
    const ShareFolder folder = ParseShareFolder(share_side);
    request["hub_share_name"] = folder.share;
    request["hub_folder_path"] = folder.folder;
    const std::string device_folder = ParseDeviceFolder(device_side, device.mount_path);
    // The destination of an export is made by its first run.
    if (!options.is_export) CheckDeviceFolder(device.mount_path, device_folder);
    request["usb_folder_path"] = device_folder;
}

// All that the daemon reads, with what is usual where nothing was said. What is usual loses
// nothing: no strategy that removes, and a file in the way is set aside.
PObject MakeRequest(const AddOptions& options, const PluggedDevice& device) {
    PObject request;
    request["usb_share_path"] = device.mount_path;
    request["uuid"] = device.uuid;
    const DeviceMake make = ReadDeviceMake(device);
    request["producer"] = make.producer;
    request["product"] = make.product;
    request["run_when_plug_in"] = !options.stays_quiet;
    request["eject_when_task_done"] = options.ejects;
    request["task_name"] = make.product.empty() ? PathBaseName(device.mount_path) : make.product;
    request["task_type"] =
        static_cast<int>(options.is_export ? TASK_TYPE_EXPORT_GENERAL : TASK_TYPE_IMPORT_GENERAL);
    request["copy_strategy"] = StrategyNumber(options.strategy);
    request["keep_dir_structure"] = true;
    request["smart_create_date_dir"] = false;
    request["rename_photo_video"] = false;
    request["remove_src_file"] = false;
    request["conflict_policy"] = static_cast<int>(CONFLICT_POLICY_RENAME);
    request["enable_rotation"] = false;
    request["max_version_count"] = VERSION_COUNT;
    request["rotation_policy"] = static_cast<int>(ROTATION_POLICY_CONDITIONAL);
    SetTaskKeys(options.task, request);
    SetFilterLists(options.filter, request);
    const Timetable timetable =
        options.time.empty() ? Timetable() : MakeTimetable(options.time, options.days);
    request["schedule_enabled"] = timetable.is_enabled;
    request["schedule_json_str"] = ScheduleText(timetable);
    return request;
}

// Whether there is no task, for sure, that copies into this folder of a share.
bool IsUnused(const DaemonClient& daemon, const ShareFolder& folder) {
    try {
        const PObject::array_type tasks = daemon.Tasks();
        return std::ranges::none_of(tasks, [&folder](const PObject& task) {
            const ShareFolder used = SplitDisplayPath(task["destination_path"].AsString());
            return used.share == folder.share && used.folder == folder.folder;
        });
    } catch (const CommandError&) {
        return false;
    }
}

// For a task that is refused for any other reason no folder is made, or it goes again.
PObject AskWithFolder(const DaemonClient& daemon, const PObject& request) {
    try {
        return daemon.Ask("add_task", request);
    } catch (const Refusal& refusal) {
        if (refusal.Code() != REFUSED_NO_DESTINATION) throw;
    }
    const ShareFolder folder{request["hub_share_name"].AsString(),
                             request["hub_folder_path"].AsString()};
    ShareFolderMaker maker;
    maker.Make(folder);
    try {
        return daemon.Ask("add_task", request);
    } catch (const CommandError&) {
        // Some refusals leave the task behind, and a daemon that fell silent may have added it.
        if (IsUnused(daemon, folder)) maker.TakeBack();
        throw;
    }
}

void AddTask(const Ctl& ctl, const AddOptions& options) {
    CheckStrategy(options.task, StrategyNumber(options.strategy));
    if (!options.days.empty() && options.time.empty()) {
        throw CommandError(EXIT_USAGE, "--days needs the time of the day: --at 02:30");
    }
    const PluggedDevice device = FindPluggedDevice(options.device);
    if (device.uuid.empty()) {
        throw CommandError(EXIT_REFUSED, "the device on " + Printable(device.mount_path) +
                                             " has no uuid to know it by: format it anew");
    }
    PObject request = MakeRequest(options, device);
    SetFolders(options, device, request);
    const PObject added = options.makes_folder ? AskWithFolder(ctl.daemon, request)
                                               : ctl.daemon.Ask("add_task", std::move(request));
    const uint64_t id = added["task_id"].AsUInt64();
    if (options.as_json) {
        Json::Value answer;
        answer["task_id"] = static_cast<Json::UInt64>(id);
        PrintJson(answer);
    } else {
        std::cout << id << '\n';
    }
    if (options.runs_now) (void)ctl.daemon.AskAbout("run_task", id);
}

}  // namespace

void AddTaskAddCommand(CLI::App& group, const Ctl& ctl) {
    const auto options = std::make_shared<AddOptions>();
    CLI::App* command = AddCommand(
        group, "add",
        "Makes a task for a plugged-in device and prints its id. Without more than --to, "
        "everything "
        "on the only device is copied when it is plugged in, what has been copied before is not "
        "copied again, and nothing is ever removed.",
        "ferrixctl task add --to photos/inbox --name Camera --make-folder\n"
        "ferrixctl task add --device /volumeUSB1/usbshare --to photos/inbox "
        "--strategy incremental --date-folders --rename --name Camera\n"
        "ferrixctl task add --device /dev/sdb1 --to backup --strategy version --versions 30\n"
        "ferrixctl task add --export --from photos --strategy mirror --at 02:30 --days mon-fri");
    command->add_option("--device", options->device,
                        "The device, by where it is mounted or by its name below /dev; not needed "
                        "when only one is plugged in");
    command->add_option("--to", options->to,
                        "Where to: SHARE/FOLDER; with --export a folder of the device");
    command->add_option("--from", options->from,
                        "What is copied: a folder of the device, all of it if not given; with "
                        "--export SHARE/FOLDER");
    CLI::Option* is_export =
        command->add_flag("--export", options->is_export, "Copies from the share to the device");
    command
        ->add_flag("--make-folder", options->makes_folder,
                   "Makes the folder of the share if it is missing; an export makes its folder of "
                   "the device without it")
        ->excludes(is_export);
    command
        ->add_option("--strategy", options->strategy,
                     "\"incremental\" copies what it has not copied yet; \"mirror\" makes the "
                     "destination equal, and removes there what is gone; \"version\" makes a whole "
                     "dated copy each time")
        ->check(CLI::IsMember({"incremental", "mirror", "version"}))
        ->capture_default_str();
    AddTaskOptions(*command, options->task);
    AddFilterOptions(*command, options->filter);
    command->add_flag("--not-on-plug-in", options->stays_quiet,
                      "Does not run by itself when the device is plugged in");
    command->add_flag("--eject", options->ejects, "Ejects the device after each run");
    command->add_option("--at", options->time, "Runs at this time of the day: \"02:30\"");
    command->add_option("--days", options->days, "On these days only: \"mon-fri\", \"sat,sun\"")
        ->delimiter(',');
    command->add_flag("--run", options->runs_now, "Runs the task at once");
    AddJsonOption(*command, options->as_json);
    command->callback([options, &ctl] { AddTask(ctl, *options); });
}
