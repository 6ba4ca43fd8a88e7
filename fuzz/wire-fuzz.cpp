// What a client may send: any bytes. Decoding them must end with a value or a refusal, and a value
// that was decoded must survive being sent and decoded again, printed and copied.
#include <cstdint>
#include <cstdlib>
#include <string>

#include "ipc/memory-channel.h"
#include "ipc/pobject.h"
#include "ipc/stream.h"
#include "utils/log.h"

namespace {

int Decode(const std::string& bytes, size_t read_limit, PObject& value) {
    MemoryChannel channel(bytes, 64);  // small rings: fields lie across their ends
    channel.pipe.read_limit = read_limit;
    PStream stream;
    stream.RefuseBinaries();  // each would leave a file behind
    return stream.Recv(channel, value);
}

void Check(bool is_true) {
    if (!is_true) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int* /*argc*/, char*** /*argv*/) {
    LogSetSink([](int, std::string_view) {});
    return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
    const std::string bytes(reinterpret_cast<const char*>(data), size);
    PObject value;
    const int result = Decode(bytes, SIZE_MAX, value);
    Check(result == 0 || result == -2 || result == -5);
    PObject slowly;
    Check(Decode(bytes, 1, slowly) == result);
    Check(slowly.ToText() == value.ToText());
    if (result != 0) return 0;

    MemoryChannel channel;
    PStream stream;
    Check(stream.Send(channel, value) == 0);
    PObject again;
    Check(Decode(channel.pipe.output, SIZE_MAX, again) == 0);
    // Not compared with what was sent: a key loses a leading '_' on its way.
    const PObject copy(again);
    Check(copy.ToText() == again.ToText());
    return 0;
}
