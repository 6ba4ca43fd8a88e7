// The live entry of a device that is mounted now.
#pragma once

#include <cstdint>
#include <string>

struct USBRunInfo {
    uint64_t usb_id = 0;
    std::string usb_share_path;  // mount path of the device's share
    std::string uuid;
    bool run_when_plug_in = false;
    bool eject_when_task_done = true;
};
