// Plugged-in devices: what a device is, where it stands, and whether it is still there.
//
// Threads: any; each operation holds the lock of the layer for its platform call. Failures are
// logged where they happen. Outs are unchanged on failure unless it is said otherwise.
#pragma once

#include <map>
#include <string>

namespace SDK {

// Reads an opaque text that names the very device and file system behind `mount_path` now; it is
// good until the machine restarts. 0, or -1 when nothing answers there.
[[nodiscard]] int GetDeviceIdentity(const std::string& mount_path, std::string& identity);
// True while the device and file system of `identity` still stand behind `mount_path`; false when
// they are gone, when that cannot be told, and for an empty identity. This asks for the device
// itself: the listing of a pulled device can be empty and without an error.
[[nodiscard]] bool IsDevicePresent(const std::string& mount_path, const std::string& identity);

// The device path ("/dev/sdb1") of a mounted volume. 0, or a negative result.
[[nodiscard]] int GetDevPath(const std::string& volume_path, std::string& dev_path);

// The uuid of a device in lower case: the file system's own, or the one of the key file on the
// device. 0, or -1 when there is neither.
[[nodiscard]] int GetUUID(const std::string& usb_share_path, const std::string& dev_path,
                          std::string& uuid);

// The name of the whole device ("sdb") of a device path with or without "/dev/". 0 or -1.
[[nodiscard]] int GetKELDDevName(const std::string& dev_path, std::string& name);

// True for a device at a front port; then `is_usb_dev` tells the USB port (true) from the SD slot.
[[nodiscard]] bool IsFrontPortDevice(const std::string& name, bool& is_usb_dev);

// The number of partitions of a whole device; -1 on failure.
[[nodiscard]] int GetPartitionCount(const std::string& name);

// All mounted removable volumes, from mount path to device path; the map is emptied first.
// 0, or -1 when the platform cannot tell, and the map is empty.
[[nodiscard]] int GetMountedVolumes(std::map<std::string, std::string>& volumes);

// Flushes, unmounts and powers off a whole device ("sdb"). 0, or the platform's other result.
[[nodiscard]] int EjectDevice(const std::string& name);

}  // namespace SDK
