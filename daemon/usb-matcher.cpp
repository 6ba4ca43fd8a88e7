#include "daemon/usb-matcher.h"

#include <algorithm>
#include <list>

#include "db/task-db.h"
#include "platform/sdk-device.h"
#include "platform/utility.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

constexpr int FOUND = 1;
constexpr int ABSENT = 0;

// A disk with more partitions than this is not a stick or a card that a default task may copy.
constexpr int MAX_PARTITIONS = 2;

const char* KindName(bool is_usb_dev) { return is_usb_dev ? "USB" : "SDCard"; }

// The device row of the default task for this kind of device. 0 or -1.
int GetDefaultUSBInfo(bool is_usb_dev, USBInfo& usb_info) {
    const char* uuid = is_usb_dev ? DEFAULT_USB_UUID : DEFAULT_SD_UUID;
    if (TaskDB::GetInstance().GetUSBInfoByUUID(uuid, usb_info) == FOUND) return 0;
    SLOG_ERR("Usb info does not exist for uuid  '%s'\n", uuid);
    SLOG_ERR("Failed to get usb info for default task '%s'\n", KindName(is_usb_dev));
    return -1;
}

// True when a task of this device row is enabled.
bool IsAnyTaskEnabled(uint64_t usb_id) {
    std::list<TaskInfo> tasks;
    if (TaskDB::GetInstance().ListTaskInfoByUSB(usb_id, tasks) < 0) return false;
    return std::any_of(tasks.begin(), tasks.end(),
                       [](const TaskInfo& task) { return task.is_enable; });
}

}  // namespace

bool IsDefaultTaskDevice(const std::string& dev_path, bool& is_usb_dev) {
    if (dev_path.empty()) {
        SLOG_ERR("Invalid parameter\n");
        return false;
    }
    if (!IsDeviceSupported()) {
        SLOG_INFO("HUB does NOT support default task\n");
        return false;
    }
    std::string name;
    if (SDK::GetKELDDevName(dev_path, name) < 0) {
        SLOG_ERR("Failed to get keld_dev_name for '%s'\n", dev_path.c_str());
        return false;
    }
    bool is_usb = false;
    if (!SDK::IsFrontPortDevice(name, is_usb)) {
        SLOG_INFO("device '%s' is NOT at front port\n", name.c_str());
        return false;
    }
    const int partitions = SDK::GetPartitionCount(name);
    if (partitions < 1 || partitions > MAX_PARTITIONS) {
        SLOG_INFO("Default Task dose NOT support device '%s' with %d partition\n", name.c_str(),
                  partitions);
        return false;
    }
    SLOG_INFO("device '%s' is at front port and type is '%s'\n", name.c_str(), KindName(is_usb));
    is_usb_dev = is_usb;
    return true;
}

USBMatcher& USBMatcher::GetInstance() {
    static auto* const instance = new USBMatcher;
    return *instance;
}

int USBMatcher::Register(const std::string& usb_share_path, const std::string& dev_path,
                         const std::string& uuid) {
    if (usb_share_path.empty() || dev_path.empty() || uuid.empty()) {
        SLOG_ERR("Invalid parameter\n");
        return REGISTER_FAILED;
    }
    USBInfo usb_info;
    const int row = TaskDB::GetInstance().GetUSBInfoByUUID(uuid, usb_info);
    if (row < 0) {
        SLOG_ERR("Failed to get usb info for uuid '%s'\n", uuid.c_str());
        return REGISTER_FAILED;
    }
    if (row == FOUND) {
        SLOG_INFO("Get matched usb info for '%s'\n", uuid.c_str());
        return REGISTER_HAS_OWN_ROW;
    }
    bool is_usb_dev = true;
    if (!IsDefaultTaskDevice(dev_path, is_usb_dev)) {
        SLOG_INFO("Current device '%s' is NOT default task\n", dev_path.c_str());
        return REGISTER_NOT_QUALIFIED;
    }
    if (GetDefaultUSBInfo(is_usb_dev, usb_info) < 0) return REGISTER_FAILED;
    {
        const MutexLock lock(m_mutex);
        m_candidates[uuid] = {usb_info.id, usb_share_path, dev_path, uuid, is_usb_dev};
    }
    SLOG_INFO("Default task exists for '%s'\n", uuid.c_str());
    return REGISTER_CANDIDATE;
}

int USBMatcher::Match(const std::string& uuid, USBInfo& usb_info) {
    if (uuid.empty()) {
        SLOG_ERR("Invalid parameter\n");
        return -1;
    }
    const int row = TaskDB::GetInstance().GetUSBInfoByUUID(uuid, usb_info);
    if (row < 0) {
        SLOG_ERR("Failed to get usb info for uuid '%s'\n", uuid.c_str());
        return -1;
    }
    if (row == FOUND) {
        SLOG_INFO("Current uuid '%s' match a USER_TASK\n", uuid.c_str());
        return FOUND;
    }
    return MatchCandidate(uuid, usb_info);
}

int USBMatcher::MatchCandidate(const std::string& uuid, USBInfo& usb_info) {
    const MutexLock lock(m_mutex);
    const auto found = m_candidates.find(uuid);
    if (found == m_candidates.end()) {
        SLOG_WARN("uuid '%s' is NOT a candidate default task\n", uuid.c_str());
        return ABSENT;
    }
    const uint64_t usb_id = found->second.usb_id;
    if (TaskDB::GetInstance().GetUSBInfoByID(usb_id, usb_info) != FOUND) {
        SLOG_ERR("Failed to get usb info for usb id '%llu'\n", Llu(usb_id));
        return -1;
    }
    if (!IsAnyTaskEnabled(usb_id)) {
        SLOG_WARN("Default task is NOT enable, usb id '%llu'\n", Llu(usb_id));
        return ABSENT;
    }
    SLOG_INFO("Current uuid '%s' match a DEFAULT_TASK\n", uuid.c_str());
    return FOUND;
}

void USBMatcher::UnregisterByPath(const std::string& usb_share_path) {
    const MutexLock lock(m_mutex);
    std::erase_if(m_candidates, [&](const auto& candidate) {
        return candidate.second.usb_share_path == usb_share_path;
    });
}

void USBMatcher::RemoveByUUID(const std::string& uuid) {
    const MutexLock lock(m_mutex);
    m_candidates.erase(uuid);
}

int USBMatcher::GetMountPath(uint64_t usb_id, std::string& path) {
    const MutexLock lock(m_mutex);
    for (const auto& [uuid, candidate] : m_candidates) {
        if (candidate.usb_id != usb_id) continue;
        path = candidate.usb_share_path;
        return 0;
    }
    SLOG_ERR("No mounted usb for usb_id '%llu'\n", Llu(usb_id));
    return -1;
}

void USBMatcher::Clear() {
    const MutexLock lock(m_mutex);
    m_candidates.clear();
}

void USBMatcher::Dump() {
    const MutexLock lock(m_mutex);
    for (const auto& [uuid, candidate] : m_candidates) {
        SLOG_INFO("candidate '%s': usb_id '%llu', usb_share_path '%s', dev_path '%s', %s\n",
                  uuid.c_str(), Llu(candidate.usb_id), candidate.usb_share_path.c_str(),
                  candidate.dev_path.c_str(), KindName(candidate.is_usb_dev));
    }
}
