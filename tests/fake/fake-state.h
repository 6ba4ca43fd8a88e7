// What stands behind FakeKeld and the platform calls. Only for the sources of the fake.
#pragma once

#include <initializer_list>
#include <mutex>
#include <optional>
#include <string>

#include "fake/fake-keld.h"

struct FakeFailure {
    int error = 0;
    int times = 0;  // FakeKeld::ALWAYS, or what is left
    int skip = 0;
};

struct FakeGroup {
    unsigned gid = 0;
    std::vector<std::string> members;
};

struct FakeState {
    std::vector<FakeCall> calls;
    std::map<std::string, FakeFailure> failures;
    int nth_left = 0;  // 0: no nth call is to fail
    int nth_error = 0;
    bool failed = false;
    std::map<std::string, std::function<void()>> actions;

    std::map<std::string, FakeShare> shares;
    std::map<std::string, FakeDevice> devices;
    std::vector<FakeVolume> volumes;

    std::map<std::string, bool> capabilities;
    std::string hostname = "fakebox";
    std::map<std::string, bool> services;
    bool acl_supported = false;
    std::map<std::string, std::vector<KELDACLEntry>> acls;
    std::map<std::string, int> archive_bits;
    std::vector<FakeUser> users;
    std::map<std::string, FakeGroup> groups;
    std::map<std::string, int> program_results;
    bool programs_are_real = false;

    std::vector<FakeNotification> notifications;
    std::vector<std::string> indexed;
    std::vector<int> led_codes;
    std::vector<int> hardware_commands;
    std::vector<std::string> ejected;
    std::vector<std::vector<std::string>> programs;
    std::vector<std::pair<std::string, std::string>> copies;
    std::vector<std::pair<std::string, std::string>> recycled;
    std::vector<unsigned> box_log_codes;

    std::map<int, FakeSchedEntry> sched;
    int next_sched_id = 1;
};

// The state, locked for as long as the object lives.
class LockedState {
public:
    LockedState();
    FakeState* operator->() const;
    FakeState& operator*() const;

private:
    std::unique_lock<std::mutex> m_lock;
};

// Records a call and runs its action; true when it is to fail, and then the error is set. To be
// called without the lock.
bool FakeFails(const char* name, std::initializer_list<std::string> arguments = {});
// The same for calls that cannot fail.
void FakeRecord(const char* name, std::initializer_list<std::string> arguments = {});

// Sets the error state of this thread; returns -1.
int FakeError(int error, int line = __builtin_LINE());
void FakeClearError();
// The error value that belongs to an errno.
int FakeErrorOf(int system_error);

// A null pointer is an empty text.
inline std::string FakeText(const char* text) { return text == nullptr ? "" : text; }
// Copies with the final NUL; false when there is no room.
bool FakeFill(const std::string& text, char* buffer, size_t size);

// The shares of this moment, those of mounted devices included.
std::vector<FakeShare> FakeAllShares(const FakeState& state);
// The share that holds a path: of several, the one with the longest root.
std::optional<FakeShare> FakeShareOf(const FakeState& state, const std::string& path);
bool FakeIsBelow(const std::string& path, const std::string& root);
// "sdb1" gives "sdb", "loop0p1" and "loop0" give "loop0".
std::string FakeDiskOf(const std::string& partition);
