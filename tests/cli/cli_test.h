#pragma once

#include <QByteArray>
#include <QProcessEnvironment>
#include <QString>
#include <QStringList>

// Runs the harness tool as a user would.
struct ToolResult
{
    int status = -1;
    QByteArray out;
    QByteArray err;
};

ToolResult RunTool(const QStringList &arguments,
                   const QProcessEnvironment &environment = QProcessEnvironment::systemEnvironment(),
                   const QString &workingDirectory = QString());
