// Makes a folder of a share for a task, and takes it back when the task does not come to be.
// Threads: an object belongs to one thread.
#pragma once

#include <string>
#include <vector>

#include "client/share-folder.h"

class ShareFolderMaker {
public:
    // Makes what is missing of the folder. CommandError, EXIT_REFUSED, and nothing is left of it:
    // there is no such share, it is locked or not mounted, or a folder cannot be made.
    void Make(const ShareFolder& folder);
    // Removes the folders that were made, as far as they are still empty.
    void TakeBack();

private:
    std::string m_root;
    std::vector<std::string> m_made;  // a folder stands before what lies in it
};
