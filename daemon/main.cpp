// ferrixd: copies files between plugged-in storage and the shares of this box.
#include <cstdlib>

#include "daemon/usb-daemon.h"
#include "utils/log.h"

namespace {

// A first argument is accepted and changes nothing.
int IgnoreArgument(const char* /*argument*/) { return 0; }

}  // namespace

int main(int argc, char** argv) {
    USBDaemon daemon;
    SLOG_INFO("Daemon Starts ...\n");
    if (argc > 1) IgnoreArgument(argv[1]);
    const int result = daemon.Run();
    SLOG_INFO("Daemon End ...\n");
    // After a failed start threads still run: nothing that they use may be destroyed under them.
    if (result < 0) std::quick_exit(0);
    return 0;
}
