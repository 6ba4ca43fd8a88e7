// Attributes, access control, notifications, the index, indicators, programs and services.
#include <keld/acl.h>
#include <keld/ea.h>
#include <keld/exec.h>
#include <keld/index.h>
#include <keld/indicator.h>
#include <keld/notify.h>
#include <keld/service.h>
#include <spawn.h>
#include <sys/wait.h>
#include <unistd.h>

#include <cstdarg>
#include <cstdio>
#include <memory>

#include "fake/fake-state.h"
#include "fake/fake-text-list.h"

namespace {

// A list with the room for its entries.
struct OwnedAcl : KELDACL {
    std::vector<KELDACLEntry> room;
};

int Service(const char* call, const std::string& name) {
    if (FakeFails(call, {name})) return -1;
    const LockedState state;
    const auto found = state->services.find(name);
    return found != state->services.end() && found->second ? 1 : 0;
}

// The program and its arguments up to the null pointer.
std::vector<std::string> CommandLine(const char* program, va_list arguments) {
    std::vector<std::string> line = {FakeText(program)};
    for (const char* text = va_arg(arguments, const char*); text != nullptr;
         text = va_arg(arguments, const char*)) {
        line.emplace_back(text);
    }
    return line;
}

// The exit status, or -1.
int SpawnAndWait(const std::vector<std::string>& line) {
    std::vector<char*> arguments;
    for (const std::string& text : line) arguments.push_back(const_cast<char*>(text.c_str()));
    arguments.push_back(nullptr);
    pid_t pid = 0;
    if (posix_spawn(&pid, arguments[0], nullptr, nullptr, arguments.data(), environ) != 0) {
        return FakeError(KELDERR_SRC_MISS);
    }
    int status = 0;
    waitpid(pid, &status, 0);
    return WIFEXITED(status) ? WEXITSTATUS(status) : FakeError(KELDERR_SYSTEM);
}

int RunProgram(const char* call, const std::vector<std::string>& line) {
    if (FakeFails(call, {line[0]})) return -1;
    {
        const LockedState state;
        state->programs.push_back(line);
        const auto found = state->program_results.find(line[0]);
        if (found != state->program_results.end()) return found->second;
        if (!state->programs_are_real) return 0;
    }
    return SpawnAndWait(line);
}

}  // namespace

