// The log of the present repository, opened for reading. Works whether the daemon runs or not.
// Threads: belongs to one thread.
#pragma once

#include <sys/stat.h>

#include <ctime>
#include <string>

#include "db/log-db.h"

class LogFile {
public:
    // EXIT_REFUSED (CommandError) when there is no log yet, or it cannot be opened. None is made.
    LogFile();

    [[nodiscard]] LogDB& Db() { return m_db; }

    // False when no row can have been added since the last call: it costs next to nothing, and a
    // look into a long log does not. Turns to another log that has taken this one's place; while
    // there is none, waits for it with false. EXIT_REFUSED when that one cannot be opened.
    [[nodiscard]] bool HasNews();

private:
    struct State {
        dev_t device = 0;
        ino_t inode = 0;
        timespec changed{};
        off_t size = 0;

        bool operator==(const State& other) const;
        [[nodiscard]] bool IsSameFile(const State& other) const;
    };

    static State StateOf(const std::string& path);
    void Open();

    std::string m_path;
    LogDB m_db;
    State m_file;
    State m_journal;  // new rows stand here first
};
