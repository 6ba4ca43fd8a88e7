// Stands between the program and the clocks of the C library. One of each kind at a time.
#pragma once

// The clock that measures how long things take runs ahead, for as long as it lives.
class MonotonicShift {
public:
    MonotonicShift() = default;
    ~MonotonicShift();
    MonotonicShift(const MonotonicShift&) = delete;
    MonotonicShift& operator=(const MonotonicShift&) = delete;
    void Advance(int seconds);
};

// No time can be told as a local one.
class NoLocalTime {
public:
    NoLocalTime();
    ~NoLocalTime();
    NoLocalTime(const NoLocalTime&) = delete;
    NoLocalTime& operator=(const NoLocalTime&) = delete;
};
