#include "fake/fake-state.h"

#include <keld/error.h>

#include <algorithm>
#include <cctype>
#include <cerrno>
#include <cstring>
#include <string_view>

namespace {

std::mutex state_mutex;
thread_local int error_code = KELDERR_SUCCESS;
thread_local int error_line = 0;

FakeState& State() {
    static auto* const state = new FakeState;
    return *state;
}

// Caller holds the lock. The error that this call is to fail with, 0 for none.
int TakeFailure(FakeState& state, const std::string& name) {
    if (state.nth_left > 0 && --state.nth_left == 0) {
        state.failed = true;
        return state.nth_error;
    }
    const auto found = state.failures.find(name);
    if (found == state.failures.end()) return 0;
    FakeFailure& failure = found->second;
    if (failure.skip > 0) {
        --failure.skip;
        return 0;
    }
    if (failure.times == 0) return 0;
    if (failure.times > 0) --failure.times;
    state.failed = true;
    return failure.error;
}

std::function<void()> RecordCall(const char* name, std::initializer_list<std::string> arguments) {
    const LockedState state;
    state->calls.push_back({name, arguments});
    const auto found = state->actions.find(name);
    return found == state->actions.end() ? std::function<void()>{} : found->second;
}

}  // namespace

LockedState::LockedState() : m_lock(state_mutex) {}
FakeState* LockedState::operator->() const { return &State(); }
FakeState& LockedState::operator*() const { return State(); }

void FakeRecord(const char* name, std::initializer_list<std::string> arguments) {
    const std::function<void()> action = RecordCall(name, arguments);
    if (action) action();
}

bool FakeFails(const char* name, std::initializer_list<std::string> arguments) {
    FakeRecord(name, arguments);
    const LockedState state;
    const int error = TakeFailure(*state, name);
    if (error == 0) return false;
    FakeError(error == FakeKeld::NO_REASON ? KELDERR_SUCCESS : error);
    return true;
}

int FakeError(int error, int line) {
    error_code = error;
    error_line = line;
    return -1;
}

void FakeClearError() {
    error_code = KELDERR_SUCCESS;
    error_line = 0;
}

int FakeErrorOf(int system_error) {
    switch (system_error) {
        case ENOENT:
            return KELDERR_SRC_MISS_PATH;
        case EEXIST:
            return KELDERR_DST_EXISTS;
        case EACCES:
        case EPERM:
        case EROFS:
            return KELDERR_NO_PERMISSION;
        case ENOSPC:
            return KELDERR_NO_SPACE;
        case EDQUOT:
            return KELDERR_QUOTA_FULL;
        case EFBIG:
            return KELDERR_FILE_TOO_LARGE;
        case ENAMETOOLONG:
            return KELDERR_NAME_TOO_LONG;
        case EIO:
            return KELDERR_IO;
        default:
            return KELDERR_FILE_OPERATION;
    }
}

bool FakeFill(const std::string& text, char* buffer, size_t size) {
    if (text.size() + 1 > size) return false;
    memcpy(buffer, text.c_str(), text.size() + 1);
    return true;
}

bool FakeIsBelow(const std::string& path, const std::string& root) {
    return path.starts_with(root) && (path.size() == root.size() || path[root.size()] == '/');
}

std::vector<FakeShare> FakeAllShares(const FakeState& state) {
    std::vector<FakeShare> shares;
    for (const auto& [name, share] : state.shares) shares.push_back(share);
    for (const auto& [mount_path, device] : state.devices) {
        if (!device.mounted) continue;
        FakeShare share;
        share.name = device.share_name;
        share.path = mount_path;
        share.volume = mount_path.substr(0, mount_path.rfind('/'));
        share.recycle_bin = device.recycle_bin;
        shares.push_back(std::move(share));
    }
    return shares;
}

std::optional<FakeShare> FakeShareOf(const FakeState& state, const std::string& path) {
    std::optional<FakeShare> best;
    for (const FakeShare& share : FakeAllShares(state)) {
        if (!FakeIsBelow(path, share.path)) continue;
        if (!best || share.path.size() > best->path.size()) best = share;
    }
    return best;
}

std::string FakeDiskOf(const std::string& partition) {
    size_t end = partition.size();
    while (end > 0 && isdigit(static_cast<unsigned char>(partition[end - 1]))) --end;
    const bool has_number = end < partition.size();
    // "mmcblk0p1", "nvme0n1p2", "loop0p1": a "p" between the digits of the disk and those of the
    // partition. Of these disks "mmcblk0" alone is whole.
    if (has_number && end >= 2 && partition[end - 1] == 'p' &&
        isdigit(static_cast<unsigned char>(partition[end - 2]))) {
        return partition.substr(0, end - 1);
    }
    for (const std::string_view prefix : {"loop", "mmcblk", "nvme", "md", "sr", "zram"}) {
        if (partition.starts_with(prefix)) return partition;
    }
    return partition.substr(0, end);
}

extern "C" {

int KLIBCErrGet(void) { return error_code; }

const char* KLIBCErrorGetFile(void) { return error_code == KELDERR_SUCCESS ? "" : "fake.c"; }

int KLIBCErrorGetLine(void) { return error_line; }

}  // extern "C"
