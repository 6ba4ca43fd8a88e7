#include <json/value.h>
#include <signal.h>

#include <fstream>
#include <iostream>

#include "client/command.h"
#include "client/ctl.h"
#include "client/exit-status.h"
#include "client/json-output.h"
#include "client/text.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "platform/service-status.h"
#include "service/repository.h"
#include "service/service-ctrl.h"
#include "service/usable-volume.h"
#include "service/usage-report.h"
#include "utils/file-op.h"

namespace {

const char* StateText(int state) {
    switch (state) {
        case SERVICE_STATE_WAITING:
            return "waiting for a volume that can hold the repository";
        case SERVICE_STATE_INITIALISING:
            return "starting";
        case SERVICE_STATE_UPGRADING:
            return "upgrading the repository";
        case SERVICE_STATE_RUNNING:
            return "running";
        case SERVICE_STATE_MOVING:
            return "moving the repository";
        case SERVICE_STATE_STOPPED:
            return "stopped";
        case SERVICE_STATE_ERROR:
            return "stopped by an error";
        default:
            return "never started";
    }
}

// The daemon's process; 0 when none runs.
pid_t DaemonPid() {
    pid_t pid = 0;
    std::ifstream(ServicePlaces().pid_file) >> pid;
    return pid > 0 && kill(pid, 0) == 0 ? pid : 0;
}

// An installation lays out the package's programs; its settings have no place yet.
void MakeSettingsFolder() {
    if (FSMKDirP(PackagePath("/etc"), FS_KEEP_UID, FS_KEEP_GID) < 0) {
        throw CommandError(EXIT_REFUSED, "the folder " + PackagePath("/etc") + " cannot be made");
    }
}

bool IsEnabled() { return FSExists(PackagePath("/enabled")); }

void Start() {
    if (!IsEnabled()) {
        throw CommandError(EXIT_REFUSED, "the package is switched off: the file " +
                                             PackagePath("/enabled") + " is not there");
    }
    MakeSettingsFolder();
    const bool was_running = DaemonPid() != 0;
    if (ServiceCtrl().StartService() < 0) {
        throw CommandError(EXIT_REFUSED, "the service could not be started");
    }
    const std::string volume = GetRepoVolPath();
    if (volume.empty()) {
        throw CommandError(EXIT_REFUSED,
                           "no volume can hold the repository: none is mounted and writable");
    }
    std::cout << (was_running ? "The service runs already" : "The service runs")
              << ", with the repository " << Printable(RepositoryPath(volume)) << ".\n";
}

void Stop() {
    if (DaemonPid() == 0) {
        std::cout << "The service does not run.\n";
        return;
    }
    if (ServiceCtrl().StopService() < 0) {
        throw CommandError(EXIT_REFUSED, "the service could not be stopped");
    }
    std::cout << "The service has stopped.\n";
}

void ShowStatus(bool as_json) {
    ServiceStatus status;
    const bool is_known = FSExists(StatusPath()) && GetServiceStatus(status) == 0;
    const pid_t pid = DaemonPid();
    const std::string volume = GetRepoVolPath();
    if (as_json) {
        Json::Value answer;
        answer["state"] = status.state;
        answer["state_text"] = StateText(status.state);
        answer["error"] = JsonText(status.error);
        answer["pid"] = pid;
        answer["enabled"] = IsEnabled();
        answer["repo_vol_path"] = JsonText(volume);
        return PrintJson(answer);
    }
    std::string state = StateText(is_known ? status.state : 0);
    if (status.state == SERVICE_STATE_RUNNING && pid == 0) {
        state = "not running, though it was not stopped: \"ferrixctl service start\" starts it";
    }
    std::cout << "State:       " << state << '\n';
    if (!status.error.empty()) std::cout << "Error:       " << Printable(status.error) << '\n';
    if (pid != 0) std::cout << "Process:     " << pid << '\n';
    std::cout << "Enabled:     " << (IsEnabled() ? "yes" : "no") << '\n'
              << "Repository:  "
              << (volume.empty() ? "none yet" : Printable(RepositoryPath(volume))) << '\n';
}

void Move(const std::string& to) {
    if (!IsVolumeMounted(to)) {
        throw CommandError(EXIT_USAGE, Printable(to) + " is no volume of this box");
    }
    if (!ServiceCtrl().MoveRepoVolume(GetRepoVolPath(), to)) {
        throw CommandError(EXIT_REFUSED, "the repository was not moved; it is whole, on " +
                                             Printable(GetRepoVolPath()));
    }
    std::cout << "The repository is " << Printable(RepositoryPath(GetRepoVolPath())) << ".\n";
}

void InitRepository(const std::string& volume) {
    MakeSettingsFolder();
    const std::string present = GetRepoVolPath();
    if (present == volume) {
        std::cout << "The repository is on " << Printable(volume) << " already.\n";
        return;
    }
    if (!present.empty()) {
        throw CommandError(EXIT_REFUSED, "there is a repository on " + Printable(present) +
                                             "; \"ferrixctl service move\" moves it");
    }
    if (!IsVolumeMounted(volume)) {
        throw CommandError(EXIT_USAGE, Printable(volume) + " is no volume of this box");
    }
    if (MakeRepo(volume) < 0 || RegisterVolume(volume) < 0) {
        throw CommandError(EXIT_REFUSED, "the repository could not be made");
    }
    std::cout << "The repository is " << Printable(RepositoryPath(volume)) << ".\n";
}

void AddRepositoryCommands(CLI::App& program) {
    CLI::App* group = AddCommandGroup(program, "repo",
                                      "The repository: where the service keeps its "
                                      "tasks, their databases and its log.",
                                      "ferrixctl repo init /volume1");
    const auto volume = std::make_shared<std::string>();
    CLI::App* init =
        AddCommand(*group, "init",
                   "Makes an empty repository on a volume. \"service start\" does this "
                   "by itself, on the first volume that it finds.",
                   "ferrixctl repo init /volume1");
    init->add_option("VOLUME", *volume, "The volume's root folder")->required();
    init->callback([volume] { InitRepository(PathWithoutTrailingSlashes(*volume)); });
}

}  // namespace

