// Brings a repository to the present version before the daemon starts: prepares the default tasks
// in a new one, lifts an old one.
//
// The daemon must not run, and no other updater on this repository. Killed at any moment, Run()
// leaves a repository that is the old or the new one in each of its files, and does the rest when
// it is called again.
#pragma once

#include <string>

#include "updater/default-task.h"

class UpdaterCore {
public:
    // The box's own files are where they always are, but for tests.
    explicit UpdaterCore(BoxConfigPaths paths = {});

    // `repository` is the volume followed by "/@Ferrix"; its folder "db" exists. 0, or -1 (logged).
    [[nodiscard]] int Run(const std::string& repository);

private:
    BoxConfigPaths m_paths;
};
