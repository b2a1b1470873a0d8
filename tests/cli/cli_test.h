#pragma once

#include <QByteArray>
#include <QByteArrayView>
#include <QDomDocument>
#include <QMap>
#include <QProcessEnvironment>
#include <QString>
#include <QStringList>

#include <initializer_list>

// Runs the harness tool as a user would.
struct ToolResult
{
    int status = -1;
    QByteArray out, err;
};

// The tool's program file.
QString HarnessProgram();

ToolResult RunTool(const QStringList &arguments,
                   const QProcessEnvironment &environment = QProcessEnvironment::systemEnvironment(),
                   const QString &workingDirectory = QString());

// An argument list from words ("res compile"), whole arguments (paths that may
// hold blanks) and lists: Args("run --junit", junit, "IClock").
struct Args : QStringList
{
    template <typename... Parts> Args(const Parts &...parts) { (Add(parts), ...); }
    void Add(const char *words) { append(QString::fromUtf8(words).split(u' ', Qt::SkipEmptyParts)); }
    void Add(const QString &argument) { append(argument); }
    void Add(const QStringList &arguments) { append(arguments); }
};

// The tool run in the current folder: Tool("res list", path).
template <typename... Parts> ToolResult Tool(const Parts &...parts)
{
    return RunTool(Args(parts...));
}

// Module name -> "[handset ]passed failed unsupported unexecuted" of each row of a summary table.
QMap<QString, QString> Rows(const QByteArray &out);

// The file as a document; fails the test when it does not parse.
QDomDocument ReadXml(const QString &path);

// The standard output of a run; fails the test unless it exited with status 0.
QByteArray OutputOf(const ToolResult &result);

// Fails the test for each part the text lacks (ExpectContains) or holds (ExpectLacks), showing the text.
void ExpectContains(const QByteArray &text, std::initializer_list<QByteArrayView> parts);
void ExpectLacks(const QByteArray &text, std::initializer_list<QByteArrayView> parts);

// Fails the test unless the tool exited with status 2 and wrote one line,
// holding message, to standard error and nothing to standard output.
void ExpectRefused(const ToolResult &result, QByteArrayView message);
