// Interrupts the thread that makes it every millisecond, while it lives, but for ten seconds at
// most: a wait that begins anew with each signal ends only after that, and HasBlownOver tells.
#pragma once

#include <gtest/gtest.h>
#include <pthread.h>
#include <signal.h>

#include <atomic>
#include <chrono>
#include <thread>

class SignalStorm {
public:
    SignalStorm() : m_target(pthread_self()) {
        struct sigaction action {};
        action.sa_handler = [](int) {};  // without SA_RESTART; it stays: a signal may be late
        EXPECT_EQ(0, sigaction(SIGUSR1, &action, nullptr));
        m_thread = std::thread([this] { Blow(); });
    }
    ~SignalStorm() {
        m_is_stopped = true;
        m_thread.join();
    }
    SignalStorm(const SignalStorm&) = delete;
    SignalStorm& operator=(const SignalStorm&) = delete;

    [[nodiscard]] bool HasBlownOver() const { return m_has_blown_over; }

private:
    void Blow() {
        using Clock = std::chrono::steady_clock;
        const auto end = Clock::now() + std::chrono::seconds(10);
        while (!m_is_stopped && !m_has_blown_over) {
            pthread_kill(m_target, SIGUSR1);
            std::this_thread::sleep_for(std::chrono::milliseconds(1));
            m_has_blown_over = Clock::now() >= end;
        }
    }

    pthread_t m_target;
    std::atomic<bool> m_is_stopped{false};
    std::atomic<bool> m_has_blown_over{false};
    std::thread m_thread;
};
