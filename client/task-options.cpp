#include "client/task-options.h"

#include "client/exit-status.h"
#include "client/task-text.h"
#include "db/task-info.h"
#include "ipc/pobject.h"

void AddSwitch(CLI::App& command, const std::string& name, const std::string& opposite,
               std::optional<bool>& value, const std::string& description,
               const std::string& opposite_description) {
    CLI::Option* on = command.add_flag_callback(
        name, [&value] { value = true; }, description);
    CLI::Option* off = command.add_flag_callback(
        opposite, [&value] { value = false; }, opposite_description);
    on->excludes(off);
}

void AddTaskOptions(CLI::App& command, TaskOptions& options) {
    command.add_option("--name", options.name, "What the task is called");
    AddSwitch(command, "--date-folders", "--no-date-folders", options.uses_date_folders,
              "Incremental: files go into folders by date, \"2026-11-21\"",
              "Incremental: no folders by date");
    AddSwitch(command, "--rename", "--no-rename", options.renames,
              "Incremental: pictures and videos are named by their time, \"2026-11-21_190433.jpg\"",
              "Incremental: files keep their names");
    AddSwitch(command, "--keep-folders", "--flat", options.keeps_folders,
              "Incremental: the folders of the source are made in the destination",
              "Incremental: all files go into one folder");
    AddSwitch(command, "--move", "--no-move", options.moves,
              "Incremental: files leave the source once their copies are proven to be on the disk",
              "Incremental: files stay in the source");
    command
        .add_option("--conflict", options.conflict,
                    "Incremental: what becomes of a file in the way: \"rename\" sets it aside, "
                    "\"overwrite\" replaces it")
        ->check(CLI::IsMember({"rename", "overwrite"}));
    CLI::Option* versions =
        command
            .add_option("--versions", options.versions,
                        "Version: how many versions are kept; older ones are removed")
            ->check(CLI::Range(uint64_t{1}, uint64_t{INT64_MAX}));
    CLI::Option* rotation =
        command
            .add_option("--rotation", options.rotation,
                        "Version: which go first: the \"oldest\", or a \"smart\" choice that keeps "
                        "one an hour, a day, a week; a new task keeps 256 if --versions does not "
                        "say how many")
            ->check(CLI::IsMember({"smart", "oldest"}));
    command
        .add_flag_callback(
            "--all-versions", [&options] { options.keeps_all_versions = true; },
            "Version: nothing is removed")
        ->excludes(versions)
        ->excludes(rotation);
}

void SetTaskKeys(const TaskOptions& options, PObject& request) {
    const bool is_sorted =
        options.uses_date_folders.value_or(false) || options.renames.value_or(false);
    if (is_sorted && options.keeps_folders.value_or(false)) {
        throw CommandError(EXIT_USAGE,
                           "--keep-folders leaves every file where it lies: it does not go with "
                           "--date-folders or --rename");
    }
    if (!options.name.empty()) request["task_name"] = options.name;
    if (options.uses_date_folders) request["smart_create_date_dir"] = *options.uses_date_folders;
    if (options.renames) request["rename_photo_video"] = *options.renames;
    if (is_sorted) request["keep_dir_structure"] = false;
    if (options.keeps_folders) request["keep_dir_structure"] = *options.keeps_folders;
    if (options.moves) request["remove_src_file"] = *options.moves;
    if (!options.conflict.empty()) {
        request["conflict_policy"] = static_cast<int>(
            options.conflict == "rename" ? CONFLICT_POLICY_RENAME : CONFLICT_POLICY_OVERWRITE);
    }
    if (options.versions) {
        request["enable_rotation"] = true;
        request["max_version_count"] = *options.versions;
    }
    if (options.keeps_all_versions) request["enable_rotation"] = false;
    if (!options.rotation.empty()) {
        request["enable_rotation"] = true;
        request["rotation_policy"] = static_cast<int>(
            options.rotation == "smart" ? ROTATION_POLICY_CONDITIONAL : ROTATION_POLICY_OLDEST);
    }
}

void CheckStrategy(const TaskOptions& options, int strategy) {
    const auto refuse = [strategy](const std::string& names, int fitting) {
        throw CommandError(EXIT_USAGE, names + " are for the strategy " + StrategyText(fitting) +
                                           ", and this is " + StrategyText(strategy));
    };
    const bool sorts = options.uses_date_folders || options.renames || options.keeps_folders ||
                       options.moves || !options.conflict.empty();
    if (sorts && strategy != COPY_STRATEGY_INCREMENTAL) {
        refuse("--date-folders, --rename, --keep-folders, --flat, --move and --conflict",
               COPY_STRATEGY_INCREMENTAL);
    }
    const bool rotates =
        options.versions || options.keeps_all_versions || !options.rotation.empty();
    if (rotates && strategy != COPY_STRATEGY_VERSION) {
        refuse("--versions, --all-versions and --rotation", COPY_STRATEGY_VERSION);
    }
}
