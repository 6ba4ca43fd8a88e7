// Plain Linux has no lists of the appliance's kind: files are guarded by their mode bits.
#include <keld/acl.h>

#include <cstdlib>
#include <memory>
#include <vector>

#include "host/host-error.h"

using keld_host::Fail;

namespace {

struct AclRecord : KELDACL {
    explicit AclRecord(int wanted) : KELDACL{}, storage(static_cast<size_t>(wanted)) {
        count = wanted;
        entries = storage.data();
    }
    std::vector<KELDACLEntry> storage;
};

// A list on the appliance has at most a few hundred entries.
constexpr int MAX_ENTRIES = 4096;

}  // namespace

KELDACL* KELDACLAlloc(int count) {
    if (count < 0 || count > MAX_ENTRIES) {
        Fail(KELDERR_INVALID_ARGUMENT);
        return nullptr;
    }
    return std::make_unique<AclRecord>(count).release();
}

void KELDACLFree(KELDACL* acl) { delete static_cast<AclRecord*>(acl); }

int KELDACLIsSupport(const char* path, int fd, int flags) {
    static_cast<void>(path);
    static_cast<void>(fd);
    static_cast<void>(flags);
    return 0;
}

int KELDACLGet(const char* path, int fd, KELDACL** acl) {
    static_cast<void>(path);
    static_cast<void>(fd);
    if (acl != nullptr) *acl = nullptr;
    return Fail(KELDERR_NO_PERMISSION_ACL);
}

int KELDACLSet(const char* path, int fd, const KELDACL* acl) {
    static_cast<void>(path);
    static_cast<void>(fd);
    static_cast<void>(acl);
    return Fail(KELDERR_NO_PERMISSION_ACL);
}
