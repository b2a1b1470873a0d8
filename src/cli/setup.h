#pragma once

#include <QCommandLineOption>
#include <QCommandLineParser>
#include <QList>
#include <QSharedPointer>
#include <QString>

#include <iostream>

class Harness;
class Log;
class _TestModule;

// Options that configure the Harness, shared by the commands that use one.
struct SetupOptions
{
    QCommandLineOption kit{
        QStringLiteral("kit"),
        QStringLiteral("Test kit: a path, or part of an installed kit's name (default: KESTIX_TESTSET)."),
        QStringLiteral("K")};
    QCommandLineOption platform{QStringLiteral("platform"),
                                QStringLiteral("Platform: a path, or part of an installed platform's name."),
                                QStringLiteral("P")};
    QCommandLineOption log{QStringLiteral("log"),
                           QStringLiteral("Write the library's log to FILE (default: harness.log in the data folder)."),
                           QStringLiteral("FILE")};
    QCommandLineOption verbose{QStringLiteral("verbose"), QStringLiteral("Echo every log message to the console.")};

    void AddTo(QCommandLineParser &parser) const;
    // The set-up the options and the environment name can be used: the
    // data root is a folder (or can be made one), the kit, platform and tool
    // set exist, the log can be written. False after one line on standard
    // error naming what is wrong.
    bool Check(const QCommandLineParser &parser, const QString &command) const;
    void Apply(const QCommandLineParser &parser, Harness &harness, Log &logger) const;
    QString LogPath(const QCommandLineParser &parser) const;
};

// The module filters of the commands that select modules.
struct SelectionOptions
{
    QCommandLineOption family{QStringLiteral("family"), QStringLiteral("Select modules whose family contains F."),
                              QStringLiteral("F")};
    QCommandLineOption subFamily{QStringLiteral("subfamily"),
                                 QStringLiteral("With --family: and whose sub-family contains S."),
                                 QStringLiteral("S")};
    QCommandLineOption features{
        QStringLiteral("features"),
        QStringLiteral("Select the modules named by a feature list file (not with patterns or --family)."),
        QStringLiteral("FILE")};

    void AddTo(QCommandLineParser &parser) const;
    // The filters alone make sense: --subfamily only with --family, a
    // feature list only on its own and only when the file exists. False
    // after one line on standard error.
    bool Check(const QCommandLineParser &parser, const QString &command) const;
    // The selected modules. Every pattern must match a module of the
    // family asked for, and a feature list or a family alone must select
    // one; false after one line on standard error otherwise. The patterns
    // are the positional arguments unless given.
    bool Select(Harness &harness, const QCommandLineParser &parser, const QString &command,
                QList<QSharedPointer<_TestModule>> &modules, const QStringList *patterns = nullptr) const;
};

// While alive, the library's console echo goes to standard error, so that
// what a command prints on standard output stays machine-readable and the
// library's errors land where errors belong; or nowhere (the log file still
// has every message), while a command checks its set-up and reports a
// failure in one line of its own.
class EchoToStandardError
{
public:
    explicit EchoToStandardError(bool silent = false) : m_saved(std::cout.rdbuf(silent ? nullptr : std::cerr.rdbuf()))
    {
    }
    ~EchoToStandardError()
    {
        std::cout.rdbuf(m_saved);
        std::cout.clear();
    }
    EchoToStandardError(const EchoToStandardError &) = delete;
    EchoToStandardError &operator=(const EchoToStandardError &) = delete;

private:
    std::streambuf *m_saved;
};
