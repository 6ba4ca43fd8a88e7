#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <vector>

#include "utils/confined-path.h"
#include "utils/file-op.h"

namespace {

constexpr int kMissing = -2;
constexpr int kFailed = -3;

// The errno of a rename.
int RenameErrno(const std::string& from, const std::string& to) {
    const PathPlace old_place(from);
    const PathPlace new_place(to);
    for (const PathPlace* place : {&old_place, &new_place}) {
        // A path that leads out of its root says EXDEV too, and that is no other file system.
        if (!place->IsReached()) return place->Error() == EXDEV ? EPERM : place->Error();
    }
    const int result =
        renameat(old_place.DirFd(), old_place.Name(), new_place.DirFd(), new_place.Name());
    return result == 0 ? 0 : errno;
}

int RemoveEmptyDir(const std::string& path) {
    const PathPlace place(path);
    if (!place.IsReached()) return -1;
    return unlinkat(place.DirFd(), place.Name(), AT_REMOVEDIR);
}

// Moves a folder between two file systems, however deep, entry by entry.
class FolderMover {
public:
    FolderMover(std::string from, std::string to) : m_from(std::move(from)), m_to(std::move(to)) {}

    int Move() {
        if (Enter() != 0) return kFailed;
        while (!m_frames.empty()) {
            Frame& top = m_frames.back();
            const int result = top.names.empty() ? Leave() : MoveNext(top);
            if (result != 0) return kFailed;
        }
        return 0;
    }

private:
    struct Frame {
        std::vector<std::string> names;  // still to be moved
        size_t from_length;
        size_t to_length;
    };

    // Makes the folder on the other side and lists this one.
    int Enter() {
        if (FSMKDir(m_to, true, FS_KEEP_UID, FS_KEEP_GID) != 0) return -1;
        FSDir dir;
        if (FSOpenDir(m_from, 0, dir) != 0) return -1;
        Frame frame{{}, m_from.size(), m_to.size()};
        FSDirEntry entry;
        int result = 0;
        while ((result = FSReadDir(dir, entry)) > 0) {
            if (entry.name != "." && entry.name != "..") frame.names.push_back(entry.name);
        }
        m_frames.push_back(std::move(frame));
        return result;
    }

    int MoveNext(Frame& top) {
        m_from.resize(top.from_length);
        m_to.resize(top.to_length);
        m_from.append("/").append(top.names.back());
        m_to.append("/").append(top.names.back());
        top.names.pop_back();
        FSInfo info;
        if (FSStat(m_from, info) != 0 || !info.exist) return -1;
        const int error = RenameErrno(m_from, m_to);
        if (error != EXDEV) return error;
        if (info.type == FS_TYPE_FILE) return CopyFile(m_from, m_to, true);
        return info.type == FS_TYPE_DIR ? Enter() : 0;
    }

    int Leave() {
        m_from.resize(m_frames.back().from_length);
        m_frames.pop_back();
        // Not FSRemove(): what could not be moved, a link or a special file, must not be lost.
        return RemoveEmptyDir(m_from);
    }

    std::string m_from;
    std::string m_to;
    std::vector<Frame> m_frames;
};

int MoveAcross(const std::string& from, const std::string& to, FSType type) {
    if (type == FS_TYPE_FILE) return CopyFile(from, to, true) == 0 ? 0 : kFailed;
    return type == FS_TYPE_DIR ? FolderMover(from, to).Move() : 0;
}

}  // namespace

int FSRename(const std::string& from, const std::string& to) {
    if (from.empty() || to.empty()) return -1;
    FSInfo info;
    if (FSStat(from, info) != 0 || !info.exist) return kMissing;
    switch (RenameErrno(from, to)) {
        case 0:
            return 0;
        case ENAMETOOLONG:
            return FS_RENAME_NAME_TOO_LONG;
        case EXDEV:
            return MoveAcross(from, to, info.type);
        default:
            return kFailed;
    }
}
