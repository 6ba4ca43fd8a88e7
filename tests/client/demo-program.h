// A program of all that a command line can hold, for tests of the manual and the completions. It
// does nothing: it is read, not run.
#pragma once

#include <CLI/CLI.hpp>
#include <memory>
#include <string>
#include <vector>

#include "client/command.h"

struct DemoProgram {
    DemoProgram() {
        app.footer("Read the manual first.\nExample:\n  demo-ctl service start");
        AddServiceCommands();
        AddTaskCommands();
        AddSendCommand();
        AddOddCommand();
    }

    CLI::App app{"Does what it is told.", "demo-ctl"};

private:
    void AddServiceCommands() {
        CLI::App* service = AddCommandGroup(app, "service", "Starts and stops.",
                                            "demo-ctl service start\ndemo-ctl service stop");
        AddCommand(*service, "start", "Starts the service.", "demo-ctl service start");
        AddCommand(*service, "stop", "Stops the service.", "demo-ctl service stop");
        CLI::App* status = AddCommand(*service, "status",
                                      "Tells what it does: all [of] it, it's "
                                      "said.",
                                      "demo-ctl service status");
        AddJsonOption(*status, is_set);
        CLI::App* move = AddCommand(*service, "move", "Moves.", "demo-ctl service move /volume2");
        move->add_option("VOLUME", text, "Where to")->required();
    }

    void AddTaskCommands() {
        CLI::App* task = AddCommandGroup(app, "task", "Tasks.", "demo-ctl task list");
        AddCommand(*task, "list", "Lists the tasks.", "demo-ctl task list");
        CLI::App* run = AddCommand(*task, "run", "Runs a task.", "demo-ctl task run 3");
        run->add_option("TASK", text, "The task's id or name")->required();
        CLI::App* set = AddCommand(*task, "set", "Changes a task.", "demo-ctl task set 3 --keep 5");
        set->add_option("TASK", text, "The task's id or name")->required();
        CLI::Option* keep = set->add_option("-k,--keep", number, "How many are kept")
                                ->check(CLI::Range(1, 99))
                                ->capture_default_str();
        set->add_flag("--keep-all", is_set, "Nothing goes")->excludes(keep);
        set->add_option("--strategy", text, "How to copy")
            ->check(CLI::IsMember({"mirror", "version"}))
            ->required();
        set->add_option("--skip", texts, "What is not copied")->type_name("NAME,...");
        set->add_option("--on", texts, "The days")->check(CLI::IsMember({"mon", "tue"}));
        set->add_option("--at", text, "The time")->type_name("HH:MM");
    }

    void AddSendCommand() {
        CLI::App* send =
            AddCommand(app, "send", "Tells something.", "demo-ctl send a --type one key=value");
        send->add_option("NAME", text, "What happens")->required();
        send->add_option("KEY=VALUE", texts, "What it happens to");
        send->add_option("--type", text, "The kind")->check(CLI::IsMember({"one", "two"}));
        send->add_option("--hidden", text, "Not for everybody")->group("");
        CLI::App* hidden = AddCommand(app, "secret", "Not for everybody.", "demo-ctl secret");
        hidden->group("");
    }

    // Texts that a page formatter or a shell would take as orders.
    void AddOddCommand() {
        CLI::App* odd =
            AddCommand(app, "odd",
                       ".B is no order, nor is 'this'; C:\\new\\fBfat `x` $HOME \"quoted\" ~ ^ "
                       "caf\u00e9 $(id)",
                       "demo-ctl odd '.*' \\\n  --back-slash \"C:\\temp\"\n.TP\n'quoted first'");
        odd->add_option("--back-slash", text, "A \\ and a '");
    }

    std::string text;
    std::vector<std::string> texts;
    int number = 7;
    bool is_set = false;
};
