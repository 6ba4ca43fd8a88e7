#include "service/service-ctrl.h"

#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <utility>

#include "daemon/process-shell.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "platform/schedule.h"
#include "platform/sdk-service.h"
#include "platform/service-status.h"
#include "service/daemon-end.h"
#include "service/repo-move.h"
#include "service/repository.h"
#include "service/service-lock.h"
#include "service/usable-volume.h"
#include "updater/updater-core.h"
#include "utils/log.h"
#include "utils/path-util.h"

namespace {

constexpr char SYSTEM_ERROR[] = "err_sys";
constexpr int WAIT_STEP_MS = 10;

int SetState(int state) { return SetServiceStatus({state, ""}); }

void EnterErrorState() {
    if (SetServiceStatus({SERVICE_STATE_ERROR, SYSTEM_ERROR}) < 0) {
        SLOG_ERR("fail to update ferrix copy status to error.");
    }
}

int LogFailure(const char* text) {
    SLOG_ERR("%s", text);
    return -1;
}

// No volume can hold the repository: the service waits for one.
int WaitForVolume() {
    int result = 0;
    if (SetState(SERVICE_STATE_WAITING) < 0) {
        SLOG_ERR("%s:%d fail to SetServiceStatus()", __FILE__, __LINE__);
        result = -1;
    }
    return RegisterVolume("") < 0 ? -1 : result;
}

// The same folder under two names would be moved onto itself.
bool IsSameFolder(const std::string& a, const std::string& b) {
    if (PathWithoutTrailingSlashes(a) == PathWithoutTrailingSlashes(b)) return true;
    struct stat first = {};
    struct stat second = {};
    return stat(a.c_str(), &first) == 0 && stat(b.c_str(), &second) == 0 &&
           first.st_dev == second.st_dev && first.st_ino == second.st_ino;
}

int MoveFiles(const std::string& from, const std::string& to) {
    if (from.empty()) {
        if (MakeRepo(to) == 0) return 0;
        SLOG_ERR("%s:%d failed to MakeRepo(), volume=[%s]", __FILE__, __LINE__, to.c_str());
        return -1;
    }
    if (SetState(SERVICE_STATE_MOVING) == 0 && MoveRepoData(from, to)) return 0;
    SLOG_ERR("%s:%d failed to move_repo_volume(), from=[%s], to=[%s]", __FILE__, __LINE__,
             from.c_str(), to.c_str());
    return -1;
}

// A package that is not enabled is moved too, and not started.
void LeaveMovingState() {
    ServiceStatus status;
    if (GetServiceStatus(status) < 0 || status.state != SERVICE_STATE_MOVING) return;
    if (SetState(SERVICE_STATE_STOPPED) < 0) {
        SLOG_ERR("fail to update ferrix copy status to stop.");
    }
}

}  // namespace

ServiceCtrl::ServiceCtrl(ServicePlaces places) : m_places(std::move(places)) {}

int ServiceCtrl::StartService() {
    const ServiceLock lock;
    return StartLocked();
}

int ServiceCtrl::StopService() {
    const ServiceLock lock;
    return StopLocked();
}

bool ServiceCtrl::MoveRepoVolume(const std::string& from, const std::string& to) {
    const ServiceLock lock;
    return MoveLocked(from, to);
}

bool ServiceCtrl::IsRunning() const {
    pid_t pid = 0;
    return IsDaemonRunning(m_places.pid_file, &pid);
}

int ServiceCtrl::StartLocked() {
    if (!SDK::FileExists(PackagePath("/enabled"))) return 0;
    if (IsRunning()) return 0;
    std::string volume = GetRepoVolPath();
    if (!IsVolumeMounted(volume)) {
        SLOG_INFO("%s:%d Ferrix Copy repo NOT mounted '%s'", __FILE__, __LINE__, volume.c_str());
        const int found = FindRepository(volume);
        if (found == 0 && volume.empty()) return WaitForVolume();
        if (found < 0) volume.clear();
    }
    if (!volume.empty() && StartOn(volume) == 0) return 0;
    EnterErrorState();
    return -1;
}