extern "C" {

KELDACL* KELDACLAlloc(int count) {
    if (FakeFails("KELDACLAlloc", {std::to_string(count)})) return nullptr;
    auto acl = std::make_unique<OwnedAcl>();
    acl->room.resize(static_cast<size_t>(count));
    acl->count = count;
    acl->entries = acl->room.data();
    return acl.release();
}

void KELDACLFree(KELDACL* acl) { delete static_cast<OwnedAcl*>(acl); }

int KELDACLIsSupport(const char* path, int, int) {
    FakeRecord("KELDACLIsSupport", {FakeText(path)});
    return LockedState()->acl_supported ? 1 : 0;
}

int KELDACLGet(const char* path, int, KELDACL** acl) {
    *acl = nullptr;
    if (FakeFails("KELDACLGet", {FakeText(path)})) return -1;
    auto copy = std::make_unique<OwnedAcl>();
    copy->room = FakeKeld::Get().Acl(FakeText(path));
    copy->count = static_cast<int>(copy->room.size());
    copy->entries = copy->room.data();
    *acl = copy.release();
    return 0;
}

int KELDACLSet(const char* path, int, const KELDACL* acl) {
    if (FakeFails("KELDACLSet", {FakeText(path)})) return -1;
    const LockedState state;
    state->acls[FakeText(path)] = {acl->entries, acl->entries + acl->count};
    return 0;
}

int KELDEARemove(const char* path, int, int) {
    return FakeFails("KELDEARemove", {FakeText(path)}) ? -1 : 0;
}

int KELDArchiveBit(const char* path, int value) {
    if (FakeFails("KELDArchiveBit", {FakeText(path), std::to_string(value)})) return -1;
    LockedState()->archive_bits[FakeText(path)] = value;
    return 0;
}

int KLIBKeldIndexAddEx(const char* path, int arg1, int arg2, int arg3, int arg4) {
    if (FakeFails("KLIBKeldIndexAddEx", {FakeText(path), std::to_string(arg1), std::to_string(arg2),
                                         std::to_string(arg3), std::to_string(arg4)})) {
        return -1;
    }
    LockedState()->indexed.push_back(FakeText(path));
    return 0;
}

int KLIBScemdNotify(int code) {
    if (FakeFails("KLIBScemdNotify", {std::to_string(code)})) return -1;
    LockedState()->led_codes.push_back(code);
    return 0;
}

int KELDHWExternalControl(int command, int arg1, int arg2) {
    if (FakeFails("KELDHWExternalControl",
                  {std::to_string(command), std::to_string(arg1), std::to_string(arg2)})) {
        return -1;
    }
    LockedState()->hardware_commands.push_back(command);
    return 0;
}

int KLIBCExec(const char* program, ...) {
    va_list arguments;
    va_start(arguments, program);
    const std::vector<std::string> line = CommandLine(program, arguments);
    va_end(arguments);
    return RunProgram("KLIBCExec", line);
}

int KLIBCBackgroundExec(const char* program, ...) {
    va_list arguments;
    va_start(arguments, program);
    const std::vector<std::string> line = CommandLine(program, arguments);
    va_end(arguments);
    return RunProgram("KLIBCBackgroundExec", line) < 0 ? -1 : 0;
}

pid_t KLIBCReadPidFile(const char* path) {
    if (FakeFails("KLIBCReadPidFile", {FakeText(path)})) return -1;
    const std::unique_ptr<FILE, int (*)(FILE*)> file(fopen(path, "re"), fclose);
    int pid = 0;
    if (!file || fscanf(file.get(), "%d", &pid) != 1) return FakeError(KELDERR_SRC_MISS);
    return pid;
}

KLIBCSzHash* KLIBCSzHashAlloc(int size) {
    if (FakeFails("KLIBCSzHashAlloc", {std::to_string(size)})) return nullptr;
    return new KLIBCSzHash;
}

int KLIBCSzHashSetValue(KLIBCSzHash** hash, const char* key, const char* value) {
    if (FakeFails("KLIBCSzHashSetValue", {FakeText(key), FakeText(value)})) return -1;
    // Another hash each time, as the interface allows: a caller that keeps the old pointer is found
    // out by the sanitizers.
    auto* grown = new KLIBCSzHash(**hash);
    delete *hash;
    grown->pairs[key] = value;
    *hash = grown;
    return 0;
}

const char* KLIBCSzHashGetValue(const KLIBCSzHash* hash, const char* key) {
    const auto found = hash->pairs.find(key);
    return found == hash->pairs.end() ? nullptr : found->second.c_str();
}

void KLIBCSzHashFree(KLIBCSzHash* hash) { delete hash; }

int KELDSysNotifySendNotifiction(const char* tag, const KLIBCSzHash* hash) {
    if (FakeFails("KELDSysNotifySendNotifiction", {FakeText(tag)})) return -1;
    LockedState()->notifications.push_back({tag, hash->pairs});
    return 0;
}

int KELDLnxGetHostname(char* buffer) {
    if (FakeFails("KELDLnxGetHostname")) return -1;
    return FakeFill(LockedState()->hostname, buffer, KELD_HOSTNAME_SIZE)
               ? 0
               : FakeError(KELDERR_SYSTEM);
}

KLIBCSzList* KLIBCSzListAlloc(int size) {
    return FakeFails("KLIBCSzListAlloc", {std::to_string(size)}) ? nullptr : new KLIBCSzList;
}

const char* KLIBCSzListGet(const KLIBCSzList* list, int index) {
    const auto position = static_cast<size_t>(index);
    return index < 0 || position >= list->texts.size() ? nullptr : list->texts[position].c_str();
}

void KLIBCSzListFree(KLIBCSzList* list) { delete list; }

int KLIBServiceIsEnabled(const char* service) {
    return Service("KLIBServiceIsEnabled", FakeText(service));
}

int KELDLDAPIsBinded(void) { return Service("KELDLDAPIsBinded", "ldap"); }

int KELDWinsIsJoined(void) { return Service("KELDWinsIsJoined", "windows"); }

int KELDServiceUserHomeIsEnabled(void) { return Service("KELDServiceUserHomeIsEnabled", "home"); }

int KELDLogSet1(int, int, unsigned code, const char* text1, const char*, const char*, const char*) {
    if (FakeFails("KELDLogSet1", {std::to_string(code), FakeText(text1)})) return -1;
    LockedState()->box_log_codes.push_back(code);
    return 0;
}

}  // extern "C"
