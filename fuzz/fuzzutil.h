#pragma once

// Helpers shared by the fuzz targets.

#include <QByteArray>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QString>
#include <QTemporaryDir>

#include <cstddef>
#include <cstdint>
#include <cstdlib>

namespace fuzzutil {

// Stops the run with a crash report when an invariant does not hold.
inline void Check(bool condition)
{
    if (!condition)
        __builtin_trap();
}

inline QByteArray Bytes(const uint8_t *data, size_t size)
{
    return QByteArray(reinterpret_cast<const char *>(data), qsizetype(size));
}

// The folder for the files of one target, kept for the whole run: the
// folder FUZZ_SCRATCH names (kept afterwards, to look at what a target
// wrote, or to make seeds from it), else a temporary one in memory
// (/dev/shm) where there is one, since the library syncs the files it writes
// atomically and a disk would make every execution wait for that.
inline QString Scratch()
{
    static const QString path = [] {
        const QString chosen = qEnvironmentVariable("FUZZ_SCRATCH");
        if (!chosen.isEmpty()) {
            if (!QDir().mkpath(chosen))
                abort();
            return QDir(chosen).absolutePath();
        }
        const QString shm = QStringLiteral("/dev/shm");
        const QString base = QFileInfo(shm).isDir() && QFileInfo(shm).isWritable() ? shm : QDir::tempPath();
        static QTemporaryDir folder(base + QStringLiteral("/harness-fuzz-XXXXXX"));
        if (!folder.isValid())
            abort();
        return folder.path();
    }();
    return path;
}

inline QString ScratchPath(const QString &name)
{
    return Scratch() + QLatin1Char('/') + name;
}

// Writes bytes to path; a failure is the harness's own and ends the run.
inline void WriteBytes(const QString &path, const QByteArray &bytes)
{
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly | QIODevice::Truncate) || file.write(bytes) != bytes.size())
        abort();
}

inline QByteArray ReadBytes(const QString &path)
{
    QFile file(path);
    return file.open(QIODevice::ReadOnly) ? file.readAll() : QByteArray();
}

} // namespace fuzzutil
