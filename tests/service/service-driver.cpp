// Calls the control side of the service, for whole-daemon scenarios.
//
// usage: service-driver start | stop | status | report | register VOLUME | move FROM TO
// Exit status 0 when the operation succeeded.
#include <cstdio>
#include <cstring>

#include "platform/service-status.h"
#include "service/repository.h"
#include "service/service-ctrl.h"
#include "service/usage-report.h"
#include "utils/log.h"

namespace {

int PrintStatus() {
    ServiceStatus status;
    if (GetServiceStatus(status) < 0) return 1;
    printf("%d %s\n", status.state, status.error.c_str());
    return 0;
}

}  // namespace

int main(int argc, char** argv) {
    LogOpen("service-driver");
    const auto is = [&](const char* name, int count) {
        return argc == count && strcmp(argv[1], name) == 0;
    };
    if (is("start", 2)) return ServiceCtrl().StartService() == 0 ? 0 : 1;
    if (is("stop", 2)) return ServiceCtrl().StopService() == 0 ? 0 : 1;
    if (is("status", 2)) return PrintStatus();
    if (is("report", 2)) return PrintUsageReport() == 0 ? 0 : 1;
    if (is("register", 3)) return RegisterVolume(argv[2]) == 0 ? 0 : 1;
    if (is("move", 4)) return ServiceCtrl().MoveRepoVolume(argv[2], argv[3]) ? 0 : 1;
    fprintf(stderr, "service-driver: see its source for what it takes\n");
    return 2;
}
