// The content of a binary between a file and a Channel, in blocks: for PStream alone. What stands
// before the content on the wire, tag and length, is PStream's affair.
//
// Results: 0; ERR_IO when the channel failed; else as told at each operation.
#pragma once

#include <cstdint>
#include <functional>
#include <string>

#include "ipc/pobject.h"
#include "ipc/tmp-name-gen.h"
#include "utils/unique-fd.h"

class Channel;

// Bytes of a block: as much as one write of a channel takes, at the daemon's capacity.
constexpr size_t kBinaryBlock = 81920;
// Transfers tell the log each time so many bytes are through.
constexpr uint64_t kBinaryLogStep = 104857600;

// Is told the length of a binary, and how many bytes of it are through.
using BinaryProgress = std::function<void(uint64_t total, uint64_t done)>;

// Sends the stretch of the file that `record` names. -1: no memory, or the file cannot be read; -5:
// the file ended early, and fewer bytes than announced are sent.
[[nodiscard]] int SendBinary(Channel& channel, const PObject::binary_type& record,
                             const BinaryProgress& progress);

// Receives one binary.
class BinaryReceiver {
public:
    // A record without a path gets a new file in `directory`, of a name from `names`.
    BinaryReceiver(Channel& channel, TmpNameGen& names, const std::string& directory,
                   BinaryProgress progress);

    // Stores `length` bytes as `record` says: over the file when its offset is 0, else from the
    // offset on, where the file is cut off. Afterwards, whatever the result, offset and length of
    // the record both tell where the content stored ends. ERR_INVALID_ARGUMENT: the disk is full;
    // -1: no memory, no name, the file cannot be written, or it ends before the offset.
    [[nodiscard]] int Receive(uint64_t length, PObject::binary_type& record);

private:
    [[nodiscard]] int OpenNew(std::string& path);
    [[nodiscard]] int OpenNamed(const PObject::binary_type& record);
    [[nodiscard]] int Store(uint64_t length, const std::string& path);
    [[nodiscard]] int WriteBlock(const uint8_t* block, size_t length);

    Channel& m_channel;
    TmpNameGen& m_names;
    const std::string& m_directory;
    BinaryProgress m_progress;
    UniqueFd m_file;
    uint64_t m_done = 0;  // bytes in the file
};
