#include "utils/log.h"

#include <signal.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <cstdarg>
#include <cstdio>
#include <cstring>
#include <memory>

#include "platform/log-connection.h"
#include "platform/log-header.h"
#include "platform/log-queue.h"

namespace {

constexpr size_t kStackLine = 2048;  // a usual line has 100 to 300 bytes
static_assert(kStackLine > LOG_HEADER_ROOM);

std::atomic<LogSink> g_sink{nullptr};
thread_local int t_batches = 0;

void Deliver(int priority, char* data, size_t size) {
    if (t_batches > 0 && priority > LOG_WARNING && LogQueuePut(data, size)) return;
    LogQueueFlush();
    const iovec line{data, size};
    LogConnectionSend(&line, 1);
}

void SendQueueInCrash(int number) {
    LogQueueSendInCrash();
    raise(number);  // by now it ends the process, also when it was sent from outside
}

// What is queued tells what led to the crash.
void SendQueueOnCrash() {
    for (const int number : {SIGSEGV, SIGBUS, SIGILL, SIGFPE, SIGABRT}) {
        struct sigaction action {};
        // A handler that is there, of a debugging tool for example, has its reasons.
        if (sigaction(number, nullptr, &action) != 0 || action.sa_handler != SIG_DFL) continue;
        action.sa_handler = SendQueueInCrash;
        action.sa_flags = static_cast<int>(SA_RESETHAND);
        sigaction(number, &action, nullptr);
    }
}

}  // namespace

void LogOpen(const char* identity) {
    SetLogIdentity(identity);
    SendQueueOnCrash();
    LogConnectionOpen();
}

void LogClose() {
    LogQueueFlush();
    LogConnectionClose();
}

void LogSetSink(LogSink sink) { g_sink = sink; }

LogBatch::LogBatch() { ++t_batches; }

LogBatch::~LogBatch() {
    if (--t_batches == 0) LogQueueFlush();
}

void LogFlush() { LogQueueFlush(); }

void LogWrite(int priority, const char* format, ...) {
    const int saved_errno = errno;  // texts are often followed by a look at errno
    char stack_line[kStackLine];
    const LogSink sink = g_sink.load(std::memory_order_relaxed);
    const size_t header = sink != nullptr ? 0 : WriteLogHeader(stack_line, priority);

    va_list arguments;
    va_start(arguments, format);
    const int length =
        vsnprintf(stack_line + header, sizeof(stack_line) - header, format, arguments);
    va_end(arguments);

    const size_t size = header + static_cast<size_t>(std::max(length, 0));
    char* line = stack_line;
    std::unique_ptr<char[]> heap_line;
    if (size >= sizeof(stack_line)) {
        heap_line = std::make_unique<char[]>(size + 1);
        std::memcpy(heap_line.get(), stack_line, header);
        va_start(arguments, format);
        vsnprintf(heap_line.get() + header, size + 1 - header, format, arguments);
        va_end(arguments);
        line = heap_line.get();
    }
    if (sink != nullptr) {
        sink(priority, std::string_view(line, size));
    } else {
        Deliver(priority, line, size);
    }
    errno = saved_errno;
}
