#include "client/log-to-stderr.h"

#include <syslog.h>

#include <cstdio>
#include <string>

#include "client/text.h"
#include "utils/log.h"

namespace {

const char* program_name = "";

void Write(int priority, std::string_view line) {
    while (!line.empty() && line.back() == '\n') line.remove_suffix(1);
    // The daemon's libraries write lines for the daemon's whole life; a program that runs for a
    // moment keeps to what matters.
    if (priority <= LOG_NOTICE) {
        syslog(LOG_USER | priority, "%.*s", static_cast<int>(line.size()), line.data());
    }
    // What goes wrong on the way to the daemon is told by who asked it.
    if (priority > LOG_ERR || line.find("] ipc/") != std::string_view::npos) return;
    // "[ERR] file.cpp(12): text": the person wants the text.
    const size_t text = line.find("): ");
    if (text != std::string_view::npos) line.remove_prefix(text + 3);
    fprintf(stderr, "%s: %s\n", program_name, Printable(line).c_str());
}

}  // namespace

void ErrorsToStderr(const char* program) {
    program_name = program;
    openlog(program, LOG_NDELAY, LOG_USER);
    LogSetSink(Write);
}
