#include "service/service-ctrl.h"

#include <unistd.h>

#include <utility>

#include "daemon/process-shell.h"
#include "platform/global-setting.h"
#include "platform/package-paths.h"
#include "platform/schedule.h"
#include "platform/sdk-service.h"
#include "platform/service-status.h"
#include "service/daemon-end.h"
#include "service/daemon-start.h"
#include "service/repo-finder.h"
#include "service/repo-move.h"
#include "service/repository.h"
#include "service/service-lock.h"
#include "service/usable-volume.h"
#include "updater/updater-core.h"
#include "utils/log.h"

namespace {

constexpr char SYSTEM_ERROR[] = "err_sys";

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

int ServiceCtrl::SettleStop() {
    const ServiceLock lock;
    if (IsRunning()) return LogFailure("the daemon runs");
    unlink(m_places.pid_file.c_str());  // its number may be given to another process
    return FinishStop();
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
    std::string volume;
    const int found = FindRepository(volume);
    if (found == 0) return WaitForVolume();
    if (found > 0 && StartOn(volume) == 0) return 0;
    EnterErrorState();
    return -1;
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
    if (StartDaemon(m_places) < 0) return LogFailure("fail to run daemon");
    SDK::AddBoxLog(SDK::BoxEvent::SERVICE_STARTED);
    return 0;
}

int ServiceCtrl::PrepareEnvironment(const std::string& volume) {
    (void)!InitBeep();
    if (MakeRepo(volume) == 0) return 0;
    SLOG_ERR("Failed to MakeRepo '%s'", volume.c_str());
    return -1;
}

int ServiceCtrl::StopLocked() { return EndDaemon(m_places) < 0 ? -1 : FinishStop(); }

int ServiceCtrl::FinishStop() {
    int result = 0;
    if (!HideAllSchedule()) result = LogFailure("fail to HideAllSchedule");
    if (SetState(SERVICE_STATE_STOPPED) < 0) {
        result = LogFailure("fail to update ferrix copy status to stop.");
    }
    SDK::AddBoxLog(SDK::BoxEvent::SERVICE_STOPPED);
    return result;
}

// A daemon that could not be stopped goes on as if nothing had been asked. One that has ended,
// where more was to be done, leaves a service that is down without having been stopped in order.
bool ServiceCtrl::StopForMove() {
    if (!IsRunning()) return true;
    if (EndDaemon(m_places) == 0) {
        if (FinishStop() == 0) return true;
        EnterErrorState();
    }
    SLOG_ERR("%s:%d failed to StopService()", __FILE__, __LINE__);
    return false;
}

bool ServiceCtrl::MoveLocked(const std::string& from, const std::string& to) {
    if (to.empty()) {
        SLOG_ERR("%s:%d error: to_volume is empty", __FILE__, __LINE__);
        return false;
    }
    if (IsSameFolder(from, to)) return true;
    if (!CanBeRegistered(to) || !IsVolumeWritable(to)) {
        SLOG_ERR("The repository cannot be moved to '%s'\n", to.c_str());
        return false;
    }
    if (!StopForMove()) return false;
    if (MoveFiles(from, to) < 0) {
        EnterErrorState();
        return false;
    }
    // A start may have found another volume in place of one that has gone meanwhile.
    if (RegisterVolume(to) < 0 || StartLocked() < 0 || !IsSameFolder(GetRepoVolPath(), to)) {
        SLOG_ERR("%s:%d failed to StartService()", __FILE__, __LINE__);
        EnterErrorState();
        return false;
    }
    LeaveMovingState();
    return true;
}
