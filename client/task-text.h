// A task's description, as the daemon gives it, in words.
#pragma once

#include <string>

#include "client/table.h"

class PObject;

// "3 Camera"
[[nodiscard]] std::string TaskLabel(const PObject& task);
// The status, coloured by what it means.
[[nodiscard]] Table::Cell StatusCell(const PObject& task);

// Where a task copies from and to: "usbshare1:/DCIM" on its device ("device:/DCIM" while that is
// not plugged in), "/photos/inbox" in a share.
[[nodiscard]] std::string SourceText(const PObject& task);
[[nodiscard]] std::string DestinationText(const PObject& task);

// Maker and product of its device, as far as they are known: "Maker Stick"; empty for neither.
[[nodiscard]] std::string DeviceText(const PObject& task);

// "version", "mirror", "incremental"; the number for any other.
[[nodiscard]] std::string StrategyText(int strategy);
// "import", "photo import", "export"; the number for any other.
[[nodiscard]] std::string TaskTypeText(int type);
[[nodiscard]] std::string ConflictPolicyText(int policy);
[[nodiscard]] std::string RotationPolicyText(int policy);
