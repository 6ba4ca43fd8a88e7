// The program ferrix-notifier.
#include "client/command.h"
#include "client/daemon-client.h"
#include "client/notifier.h"
#include "utils/log.h"

int main(int argc, char** argv) {
    // The scheduler runs this with nobody watching: the system log tells what was asked and
    // answered.
    LogOpen("ferrix-notifier");
    const DaemonClient daemon;
    return RunProgram(*MakeNotifierProgram(daemon), argc, argv);
}
