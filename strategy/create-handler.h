// The creation of one destination folder, with the modification time of the source folder.
#pragma once

#include <string>

#include "strategy/file-event-handler.h"

class CreateHandler : public FileEventHandler {
public:
    // Returns 0 or a negative ErrorCode; "Ignore this error" for an event that is none of ours.
    [[nodiscard]] int Handle();

protected:
    [[nodiscard]] virtual int RunCreate();
    // Chooses where the folder lands: the destination root followed by the event path.
    [[nodiscard]] virtual int SetCreateFullPath();

    // Makes the folder at m_create_full_path, or settles what is in its way.
    [[nodiscard]] int CreateFolder();

    std::string m_create_full_path;

private:
    [[nodiscard]] int HandleDstTypeConflict();
};
