#include <utility>
#include <vector>

#include "utils/file-op.h"

namespace {

constexpr int kFailed = -1;
constexpr int kEnded = -2;

struct Child {
    std::string name;
    bool is_dir;
};

// Everything but "." and "..", read to the end so that no walk holds a folder open for each level.
int ReadChildren(const std::string& path, std::vector<Child>& children) {
    FSDir dir;
    if (FSOpenDir(path, 0, dir) != 0) return -1;
    FSDirEntry entry;
    int result = 0;
    while ((result = FSReadDir(dir, entry)) > 0) {
        if (entry.name == "." || entry.name == "..") continue;
        children.push_back({entry.name, entry.type == FS_TYPE_DIR});
    }
    return result;
}

bool IsDir(const std::string& path) {
    FSInfo info;
    return FSStat(path, info) == 0 && info.exist && info.type == FS_TYPE_DIR;
}

}  // namespace

int FSWalk(const std::string& path, FSWalkCallback callback, void* arg) {
    struct Frame {
        std::vector<Child> children;
        size_t next;
        size_t path_length;
    };
    if (!IsDir(path)) return kFailed;
    std::string at = path;
    if (callback(at, arg) != 0) return kEnded;
    std::vector<Frame> frames;
    frames.push_back({{}, 0, at.size()});
    if (ReadChildren(at, frames.back().children) != 0) return kFailed;
    while (!frames.empty()) {
        Frame& top = frames.back();
        at.resize(top.path_length);
        if (top.next == top.children.size()) {
            frames.pop_back();
            continue;
        }
        const Child& child = top.children[top.next++];
        at.append("/").append(child.name);
        if (callback(at, arg) != 0) return kEnded;
        if (!child.is_dir) continue;
        Frame below{{}, 0, at.size()};
        if (ReadChildren(at, below.children) != 0) return kFailed;
        frames.push_back(std::move(below));
    }
    return 0;
}

int FSWalkTyped(const std::string& path, FSWalkTypedCallback callback, void* arg) {
    if (!IsDir(path)) return kFailed;
    if (callback(path, true, arg) != 0) return kEnded;
    std::vector<Child> children;
    if (ReadChildren(path, children) != 0) return kFailed;
    for (const Child& child : children) {
        if (callback(path + "/" + child.name, child.is_dir, arg) != 0) return kEnded;
    }
    return 0;
}
