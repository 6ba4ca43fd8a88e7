#include "client/plugged-device.h"

#include <fstream>
#include <map>

#include "client/exit-status.h"
#include "client/text.h"
#include "platform/sdk-device.h"
#include "utils/path-util.h"

namespace {

// The first line of a file of the kernel, without the blanks that pad it.
std::string KernelText(const std::string& path) {
    std::string line;
    std::ifstream file(path);
    std::getline(file, line);
    const size_t end = line.find_last_not_of(' ');
    return end == std::string::npos ? "" : line.substr(0, end + 1);
}

}  // namespace

std::vector<PluggedDevice> ListPluggedDevices() {
    std::map<std::string, std::string> volumes;
    if (SDK::GetMountedVolumes(volumes) < 0) {
        throw CommandError(EXIT_REFUSED, "the plugged-in devices cannot be listed");
    }
    std::vector<PluggedDevice> devices;
    for (const auto& [mount_path, device_path] : volumes) {
        PluggedDevice device{mount_path, device_path, ""};
        (void)!SDK::GetUUID(mount_path, device_path, device.uuid);
        devices.push_back(std::move(device));
    }
    return devices;
}

PluggedDevice FindPluggedDevice(const std::string& path) {
    const std::vector<PluggedDevice> devices = ListPluggedDevices();
    if (path.empty() && devices.size() == 1) return devices.front();
    if (path.empty()) {
        throw CommandError(EXIT_USAGE, devices.empty()
                                           ? "no device is plugged in and mounted"
                                           : "several devices are plugged in: say which with "
                                             "--device (\"ferrixctl device list\" shows them)");
    }
    const std::string wanted = PathWithoutTrailingSlashes(path);
    for (const PluggedDevice& device : devices) {
        if (device.mount_path == wanted || device.device_path == wanted) return device;
    }
    throw CommandError(EXIT_USAGE, "no plugged-in device is mounted on " + Printable(wanted) +
                                       "; \"ferrixctl device list\" shows what there is");
}

DeviceMake ReadDeviceMake(const PluggedDevice& device) {
    std::string disk;
    if (SDK::GetKELDDevName(device.device_path, disk) < 0) return {};
    const std::string folder = "/sys/class/block/" + disk + "/device/";
    const std::string card = KernelText(folder + "name");  // of an SD card, which has no model
    return {KernelText(folder + "vendor"), card.empty() ? KernelText(folder + "model") : card};
}
