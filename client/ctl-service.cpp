#include <json/value.h>
#include <signal.h>
#include <unistd.h>

#include <cerrno>
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
    // A process of another user's may be looked for, but not sent a signal.
    return pid > 0 && (kill(pid, 0) == 0 || errno == EPERM) ? pid : 0;
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
                           "no volume can hold the repository: none is mounted and writable; on a "
                           "plain machine the folder /volume1 is one, and host.conf names others");
    }
    std::cout << (was_running ? "The service runs already" : "The service runs")
              << ", with the repository " << Printable(RepositoryPath(volume)) << ".\n";
}

// All zero when the service was never started.
ServiceStatus ReadStatus() {
    ServiceStatus status;
    if (FSExists(StatusPath()) && GetServiceStatus(status) < 0) {
        throw CommandError(EXIT_REFUSED, geteuid() == 0
                                             ? "the state of the service cannot be read"
                                             : "the state of the service is for root: run this as "
                                               "root");
    }
    return status;
}

void Stop() {
    const bool runs = DaemonPid() != 0;
    const int state = ReadStatus().state;
    if (!runs && (state == 0 || state == SERVICE_STATE_STOPPED)) {
        std::cout << "The service does not run.\n";
        return;
    }
    if ((runs ? ServiceCtrl().StopService() : ServiceCtrl().SettleStop()) < 0) {
        throw CommandError(EXIT_REFUSED, "the service could not be stopped");
    }
    std::cout << (runs ? "The service has stopped.\n"
                       : "The service had ended by itself; it counts as stopped now.\n");
}

void ShowStatus(bool as_json) {
    const ServiceStatus status = ReadStatus();
    const pid_t pid = DaemonPid();
    const bool has_crashed = status.state == SERVICE_STATE_RUNNING && pid == 0;
    const std::string state =
        has_crashed ? "not running, though it was not stopped" : StateText(status.state);
    const std::string volume = GetRepoVolPath();
    if (as_json) {
        Json::Value answer;
        answer["state"] = status.state;
        answer["state_text"] = state;
        answer["error"] = JsonText(status.error);
        answer["pid"] = pid;
        answer["enabled"] = IsEnabled();
        answer["repo_vol_path"] = JsonText(volume);
        return PrintJson(answer);
    }
    std::cout << "State:       " << state
              << (has_crashed ? ": \"ferrixctl service start\" starts it\n" : "\n");
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
        const std::string volume = GetRepoVolPath();
        throw CommandError(
            EXIT_REFUSED,
            volume == to ? "the repository is on " + Printable(to) +
                               " now, but the service could not be started there; "
                               "the system log says why"
                         : "the repository was not moved; it is whole, on " + Printable(volume));
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

    CLI::App* report =
        AddCommand(*group, "report",
                   "Prints a usage report as JSON, with or without --json: how many devices and "
                   "tasks there are, and how they are set. It holds no names of tasks, folders or "
                   "shares.",
                   "ferrixctl service report");
    const auto is_asked_for = std::make_shared<bool>(false);
    AddJsonOption(*report, *is_asked_for);
    report->callback([is_asked_for] {
        if (PrintUsageReport() < 0) {
            throw CommandError(EXIT_REFUSED, "there is nothing to report on");
        }
    });
    AddRepositoryCommands(program);
}
