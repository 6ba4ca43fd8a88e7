// The end of a wait that signals or small steps cut in pieces. The clock is one that setting the
// time of day does not move.
#pragma once

#include <sys/time.h>

#include <algorithm>
#include <chrono>

class Deadline {
public:
    explicit Deadline(const timeval& timeout)
        : m_end(Clock::now() + std::chrono::seconds(timeout.tv_sec) +
                std::chrono::microseconds(timeout.tv_usec)) {}

    // What is left; zero when it is over.
    [[nodiscard]] timeval Left() const {
        using std::chrono::microseconds;
        const auto left = std::chrono::ceil<microseconds>(m_end - Clock::now()).count();
        const auto rest = std::max<microseconds::rep>(left, 0);
        return {static_cast<time_t>(rest / 1000000), static_cast<suseconds_t>(rest % 1000000)};
    }
    [[nodiscard]] bool IsOver() const { return Clock::now() >= m_end; }

private:
    using Clock = std::chrono::steady_clock;
    Clock::time_point m_end;
};
