// The program ferrixctl.
#include <unistd.h>

#include "client/command.h"
#include "client/ctl.h"
#include "client/log-to-stderr.h"

int main(int argc, char** argv) {
    ErrorsToStderr("ferrixctl");
    const Ctl ctl{DaemonClient(), Terminal(STDOUT_FILENO)};
    return RunProgram(*MakeCtlProgram(ctl), argc, argv);
}
