#include "platform/log-queue.h"

#include <pthread.h>
#include <sys/uio.h>

#include <atomic>
#include <cstring>

#include "platform/log-connection.h"
#include "utils/mutex-lock.h"

namespace {

constexpr size_t kBytes = size_t{32} * 1024;
constexpr size_t kLines = 64;

struct Lines {
    char bytes[kBytes];
    iovec lines[kLines];
    size_t size;
    std::atomic<size_t> count;
};

Lines g_lines;
// Held while lines are sent, too: that keeps their order.
pthread_mutex_t g_mutex = PTHREAD_MUTEX_INITIALIZER;

// Under g_mutex.
void SendAll() {
    LogConnectionSend(g_lines.lines, g_lines.count);
    g_lines.count = 0;
    g_lines.size = 0;
}

}  // namespace

bool LogQueuePut(const char* line, size_t size) {
    if (size > kBytes) return false;
    const MutexLock lock(g_mutex);
    if (g_lines.count == kLines || g_lines.size + size > kBytes) SendAll();
    char* const place = g_lines.bytes + g_lines.size;
    std::memcpy(place, line, size);
    g_lines.lines[g_lines.count] = {place, size};
    g_lines.size += size;
    ++g_lines.count;
    return true;
}

void LogQueueFlush() {
    if (g_lines.count == 0) return;
    const MutexLock lock(g_mutex);
    if (g_lines.count != 0) SendAll();
}

void LogQueueSendInCrash() {
    const size_t count = g_lines.count.exchange(0);
    LogConnectionSendInCrash(g_lines.lines, count);
}
