// Removes a folder with all that it holds, however deep and wide, without following a link.
//
// A folder that lies on another file system than the outermost one is not gone into, and stays:
// somebody has mounted it there, and what it holds belongs elsewhere. The outermost folder itself
// may be no such mount point either.
//
// Every call is made relative to the open folder that holds the entry. At most MAX_OPEN folders are
// open at a time: those further up are closed and reached again through "..", which has to be the
// same folder still. An object does one removal, on one thread.
#pragma once

#include <dirent.h>
#include <sys/types.h>

#include <cstddef>
#include <string>
#include <vector>

#include "utils/unique-fd.h"

class TreeRemover {
public:
    static constexpr size_t MAX_OPEN = 32;

    // `path` is the full path of the folder, for log lines and for the platform; the folder itself
    // is `name` in the open folder `parent_fd`, which is not taken over.
    TreeRemover(int parent_fd, std::string name, std::string path);

    // True when nothing is left. What cannot be removed is logged, and the rest goes nevertheless.
    [[nodiscard]] bool Remove();

    // Drops what the platform keeps for a removed entry.
    [[nodiscard]] static bool RemoveAttributes(const std::string& path);

private:
    struct Frame {
        UniqueFd fd;
        dev_t device = 0;  // of a closed folder
        ino_t inode = 0;
        std::vector<std::string> sub_dirs;  // still to be removed
        size_t path_length = 0;             // of the folder itself
        size_t removed = 0;                 // by the latest sweep
        int sweeps = 0;
        bool has_rest = false;  // something in it could not be removed
    };

    [[nodiscard]] std::string NameOfTop() const;
    bool Enter(int parent_fd, const char* name);
    [[nodiscard]] bool IsOnSameFileSystem(int fd);
    void CloseFarFolder();
    bool ReopenParent();
    void Sweep(Frame& frame);
    void TakeEntry(Frame& frame, const char* name, unsigned char d_type);
    void RemoveEntry(Frame& frame, const char* name);
    bool Leave();
    void NoteFailure();

    int m_parent_fd;
    std::string m_name;
    std::string m_path;  // of the entry in hand; grows and shrinks
    std::vector<Frame> m_frames;
    std::vector<char> m_buffer;
    dev_t m_device = 0;  // of the outermost folder
    bool m_has_failed = false;
};
