#pragma once

#include "export.h"

#include <QtGlobal>

// Every wait and every elapsed-time measurement of the library goes through
// this clock. KESTIX_TIME_SCALE (a decimal factor, default 1, read once)
// scales the real time a sleep takes, while the clock still advances by the
// full nominal time, so timeouts keep their meaning and a factor of 0 makes a
// whole run instant. The nominal advance is kept per thread, so threads that
// wait independently never shorten each other's timeouts.
namespace Clock {

// Milliseconds on this thread's clock: real monotonic time plus the part of
// every earlier sleep of this thread that the scale factor skipped.
HARNESS_EXPORT qint64 Now();

// Sleeps ms milliseconds of nominal time (ms x scale of real time).
HARNESS_EXPORT void Sleep(qint64 ms);

// The scale factor in force.
HARNESS_EXPORT double Scale();

// Replaces the scale factor read from the environment (tests, tools).
HARNESS_EXPORT void SetScale(double factor);

// Elapsed time measured on the clock.
class HARNESS_EXPORT Timer
{
public:
    Timer() : m_start(Now()) { }
    void Restart() { m_start = Now(); }
    qint64 Elapsed() const { return Now() - m_start; }

private:
    qint64 m_start;
};

} // namespace Clock
