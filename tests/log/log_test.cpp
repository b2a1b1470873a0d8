#include "log/log.h"

#include "support/testutil.h"

#include <QTemporaryDir>

#include <gtest/gtest.h>

#include <thread>
#include <vector>

using namespace Qt::StringLiterals;

namespace {

using testutil::ReadFile;
using testutil::WriteFile;

// The program's first test: the process-wide first-open flag is still fresh.
TEST(Log, FirstOpenOfTheProcessTruncatesEveryLaterOneAppendsAndNoPathIsLogTxt)
{
    QTemporaryDir dir;
    const QString first = dir.filePath(u"first.txt"_s), second = dir.filePath(u"second.txt"_s);
    WriteFile(first, "old first\n");
    WriteFile(second, "old second\n");

    Log a;
    a.SetLogPath(first);
    Log b;
    b.SetLogPath(second);
    a.LogMessage(u"one "_s, false);
    b.LogMessage(u"two\n"_s, false);
    a.LogMessage(u"three\n"_s, false);

    EXPECT_EQ(ReadFile(first), QByteArray("one three\n"));
    EXPECT_EQ(ReadFile(second), QByteArray("old second\ntwo\n"));

    // A new path after the first message appends as well.
    const QString third = dir.filePath(u"third.txt"_s);
    WriteFile(third, "kept\n");
    a.SetLogPath(third);
    a.LogMessage(u"four"_s, false);
    EXPECT_EQ(ReadFile(third), QByteArray("kept\nfour"));

    // An empty path names log.txt in the current folder.
    testutil::CurrentDirectory current(dir.path());
    a.SetLogPath(QString());
    a.LogMessage(u"hello\n"_s, false);
    EXPECT_EQ(ReadFile(dir.filePath(u"log.txt"_s)), QByteArray("hello\n"));
}

TEST(Log, EchoesWhenAskedOrVerboseAndTheFileGetsLatin1WhatTheConsoleGetsWhole)
{
    QTemporaryDir dir;
    Log log;
    log.SetLogPath(dir.filePath(u"l.txt"_s));
    const QString message = u"caf\u00e9 \u0141\u00f3d\u017a"_s;
    testing::internal::CaptureStdout();
    log.LogMessage(u"quiet "_s, false);
    log.LogMessage(message, true);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), message.toStdString() + "\n");
    EXPECT_EQ(ReadFile(dir.filePath(u"l.txt"_s)), QByteArray("quiet caf\xe9 ?\xf3\x64?")); // "?" for what Latin-1 lacks

    log.SetVerbose(true);
    testing::internal::CaptureStdout();
    log.LogMessage(u"loud"_s, false);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "loud\n");

    // An unwritable path loses the file's text, not the echo.
    log.SetVerbose(false);
    log.SetLogPath(u"/nonexistent-folder/for/log.txt"_s);
    testing::internal::CaptureStdout();
    log.LogMessage(u"still here"_s, true);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "still here\n");
}

TEST(Log, ProgressMarksIndentOnlyOnANewLine)
{
    Log log;
    testing::internal::CaptureStdout();
    log.EchoDot(false, 5);
    log.EchoDot(true, 3);
    log.EchoDash(false, 7);
    log.EchoDash(true, 0);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), ".\n   .-\n-");
}

TEST(Log, MessagesFromManyThreadsNeverInterleave)
{
    QTemporaryDir dir;
    const QString path = dir.filePath(u"threads.txt"_s);
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&path, t] {
            Log log;
            log.SetLogPath(path);
            for (int i = 0; i < 50; ++i)
                log.LogMessage(u"thread %1 line %2\n"_s.arg(t).arg(i), false);
        });
    }
    for (std::thread &thread : threads)
        thread.join();
    const QList<QByteArray> lines = ReadFile(path).split('\n');
    EXPECT_EQ(lines.size(), 201); // 200 whole lines and the empty tail
    for (int i = 0; i < 200; ++i)
        EXPECT_TRUE(lines.at(i).startsWith("thread ")) << lines.at(i).constData();
}

} // namespace
