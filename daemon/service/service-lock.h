// Keeps control programs from starting, stopping or moving the service at the same time, and from
// reading its database meanwhile. It ends with the process, however that ends.
#pragma once

#include "utils/unique-fd.h"

class ServiceLock {
public:
    // Waits for another program's operation. Where the lock file cannot be made (logged) the
    // operation goes on without: its own steps will tell what is wrong with the package's folder.
    ServiceLock();

private:
    UniqueFd m_file;
};
