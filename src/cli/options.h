#pragma once

#include <QCommandLineParser>
#include <QStringList>

// Parses a sub-command's arguments with --help added. Returns true when the
// command should go on; otherwise status holds the exit status (0 after
// --help, 2 after a usage error, reported on standard error).
bool ParseArguments(QCommandLineParser &parser, const QStringList &arguments, int &status, int minPositional = 0,
                    int maxPositional = -1);