void AddServiceCommands(CLI::App& program) {
    CLI::App* group =
        AddCommandGroup(program, "service", "Starts, stops, moves and reads the service.",
                        "ferrixctl service start\nferrixctl service status");
    AddCommand(*group, "start",
               "Finds or makes the repository, brings it to the present version, and starts the "
               "daemon. A service that runs is left alone.",
               "ferrixctl service start")
        ->callback(Start);
    AddCommand(*group, "stop",
               "Ends the daemon; a run in progress is broken off, and its files stay whole.",
               "ferrixctl service stop")
        ->callback(Stop);

    const auto as_json = std::make_shared<bool>(false);
    CLI::App* status = AddCommand(*group, "status",
                                  "Tells what the service does, and where its "
                                  "repository is.",
                                  "ferrixctl service status --json");
    AddJsonOption(*status, *as_json);
    status->callback([as_json] { ShowStatus(*as_json); });

    const auto to = std::make_shared<std::string>();
    CLI::App* move = AddCommand(*group, "move",
                                "Stops the service, moves the repository to another volume, and "
                                "starts the service there.",
                                "ferrixctl service move /volume2");
    move->add_option("VOLUME", *to, "The other volume's root folder")->required();
    move->callback([to] { Move(PathWithoutTrailingSlashes(*to)); });

    AddCommand(*group, "report",
               "Prints a usage report as JSON: how many devices and tasks there are, and how they "
               "are set. It holds no names of tasks, folders or shares.",
               "ferrixctl service report")
        ->callback([] {
            if (PrintUsageReport() < 0) {
                throw CommandError(EXIT_REFUSED, "there is nothing to report on");
            }
        });
    AddRepositoryCommands(program);
}
