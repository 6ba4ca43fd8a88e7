// Names of temporary files beside a destination, and what a crash left of them.
//
// ".ferrix-tmp-PID-BOOT-RANDOM": the process, eight digits of the boot's id, sixteen random digits.
// Not made from the final name, which may be as long as the file system allows.
// Threads: any.
#pragma once

#include <string>
#include <string_view>

namespace keld_host {

// A name that was not given before. It counts as in use until it is given back.
[[nodiscard]] std::string TakeCopyTempName();
// The name is no longer that of a file, or nobody will see to the file any more: the device was
// pulled out, say. Then the folder is swept again when it comes back.
void GiveBackCopyTempName(const std::string& name, bool is_file_left);

// True for a name of the form above that is not in use: its process no longer runs, or gave it
// back.
[[nodiscard]] bool IsCopyLeftover(std::string_view name);

// Removes the leftovers of crashed copies in an open folder (O_PATH will do): once for each folder
// in the life of this process, further calls for it do nothing. A device that is plugged in anew
// has new folders. Failures are left to the next run.
void SweepCopyLeftovers(int dir_fd);

}  // namespace keld_host
