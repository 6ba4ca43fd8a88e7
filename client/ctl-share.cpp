#include <json/value.h>

#include <iostream>
#include <optional>

#include "client/box-admin.h"
#include "client/command.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/json-output.h"
#include "client/share-change.h"
#include "client/share-tasks.h"
#include "client/table.h"
#include "client/text.h"
#include "platform/sdk-share.h"
#include "utils/file-op.h"

namespace {

using TaskList = std::optional<PObject::array_type>;  // none: the daemon does not answer

Table::Cell StateCell(const SDK::Share& share) {
    if (!share.IsMounted()) return {"locked", Colour::YELLOW};
    if (!FSExists(share.GetPath())) return {"missing", Colour::RED};
    return {"mounted", Colour::GREEN};
}

const char* RecycleBinText(const SDK::Share& share) {
    if (!share.IsRecycleBinEnabled()) return "no";
    return share.IsRecycleBinAdminOnly() ? "administrators" : "yes";
}

Json::Value ShareJson(const std::string& name, const SDK::Share& share, const TaskList& tasks) {
    Json::Value json;
    json["name"] = JsonText(name);
    json["path"] = JsonText(share.GetPath());
    json["volume"] = JsonText(share.GetVolumePath());
    json["state"] = StateCell(share).text;
    json["can_be_locked"] = share.IsEncrypted();
    json["recycle_bin"] = share.IsRecycleBinEnabled();
    json["recycle_bin_admin_only"] = share.IsRecycleBinAdminOnly();
    Json::Value& ids = json["task_ids"];
    if (!tasks) return json;
    ids = Json::Value(Json::arrayValue);
    for (const PObject& task : TasksOfShare(*tasks, name)) {
        ids.append(static_cast<Json::UInt64>(task["id"].AsUInt64()));
    }
    return json;
}

Table::Row ShareRow(const std::string& name, const SDK::Share& share, const TaskList& tasks) {
    const std::string labels = tasks ? TaskLabels(TasksOfShare(*tasks, name)) : "?";
    return {Printable(name),  Printable(share.GetPath()), Printable(share.GetVolumePath()),
            StateCell(share), RecycleBinText(share),      labels.empty() ? "none" : labels};
}

void ListShares(const Ctl& ctl, bool as_json) {
    CheckShares();
    std::vector<std::string> names;
    if (SDK::ListShares(1, names) < 0) {
        throw CommandError(EXIT_REFUSED, "the shares cannot be listed");
    }
    const TaskList tasks = ctl.daemon.TasksIfReachable();
    Json::Value list(Json::arrayValue);
    Table table({"NAME", "FOLDER", "VOLUME", "STATE", "RECYCLE BIN", "TASKS"});
    for (const std::string& name : names) {
        SDK::Share share;
        if (share.Open(name) < 0) continue;  // gone since it was listed
        list.append(ShareJson(name, share, tasks));
        table.Add(ShareRow(name, share, tasks));
    }
    if (as_json) return PrintJson(list);
    if (list.empty()) {
        std::cout << "There are no shares. \"ferrixctl share add --help\" tells how to make one.\n";
        return;
    }
    std::cout << table.Text(ctl.output);
    if (!tasks) std::cout << "The daemon does not run: tasks are not known.\n";
}

void AddListCommand(CLI::App& group, const Ctl& ctl) {
    const auto as_json = std::make_shared<bool>(false);
    CLI::App* list =
        AddCommand(group, "list",
                   "Lists the shares of this box, with their folders, whether they are "
                   "locked, and the tasks that use them.",
                   "ferrixctl share list");
    AddJsonOption(*list, *as_json);
    list->callback([as_json, &ctl] { ListShares(ctl, *as_json); });
}

void AddAddCommand(CLI::App& group) {
    const auto place = std::make_shared<std::string>();
    CLI::App* add = AddCommand(group, "add",
                               "Makes a folder of a volume a share. A folder that is missing is "
                               "made; one that is there keeps its files.",
                               "ferrixctl share add photos\nferrixctl share add /volume2/music");
    add->add_option("FOLDER", *place, "The whole path, or a name on the box's only volume")
        ->required();
    add->callback([place] {
        const std::string path = AddShare(*place);
        std::cout << "The folder " << Printable(path) << " is a share now.\n";
    });
}

void AddRemoveCommand(CLI::App& group, const Ctl& ctl) {
    struct Options {
        std::string name;
        bool with_tasks = false;
    };
    const auto options = std::make_shared<Options>();
    CLI::App* remove = AddCommand(
        group, "remove",
        "Takes a share away. No file is removed: the folder of a share that host.conf names stays "
        "as it is, and where every folder of a volume is a share it has to be empty.",
        "ferrixctl share remove photos\nferrixctl share remove photos --with-tasks");
    remove->add_option("NAME", options->name, "The share")->required();
    remove->add_flag("--with-tasks", options->with_tasks,
                     "Remove the tasks that use it as well; the tasks that come with the box are "
                     "switched off");
    remove->callback([options, &ctl] {
        const std::string path = RemoveShareOfTasks(ctl.daemon, options->name, options->with_tasks);
        std::cout << Printable(options->name) << " is no share any more"
                  << (FSExists(path) ? "; its files are in " + Printable(path) : "") << ".\n";
    });
}

void AddRenameCommand(CLI::App& group, const Ctl& ctl) {
    struct Options {
        std::string name;
        std::string new_name;
    };
    const auto options = std::make_shared<Options>();
    CLI::App* rename = AddCommand(group, "rename",
                                  "Renames a share and its folder. The tasks that use it follow; a "
                                  "run in progress on it ends, and its files stay whole.",
                                  "ferrixctl share rename photos pictures");
    rename->add_option("NAME", options->name, "The share")->required();
    rename->add_option("NEW-NAME", options->new_name, "Its new name")->required();
    rename->callback([options, &ctl] {
        const std::string path = RenameShareOfTasks(ctl.daemon, options->name, options->new_name);
        std::cout << "The share " << Printable(options->new_name) << " is the folder "
                  << Printable(path) << ".\n";
    });
}

}  // namespace

void AddShareCommands(CLI::App& program, const Ctl& ctl) {
    CLI::App* group = AddCommandGroup(program, "share",
                                      "The shares of this box: the folders to copy to and from.",
                                      "ferrixctl share list\nferrixctl share add photos");
    AddListCommand(*group, ctl);
    AddAddCommand(*group);
    AddRemoveCommand(*group, ctl);
    AddRenameCommand(*group, ctl);
}
