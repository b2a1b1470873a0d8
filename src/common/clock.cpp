#include "common/clock.h"

#include <QElapsedTimer>
#include <QThread>

#include <atomic>
#include <cstdlib>

namespace Clock {
namespace {

double ReadScale()
{
    const char *value = std::getenv("KESTIX_TIME_SCALE");
    if (!value || !*value)
        return 1.0;
    bool ok = false;
    const double factor = QByteArray(value).trimmed().toDouble(&ok);
    if (!ok || !(factor >= 0.0) || factor > 1e6)
        return 1.0;
    return factor;
}

std::atomic<double> &ScaleValue()
{
    static std::atomic<double> scale(ReadScale());
    return scale;
}

const QElapsedTimer &Monotonic()
{
    static const QElapsedTimer timer = [] {
        QElapsedTimer t;
        t.start();
        return t;
    }();
    return timer;
}

thread_local qint64 t_skipped = 0;

} // namespace

qint64 Now()
{
    return Monotonic().elapsed() + t_skipped;
}

void Sleep(qint64 ms)
{
    if (ms <= 0)
        return;
    const double factor = Scale();
    const qint64 real = static_cast<qint64>(static_cast<double>(ms) * factor);
    if (real > 0)
        QThread::msleep(static_cast<unsigned long>(real));
    t_skipped += ms - real;
}

double Scale()
{
    return ScaleValue().load();
}

void SetScale(double factor)
{
    if (factor >= 0.0)
        ScaleValue().store(factor);
}

} // namespace Clock
