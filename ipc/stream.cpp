#include "ipc/stream.h"

#include <algorithm>
#include <iterator>

#include "ipc/channel.h"
#include "ipc/stream-reader.h"
#include "ipc/stream-writer.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

PStream::~PStream() { pthread_mutex_destroy(&m_mutex); }

int PStream::Send(Channel& channel, const PObject& value) {
    return Finish(Writer(*this, channel).WriteAndFlush(value));
}

int PStream::Recv(Channel& channel, PObject& value) {
    return Finish(Reader(*this, channel).Read(value));
}

void PStream::GetStatus(std::string& error_path, uint64_t& done, uint64_t& total) const {
    const MutexLock lock(m_mutex);
    error_path = ErrorPathLocked();
    done = m_done_bytes;
    total = m_total_bytes;
}

void PStream::PushKey(std::string_view key) {
    const MutexLock lock(m_mutex);
    if (m_key_count == m_error_stack.size()) m_error_stack.emplace_back();
    m_error_stack[m_key_count++].assign(key);
}

void PStream::PopKey() {
    const MutexLock lock(m_mutex);
    --m_key_count;
}

void PStream::SetProgress(uint64_t total, uint64_t done) {
    const MutexLock lock(m_mutex);
    m_total_bytes = total;
    m_done_bytes = done;
}

// The first key stands there twice: the text is known in this form.
std::string PStream::ErrorPathLocked() const {
    if (m_key_count == 0) return {};
    std::string path = m_error_stack.front();
    for (size_t i = 0; i < m_key_count; ++i) path.append(1, '.').append(m_error_stack[i]);
    return path;
}

int PStream::Finish(int result) {
    const MutexLock lock(m_mutex);
    if (result < 0) SLOG_ERR("Error stack: %s\n", ErrorPathLocked().c_str());
    m_error_stack.clear();
    m_key_count = 0;
    m_total_bytes = 0;
    m_done_bytes = 0;
    m_level = 0;
    return result;
}

const char* PStream::Indent() const {
    static constexpr const char* kIndents[] = {
        "",
        "  ",
        "    ",
        "      ",
        "        ",
        "          ",
        "            ",
        "              ",
        "                ",
        "                  ",
        "                    ",
        "                      ",
    };
    return kIndents[std::min<size_t>(m_level, std::size(kIndents) - 1)];
}
