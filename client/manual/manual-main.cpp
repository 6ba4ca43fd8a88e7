// The program ferrix-manual: writes the manual pages and the completion scripts into a folder. It
// is run while building and is not installed.
#include <unistd.h>

#include <cstdio>
#include <fstream>
#include <string>

#include "client/ctl.h"
#include "client/notifier.h"
#include "manual/command-tree.h"
#include "manual/completion.h"
#include "manual/man-page.h"
#include "manual/page-texts.h"

namespace {

bool Write(const std::string& path, const std::string& text) {
    std::ofstream file(path, std::ios::binary);
    file << text;
    file.close();
    if (file) return true;
    perror(path.c_str());
    return false;
}

}  // namespace

int main(int argc, char** argv) {
    if (argc != 2) {
        fprintf(stderr, "usage: ferrix-manual FOLDER\n");
        return 2;
    }
    const std::string folder = std::string(argv[1]) + "/";
    const Ctl ctl{DaemonClient(), Terminal(STDOUT_FILENO)};
    const auto ctl_program = MakeCtlProgram(ctl);
    const auto notifier_program = MakeNotifierProgram(ctl.daemon);
    const CommandInfo ctl_tree = ReadCommandTree(*ctl_program);
    const CommandInfo notifier_tree = ReadCommandTree(*notifier_program);
    const bool is_written =
        Write(folder + "ferrixctl.1", PageText(CtlPage(), ctl_tree)) &&
        Write(folder + "ferrix-notifier.1", PageText(NotifierPage(), notifier_tree)) &&
        Write(folder + "ferrixd.8", PageText(DaemonPage())) &&
        Write(folder + "ferrixctl.bash", BashCompletion(ctl_tree)) &&
        Write(folder + "ferrixctl.zsh", ZshCompletion(ctl_tree));
    return is_written ? 0 : 1;
}
