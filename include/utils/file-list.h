// The names of a folder's contents as a tree in memory, read back in one fixed order by a cursor.
//
// Built in any order by a walk or from database rows. The order of reading is descending by the
// bytes of the names (strcmp) within each folder, and a folder comes right after its contents; two
// lists can therefore be compared step by step.
//
// Ownership: a list does not own its pool, which must outlive it; lists that are compared share
// one. Threads: a list, its pool and its cursors belong to one thread. Adding invalidates cursors.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "utils/name-pool.h"

struct FileListFile {
    const char* name;  // in the pool
    uint32_t mtime;
    uint64_t size;
};

// Which names a folder holds: addresses in the pool, each with a number. Open addressing.
class FileListNames {
public:
    // The slot's number, or null when the name is not there.
    [[nodiscard]] const int* Find(const char* name) const;
    // The name must not be there.
    void Insert(const char* name, int value);

private:
    struct Slot {
        const char* name = nullptr;
        int value = 0;
    };
    [[nodiscard]] size_t SlotOf(const char* name) const;
    void Grow();

    std::vector<Slot> m_slots;
    size_t m_count = 0;
};

struct FileListDir {
    const char* name = nullptr;  // in the pool
    int parent = -1;             // index of its folder; -1 for the root
    uint32_t mtime = 0;
    // Both sets are sorted by name when a cursor is made, not at each addition.
    std::vector<int> dirs;            // indexes of the sub-folders
    std::vector<FileListFile> files;  // names are unique among files and sub-folders together
    bool is_sorted = true;
    FileListNames names;  // a sub-folder's index, or -1 for a file
};

class FileListIterator;

class FileList {
public:
    static constexpr int ROOT = 0;
    static constexpr size_t MAX_COMPONENT = 1023;
    static constexpr size_t MAX_PATH_LENGTH = 4096;

    explicit FileList(NamePool& pool);
    FileList(const FileList&) = delete;
    FileList& operator=(const FileList&) = delete;

    // Adds to the folder of that index (ROOT, or a result of AddDir). AddFile gives 0, AddDir the
    // new folder's index; both give -1 for a negative index, a name that the folder has already, or
    // a full pool, and the list is then unchanged. An index out of range is a programming error.
    [[nodiscard]] int AddFile(int dir_index, std::string_view name, uint32_t mtime, uint64_t size);
    [[nodiscard]] int AddDir(int dir_index, std::string_view name, uint32_t mtime);
    // The same by path below the root, making the folders on the way; those made stay after a
    // failure. 0, or -1: also for a path that is empty, ends in "/" or is over the limits.
    // A folder that is there already takes the new mtime.
    [[nodiscard]] int AddFileByPath(std::string_view path, uint32_t mtime, uint64_t size);
    [[nodiscard]] int AddDirByPath(std::string_view path, uint32_t mtime);

    // False once a name was refused because the pool had no room for it: names may be missing then.
    [[nodiscard]] bool HasRoom() const { return m_pool.HasRoom(); }

    [[nodiscard]] FileListIterator begin() const;
    [[nodiscard]] FileListIterator end() const;

    [[nodiscard]] size_t DirCount(int dir_index) const {
        return m_dirs[Slot(dir_index)].dirs.size();
    }
    [[nodiscard]] size_t FileCount(int dir_index) const {
        return m_dirs[Slot(dir_index)].files.size();
    }

private:
    friend class FileListIterator;

    static size_t Slot(int dir_index) { return static_cast<size_t>(dir_index); }
    // The index of the folder that `path` (with a "/" before its last component) lies in, made if
    // need be, and the last component; -1 on failure.
    [[nodiscard]] int MakeParents(std::string_view path, std::string_view& name);
    // The index of a sub-folder; -1 when there is none of that name.
    [[nodiscard]] int FindDir(int parent, std::string_view name) const;
    // Sorts a folder's sets for reading.
    const FileListDir& Sorted(int dir_index) const;

    NamePool& m_pool;
    mutable std::vector<FileListDir> m_dirs;  // mutable: sorted on first reading
};

// What a cursor stands on.
struct FileListEntry {
    bool is_dir = false;
    std::string path;  // from the list's root, with a "/" before each name
    uint32_t mtime = 0;
    uint64_t size = 0;  // 0 for a folder
};

// The cursor. The root's own entry is never delivered: standing on it is the end.
class FileListIterator {
public:
    enum State : int {
        STATE_DIR = 0,   // on the folder itself, after its contents
        STATE_BACK = 1,  // back in a folder from a finished sub-folder (within Next only)
        STATE_FILE = 2,  // on a file
    };

    // Steps on; not to be called at the end.
    void next();
    FileListIterator& operator++() {
        next();
        return *this;
    }
    [[nodiscard]] const FileListEntry& operator*() const { return m_entry; }
    [[nodiscard]] const FileListEntry* operator->() const { return &m_entry; }
    // List, folder and state are compared, the road there is not.
    [[nodiscard]] bool operator==(const FileListIterator& other) const {
        return m_list == other.m_list && m_dir == other.m_dir && m_state == other.m_state;
    }
    [[nodiscard]] bool operator!=(const FileListIterator& other) const { return !(*this == other); }

private:
    friend class FileList;

    struct Frame {
        int dir;
        size_t files_left;   // the next file is the one before this position
        size_t dirs_left;    // likewise
        size_t path_length;  // of the path of the folder itself
    };

    FileListIterator(const FileList& list, State state);
    void Push(int dir);
    void Settle();
    void BuildEntry();

    const FileList* m_list;
    int m_dir = 0;
    State m_state;
    std::vector<Frame> m_stack;
    FileListEntry m_entry;
};
