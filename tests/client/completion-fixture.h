// What the tests of both shells' completions share: the scripts in files, and a "demo-ctl" that
// shows how it was called.
#pragma once

#include <sys/stat.h>

#include <string>

#include "demo-program.h"
#include "manual/command-tree.h"
#include "manual/completion.h"
#include "shell.h"
#include "support/temp-dir.h"

class CompletionFixture {
protected:
    CompletionFixture() {
        m_folder.Write("bash-script", BashCompletion(m_tree));
        m_folder.Write("zsh/_demo-ctl", ZshCompletion(m_tree));
        m_folder.Write("files/a picture.jpg", "");
        m_folder.MakeDir("files/volume2");
        WriteProgram("demo-ctl",
                     "if [ \"$1 $2\" = 'task list' ]; then\n"
                     "  echo 'a warning' >&2\n"
                     "  echo 'ID  NAME        STATUS'\n"
                     "  echo '3   Camera      waiting'\n"
                     "  echo '41  Two words   waiting'\n"
                     "  exit\n"
                     "fi\n"
                     "printf 'CALLED'; printf '<%s>' \"$@\"; echo .\n");
    }

    // Puts a program into the folder that is first in the shells' path.
    void WriteProgram(const std::string& name, const std::string& body) const {
        chmod(m_folder.Write("bin/" + name, "#!/bin/sh\n" + body).c_str(), 0755);
    }

    [[nodiscard]] std::vector<std::string> Environment() const {
        return {"PATH=" + (m_folder / "bin") + ":/usr/local/bin:/usr/bin:/bin",
                "HOME=" + m_folder.Path(), "TERM=xterm", "LC_ALL=C.UTF-8", "INPUTRC=/dev/null"};
    }

    TempDir m_folder;
    DemoProgram m_demo;
    const CommandInfo m_tree = ReadCommandTree(m_demo.app);
};
