#pragma once

#include <QByteArray>
#include <QDir>
#include <QMap>
#include <QString>
#include <QStringList>
#include <QTemporaryDir>

namespace testutil {

using namespace Qt::StringLiterals;

// Sets environment variables for the lifetime of the object and restores the
// previous values (or their absence) afterwards.
class EnvGuard
{
public:
    EnvGuard() = default;
    EnvGuard(const char *name, const QString &value) { Set(name, value); }
    ~EnvGuard();
    EnvGuard(const EnvGuard &) = delete;
    EnvGuard &operator=(const EnvGuard &) = delete;

    void Set(const char *name, const QString &value);
    void Unset(const char *name);

private:
    void Remember(const char *name);
    QMap<QByteArray, QByteArray> m_saved;
    QList<QByteArray> m_absent;
};

// Changes the current directory for the lifetime of the object.
class CurrentDirectory
{
public:
    explicit CurrentDirectory(const QString &path) : m_previous(QDir::currentPath()) { QDir::setCurrent(path); }
    ~CurrentDirectory() { QDir::setCurrent(m_previous); }
    CurrentDirectory(const CurrentDirectory &) = delete;
    CurrentDirectory &operator=(const CurrentDirectory &) = delete;

private:
    QString m_previous;
};

// Writes bytes to path, creating parent folders; fails the test on error.
void WriteFile(const QString &path, const QByteArray &bytes);
QByteArray ReadFile(const QString &path);

// Every file and folder below a folder, relative, sorted.
QStringList Tree(const QString &folder);

// The moduleName of each module of a list, in its order.
template <typename Modules> QStringList ModuleNames(const Modules &modules)
{
    QStringList names;
    for (const auto &module : modules)
        names.append(module->moduleName);
    return names;
}

// Runs a program to completion; returns its exit code (-1 when it could not
// start). Standard output and error go to output when given.
int RunProgram(const QString &program, const QStringList &arguments, QByteArray *output = nullptr,
               const QString &workingDirectory = QString());

// True when a program of that name is on PATH.
bool HaveProgram(const QString &program);

// When the program is installed, runs it and expects exit status 0; its output is shown on failure.
void ExpectProgramAccepts(const QString &program, const QStringList &arguments);

// xmllint finds the file well formed (and valid against a schema of tests/data when one is named).
void ExpectXmllintAccepts(const QString &path, const QString &schema = QString());

// The folder of data files committed under tests/data.
QString DataPath(const QString &relative);

// Points the library's data root and handset folder into root, makes every wait instant and forgets the platforms, kits
// and tool set the user has, so that a test or benchmark program touches none of the user's folders.
void IsolateEnvironment(const QTemporaryDir &root);

} // namespace testutil

#include <ostream>

// Readable failure messages for Qt strings.
inline void PrintTo(const QString &text, std::ostream *os)
{
    *os << '"' << text.toStdString() << '"';
}
inline void PrintTo(const QByteArray &bytes, std::ostream *os)
{
    *os << '"' << bytes.toStdString() << '"';
}
