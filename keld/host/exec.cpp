// Running single programs, and pid files.
#include <keld/exec.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdarg>
#include <cstdlib>
#include <iterator>
#include <string>

#include "host/host-error.h"
#include "host/replace-file.h"
#include "host/run-program.h"
#include "host/text.h"

using keld_host::Fail;
using keld_host::FailErrno;
using keld_host::Program;

namespace {

// The appliance's own script for docks of removable cartridges. Where it is not installed there is
// no such dock to be told: the kernel's eject of the disk, which goes before, was all there is to
// do.
constexpr const char* RDX_SCRIPT = "/lib/udev/script/rdx_util.sh";

// What moves a repository to another volume, which takes as long as it takes. No daemon waits for
// these: they are run by control programs, while it is stopped.
constexpr const char* UNLIMITED_PROGRAMS[] = {"/bin/cp", "/bin/mv"};

int LimitOf(const std::string& program) {
    const bool is_unlimited =
        std::find(std::begin(UNLIMITED_PROGRAMS), std::end(UNLIMITED_PROGRAMS), program) !=
        std::end(UNLIMITED_PROGRAMS);
    return is_unlimited ? INT_MAX : keld_host::RUN_LIMIT_MS;
}

// Reads the arguments up to the null pointer. The caller has started and ends the list.
Program ReadArguments(const char* path, va_list list) {
    Program program;
    program.path = path;
    while (const char* argument = va_arg(list, const char*))
        program.arguments.emplace_back(argument);
    return program;
}

}  // namespace

int KLIBCExec(const char* program, ...) {
    if (program == nullptr || program[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    va_list list;
    va_start(list, program);
    const Program prepared = ReadArguments(program, list);
    va_end(list);
    const int result = keld_host::RunProgram(prepared, LimitOf(prepared.path));
    if (result >= 0) return result;
    if (errno == ENOENT && prepared.path == RDX_SCRIPT) return 0;
    return FailErrno(errno);
}

int KLIBCBackgroundExec(const char* program, ...) {
    if (program == nullptr || program[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    va_list list;
    va_start(list, program);
    const Program prepared = ReadArguments(program, list);
    va_end(list);
    return keld_host::StartProgram(prepared) == 0 ? 0 : FailErrno(errno);
}

pid_t KLIBCReadPidFile(const char* path) {
    if (path == nullptr) return Fail(KELDERR_INVALID_ARGUMENT);
    constexpr size_t limit = 64;  // a number and a newline
    std::string content;
    const int error = keld_host::ReadFile(path, limit, content);
    if (error != 0) return FailErrno(error);
    const std::string text(keld_host::Trim(content));
    char* end = nullptr;
    errno = 0;
    const long pid = strtol(text.c_str(), &end, 10);
    const bool isNumber = !text.empty() && *end == '\0' && errno == 0;
    // 1 is init, which is nobody's daemon.
    if (!isNumber || pid <= 1 || pid > 0x7fffffffL) return Fail(KELDERR_INVALID_ARGUMENT);
    return static_cast<pid_t>(pid);
}
