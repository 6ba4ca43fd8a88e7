#include "manual/page-texts.h"

namespace {

using Section = ManPage::Section;
using Entry = ManPage::Entry;

const Entry SOCKET = {"/tmp/ferrix-socket",
                      "Where the daemon is spoken to. Only root and its own user are heard."};
const Entry SETTINGS = {
    "/var/packages/Ferrix/etc/setting.conf",
    "Settings of the service; \"repo_vol_path\" names the volume of the repository."};
const Entry REPOSITORY = {"/volumeN/@Ferrix",
                          "The repository: tasks, devices and the log in \"db/\", what belongs to "
                          "one task in \"task/\"."};
const Entry PID_FILE = {"/var/run/ferrixd.pid", "The number of the daemon's process."};
const Entry BOX = {"/etc/keld/host.conf",
                   "On plain Linux: volumes, shares, plugged-in devices and the front panel. "
                   "Without it every folder of a volume is a share."};
const std::vector<Entry> ALL_FILES = {SOCKET, PID_FILE, SETTINGS, REPOSITORY, BOX};

Section ClientStatus() {
    Section section{"EXIT STATUS", {}};
    section.entries.push_back({"0", "Done."});
    section.entries.push_back({"1",
                               "Refused, by the daemon or by what the command would have worked "
                               "on. Standard error says why."});
    section.entries.push_back({"2", "The command line makes no sense."});
    section.entries.push_back({"3", "The daemon does not answer."});
    return section;
}

Section Environment() {
    Section section{"ENVIRONMENT", {}};
    section.entries.push_back(
        {"NO_COLOR", "When it is not empty, nothing is coloured. Colours are for terminals only."});
    section.entries.push_back(
        {"TERM", "With \"dumb\", or without it, nothing is coloured either."});
    return section;
}

Section DaemonSignals() {
    return {"SIGNALS",
            {{"SIGTERM, SIGINT",
              "End the daemon in order. A run in progress is broken off; what was copied whole "
              "stays, and nothing half copied does."}}};
}

Section DaemonStatus() {
    return {
        "EXIT STATUS",
        {{"0",
          "Always: the daemon goes to the background before it knows whether it can work. The "
          "system log tells what went wrong, and \"ferrixctl service status\" whether it runs."}}};
}

Section Files(const std::vector<Entry>& files) { return {"FILES", files}; }

}  // namespace

ManPage CtlPage() {
    ManPage page;
    page.name = "ferrixctl";
    page.description = {
        "ferrixctl is how a person or a script talks to the copy service: it starts and stops the "
        "service, makes and runs tasks, and shows what they do. Most commands ask the daemon, "
        "ferrixd(8), and need its rights: run them as root.",
        "Every command has an option \"--help\" of its own. Commands that read have \"--json\"; "
        "what they write then is meant for scripts and does not change its form. The other output "
        "is meant for people: in it, what a terminal would take as an order is shown as \"\\xNN\".",
    };
    page.sections = {ClientStatus(), Environment(), Files(ALL_FILES)};
    page.see_also = {"ferrix-notifier(1)", "ferrixd(8)"};
    return page;
}

ManPage NotifierPage() {
    ManPage page;
    page.name = "ferrix-notifier";
    page.description = {
        "ferrix-notifier is called by other services of the box. The scheduler runs a task with it "
        "when its time has come; what mounts volumes and changes shares tells the daemon, "
        "ferrixd(8), what happens. It writes nothing when all went well. What was asked and "
        "answered stands in the system log.",
        "A task that is run waits its turn: the program does not wait for its end. A hook is only "
        "heard; what the daemon makes of it stands in the system log.",
    };
    page.forms = {"--execute-task", "--hook"};
    page.sections = {ClientStatus(), Files({SOCKET})};
    page.see_also = {"ferrixctl(1)", "ferrixd(8)"};
    return page;
}

ManPage DaemonPage() {
    ManPage page;
    page.name = "ferrixd";
    page.number = 8;
    page.summary = "copies between plugged-in storage and the shares of this box";
    page.description = {
        "ferrixd copies files between a USB disk or an SD card and the shared folders of a storage "
        "box: when the device is plugged in, at the copy button, by a timetable or on command. "
        "What is copied, where to, and how, is told by tasks, at most one for each device.",
        "It takes no options. It goes to the background, writes its pid file and logs to syslog "
        "under the name \"ferrixd\". It does not start without a repository, nor a second time; "
        "\"ferrixctl service start\" makes the repository, brings it to the present version, and "
        "starts the daemon.",
    };
    page.sections = {DaemonSignals(), DaemonStatus(), Files(ALL_FILES)};
    page.see_also = {"ferrixctl(1)", "ferrix-notifier(1)"};
    return page;
}
