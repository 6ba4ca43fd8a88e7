#include "platform/sdk-service.h"

#include <keld/exec.h>
#include <keld/keyfile.h>
#include <keld/service.h>

#include <cassert>

#include "platform/sdk-mutex.h"

namespace SDK {
namespace {

constexpr int INFORMATION = 1;

// The argument at a place, or the end of the list.
const char* At(const Arguments& arguments, size_t place) {
    assert(arguments.size() <= MAX_PROGRAM_ARGUMENTS);
    return place < arguments.size() ? arguments[place].c_str() : nullptr;
}

}  // namespace

int RunProgram(const std::string& path, const Arguments& arguments) {
    const ReentrantLock lock;
    return KLIBCExec(path.c_str(), At(arguments, 0), At(arguments, 1), At(arguments, 2), nullptr);
}

int StartProgram(const std::string& path, const Arguments& arguments) {
    const ReentrantLock lock;
    return KLIBCBackgroundExec(path.c_str(), At(arguments, 0), At(arguments, 1), At(arguments, 2),
                               nullptr);
}

pid_t ReadPidFile(const std::string& path) {
    const ReentrantLock lock;
    return KLIBCReadPidFile(path.c_str());
}

bool FileExists(const std::string& path) {
    const ReentrantLock lock;
    return KLIBCFileExist(path.c_str()) > 0;
}

void AddBoxLog(BoxEvent event) {
    const ReentrantLock lock;
    const unsigned code =
        event == BoxEvent::SERVICE_STARTED ? KELD_LOG_FERRIX_STARTED : KELD_LOG_FERRIX_STOPPED;
    KELDLogSet1(INFORMATION, INFORMATION, code, "Ferrix Copy", "", "", "");
}

}  // namespace SDK
