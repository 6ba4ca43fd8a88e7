#include <keld/keyfile.h>
#include <keld/support.h>

#include "host/host-paths.h"

int KLIBCSupportGet(const char* key) {
    return KLIBCFileCheckKeyValue(keld_host::Paths().keldInfo.c_str(), key, "yes") == 1 ? 1 : 0;
}
