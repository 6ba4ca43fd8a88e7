// A database file as a file: with what sqlite puts beside it, copied, and put in another's place.
//
// sqlite takes a journal that lies beside a database for that database's own and plays it back. So
// a file is moved only while neither it nor the one that it replaces has any.
// Failures are logged. Threads: any, one for each database.
#pragma once

#include <string>

// Brings everything into the one file: what lies in a write-ahead log, or waits to be rolled back
// in a journal, after a crash of the daemon. The content does not change. 0 or -1, as when another
// program has the file open.
[[nodiscard]] int MakeSingleFile(const std::string& path);

// Whether a transaction was broken off and waits to be rolled back, which a reader cannot do.
[[nodiscard]] bool HasJournal(const std::string& path);

// Removes the database with all that lies beside it. Nothing there is no failure.
void RemoveDatabase(const std::string& path);

// Puts `from` in the place of `to` in one step, there for good when it returns 0. -1 when one of
// the two is no single file, too. `is_moved` tells whether it has the place, also after a failure
// to make that last.
[[nodiscard]] int PutInPlace(const std::string& from, const std::string& to, bool& is_moved);

// A copy to work on, beside the original and named by its version; it is gone at the end unless it
// has taken the place of the original.
class DatabaseCopy {
public:
    DatabaseCopy(std::string original, unsigned version);
    ~DatabaseCopy();
    DatabaseCopy(const DatabaseCopy&) = delete;
    DatabaseCopy& operator=(const DatabaseCopy&) = delete;

    // Takes the copy, in place of one that an earlier attempt has left. 0 or -1.
    [[nodiscard]] int Make();
    // 0; -1 when the original is still in its place, or nobody knows whether the copy would be
    // there after a power cut.
    [[nodiscard]] int ReplaceOriginal();
    // Whether the copy has taken the place.
    [[nodiscard]] bool HasReplacedOriginal() const { return m_has_replaced; }
    [[nodiscard]] const std::string& Path() const { return m_copy; }

private:
    std::string m_original;
    std::string m_copy;
    bool m_has_replaced = false;
};
