#include "log/log.h"

#include "support/testutil.h"

#include <QDir>
#include <QTemporaryDir>

#include <gtest/gtest.h>

#include <thread>
#include <vector>

namespace {

using testutil::ReadFile;
using testutil::WriteFile;

// CTest runs every test in a process of its own, so the process-wide
// first-open flag is fresh here.
TEST(Log, FirstOpenOfTheProcessTruncatesAndEveryLaterOpenAppends)
{
    QTemporaryDir dir;
    const QString first = dir.filePath(QStringLiteral("first.txt"));
    const QString second = dir.filePath(QStringLiteral("second.txt"));
    WriteFile(first, "old first\n");
    WriteFile(second, "old second\n");

    Log a;
    a.SetLogPath(first);
    Log b;
    b.SetLogPath(second);
    a.LogMessage(QStringLiteral("one "), false);
    b.LogMessage(QStringLiteral("two\n"), false);
    a.LogMessage(QStringLiteral("three\n"), false);

    EXPECT_EQ(ReadFile(first), QByteArray("one three\n"));
    EXPECT_EQ(ReadFile(second), QByteArray("old second\ntwo\n"));

    // A new path after the first message appends as well.
    const QString third = dir.filePath(QStringLiteral("third.txt"));
    WriteFile(third, "kept\n");
    a.SetLogPath(third);
    a.LogMessage(QStringLiteral("four"), false);
    EXPECT_EQ(ReadFile(third), QByteArray("kept\nfour"));
}

TEST(Log, EmptyPathNamesLogTxtInTheCurrentDirectory)
{
    QTemporaryDir dir;
    const QString previous = QDir::currentPath();
    ASSERT_TRUE(QDir::setCurrent(dir.path()));
    {
        Log log;
        log.SetLogPath(QString());
        log.LogMessage(QStringLiteral("hello\n"), false);
    }
    QDir::setCurrent(previous);
    EXPECT_EQ(ReadFile(dir.filePath(QStringLiteral("log.txt"))), QByteArray("hello\n"));
}

TEST(Log, FileGetsLatin1WhileTheConsoleGetsTheWholeText)
{
    QTemporaryDir dir;
    Log log;
    log.SetLogPath(dir.filePath(QStringLiteral("l.txt")));
    const QString message = QStringLiteral("caf\u00e9 \u0141\u00f3d\u017a");
    testing::internal::CaptureStdout();
    log.LogMessage(message, true);
    const std::string console = testing::internal::GetCapturedStdout();
    EXPECT_EQ(console, message.toStdString() + "\n");
    EXPECT_EQ(ReadFile(dir.filePath(QStringLiteral("l.txt"))), message.toLatin1());
    EXPECT_EQ(ReadFile(dir.filePath(QStringLiteral("l.txt"))).at(3), '\xe9');
}

TEST(Log, EchoesOnlyWhenAskedOrVerbose)
{
    QTemporaryDir dir;
    Log log;
    log.SetLogPath(dir.filePath(QStringLiteral("l.txt")));
    testing::internal::CaptureStdout();
    log.LogMessage(QStringLiteral("quiet"), false);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "");

    log.SetVerbose(true);
    testing::internal::CaptureStdout();
    log.LogMessage(QStringLiteral("loud"), false);
    EXPECT_EQ(testing::internal::GetCapturedStdout(), "loud\n");
}

TEST(Log, UnwritablePathLosesTheFileTextButStillEchoes)
{
    Log log;
    log.SetLogPath(QStringLiteral("/nonexistent-folder/for/log.txt"));
    testing::internal::CaptureStdout();
    log.LogMessage(QStringLiteral("still here"), true);
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
    const QString path = dir.filePath(QStringLiteral("threads.txt"));
    std::vector<std::thread> threads;
    for (int t = 0; t < 4; ++t) {
        threads.emplace_back([&path, t] {
            Log log;
            log.SetLogPath(path);
            for (int i = 0; i < 50; ++i)
                log.LogMessage(QStringLiteral("thread %1 line %2\n").arg(t).arg(i), false);
        });
    }
    for (std::thread &thread : threads)
        thread.join();
    const QList<QByteArray> lines = ReadFile(path).split('\n');
    EXPECT_EQ(lines.size(), 201);  // 200 whole lines and the empty tail
    for (int i = 0; i < 200; ++i)
        EXPECT_TRUE(lines.at(i).startsWith("thread ")) << lines.at(i).constData();
}

} // namespace
