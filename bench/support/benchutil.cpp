#include "support/benchutil.h"

#include <QCoreApplication>
#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QMap>
#include <QProcess>
#include <QTemporaryDir>

#include <sys/resource.h>

#include <memory>

namespace benchutil {

namespace {

QMap<QString, ChildFunction> &Children()
{
    static QMap<QString, ChildFunction> children;
    return children;
}

} // namespace

bool RegisterChild(const QString &name, ChildFunction function)
{
    Children().insert(name, std::move(function));
    return true;
}

bool RunChildMode(int argc, char **argv, int *status)
{
    if (argc < 3 || QByteArray(argv[1]) != "--child")
        return false;
    const QString name = QString::fromLocal8Bit(argv[2]);
    QStringList arguments;
    for (int i = 3; i < argc; ++i)
        arguments << QString::fromLocal8Bit(argv[i]);
    auto it = Children().constFind(name);
    *status = it == Children().constEnd() ? 2 : (*it)(arguments);
    return true;
}

QByteArray RunChild(const QString &name, const QStringList &arguments, QString *error)
{
    QProcess process;
    process.setProcessChannelMode(QProcess::ForwardedErrorChannel);
    process.start(QCoreApplication::applicationFilePath(), QStringList{QStringLiteral("--child"), name} + arguments);
    if (!process.waitForStarted() || !process.waitForFinished(-1)) {
        *error = process.errorString();
        return QByteArray();
    }
    if (process.exitStatus() != QProcess::NormalExit || process.exitCode() != 0) {
        *error = QStringLiteral("child %1 failed with status %2").arg(name).arg(process.exitCode());
        return QByteArray();
    }
    return process.readAllStandardOutput();
}

long PeakRssKiB()
{
    // VmHWM belongs to this program alone; ru_maxrss would also count what
    // the parent held when it started this process (Linux keeps it across
    // fork and exec).
    QFile status(QStringLiteral("/proc/self/status"));
    if (status.open(QIODevice::ReadOnly)) {
        for (const QByteArray &line : status.readAll().split('\n')) {
            if (line.startsWith("VmHWM:"))
                return line.mid(6).trimmed().split(' ').value(0).toLong();
        }
    }
    struct rusage usage
    {
    };
    if (getrusage(RUSAGE_SELF, &usage) != 0)
        return -1;
    return usage.ru_maxrss;
}

qint64 ReadTree(const QString &root)
{
    qint64 total = 0;
    QDirIterator it(root, QDir::Files | QDir::NoDotAndDotDot | QDir::Hidden, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        QFile file(it.next());
        if (file.open(QIODevice::ReadOnly))
            total += file.readAll().size();
    }
    return total;
}

QString WorkFolder()
{
    static const QString folder = [] {
        const QString given = qEnvironmentVariable("HARNESS_BENCH_WORK");
        if (!given.isEmpty()) {
            QDir().mkpath(given);
            return QDir(given).absolutePath();
        }
        static QTemporaryDir temporary;
        return temporary.path();
    }();
    return folder;
}

void SetMinTime(benchmark::internal::Benchmark *benchmark, double seconds)
{
    bool ok = false;
    const double given = qEnvironmentVariable("HARNESS_BENCH_MIN_TIME").toDouble(&ok);
    if (ok && given <= 0)
        benchmark->Iterations(1);
    else
        benchmark->MinTime(ok ? given : seconds);
}

} // namespace benchutil
