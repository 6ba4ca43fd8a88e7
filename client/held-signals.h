// Puts off what would end the program (Ctrl-C, a terminal that is closed, a plain kill) while the
// daemon and the box are told of one change in several steps.
//
// Threads: of the calling thread.
#pragma once

#include <csignal>

class HeldSignals {
public:
    HeldSignals() {
        sigset_t held;
        sigemptyset(&held);
        for (const int number : {SIGINT, SIGTERM, SIGHUP}) sigaddset(&held, number);
        pthread_sigmask(SIG_BLOCK, &held, &m_before);
    }
    // What came meanwhile takes effect.
    ~HeldSignals() { pthread_sigmask(SIG_SETMASK, &m_before, nullptr); }
    HeldSignals(const HeldSignals&) = delete;
    HeldSignals& operator=(const HeldSignals&) = delete;

private:
    sigset_t m_before{};
};
