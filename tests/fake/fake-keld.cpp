#include "fake/fake-keld.h"

#include <algorithm>

#include "fake/fake-state.h"

FakeKeld& FakeKeld::Get() {
    static auto* const instance = new FakeKeld;
    return *instance;
}

FakeKeld& FakeKeld::Reset() {
    *LockedState() = FakeState{};
    FakeClearError();
    return Get();
}

void FakeKeld::FailCall(const std::string& name, int error, int times, int skip) {
    LockedState()->failures[name] = {error, times, skip};
}

void FakeKeld::FailNthCall(int nth, int error) {
    const LockedState state;
    state->nth_left = nth;
    state->nth_error = error;
    state->failed = false;
}

bool FakeKeld::Failed() const { return LockedState()->failed; }

void FakeKeld::OnCall(const std::string& name, std::function<void()> action) {
    LockedState()->actions[name] = std::move(action);
}

std::vector<FakeCall> FakeKeld::Calls() const { return LockedState()->calls; }

std::vector<std::vector<std::string>> FakeKeld::CallsOf(const std::string& name) const {
    std::vector<std::vector<std::string>> calls;
    const LockedState state;
    for (const FakeCall& call : state->calls) {
        if (call.name == name) calls.push_back(call.arguments);
    }
    return calls;
}

int FakeKeld::CallCount(const std::string& name) const {
    return static_cast<int>(CallsOf(name).size());
}

void FakeKeld::ForgetCalls() { LockedState()->calls.clear(); }

void FakeKeld::AddShare(FakeShare share) {
    if (share.volume.empty()) share.volume = share.path.substr(0, share.path.rfind('/'));
    const LockedState state;
    state->shares[share.name] = std::move(share);
}

void FakeKeld::RemoveShare(const std::string& name) { LockedState()->shares.erase(name); }

void FakeKeld::LockShare(const std::string& name, bool locked) {
    LockedState()->shares[name].locked = locked;
}

void FakeKeld::AddDevice(FakeDevice device) {
    if (device.share_name.empty()) {
        device.share_name = device.mount_path.substr(device.mount_path.rfind('/') + 1);
    }
    if (device.disk.empty()) {
        device.disk = FakeDiskOf(device.dev_path.substr(device.dev_path.rfind('/') + 1));
    }
    if (device.identity.empty()) device.identity = device.dev_path + " on " + device.mount_path;
    const LockedState state;
    state->devices[device.mount_path] = std::move(device);
}

void FakeKeld::Unmount(const std::string& mount_path) {
    LockedState()->devices[mount_path].mounted = false;
}

void FakeKeld::Pull(const std::string& mount_path) {
    LockedState()->devices[mount_path].present = false;
}

void FakeKeld::AddVolume(FakeVolume volume) { LockedState()->volumes.push_back(std::move(volume)); }

void FakeKeld::RemoveVolume(const std::string& mount_path) {
    std::erase_if(LockedState()->volumes,
                  [&](const FakeVolume& volume) { return volume.mount_path == mount_path; });
}

void FakeKeld::RunProgramsForReal() { LockedState()->programs_are_real = true; }

void FakeKeld::SetCapability(const std::string& key, bool has) {
    LockedState()->capabilities[key] = has;
}

void FakeKeld::SetHostname(const std::string& name) { LockedState()->hostname = name; }

void FakeKeld::SetService(const std::string& name, bool on) { LockedState()->services[name] = on; }

void FakeKeld::SetAclSupported(bool supported) { LockedState()->acl_supported = supported; }

std::vector<KELDACLEntry> FakeKeld::Acl(const std::string& path) const {
    const LockedState state;
    const auto found = state->acls.find(path);
    return found == state->acls.end() ? std::vector<KELDACLEntry>{} : found->second;
}

std::map<std::string, int> FakeKeld::ArchiveBits() const { return LockedState()->archive_bits; }

void FakeKeld::AddUser(FakeUser user) { LockedState()->users.push_back(std::move(user)); }

void FakeKeld::AddGroup(const std::string& name, unsigned gid, std::vector<std::string> members) {
    LockedState()->groups[name] = {gid, std::move(members)};
}

void FakeKeld::SetProgramResult(const std::string& program, int result) {
    LockedState()->program_results[program] = result;
}

std::vector<FakeNotification> FakeKeld::Notifications() const {
    return LockedState()->notifications;
}

std::vector<std::string> FakeKeld::Indexed() const { return LockedState()->indexed; }

std::vector<int> FakeKeld::LedCodes() const { return LockedState()->led_codes; }

std::vector<int> FakeKeld::HardwareCommands() const { return LockedState()->hardware_commands; }

std::vector<std::string> FakeKeld::Ejected() const { return LockedState()->ejected; }

std::vector<std::vector<std::string>> FakeKeld::Programs() const { return LockedState()->programs; }

std::vector<std::pair<std::string, std::string>> FakeKeld::Copies() const {
    return LockedState()->copies;
}

std::vector<std::pair<std::string, std::string>> FakeKeld::Recycled() const {
    return LockedState()->recycled;
}

std::vector<unsigned> FakeKeld::BoxLogCodes() const { return LockedState()->box_log_codes; }

std::map<int, FakeSchedEntry> FakeKeld::SchedEntries() const { return LockedState()->sched; }

int FakeKeld::AddSchedEntry(FakeSchedEntry entry) {
    const LockedState state;
    if (entry.id == 0) entry.id = state->next_sched_id;
    state->next_sched_id = std::max(state->next_sched_id, entry.id + 1);
    const int id = entry.id;
    state->sched[id] = std::move(entry);
    return id;
}
