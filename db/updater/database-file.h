// A database file as a file: with what sqlite puts beside it, copied, and put in another's place.
//
// A file is moved only while neither it nor the one that it replaces has anything beside it
// (db/side-files.h).
// Failures are logged. Threads: any, one for each database.
#pragma once

#include <string>

// Brings everything into the one file: what lies in a write-ahead log, or waits to be rolled back
// in a journal, after a crash of the daemon. The content does not change. 0 or -1, as when another
// program keeps the file open for longer than a minute.
[[nodiscard]] int MakeSingleFile(const std::string& path);

// Whether something is in the place that a file is put in, and may be replaced.
enum class Place { FREE, TAKEN };

// Puts `from` in the place of `to` in one step, there for good when it returns 0. -1 when one of
// the two is no single file, too, or something is in a place that was to be free. `is_moved` tells
// whether it has the place, also after a failure to make that last.
[[nodiscard]] int PutInPlace(const std::string& from, const std::string& to, Place place,
                             bool& is_moved);

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
