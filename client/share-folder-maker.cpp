#include "client/share-folder-maker.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>

#include "client/exit-status.h"
#include "client/text.h"
#include "platform/sdk-share.h"
#include "utils/confined-path.h"
#include "utils/file-op.h"

namespace {

std::string RootOf(const std::string& name) {
    SDK::Share share;
    if (share.Open(name) < 0) {
        throw CommandError(EXIT_REFUSED, "there is no share \"" + Printable(name) +
                                             "\": \"ferrixctl share list\" shows what there is");
    }
    // What is made while it is locked lies beneath it when it is unlocked.
    if (!share.IsMounted()) {
        throw CommandError(EXIT_REFUSED,
                           "the share \"" + Printable(name) + "\" is locked: unlock it first");
    }
    if (!FSExists(share.GetPath())) {
        throw CommandError(EXIT_REFUSED, "the folder of the share \"" + Printable(name) +
                                             "\" is not there: is its volume mounted?");
    }
    return share.GetPath();
}

}  // namespace

void ShareFolderMaker::Make(const ShareFolder& folder) {
    m_root = RootOf(folder.share);
    const ConfinedRoot root(m_root);
    for (size_t end = 0; end < folder.folder.size();) {
        end = std::min(folder.folder.find('/', end + 1), folder.folder.size());
        const std::string path = m_root + folder.folder.substr(0, end);
        const bool was_there = FSExists(path);
        if (FSMKDir(path, false, FS_KEEP_UID, FS_KEEP_GID) == 0) {
            if (!was_there) m_made.push_back(path);
            continue;
        }
        TakeBack();
        throw CommandError(EXIT_REFUSED, "the folder \"" + Printable(path) +
                                             "\" could not be made: is a file in its place, or its "
                                             "volume full or read-only?");
    }
}

void ShareFolderMaker::TakeBack() {
    for (; !m_made.empty(); m_made.pop_back()) {
        const PathPlace place(m_root, m_made.back());
        // One that is not empty is in use by now, and stays.
        if (place.IsReached()) (void)unlinkat(place.DirFd(), place.Name(), AT_REMOVEDIR);
    }
}
