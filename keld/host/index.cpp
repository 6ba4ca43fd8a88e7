// The media index: the programs of the index folder.
#include <keld/index.h>

#include <string>

#include "host/host-conf.h"
#include "host/host-error.h"
#include "host/run-program.h"

using keld_host::Fail;

int KLIBKeldIndexAddEx(const char* path, int arg1, int arg2, int arg3, int arg4) {
    // The numbers belong to the appliance's indexer.
    static_cast<void>(arg1);
    static_cast<void>(arg2);
    static_cast<void>(arg3);
    static_cast<void>(arg4);
    if (path == nullptr || path[0] != '/') return Fail(KELDERR_INVALID_ARGUMENT);
    keld_host::Program program;
    program.arguments = {path};
    const std::string folder = keld_host::CurrentHostConf()->indexFolder;
    return keld_host::RunFolder(folder, std::move(program)) == 0 ? 0 : Fail(KELDERR_SYSTEM);
}
