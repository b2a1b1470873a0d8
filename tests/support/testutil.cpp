#include "testutil.h"

#include "common/clock.h"

#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QFileInfo>
#include <QProcess>
#include <QStandardPaths>

#include <gtest/gtest.h>

#include <cstdlib>

namespace testutil {

EnvGuard::~EnvGuard()
{
    for (auto it = m_saved.cbegin(); it != m_saved.cend(); ++it)
        qputenv(it.key().constData(), it.value());
    for (const QByteArray &name : m_absent)
        qunsetenv(name.constData());
}

void EnvGuard::Remember(const char *name)
{
    const QByteArray key(name);
    if (m_saved.contains(key) || m_absent.contains(key))
        return;
    if (qEnvironmentVariableIsSet(name))
        m_saved.insert(key, qgetenv(name));
    else
        m_absent.append(key);
}

void EnvGuard::Set(const char *name, const QString &value)
{
    Remember(name);
    qputenv(name, value.toLocal8Bit());
}

void EnvGuard::Unset(const char *name)
{
    Remember(name);
    qunsetenv(name);
}

void WriteFile(const QString &path, const QByteArray &bytes)
{
    QDir().mkpath(QFileInfo(path).absolutePath());
    QFile file(path);
    ASSERT_TRUE(file.open(QIODevice::WriteOnly | QIODevice::Truncate)) << path.toStdString();
    ASSERT_EQ(file.write(bytes), bytes.size());
}

QByteArray ReadFile(const QString &path)
{
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return QByteArray();
    return file.readAll();
}

QStringList Tree(const QString &folder)
{
    QStringList entries;
    QDirIterator it(folder, QDir::AllEntries | QDir::NoDotAndDotDot | QDir::Hidden | QDir::System,
                    QDirIterator::Subdirectories);
    while (it.hasNext())
        entries.append(QDir(folder).relativeFilePath(it.next()));
    entries.sort();
    return entries;
}

int RunProgram(const QString &program, const QStringList &arguments, QByteArray *output,
               const QString &workingDirectory)
{
    QProcess process;
    process.setProcessChannelMode(QProcess::MergedChannels);
    process.setWorkingDirectory(workingDirectory); // empty: the current one
    process.start(program, arguments);
    if (!process.waitForStarted(30000))
        return -1;
    process.closeWriteChannel();
    process.waitForFinished(300000);
    if (output)
        *output = process.readAll();
    return process.exitStatus() == QProcess::NormalExit ? process.exitCode() : -1;
}

bool HaveProgram(const QString &program)
{
    return !QStandardPaths::findExecutable(program).isEmpty();
}

void ExpectProgramAccepts(const QString &program, const QStringList &arguments)
{
    if (!HaveProgram(program))
        return;
    QByteArray output;
    EXPECT_EQ(RunProgram(program, arguments, &output), 0)
        << program.toStdString() << ' ' << arguments.join(u' ').toStdString() << '\n'
        << output.constData();
}

void ExpectXmllintAccepts(const QString &path, const QString &schema)
{
    QStringList arguments{u"--noout"_s, path};
    if (!schema.isEmpty())
        arguments << u"--schema"_s << DataPath(schema);
    ExpectProgramAccepts(u"xmllint"_s, arguments);
}

QString DataPath(const QString &relative)
{
    return QStringLiteral(HARNESS_TEST_DATA_DIR) + u'/' + relative;
}

void IsolateEnvironment(const QTemporaryDir &root)
{
    qputenv("KESTIX_DATA_ROOT", root.path().toLocal8Bit());
    qputenv("KESTIX_HANDSETS", (root.path() + u"/handsets"_s).toLocal8Bit());
    qputenv("KESTIX_TIME_SCALE", "0");
    for (const char *name :
         {"KESTIX_TOOLSET", "KESTIX_PLATFORMS_ALL", "KESTIX_PLATFORM", "KESTIX_TESTSETS_ALL", "KESTIX_TESTSET"})
        qunsetenv(name);
    Clock::SetScale(0.0);
}

} // namespace testutil
