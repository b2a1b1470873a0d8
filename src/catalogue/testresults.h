#pragma once

#include "../common/export.h"

#include <QDateTime>
#include <QList>
#include <QString>

// The verdict of one test case as a log states it.
struct HARNESS_EXPORT TestCaseResult
{
    TestCaseResult() = default;
    // The verdict result of testCase.
    TestCaseResult(const QString &testCase, const QString &result) : testCase(testCase), result(result) { }

    // The test case's name as the log states it.
    QString testCase;
    // "pass", "fail", "unsupported", "unexecuted" (CTF logs: the log's own
    // word, lower-cased).
    QString result;
};

// The parsed content of one module's log.
struct HARNESS_EXPORT TestResults
{
    // The module name as the log states it; empty when the log was not
    // recognised.
    QString manifestName;
    // The module's ID hash as the log states it, when it does.
    QString idHash;
    // The log shows its end marker.
    bool complete = false;
    // When the run took place: the log's own time, else when parsing began.
    QDateTime timeStamp = QDateTime::currentDateTime();
    // The verdicts in log order.
    QList<TestCaseResult> caseResults;
};
