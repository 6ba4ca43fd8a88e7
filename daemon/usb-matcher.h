// Says which device row serves a plugged-in device: its own, or that of a default task.
//
// A device at a front port without a row of its own is a candidate for the default task of its
// kind, USB or SD. Candidates are kept while the default task is disabled too: the test is made on
// matching, so that enabling the task takes effect on a device that is already plugged in.
//
// Threads: any. The matcher's mutex is taken before that of TaskDB, which never calls back.
#pragma once

#include <pthread.h>

#include <cstdint>
#include <map>
#include <string>

#include "db/task-info.h"

// A mounted device that qualifies for a default task.
struct MountedUSB {
    uint64_t usb_id = 0;         // the default task's device row; several candidates may share it
    std::string usb_share_path;  // mount path
    std::string dev_path;
    std::string uuid;        // the device's own
    bool is_usb_dev = true;  // false: an SD card
};

enum RegisterResult : int {
    REGISTER_FAILED = -1,
    REGISTER_CANDIDATE = 0,
    REGISTER_HAS_OWN_ROW = 1,
    REGISTER_NOT_QUALIFIED = 2,
};

class USBMatcher {
public:
    // The one instance, made on first use and kept to the end of the process.
    static USBMatcher& GetInstance();

    USBMatcher(const USBMatcher&) = delete;
    USBMatcher& operator=(const USBMatcher&) = delete;

    // Takes note of a mounted device; a RegisterResult. An earlier candidate of this uuid is
    // overwritten.
    [[nodiscard]] int Register(const std::string& usb_share_path, const std::string& dev_path,
                               const std::string& uuid);
    // 1: `usb_info` is the row that serves this uuid; 0: nothing serves it; -1: failure.
    [[nodiscard]] int Match(const std::string& uuid, USBInfo& usb_info);
    // Forgets every candidate with this mount path.
    void UnregisterByPath(const std::string& usb_share_path);
    // Forgets the candidate of this uuid, if any.
    void RemoveByUUID(const std::string& uuid);
    // The mount path of the first candidate, in order of uuid, with this row. 0, or -1 for none.
    [[nodiscard]] int GetMountPath(uint64_t usb_id, std::string& path);
    void Clear();
    // Writes all candidates to the log.
    void Dump();

private:
    USBMatcher() = default;
    ~USBMatcher() = default;
    int MatchCandidate(const std::string& uuid, USBInfo& usb_info);

    pthread_mutex_t m_mutex = PTHREAD_MUTEX_INITIALIZER;
    std::map<std::string, MountedUSB> m_candidates;  // by uuid; guarded by m_mutex
};

// True for a device that a default task may serve: this model has default tasks, the device stands
// at a front port and has one or two partitions. Then `is_usb_dev` tells a USB device from an SD
// card.
[[nodiscard]] bool IsDefaultTaskDevice(const std::string& dev_path, bool& is_usb_dev);
