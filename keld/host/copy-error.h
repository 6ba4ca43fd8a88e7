// What an errno means for a copy: the same number says different things on its two sides.
#pragma once

namespace keld_host {

// The KELDERR value for a failure to find, open or read the source.
[[nodiscard]] int CopySourceError(int error);
// The KELDERR value for a failure to reach the destination's folder, to write, or to put in place.
[[nodiscard]] int CopyDestinationError(int error);

}  // namespace keld_host
