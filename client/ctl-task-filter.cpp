#include <iostream>

#include "client/command.h"
#include "client/ctl-task.h"
#include "client/ctl.h"
#include "client/filter-lists.h"
#include "client/json-output.h"
#include "client/text.h"

namespace {

bool IsEverything(const PObject& list) {
    for (const PObject& item : list.AsArray()) {
        if (item.StringView() == "*") return true;
    }
    return false;
}

void ShowList(const char* name, const PObject& list) {
    std::string text;
    for (const PObject& item : list.AsArray()) {
        if (!text.empty()) text += ", ";
        text += Printable(item.StringView());
    }
    std::cout << Padded(name, 20) << (text.empty() ? "-" : text) << '\n';
}

void ShowFilter(const Ctl& ctl, const std::string& task, bool as_json) {
    const uint64_t id = ctl.daemon.FindTask(task)["id"].AsUInt64();
    PObject filter = ctl.daemon.AskAbout("get_filter_setting", id);
    if (as_json) {
        filter.AsMap().erase("ack");
        return PrintJson(ToJson(filter));
    }
    ShowList("Not copied", filter["black_name"]);
    ShowList("  with extension", filter["black_ext"]);
    if (IsEverything(filter["white_name"]) || IsEverything(filter["white_ext"])) {
        std::cout << "Everything else is copied.\n";
        return;
    }
    ShowList("Only copied", filter["white_name"]);
    ShowList("  with extension", filter["white_ext"]);
}

}  // namespace

void AddTaskFilterCommands(CLI::App& group, const Ctl& ctl) {
    struct Options {
        std::string task;
        bool as_json = false;
        FilterOptions filter;
    };
    CLI::App* filter = AddCommandGroup(
        group, "filter",
        "What a task copies and what not. Names are compared whole, upper and lower case of ASCII "
        "letters alike.",
        "ferrixctl task filter show Camera\n"
        "ferrixctl task filter set Camera --only-ext jpg,cr2,mov");

    const auto shown = std::make_shared<Options>();
    CLI::App* show = AddCommand(*filter, "show", "Shows the filter of a task.",
                                "ferrixctl task filter show Camera");
    AddTaskArgument(*show, shown->task);
    AddJsonOption(*show, shown->as_json);
    show->callback([shown, &ctl] { ShowFilter(ctl, shown->task, shown->as_json); });

    const auto options = std::make_shared<Options>();
    CLI::App* set =
        AddCommand(*filter, "set",
                   "Replaces the filter of a task; without options everything is "
                   "copied. A run in progress goes by it from the next file on.",
                   "ferrixctl task filter set Camera --exclude private --exclude-ext tmp");
    AddTaskArgument(*set, options->task);
    AddFilterOptions(*set, options->filter);
    set->callback([options, &ctl] {
        PObject request;
        request["task_id"] = ctl.daemon.FindTask(options->task)["id"].AsUInt64();
        SetFilterLists(options->filter, request);
        (void)ctl.daemon.Ask("set_filter_setting", std::move(request));
    });
}
