#include <json/value.h>

#include <iostream>

#include "client/command.h"
#include "client/ctl-task.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/filter-lists.h"
#include "client/json-output.h"
#include "client/plugged-device.h"
#include "client/share-folder.h"
#include "client/task-options.h"
#include "client/text.h"
#include "client/timetable.h"
#include "db/task-info.h"
#include "platform/task-utils.h"
#include "utils/file-op.h"

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

// An option that the strategy would pass over in silence is a misunderstanding.
void CheckStrategy(const AddOptions& options) {
    const bool sorts = options.task.uses_date_folders || options.task.renames ||
                       options.task.keeps_folders || options.task.moves ||
                       !options.task.conflict.empty();
    if (sorts && options.strategy != "incremental") {
        throw CommandError(
            EXIT_USAGE,
            "--date-folders, --rename, --keep-folders, --flat, --move and --conflict "
            "are for --strategy incremental");
    }
    const bool rotates =
        options.task.versions || options.task.keeps_all_versions || !options.task.rotation.empty();
    if (rotates && options.strategy != "version") {
        throw CommandError(EXIT_USAGE,
                           "--versions, --all-versions and --rotation are for --strategy version");
    }
    if (!options.days.empty() && options.time.empty()) {
        throw CommandError(EXIT_USAGE, "--days needs the time of the day: --at 02:30");
    }
}

void SetFolders(const AddOptions& options, PObject& request) {
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
    request["usb_folder_path"] = ParseDeviceFolder(device_side);
    if (!options.makes_folder || options.is_export) return;
    std::string path;
    if (GetHubDirFullPath(folder.share, folder.folder, path) < 0 ||
        FSMKDirP(path, FS_KEEP_UID, FS_KEEP_GID) < 0) {
        throw CommandError(EXIT_REFUSED,
                           "the folder \"" + Printable(share_side) + "\" could not be made");
    }
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

void AddTask(const Ctl& ctl, const AddOptions& options) {
    CheckStrategy(options);
    const PluggedDevice device = FindPluggedDevice(options.device);
    if (device.uuid.empty()) {
        throw CommandError(EXIT_REFUSED, "the device on " + Printable(device.mount_path) +
                                             " has no uuid to know it by: format it anew");
    }
    PObject request = MakeRequest(options, device);
    SetFolders(options, request);
    const uint64_t id = ctl.daemon.Ask("add_task", std::move(request))["task_id"].AsUInt64();
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
    command->add_flag("--export", options->is_export, "Copies from the share to the device");
    command->add_flag("--make-folder", options->makes_folder,
                      "Makes the folder of the share if it is missing");
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
