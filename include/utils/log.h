// The daemon's log: one line of text to syslog, in the form "[TAG] file(line): text".
//
// Threads: every operation may be called from any thread. A line is built once, in a buffer on the
// caller's stack, and sent as one datagram over a connection that stays open. A log daemon that
// hangs holds callers up for at most LOG_STALL_MS; further lines are dropped until it takes lines
// again, and a line then tells how many were lost.
// Texts may hold any bytes; a name is always an argument, never the format.
#pragma once

#include <syslog.h>

#include <cstdint>
#include <string_view>

constexpr int LOG_STALL_MS = 200;

// Opens the connection under this identity (a literal; it is kept by pointer), facility LOG_USER.
// Without it the first line opens the connection.
void LogOpen(const char* identity);
// Closes the connection; the next line opens it again.
void LogClose();

// Takes every line instead of syslog, without the syslog header; nullptr gives them back to syslog.
using LogSink = void (*)(int priority, std::string_view line);
void LogSetSink(LogSink sink);

// While one lives, lines of its thread may be kept back a little and go out together, which costs
// half. All threads' lines keep one order. What is kept goes out when the last batch of the thread
// ends, when it is 64 lines, before a warning or worse, before a line of a thread without a batch,
// and on a crash; so a SIGKILL takes no more than that away.
class LogBatch {
public:
    LogBatch();
    ~LogBatch();
    LogBatch(const LogBatch&) = delete;
    LogBatch& operator=(const LogBatch&) = delete;
};

// Sends what is kept back. For a thread with a batch: before it sleeps.
void LogFlush();

// Use the macros below.
void LogWrite(int priority, const char* format, ...) __attribute__((format(printf, 2, 3)));

#define SLOG_STR2(x) #x
#define SLOG_STR(x) SLOG_STR2(x)
#define SLOG_AT(priority, tag, format, ...) \
    LogWrite(priority,                      \
             tag " " __FILE__ "(" SLOG_STR(__LINE__) "): " format __VA_OPT__(, ) __VA_ARGS__)

#define SLOG_DBG(...) SLOG_AT(LOG_DEBUG, "[DBG]", __VA_ARGS__)
#define SLOG_INFO(...) SLOG_AT(LOG_INFO, "[INFO]", __VA_ARGS__)
#define SLOG_NOTICE(...) SLOG_AT(LOG_NOTICE, "[NOTICE]", __VA_ARGS__)
#define SLOG_WARN(...) SLOG_AT(LOG_WARNING, "[WARN]", __VA_ARGS__)
#define SLOG_ERR(...) SLOG_AT(LOG_ERR, "[ERR]", __VA_ARGS__)
#define SLOG_CRIT(...) SLOG_AT(LOG_CRIT, "[CRIT]", __VA_ARGS__)

// 64-bit arguments for "%llu" and "%lld": uint64_t is another type on each machine.
constexpr unsigned long long Llu(uint64_t value) { return value; }
constexpr long long Lld(int64_t value) { return value; }
