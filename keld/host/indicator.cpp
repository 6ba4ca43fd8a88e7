// The LED by its files in sysfs, the beeper by its input device.
#include <fcntl.h>
#include <keld/indicator.h>
#include <linux/input.h>
#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <string>

#include "host/host-conf.h"
#include "host/host-error.h"
#include "utils/unique-fd.h"

using keld_host::Fail;
using keld_host::FailErrno;

namespace {

struct LedRow {
    int code;
    const char* trigger;
    const char* brightness;  // null: the trigger decides
};

constexpr LedRow kLedRows[] = {
    {KELD_LED_BUSY,        "timer", nullptr},
    {KELD_LED_BUTTON_BUSY, "timer", nullptr},
    {KELD_LED_BUTTON_IDLE, "none",  "1"    },
    {KELD_LED_BUTTON_OFF,  "none",  "0"    },
    {KELD_LED_OFF,         "none",  "0"    },
};

constexpr int TONE_HZ = 1000;
// Long enough to be heard, short enough that nobody waits for it.
constexpr int TONE_MS = 100;

int WriteWord(const std::string& file, const char* word) {
    const UniqueFd fd(open(file.c_str(), O_WRONLY | O_TRUNC | O_CLOEXEC | O_NONBLOCK));
    if (!fd.IsValid()) return FailErrno(errno);
    const ssize_t length = static_cast<ssize_t>(strlen(word));
    return write(fd.Get(), word, strlen(word)) == length ? 0 : FailErrno(errno);
}

int WriteTone(int fd, int hertz) {
    input_event events[2] = {};
    events[0].type = EV_SND;
    events[0].code = SND_TONE;
    events[0].value = hertz;
    events[1].type = EV_SYN;
    events[1].code = SYN_REPORT;
    const ssize_t length = sizeof(events);
    return write(fd, events, sizeof(events)) == length ? 0 : FailErrno(errno);
}

int Beep(const std::string& speaker) {
    const UniqueFd fd(open(speaker.c_str(), O_WRONLY | O_CLOEXEC | O_NONBLOCK));
    if (!fd.IsValid()) return FailErrno(errno);
    if (WriteTone(fd.Get(), TONE_HZ) != 0) return -1;
    poll(nullptr, 0, TONE_MS);
    return WriteTone(fd.Get(), 0);
}

}  // namespace

int KLIBScemdNotify(int code) {
    const std::string led = keld_host::CurrentHostConf()->led;
    for (const LedRow& row : kLedRows) {
        if (row.code != code) continue;
        if (led.empty()) return 0;
        if (WriteWord(led + "/trigger", row.trigger) != 0) return -1;
        return row.brightness == nullptr ? 0 : WriteWord(led + "/brightness", row.brightness);
    }
    return Fail(KELDERR_INVALID_ARGUMENT);
}

int KELDHWExternalControl(int command, int arg1, int arg2) {
    static_cast<void>(arg1);
    static_cast<void>(arg2);
    const std::string speaker = keld_host::CurrentHostConf()->speaker;
    switch (command) {
        case KELD_HW_BEEP:
            return speaker.empty() ? 0 : Beep(speaker);
        // The tone has ended already: a process that dies between two commands must not leave it
        // on.
        case KELD_HW_BEEP_APPLY:
            return 0;
        default:
            return Fail(KELDERR_INVALID_ARGUMENT);
    }
}
