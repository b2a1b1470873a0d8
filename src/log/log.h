#pragma once

#include "../common/export.h"

#include <QFile>
#include <QString>

// The one sink for the library's progress, warning and error messages.
//
// Every message is written to a plain text file (Latin-1, one byte per
// character, nothing added: a message that is to stand on its own line ends
// in "\n") and, when asked or when verbose, echoed to standard output as
// UTF-8 followed by a line end. The file is opened, written and closed for
// each message, under one recursive lock shared by every Log of the process.
// The first message of the process truncates its file; every later open, by
// any Log object, appends. No operation reports failure: an unwritable file
// loses its text, the console echo still happens.
class HARNESS_EXPORT Log
{
public:
    Log();
    ~Log();
    Log(const Log &) = delete;
    Log &operator=(const Log &) = delete;

    // When set, every message is echoed to the console.
    void SetVerbose(bool verbose);
    // Text put before every line of this Log's console echo (not the file),
    // e.g. the handset's name when several handsets share the console.
    void SetEchoPrefix(const QString &prefix);

    // A non-empty path names the log file; an empty one "log.txt" in the
    // current directory. Does not open the file.
    void SetLogPath(const QString &path);

    // Appends message to the log file; with echo (or verbose) prints it too.
    void LogMessage(const QString &message, bool echo);

    // Progress characters on the console while waiting for a handset: with
    // newLine, a line end and `indent` blanks first.
    void EchoDot(bool newLine, unsigned int indent);
    // A "-" as EchoDot writes a ".".
    void EchoDash(bool newLine, unsigned int indent);

private:
    void OpenLog();
    void CloseLog();

    QFile m_file;
    QString m_echoPrefix;
    bool m_verbose = false;
};