// Another volume takes the place of one that is not there. Empty when there is none.
int ServiceCtrl::FindRepository(std::string& volume) {
    const std::string old_volume = std::exchange(volume, FindUsableVolume());
    return volume.empty() ? 0 : ReplaceRepository(old_volume, volume);
}

int ServiceCtrl::ReplaceRepository(const std::string& old_volume, const std::string& volume) {
    if (old_volume.empty()) {
        if (MakeRepo(volume) < 0) return -1;
        SLOG_NOTICE("%s:%d Repo volume was empty, create default repo volume as [%s].", __FILE__,
                    __LINE__, volume.c_str());
    } else {
        // What cannot be reached any more cannot be moved: the service goes on with a repository
        // that has no tasks yet.
        (void)!MoveRepoData(old_volume, volume);
        SLOG_NOTICE("%s:%d Repo volume [%s] was not valid, create new repo volume as [%s].",
                    __FILE__, __LINE__, old_volume.c_str(), volume.c_str());
    }
    return RegisterVolume(volume);
}

int ServiceCtrl::StartOn(const std::string& volume) {
    if (SetState(SERVICE_STATE_INITIALISING) < 0) {
        return LogFailure("fail to update ferrix copy status to init.");
    }
    if (PrepareEnvironment(volume) < 0) return LogFailure("fail to prepare env.");
    if (SetState(SERVICE_STATE_UPGRADING) < 0) {
        return LogFailure("fail to update ferrix copy status to upgrading.");
    }
    if (UpdaterCore(m_places.box_config).Run(RepositoryPath(volume)) < 0) {
        return LogFailure("fail to run updater");
    }
    if (!ShowAllSchedule()) return LogFailure("fail to ShowAllSchedule");
    if (RunDaemon() < 0) return LogFailure("fail to run daemon");
    SDK::AddBoxLog(SDK::BoxEvent::SERVICE_STARTED);
    return 0;
}

int ServiceCtrl::PrepareEnvironment(const std::string& volume) {
    (void)!InitBeep();
    if (MakeRepo(volume) == 0) return 0;
    SLOG_ERR("Failed to MakeRepo '%s'", volume.c_str());
    return -1;
}

int ServiceCtrl::RunDaemon() {
    if (SDK::RunProgram(PackagePath("/target/sbin/ferrixd"), {}) != 0) {
        SLOG_ERR("Failed to start daemon\n");
        return -1;
    }
    WaitForDaemon();
    return 0;
}

// The program ends before the daemon that it has become can be found. Whoever looks for it next
// would start a second one.
void ServiceCtrl::WaitForDaemon() const {
    for (int waited = 0; waited < m_places.start_wait_ms; waited += WAIT_STEP_MS) {
        if (access(m_places.pid_file.c_str(), F_OK) == 0) {
            const pid_t pid = SDK::ReadPidFile(m_places.pid_file);
            if (pid > 1 && kill(pid, 0) == 0) return;
        }
        usleep(WAIT_STEP_MS * 1000);
    }
}

int ServiceCtrl::StopLocked() {
    if (EndDaemon(m_places) < 0) return -1;
    int result = 0;
    if (!HideAllSchedule()) result = LogFailure("fail to HideAllSchedule");
    if (SetState(SERVICE_STATE_STOPPED) < 0) {
        result = LogFailure("fail to update ferrix copy status to stop.");
    }
    SDK::AddBoxLog(SDK::BoxEvent::SERVICE_STOPPED);
    return result;
}

bool ServiceCtrl::MoveLocked(const std::string& from, const std::string& to) {
    if (to.empty()) {
        SLOG_ERR("%s:%d error: to_volume is empty", __FILE__, __LINE__);
        return false;
    }
    if (IsSameFolder(from, to)) return true;
    if (IsRunning() && StopLocked() < 0) {
        SLOG_ERR("%s:%d failed to StopService()", __FILE__, __LINE__);
        return false;
    }
    if (MoveFiles(from, to) < 0) {
        EnterErrorState();
        return false;
    }
    if (RegisterVolume(to) < 0 || StartLocked() < 0) {
        SLOG_ERR("%s:%d failed to StartService()", __FILE__, __LINE__);
        EnterErrorState();
        return false;
    }
    LeaveMovingState();
    return true;
}
