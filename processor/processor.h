// Base of the daemon's long-running worker threads: a thread with a status that others set and that
// the worker looks at on the head of its loop and while it waits. No worker is ever cancelled or
// signalled.
//
// Threads: the control operations and the readings may be called from any thread; Start() and
// Join() from the thread that owns the object. The destructor does not join.
#pragma once

#include <pthread.h>

#include <atomic>

enum ProcessorStatus : int {
    PROCESSOR_RUNNING = 0,
    PROCESSOR_PAUSED = 1,
    PROCESSOR_STOPPED = 2,
};

class Processor {
public:
    Processor();
    virtual ~Processor();
    Processor(const Processor&) = delete;
    Processor& operator=(const Processor&) = delete;

    virtual int Init();
    // Waits for the end of the thread. 0, or -1 when none has been started.
    virtual int Join();
    // Sets the status; always 0. A stop is final until the next Start(): a pause or resume that
    // comes from another thread just behind it must not bring the worker back to life.
    virtual int Pause();
    virtual int Resume();
    virtual int Stop();
    virtual int SetAbortFlag(bool is_set);
    // The body of the thread.
    virtual void Run();

    // Makes the thread, with the status running. 0, or -1 when it has been started before and not
    // joined, or cannot be made.
    int Start();
    [[nodiscard]] int GetStatus() const;
    void SetStatus(int status);
    // -1 before Start() and after Join().
    [[nodiscard]] int GetID() const { return m_id.load(); }
    // Sleeps; ends within a tenth of a second when the status is not "running" any more, with -1.
    // 0 when the time is up.
    int Wait(int seconds);

    // For tests: the length of one step of Wait() in place of a tenth of a second, so that the
    // workers' retry times pass quickly. The number of steps stays.
    static void SetWaitStepForTest(unsigned microseconds);

protected:
    // One step of a pause, a tenth of a second: the worker then looks at its barrier and its status
    // again.
    static void SleepOneStep();

private:
    static void* Exec(void* processor);

    static int processor_count;  // the next id to give, under a mutex of its own; never lowered
    static std::atomic<unsigned> s_step_us;

    int m_status = PROCESSOR_STOPPED;  // guarded by m_mutex
    bool m_is_stop_final = false;      // guarded by m_mutex: Stop() was called since Start()
    mutable pthread_mutex_t m_mutex;
    pthread_t m_thread{};
    std::atomic<int> m_id{-1};
};
