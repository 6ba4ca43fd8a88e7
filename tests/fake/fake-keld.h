// A scripted platform for unit tests: tests say what a call answers and read what was asked.
//
//     FakeKeld& fake = FakeKeld::Reset();                       // an empty box, nothing fails
//     fake.AddShare({.name = "photos", .path = dir / "volume1/photos", .volume = dir / "volume1"});
//     fake.AddDevice({.mount_path = dir / "usb", .dev_path = "/dev/sdb1"});
//     fake.FailCall("KELDFileCopy_r", KELDERR_IO, 2);           // the next two copies fail
//     ... run what is tested ...
//     EXPECT_EQ(3, fake.CallCount("KELDFileCopy_r"));
//
// What works for real: key files (on the disk), copies, recycle bins (on the disk, "#recycle" below
// the share), hashes and lists, the scheduler's store (in memory), the error state of each thread.
// Everything else answers from the records below.
//
// Threads: every operation may be called from any thread; records are handed out as copies. Reset()
// is called while no other thread makes a platform call.
#pragma once

#include <keld/acl.h>
#include <keld/error.h>

#include <functional>
#include <map>
#include <string>
#include <utility>
#include <vector>

struct FakeShare {
    std::string name{};
    std::string path{};
    std::string volume{};  // empty: the folder that holds `path`
    bool recycle_bin = false;
    bool recycle_bin_admin_only = false;
    bool locked = false;
    bool lockable = false;  // of the encrypted kind
    bool read_only_by_replica = false;
    std::map<std::string, int> rights{};  // by user name: 0 none, 1 read, 2 write
};

// A plugged-in device with one mounted file system. While it is mounted it is a share as well.
struct FakeDevice {
    std::string mount_path{};
    std::string dev_path{};  // "/dev/sdb1", or the path of an image file
    std::string disk{};  // "sdb"; empty: what is left of dev_path without "/dev/" and the number
    std::string share_name{};  // empty: the last component of mount_path
    int location = 99;         // 99 front USB port, 98 SD slot, others elsewhere
    int partitions = 1;        // below 0: the disk's layout cannot be read
    std::string identity{};    // empty: made up from mount_path and dev_path
    bool mounted = true;
    bool present = true;  // false: pulled out, but still in the mount table
    bool recycle_bin = false;
};

// A volume of the box. The shares' volumes need not be named.
struct FakeVolume {
    std::string mount_path{};
    bool mounted = true;
    bool writable = true;
    bool internal = true;
};

struct FakeUser {
    std::string name{};
    unsigned uid = 0;
    unsigned gid = 0;
    std::string home{};
    bool expired = false;
    bool admin = false;
};

struct FakeSchedEntry {
    int id = 0;  // 0: not stored yet
    std::string app{}, app_name{}, name{}, action{}, command{};
    int state = 0;
    int can_run_app_same_time = 0;
    int can_run_task_same_time = 0;
    int can_run_from_ui = 0;
    int owner = 0;
    int can_edit_name = 0;
    int can_edit_owner = 0;
    int can_delete_from_ui = 0;
    int listable = 1;
    std::string json{};  // the timetable as it was handed over
};

struct FakeNotification {
    std::string tag;
    std::map<std::string, std::string> variables;
};

// One platform call: its name, and its arguments as texts.
struct FakeCall {
    std::string name;
    std::vector<std::string> arguments;
};

class FakeKeld {
public:
    static constexpr int ALWAYS = -1;
    // In place of an error: the call fails, and the error state tells nothing.
    static constexpr int NO_REASON = -1;

    static FakeKeld& Get();
    // Forgets everything: records, calls, failures.
    static FakeKeld& Reset();

    // --- Failures
    // The next `times` calls of this name fail with `error`, after `skip` calls that do not.
    void FailCall(const std::string& name, int error = KELDERR_SYSTEM, int times = 1, int skip = 0);
    // The nth call from now on (1 is the next), of whatever name, fails. Failed() tells whether
    // that came to pass; calls that cannot fail are not counted.
    void FailNthCall(int nth, int error = KELDERR_SYSTEM);
    [[nodiscard]] bool Failed() const;
    // Runs `action` at the start of every call of this name, on its thread, with no lock held.
    void OnCall(const std::string& name, std::function<void()> action);

    // --- What was asked
    [[nodiscard]] std::vector<FakeCall> Calls() const;
    // The calls of one name, by their arguments.
    [[nodiscard]] std::vector<std::vector<std::string>> CallsOf(const std::string& name) const;
    [[nodiscard]] int CallCount(const std::string& name) const;
    void ForgetCalls();

    // --- Shares; adding one of the same name replaces it
    void AddShare(FakeShare share);
    void RemoveShare(const std::string& name);
    void LockShare(const std::string& name, bool locked = true);

    // --- Devices, by mount path; adding one again replaces it
    void AddDevice(FakeDevice device);
    void Unmount(const std::string& mount_path);  // orderly: no share and no volume any more
    void Pull(const std::string& mount_path);     // gone, but still listed as mounted

    // --- Volumes of the box, in the order in which they are added
    void AddVolume(FakeVolume volume);
    void RemoveVolume(const std::string& mount_path);

    // --- The box
    void SetCapability(const std::string& key, bool has = true);
    void SetHostname(const std::string& name);
    void SetService(const std::string& name, bool on);  // also "ldap", "windows" and "home"
    void SetAclSupported(bool supported);
    [[nodiscard]] std::vector<KELDACLEntry> Acl(const std::string& path) const;
    [[nodiscard]] std::map<std::string, int> ArchiveBits() const;
    void AddUser(FakeUser user);
    void AddGroup(const std::string& name, unsigned gid, std::vector<std::string> members);
    // What a program gives back when it is run; 0 for one that is not named.
    void SetProgramResult(const std::string& program, int result);

    // From now on programs are run, not only noted: those that need no environment of their own.
    void RunProgramsForReal();

    // --- What was done
    [[nodiscard]] std::vector<FakeNotification> Notifications() const;
    [[nodiscard]] std::vector<std::string> Indexed() const;
    [[nodiscard]] std::vector<int> LedCodes() const;
    [[nodiscard]] std::vector<int> HardwareCommands() const;
    [[nodiscard]] std::vector<std::string> Ejected() const;
    [[nodiscard]] std::vector<std::vector<std::string>> Programs() const;
    // Copies that were made, from and to.
    [[nodiscard]] std::vector<std::pair<std::string, std::string>> Copies() const;
    // What went to a recycle bin, share path and relative path.
    [[nodiscard]] std::vector<std::pair<std::string, std::string>> Recycled() const;
    [[nodiscard]] std::vector<unsigned> BoxLogCodes() const;

    // --- The scheduler's store, by id
    [[nodiscard]] std::map<int, FakeSchedEntry> SchedEntries() const;
    // Stores an entry under its id, or under the next one when it is 0; returns the id.
    int AddSchedEntry(FakeSchedEntry entry);

private:
    FakeKeld() = default;
};
