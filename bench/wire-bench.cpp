// How fast the answer of "list_task" for 100 tasks is encoded and decoded, through PStream and
// Channel with rings of the daemon's size. The transport is memory, so that the system's copying
// through a socket is left out; WireSocketRoundTrip shows what that adds.
//
// The argument says what becomes of the debug lines: 0: a sink takes each finished line and drops
// it (what the daemon itself pays for a line), 1: they go to the log daemon of this machine, if
// any.
#include <benchmark/benchmark.h>
#include <sys/socket.h>

#include <cstdlib>
#include <string>
#include <thread>

#include "ipc/memory-channel.h"
#include "ipc/pobject.h"
#include "ipc/stream.h"
#include "utils/log.h"

namespace {

constexpr int kTasks = 100;

PObject OneTask(int id) {
    const std::string number = std::to_string(id);
    PObject task;
    task["id"] = id;
    task["type"] = 1;
    task["task_name"] = "Holiday pictures " + number;
    task["copy_strategy"] = 2;
    task["keep_dir_structure"] = true;
    task["smart_create_date_dir"] = false;
    task["rename_photo_video"] = false;
    task["remove_src_file"] = false;
    task["conflict_policy"] = 1;
    task["enable_rotation"] = false;
    task["max_version_count"] = 256U;
    task["rotation_policy"] = 1;
    task["latest_finish_time"] = 1714556400U + static_cast<unsigned>(id);
    task["is_default_task"] = false;
    task["uuid"] = "6fa1c2f0-0d5a-4b0c-9d6e-0123456789" + number;
    task["run_when_plug_in"] = true;
    task["eject_when_task_done"] = false;
    task["producer"] = "A maker of sticks";
    task["product"] = "Stick of 64 GB";
    task["task_status"] = "copying";
    task["is_usb_mounted"] = true;
    task["is_hub_mounted"] = true;
    task["is_task_runnable"] = true;
    task["error_code"] = -19;
    task["source_path"] = "/usbshare" + number + "/DCIM/100CAMERA";
    task["destination_path"] = "/photos/backup/camera/" + number;
    task["usb_share_name"] = "usbshare" + number;
    task["schedule_id"] = -1;
    task["copy_file_path"] = "/volumeUSB1/usbshare/DCIM/100CAMERA/IMG_" + number + ".JPG";
    return task;
}

PObject Answer() {
    PObject answer;
    answer["ack"] = "ok";
    for (int i = 0; i < kTasks; ++i) answer["task_list"].AsArray().push_back(OneTask(i));
    return answer;
}

std::string Encoded(const PObject& value) {
    MemoryChannel channel;
    PStream stream;
    if (stream.Send(channel, value) != 0) std::abort();
    return channel.pipe.output;
}

// Where the debug lines go while this lives.
class Lines {
public:
    explicit Lines(const benchmark::State& state) {
        if (state.range(0) == 0) {
            LogSetSink([](int, std::string_view line) { benchmark::DoNotOptimize(line.data()); });
        }
    }
    ~Lines() { LogSetSink(nullptr); }
    Lines(const Lines&) = delete;
    Lines& operator=(const Lines&) = delete;
};

void CountBytes(benchmark::State& state, size_t size) {
    state.SetBytesProcessed(state.iterations() * static_cast<int64_t>(size));
    state.counters["bytes"] = static_cast<double>(size);
}

void WireEncode(benchmark::State& state) {
    const PObject answer = Answer();
    const size_t size = Encoded(answer).size();
    const Lines lines(state);
    MemoryChannel channel;
    PStream stream;
    for (auto _ : state) {
        channel.pipe.output.clear();
        if (stream.Send(channel, answer) != 0) state.SkipWithError("not sent");
    }
    CountBytes(state, size);
}

void WireDecode(benchmark::State& state) {
    const std::string bytes = Encoded(Answer());
    const Lines lines(state);
    MemoryChannel channel(bytes);
    PStream stream;
    for (auto _ : state) {
        channel.pipe.position = 0;
        PObject value;
        if (stream.Recv(channel, value) != 0) state.SkipWithError("not received");
        benchmark::DoNotOptimize(value);
    }
    CountBytes(state, bytes.size());
}

// Encoded by this thread, carried by a domain socket, decoded by another.
void WireSocketRoundTrip(benchmark::State& state) {
    const PObject answer = Answer();
    const size_t size = Encoded(answer).size();
    const Lines lines(state);
    int ends[2];
    if (socketpair(AF_UNIX, SOCK_STREAM, 0, ends) != 0) std::abort();
    std::thread receiver([descriptor = ends[1]] {
        Channel channel(Channel::DEFAULT_CAPACITY);
        if (channel.Open(descriptor, true) != 0) std::abort();
        PStream stream;
        for (PObject value; stream.Recv(channel, value) == 0;) {
            if (stream.Send(channel, PObject("got it")) != 0) std::abort();
        }
    });
    {
        Channel channel(Channel::DEFAULT_CAPACITY);
        if (channel.Open(ends[0], true) != 0) std::abort();
        PStream stream;
        PObject reply;
        for (auto _ : state) {
            if (stream.Send(channel, answer) != 0 || stream.Recv(channel, reply) != 0) {
                state.SkipWithError("no answer");
            }
        }
    }
    receiver.join();
    CountBytes(state, size);
}

void ValueCopy(benchmark::State& state) {
    const PObject answer = Answer();
    for (auto _ : state) {
        PObject copy(answer);
        benchmark::DoNotOptimize(copy);
    }
    CountBytes(state, Encoded(answer).size());
}

void ValueToText(benchmark::State& state) {
    const PObject answer = Answer();
    for (auto _ : state) benchmark::DoNotOptimize(answer.ToText());
    CountBytes(state, answer.ToText().size());
}

BENCHMARK(WireEncode)->Arg(0)->Arg(1);
BENCHMARK(WireDecode)->Arg(0)->Arg(1);
BENCHMARK(WireSocketRoundTrip)->Arg(0)->Arg(1)->UseRealTime();
BENCHMARK(ValueCopy);
BENCHMARK(ValueToText);

}  // namespace

BENCHMARK_MAIN();
