#include "log/log.h"

#include <QDir>
#include <QStringList>

#include <iostream>
#include <mutex>

namespace {

// A standard mutex rather than QRecursiveMutex: its locking is visible to
// ThreadSanitizer, which checks the runs on several handsets.
std::recursive_mutex &LogMutex()
{
    static std::recursive_mutex mutex;
    return mutex;
}

// Cleared by the first open of any log file in the process.
bool g_firstOpen = true;

void Echo(bool newLine, unsigned int indent, char mark)
{
    // Handsets run from several threads share the console.
    const std::lock_guard<std::recursive_mutex> locker(LogMutex());
    if (newLine)
        std::cout << std::endl << std::string(indent, ' ');
    std::cout << mark;
}

} // namespace

Log::Log() = default;

Log::~Log()
{
    const std::lock_guard<std::recursive_mutex> locker(LogMutex());
    CloseLog();
}

void Log::SetVerbose(bool verbose)
{
    m_verbose = verbose;
}

void Log::SetEchoPrefix(const QString &prefix)
{
    const std::lock_guard<std::recursive_mutex> locker(LogMutex());
    m_echoPrefix = prefix;
}

void Log::SetLogPath(const QString &path)
{
    const std::lock_guard<std::recursive_mutex> locker(LogMutex());
    CloseLog();
    if (path.isEmpty())
        m_file.setFileName(QDir::currentPath() + QDir::separator() + QLatin1String("log.txt"));
    else
        m_file.setFileName(path);
}

void Log::LogMessage(const QString &message, bool echo)
{
    const std::lock_guard<std::recursive_mutex> locker(LogMutex());
    OpenLog();
    if (m_file.isOpen()) {
        m_file.write(message.toLatin1());
        CloseLog();
    }
    if (!m_verbose && !echo)
        return;
    if (m_echoPrefix.isEmpty()) {
        std::cout << message.toUtf8().constData() << std::endl;
        return;
    }
    QStringList lines = message.split(QLatin1Char('\n'));
    for (QString &line : lines) {
        if (!line.isEmpty())
            line.prepend(m_echoPrefix);
    }
    std::cout << lines.join(QLatin1Char('\n')).toUtf8().constData() << std::endl;
}

void Log::EchoDot(bool newLine, unsigned int indent)
{
    Echo(newLine, indent, '.');
}

void Log::EchoDash(bool newLine, unsigned int indent)
{
    Echo(newLine, indent, '-');
}

void Log::OpenLog()
{
    if (m_file.isOpen() || m_file.fileName().isEmpty())
        return;
    if (g_firstOpen) {
        g_firstOpen = false;
        m_file.open(QIODevice::WriteOnly);
    } else {
        m_file.open(QIODevice::Append);
    }
}

void Log::CloseLog()
{
    if (m_file.isOpen())
        m_file.close();
}
