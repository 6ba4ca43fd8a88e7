// Adding, removing and renaming shares of this box, for its control programs; the daemon calls none
// of it. A share is a section of host.conf or, while that has no [share ...] section, a folder of a
// volume. Files of users are never removed.
//
// Threads: any; several programs may do this at once, none loses the other's change. Tasks know
// shares by their names: telling the daemon, before and after, is the caller's part.
#pragma once

#include <string>

namespace keld_host {

struct ShareOutcome {
    enum Kind {
        DONE,
        WRONG_REQUEST,  // no such share, a name that cannot be one
        REFUSED,        // by the state of the box
    };
    Kind kind = DONE;
    // DONE: the share's path. Else a sentence: why not, and what to do; names in it are as they
    // are. Nothing has been changed then, unless the sentence says so.
    std::string text;

    [[nodiscard]] bool IsDone() const { return kind == DONE; }
};

// Whether host.conf can be read: with a broken one, nobody but the running daemon knows which
// shares there are.
[[nodiscard]] ShareOutcome CheckShareConf();

// The share is named by the last component of its path; a name alone stands for a folder of the
// box's only volume. The folder is made if it is missing.
[[nodiscard]] ShareOutcome AddShare(const std::string& nameOrPath);

// Takes the share's section out of host.conf; its files stay. A share without a section is an empty
// folder, and the folder goes: any other is refused. So is the last section, as without any every
// folder would be a share.
[[nodiscard]] ShareOutcome RemoveShare(const std::string& name);
// What RemoveShare would say now, as far as that can be told without doing it.
[[nodiscard]] ShareOutcome CheckRemoveShare(const std::string& name);

// Renames the folder, within the folder that it lies in, and its section with it.
[[nodiscard]] ShareOutcome RenameShare(const std::string& name, const std::string& newName);
[[nodiscard]] ShareOutcome CheckRenameShare(const std::string& name, const std::string& newName);

}  // namespace keld_host
