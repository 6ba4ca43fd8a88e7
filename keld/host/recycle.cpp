#include <keld/error.h>
#include <keld/recycle.h>

#include "host/host-error.h"
#include "host/recycle-bin.h"
#include "host/share-table.h"

namespace keld_host {
namespace {

int Recycle(const char* share_path, const char* relative_path, bool is_admin_only, bool is_folder) {
    RecycleMove move(share_path, is_admin_only);
    const int code = move.Run(relative_path, is_folder);
    return code == KELDERR_SUCCESS ? 0 : Fail(code);
}

bool IsBinAdminOnly(const char* share_path) {
    const auto shares = CurrentShares();
    const ShareEntry* share = shares->FindByPath(share_path);
    return share != nullptr && share->recycleBinAdminOnly;
}

bool IsMissing(const char* text) { return text == nullptr || *text == 0; }

}  // namespace
}  // namespace keld_host

extern "C" {

int KELDRecycleUnlinkFileWithSharePath(const char* share_path, const char* relative_path) {
    if (keld_host::IsMissing(share_path) || keld_host::IsMissing(relative_path)) {
        return keld_host::Fail(KELDERR_INVALID_ARGUMENT);
    }
    return keld_host::Recycle(share_path, relative_path, keld_host::IsBinAdminOnly(share_path),
                              false);
}

int KELDRecycleRmDirWithSharePath(const char* share_path, const char* relative_path, int reserved,
                                  int admin_only) {
    (void)reserved;
    if (keld_host::IsMissing(share_path) || keld_host::IsMissing(relative_path)) {
        return keld_host::Fail(KELDERR_INVALID_ARGUMENT);
    }
    return keld_host::Recycle(share_path, relative_path, admin_only != 0, true);
}

}  // extern "C"
