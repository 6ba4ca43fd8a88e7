#include "host/share-rules.h"

#include <dirent.h>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <cstdlib>
#include <cstring>

#include "host/host-conf-edit.h"
#include "host/share-table-builder.h"
#include "host/text.h"
#include "utils/unique-fd.h"

namespace keld_host {
namespace {

using UniqueText = std::unique_ptr<char, FreeWith<free>>;

ShareOutcome Wrong(const std::string& text) { return {ShareOutcome::WRONG_REQUEST, text}; }
ShareOutcome Refused(const std::string& text) { return {ShareOutcome::REFUSED, text}; }

std::string Quoted(std::string_view name) { return "\"" + std::string(name) + "\""; }

ShareOutcome CannotHold(const std::string& path) {
    return Refused("host.conf cannot hold the path " + path + ": choose another");
}

// 0 when the folder of `path` lets names in it be changed.
int CanChangeNames(const std::string& path) {
    return faccessat(AT_FDCWD, ParentOf(path).c_str(), W_OK | X_OK, AT_EACCESS) == 0 ? 0 : errno;
}

std::string VolumeList(const ShareTable& table, const std::string& suffix) {
    std::string list;
    for (const VolumeEntry& volume : table.volumes) {
        list += (list.empty() ? "" : " or ") + volume.path + suffix;
    }
    return list;
}

// --- A new share

// The path that a name or a path on a command line means.
ShareOutcome PathOf(const ShareTable& table, const std::string& nameOrPath, std::string& path) {
    if (!nameOrPath.empty() && nameOrPath.front() == '/') {
        path = CleanPath(nameOrPath);
        return {};
    }
    if (nameOrPath.find('/') != std::string::npos) {
        return Wrong(Quoted(nameOrPath) + " is neither a name nor a whole path: give /VOLUME/NAME");
    }
    if (table.volumes.empty()) {
        return Refused(
            "this box has no volume: mount a disk on /volume1, or name another folder in host.conf "
            "as [volume PATH]");
    }
    if (table.volumes.size() > 1) {
        return Wrong("there are several volumes: say which one, as in " +
                     VolumeList(table, "/" + nameOrPath));
    }
    path = table.volumes.front().path + "/" + nameOrPath;
    return {};
}

// Every name below the volume: a share inside the box's own folders ("@...", "#recycle") would be
// as bad as one that is called so.
ShareOutcome CheckNames(const std::string& path, const std::string& volume) {
    for (size_t begin = volume.size() + 1; begin <= path.size();) {
        const size_t end = std::min(path.find('/', begin), path.size());
        const std::string name = path.substr(begin, end - begin);
        const std::string fault = ShareNameFault(name);
        if (!fault.empty()) {
            return Wrong(Quoted(name) + " cannot be the name of a share: " + fault +
                         "; take another name");
        }
        begin = end + 1;
    }
    return {};
}

ShareOutcome CheckPlace(const ShareBox& box, const std::string& path) {
    const std::string framed = path + "/";
    const VolumeEntry* volume = box.Table().FindVolume(path);
    if (volume == nullptr || volume->path == path || framed.find("/../") != std::string::npos ||
        framed.find("/./") != std::string::npos) {
        return Wrong(path + " does not lie on a volume of this box: give " +
                     VolumeList(box.Table(), "/NAME"));
    }
    if (const ShareOutcome outcome = CheckNames(path, volume->path); !outcome.IsDone()) {
        return outcome;
    }
    if (path.size() >= PATH_MAX) return Wrong("the path is too long");
    if (!box.HasSections() && ParentOf(path) != volume->path) {
        return Refused(
            "as long as host.conf has no [share ...] section, shares are folders right "
            "below a volume: give " +
            volume->path + "/" + std::string(BaseNameOf(path)) +
            ", or name all shares of the box in host.conf");
    }
    return {};
}

// By another way the folder could be, or hold, the folder of another share.
ShareOutcome CheckWay(const ShareTable& table, const std::string& path) {
    const std::string volume = table.FindVolume(path)->path;
    const std::string parent = ParentOf(path);
    const UniqueText realVolume(realpath(volume.c_str(), nullptr));
    const UniqueText realParent(realpath(parent.c_str(), nullptr));
    if (!realVolume || !realParent) {
        return Refused("there is no folder " + parent + " to hold the share: make it first");
    }
    if (realParent.get() != realVolume.get() + parent.substr(volume.size())) {
        return Refused(parent + " is reached through a link: give the path without links");
    }
    return {};
}

ShareOutcome CheckNameIsFree(const ShareBox& box, const std::string& name) {
    const ShareEntry* taken = box.Table().FindByName(name);
    if (taken != nullptr && taken->isDevice) {
        return Refused("a plugged-in device is called " + Quoted(name) + ": take another name");
    }
    if (taken != nullptr) {
        return Refused("there is a share " + Quoted(name) + " already, the folder " + taken->path);
    }
    if (HasShareSection(box.File().Text(), name)) {
        return Refused("host.conf has a section [share " + name +
                       "] already, for a folder of another name: take another name, or correct it "
                       "there");
    }
    return {};
}

ShareOutcome CheckIsApart(const ShareTable& table, const std::string& path) {
    for (const ShareEntry& share : table.shares) {
        if (IsSameOrBelow(path, share.path)) {
            return Refused(path + " lies in the share " + Quoted(share.name) +
                           ", and what is copied to the one would land in the other: take a folder "
                           "beside it");
        }
        if (IsSameOrBelow(share.path, path)) {
            return Refused("the share " + Quoted(share.name) + " lies in " + path +
                           ", and what is copied to the one would land in the other: take a folder "
                           "beside it");
        }
    }
    return {};
}

// --- A share that is there

ShareOutcome Find(const ShareBox& box, const std::string& name, const ShareEntry*& share) {
    share = box.Table().FindByName(name);
    if (share == nullptr) return Wrong("there is no share " + Quoted(name));
    if (share->isDevice) {
        return Refused(Quoted(name) + " is a plugged-in device, which is no share of the box");
    }
    return {};
}

ShareOutcome CheckNothingIsMounted(const ShareBox& box, const ShareEntry& share) {
    if (!box.IsMounted(share.path)) return {};
    return Refused("a file system is mounted on " + share.path + ": unmount it first");
}

ShareOutcome CheckWritable(const ShareBox& box, const SharePlan& plan, bool changesFolder) {
    if (const int error = changesFolder ? CanChangeNames(plan.path) : 0; error != 0) {
        return Refused(ParentOf(plan.path) + " cannot be changed: " + Because(error));
    }
    if (const int error = plan.text ? box.File().CanReplace() : 0; error != 0) {
        return Refused(box.File().Path() + " cannot be changed: " + Because(error));
    }
    return {};
}

// 0 when the folder is there and empty.
int IsEmptyFolder(const std::string& path) {
    const UniqueDir dir(opendir(path.c_str()));
    if (!dir) return errno;
    for (;;) {
        errno = 0;
        const dirent* entry = readdir(dir.get());
        if (entry == nullptr) return errno;
        const std::string_view name = entry->d_name;
        if (name != "." && name != "..") return ENOTEMPTY;
    }
}

ShareOutcome CheckIsEmpty(const std::string& path) {
    const int error = IsEmptyFolder(path);
    if (error == 0) return {};
    if (error != ENOTEMPTY) return Refused(path + " cannot be read: " + Because(error));
    return Refused(path +
                   " is not empty, and no files are removed here: move them away first. A folder "
                   "that keeps its files and is no share any more needs a name that starts with a "
                   "dot");
}

ShareOutcome CheckFolderIsThere(const ShareEntry& share) {
    struct stat info {};
    if (lstat(share.path.c_str(), &info) != 0) {
        return Refused("the folder of the share, " + share.path +
                       ", is not there: bring it back first (" + Because(errno) + ")");
    }
    if (S_ISDIR(info.st_mode)) return {};
    return Refused(share.path + " is no folder but a link or a file: it is not renamed here");
}

// Paths that would lead nowhere when the folder has another name.
ShareOutcome CheckNothingInside(const ShareBox& box, const ShareEntry& share) {
    for (const ShareEntry& other : box.Table().shares) {
        if (&other != &share && IsSameOrBelow(other.path, share.path)) {
            return Refused("the share " + Quoted(other.name) + " lies in " + share.path +
                           " and would be lost: move it away first");
        }
    }
    for (const VolumeEntry& volume : box.Table().volumes) {
        if (IsSameOrBelow(volume.path, share.path)) {
            return Refused("the volume " + volume.path + " lies in " + share.path +
                           " and would be lost");
        }
    }
    return {};
}

ShareOutcome CheckCanMove(const ShareBox& box, const ShareEntry& share) {
    if (share.mountPoint) {
        return Refused("what is mounted on " + share.path +
                       " would not follow to another name: change the mount and the section of "
                       "host.conf together by hand");
    }
    if (const ShareOutcome outcome = CheckNothingIsMounted(box, share); !outcome.IsDone()) {
        return outcome;
    }
    if (const ShareOutcome outcome = CheckFolderIsThere(share); !outcome.IsDone()) return outcome;
    return CheckNothingInside(box, share);
}

ShareOutcome CheckTarget(const ShareBox& box, const std::string& newPath) {
    const std::string newName(BaseNameOf(newPath));
    if (const ShareOutcome outcome = CheckNameIsFree(box, newName); !outcome.IsDone()) {
        return outcome;
    }
    struct stat info {};
    if (lstat(newPath.c_str(), &info) == 0) {
        return Refused("there is a " + newPath +
                       " already, and nothing is ever replaced: take "
                       "another name");
    }
    return {};
}

}  // namespace

std::string ShareNameFault(std::string_view name) {
    const auto isControl = [](char c) {
        return static_cast<unsigned char>(c) < ' ' || c == '\x7F';
    };
    if (name.empty()) return "it is empty";
    if (name == "." || name == "..") return "it stands for a folder itself";
    if (name.find('/') != std::string_view::npos) return "it holds a slash";
    if (std::any_of(name.begin(), name.end(), isControl)) return "it holds a control character";
    if (name.find_first_of("@#.") == 0) return "it starts with \"@\", \"#\" or \".\"";
    if (name.find_first_of("];") != std::string_view::npos) return "it holds \"]\" or \";\"";
    if (name.front() == ' ' || name.back() == ' ') return "it starts or ends with a blank";
    if (name.size() > NAME_MAX) return "it is longer than 255 bytes";
    return {};
}

std::string Because(int error) {
    std::string text = strerror(error);
    const bool isRights = error == EACCES || error == EPERM;
    if (isRights && geteuid() != 0) text += "; this takes root";
    return text;
}

ShareOutcome ShareBox::Open(bool forChange) {
    if (const int error = m_file.Open(forChange); error != 0) {
        return Refused(m_file.Path() + " cannot be " + (forChange ? "changed: " : "read: ") +
                       Because(error));
    }
    HostConfError fault;
    if (!ParseHostConf(m_file.Text(), m_conf, fault)) {
        return Refused(m_file.Path() + " is broken in line " + std::to_string(fault.line) + ", " +
                       fault.reason + ": mend it first");
    }
    m_mounts = CurrentMounts();
    if (!m_mounts) return Refused("the mount table cannot be read");
    m_table = BuildShareTable(m_conf, m_mounts.get(), [](const std::string&) {});
    return {};
}

bool ShareBox::IsMounted(const std::string& path) const {
    return m_mounts->FindAt(path) != nullptr;
}

ShareOutcome PlanAdd(const ShareBox& box, const std::string& nameOrPath, SharePlan& plan) {
    std::string& path = plan.path;
    ShareOutcome outcome = PathOf(box.Table(), nameOrPath, path);
    if (outcome.IsDone()) outcome = CheckPlace(box, path);
    if (outcome.IsDone()) outcome = CheckWay(box.Table(), path);
    if (outcome.IsDone()) outcome = CheckNameIsFree(box, std::string(BaseNameOf(path)));
    if (outcome.IsDone()) outcome = CheckIsApart(box.Table(), path);
    if (!outcome.IsDone() || !box.HasSections()) return outcome;
    plan.text = WithShareAdded(box.File().Text(), path);
    return plan.text ? outcome : CannotHold(path);
}

ShareOutcome PlanRemoval(const ShareBox& box, const std::string& name, SharePlan& plan) {
    const ShareEntry* share = nullptr;
    if (const ShareOutcome outcome = Find(box, name, share); !outcome.IsDone()) return outcome;
    plan.path = share->path;
    if (!box.HasSections()) {
        ShareOutcome outcome = CheckNothingIsMounted(box, *share);
        if (outcome.IsDone()) outcome = CheckIsEmpty(plan.path);
        return outcome.IsDone() ? CheckWritable(box, plan, true) : outcome;
    }
    if (box.Conf().shares.size() == 1) {
        return Refused(Quoted(name) +
                       " is the only share that host.conf names, and without any every folder of a "
                       "volume would be one: add another share first");
    }
    plan.text = WithShareRemoved(box.File().Text(), plan.path);
    return plan.text ? CheckWritable(box, plan, false) : CannotHold(plan.path);
}

ShareOutcome PlanRename(const ShareBox& box, const std::string& name, const std::string& newName,
                        SharePlan& plan) {
    const ShareEntry* share = nullptr;
    if (const ShareOutcome outcome = Find(box, name, share); !outcome.IsDone()) return outcome;
    if (const std::string fault = ShareNameFault(newName); !fault.empty()) {
        return Wrong(Quoted(newName) + " cannot be the name of a share: " + fault +
                     "; take another name");
    }
    if (newName == name) return Wrong("the share is called " + Quoted(name) + " already");
    plan.path = share->path;
    plan.newPath = (ParentOf(plan.path) == "/" ? "" : ParentOf(plan.path)) + "/" + newName;
    ShareOutcome outcome = CheckCanMove(box, *share);
    if (outcome.IsDone()) outcome = CheckTarget(box, plan.newPath);
    if (!outcome.IsDone()) return outcome;
    if (box.HasSections()) {
        plan.text = WithShareMoved(box.File().Text(), plan.path, plan.newPath);
        if (!plan.text) return CannotHold(plan.newPath);
    }
    return CheckWritable(box, plan, true);
}

}  // namespace keld_host
