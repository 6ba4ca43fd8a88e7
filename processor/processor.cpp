#include "processor/processor.h"

#include <unistd.h>

#include "utils/confined-path.h"
#include "utils/log.h"
#include "utils/mutex-lock.h"

namespace {

constexpr unsigned kStepUs = 100000;
constexpr int kStepsPerSecond = 10;

pthread_mutex_t g_count_mutex = PTHREAD_MUTEX_INITIALIZER;

}  // namespace

int Processor::processor_count = 0;
std::atomic<unsigned> Processor::s_step_us{kStepUs};

Processor::Processor() { pthread_mutex_init(&m_mutex, nullptr); }

Processor::~Processor() {
    SetStatus(PROCESSOR_STOPPED);
    pthread_mutex_destroy(&m_mutex);
}

int Processor::Init() { return 0; }

int Processor::Join() {
    if (m_id.load() < 0) return -1;
    if (pthread_join(m_thread, nullptr) < 0) return -1;
    m_id = -1;
    return 0;
}

int Processor::Pause() {
    const MutexLock lock(m_mutex);
    if (!m_is_stop_final) m_status = PROCESSOR_PAUSED;
    return 0;
}

int Processor::Resume() {
    const MutexLock lock(m_mutex);
    if (!m_is_stop_final) m_status = PROCESSOR_RUNNING;
    return 0;
}

int Processor::Stop() {
    const MutexLock lock(m_mutex);
    m_status = PROCESSOR_STOPPED;
    m_is_stop_final = true;
    return 0;
}

int Processor::SetAbortFlag(bool) { return 0; }

void Processor::Run() {}

int Processor::Start() {
    const MutexLock lock(m_mutex);
    if (m_id.load() >= 0) return -1;
    m_status = PROCESSOR_RUNNING;
    m_is_stop_final = false;
    if (pthread_create(&m_thread, nullptr, &Processor::Exec, this) != 0) {
        m_status = PROCESSOR_STOPPED;
        return -1;
    }
    const MutexLock count_lock(g_count_mutex);
    m_id = processor_count++;
    return 0;
}

int Processor::GetStatus() const {
    const MutexLock lock(m_mutex);
    return m_status;
}

void Processor::SetStatus(int status) {
    const MutexLock lock(m_mutex);
    m_status = status;
}

int Processor::Wait(int seconds) {
    for (int step = 0; step < seconds * kStepsPerSecond; ++step) {
        if (GetStatus() != PROCESSOR_RUNNING) return -1;
        SleepOneStep();
    }
    return 0;
}

void Processor::SetWaitStepForTest(unsigned microseconds) { s_step_us = microseconds; }

void Processor::SleepOneStep() {
    // Nothing of what is kept for speed outlasts the work.
    LogFlush();
    PathPlaceScope::CloseKept();
    usleep(s_step_us.load());
}

void* Processor::Exec(void* processor) {
    auto* const self = static_cast<Processor*>(processor);
    {
        // Start() holds it until the id is given, which the worker's log lines are to show.
        const MutexLock lock(self->m_mutex);
    }
    self->Run();
    self->SetStatus(PROCESSOR_STOPPED);
    pthread_exit(nullptr);
}
