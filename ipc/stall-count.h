// How long a connection in the making has been silent, counted in waits that timed out.
#pragma once

class StallCount {
public:
    // Seconds; 0 is no limit.
    explicit StallCount(unsigned total) : m_total(total) {}

    // Counts one wait; true when the limit is reached. Peers are used to giving up after 20 waits
    // of a second for a limit of 60, so a wait counts as three.
    [[nodiscard]] bool CountTimeout() {
        m_count += 3;
        return m_total != 0 && m_count >= m_total;
    }
    void Reset() { m_count = 0; }

private:
    unsigned m_total;
    unsigned m_count = 0;
};
