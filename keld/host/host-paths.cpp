#include "host/host-paths.h"

#include "host/host-cache.h"

namespace keld_host {
namespace {

HostPaths& Stored() {
    static HostPaths paths;
    return paths;
}

}  // namespace

const HostPaths& Paths() { return Stored(); }

void SetPaths(const HostPaths& paths) {
    Stored() = paths;
    DropHostCaches();
}

}  // namespace keld_host
