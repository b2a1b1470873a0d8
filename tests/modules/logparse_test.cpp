// Parsing of copied handset logs in every module kind's format.

#include "moduletest.h"

#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"
#include "support/testutil.h"

#include <QDir>
#include <QFileInfo>
#include <QTemporaryDir>

#include <gtest/gtest.h>

namespace {

using moduletest::Pairs;
using moduletest::PairsOf;

class LogFiles : public ::testing::Test
{
protected:
    QString Write(const QString &name, const QByteArray &bytes)
    {
        const QString path = dir.filePath(name);
        testutil::WriteFile(path, bytes);
        return path;
    }
    QTemporaryDir dir;
};

} // namespace

TEST_F(LogFiles, CtfPairsResultsWithTestNamesInEitherOrder)
{
    CtfTestModule module;
    TestResults results;
    const QString path = Write(QStringLiteral("a.LOG"),
        "Suite: A\r\n"
        "Time: 2026/12/03 14:05:09\r\n"
        "Result: PASS\r\n"
        "Test: t1\r\n"
        "test:  t2 with words \r\n"
        "RESULT: Failed\r\n"
        "Suite: ignored\r\n"
        "Manifest Name: B\r\n"
        "ID Hash: #123\r\n"
        "[/verbose]\r\n");
    ASSERT_TRUE(module.ParseLog(path, results));
    EXPECT_EQ(results.manifestName, QStringLiteral("B"));
    EXPECT_EQ(results.idHash, QStringLiteral("#123"));
    EXPECT_TRUE(results.complete);
    EXPECT_EQ(results.timeStamp, QDateTime(QDate(2026, 12, 3), QTime(14, 5, 9)));
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "pass"}, {"t2 with words", "failed"}}));
    EXPECT_EQ(module.moduleName, QStringLiteral("A")); // named by the first suite line
}

TEST_F(LogFiles, CtfLogWithoutSuiteOrManifestNameIsNotRecognised)
{
    CtfTestModule module;
    TestResults results;
    results.caseResults.append(TestCaseResult(QStringLiteral("old"), QStringLiteral("pass")));
    EXPECT_FALSE(module.ParseLog(Write(QStringLiteral("x.log"), "Test: t1\nResult: pass\n"), results));
    EXPECT_EQ(results.caseResults.size(), 1); // this log's own entry only
    EXPECT_FALSE(module.ParseLog(Write(QStringLiteral("x.txt"), "Suite: A\n"), results));
    EXPECT_FALSE(module.ParseLog(dir.filePath(QStringLiteral("missing.log")), results));
    ASSERT_TRUE(QDir().mkpath(dir.filePath(QStringLiteral("folder.log"))));
    EXPECT_FALSE(module.ParseLog(dir.filePath(QStringLiteral("folder.log")), results));
    // A link to an endless device is no log.
    const QString zero = dir.filePath(QStringLiteral("zero.oat"));
    if (QFile::link(QStringLiteral("/dev/zero"), zero)) {
        OatTestModule oat;
        EXPECT_FALSE(oat.ParseLog(zero, results));
    }
}

TEST_F(LogFiles, AppletTakesTheFirstWordAndDropsKFromSuiteNames)
{
    CtfAppletTestModule module;
    TestResults results;
    ASSERT_TRUE(module.ParseLog(Write(QStringLiteral("s.log"),
        "Suite: foo_K\nTest: t1 extra words\nResult: Pass\nTest:\nResult: x\n"), results));
    EXPECT_EQ(results.manifestName, QStringLiteral("foo"));
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "pass"}}));

    ASSERT_TRUE(module.ParseLog(Write(QStringLiteral("m.log"), "Suite: foo_k\nManifest Name: foo_k\n"), results));
    EXPECT_EQ(results.manifestName, QStringLiteral("foo_k"));
}

TEST_F(LogFiles, OatMapsStatusWordsAndMarksUnfinishedCasesUnexecuted)
{
    OatTestModule module;
    TestResults results;
    ASSERT_TRUE(module.ParseLog(Write(QStringLiteral("timer_u.OAT"),
        "@#OatTimer#\n"
        "@Another\n"
        "TimeStamp: 14:05:09 12-03-2026\n"
        "@1: #t1@\n"
        "@2: t2\n"
        "Status: Success\n"
        "@3: t3\n"
        "status: FAILED\n"
        "@4: t4\n"
        "Status: unsupported\n"
        "@5: t5\n"
        "Status: error\n"
        "@6: t6\n"
        "ID Hash: #9\n"
        "TEST RESULT: done\n"), results));
    EXPECT_EQ(results.manifestName, QStringLiteral("OatTimer"));
    EXPECT_EQ(module.moduleName, QStringLiteral("OatTimer"));
    EXPECT_EQ(results.idHash, QStringLiteral("#9"));
    EXPECT_TRUE(results.complete);
    EXPECT_EQ(results.timeStamp, QDateTime(QDate(2026, 12, 3), QTime(14, 5, 9)));
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "unexecuted"}, {"t2", "pass"}, {"t3", "fail"},
                                       {"t4", "unsupported"}, {"t5", "unexecuted"}}));
}

TEST_F(LogFiles, OatStampedManifestNameReplacesTheSuiteLine)
{
    OatTestModule module;
    TestResults results;
    ASSERT_TRUE(module.ParseLog(Write(QStringLiteral("a.oat"), "@suite\nManifest Name: Timer\n"), results));
    EXPECT_EQ(results.manifestName, QStringLiteral("Timer"));
    EXPECT_FALSE(module.ParseLog(Write(QStringLiteral("a.log"), "@suite\n"), results));
}

TEST_F(LogFiles, UtReadsTheResultTableAndDropsTheUtPrefix)
{
    UTTestModule module;
    TestResults results;
    ASSERT_TRUE(module.ParseLog(Write(QStringLiteral("ut.TXT"),
        "SuiteName: UTTimer 14:05:09 03-Dec-2026 extra\n"
        "ID Hash: #77\n"
        "---- results\n"
        "t1 PASSED 12 ms\n"
        "t2 FAILED\n"
        "t3 Failed 1 ms\n"
        "t4 UNSUPPORTED 0 ms\n"
        "t5 skipped 0 ms\n"
        "----------\n"
        "t6 PASSED 1 ms\n"
        "Elapsed Time: 12s\n"), results));
    EXPECT_EQ(results.manifestName, QStringLiteral("Timer"));
    EXPECT_EQ(results.idHash, QStringLiteral("#77"));
    EXPECT_TRUE(results.complete);
    EXPECT_EQ(results.timeStamp, QDateTime(QDate(2026, 12, 3), QTime(14, 5, 9)));
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "pass"}, {"t3", "fail"}, {"t4", "unsupported"}, {"t5", "unexecuted"}}));
    EXPECT_FALSE(module.ParseLog(Write(QStringLiteral("ut.xml"), "<TestRunLog/>"), results));
}

TEST_F(LogFiles, SecondaryModulesParseNothing)
{
    SecondaryModule module;
    TestResults results;
    module.AddDesktopLogFile(Write(QStringLiteral("a.log"), "Suite: x\n"));
    EXPECT_FALSE(module.ParseLog(results));
    EXPECT_FALSE(module.selectable);
}

TEST_F(LogFiles, BaseParseStopsAtTheFirstRecognisedLog)
{
    CtfTestModule module;
    TestResults results;
    EXPECT_FALSE(module.ParseLog(results));
    EXPECT_TRUE(results.manifestName.isEmpty());
    module.AddDesktopLogFile(Write(QStringLiteral("a.txt"), "Suite: wrong kind\n"));
    module.AddDesktopLogFile(Write(QStringLiteral("b.log"), "Suite: first\n"));
    module.AddDesktopLogFile(Write(QStringLiteral("c.log"), "Suite: second\n"));
    ASSERT_TRUE(module.ParseLog(results));
    EXPECT_EQ(results.manifestName, QStringLiteral("first"));
}

// Whatever a handset leaves in a log file, the parsers return and keep what
// they can read.
class HostileLog : public LogFiles, public ::testing::WithParamInterface<QByteArray>
{
};

TEST_P(HostileLog, EveryParserSurvives)
{
    const QByteArray bytes = GetParam();
    CtfTestModule ctf;
    CtfAppletTestModule applet;
    OatTestModule oat;
    UTTestModule ut;
    TestResults results;
    const QByteArray named = "Suite: S\nSuiteName: S\n@S\n" + bytes + "\nTest: t\nResult: pass\n";
    EXPECT_TRUE(ctf.ParseLog(Write(QStringLiteral("h.log"), named), results));
    EXPECT_EQ(results.caseResults.last().testCase, QStringLiteral("t"));
    EXPECT_TRUE(applet.ParseLog(Write(QStringLiteral("h.log"), named), results));
    EXPECT_TRUE(oat.ParseLog(Write(QStringLiteral("h.oat"), named), results));
    EXPECT_TRUE(ut.ParseLog(Write(QStringLiteral("h.txt"), named), results));
    ctf.ParseLog(Write(QStringLiteral("raw.log"), bytes), results);
    oat.ParseLog(Write(QStringLiteral("raw.oat"), bytes), results);
    ut.ParseLog(Write(QStringLiteral("raw.txt"), bytes), results);
}

INSTANTIATE_TEST_SUITE_P(
    Bytes, HostileLog,
    ::testing::Values(QByteArray(), QByteArray("\0\0Test:\0x\0\n", 12), QByteArray("\xff\xfe\xc3(\x80 Result:\xed\xa0\x80"),
                      QByteArray(3 * 1024 * 1024, 'A'), QByteArray("@:::::\nStatus:\n----\n----\nSuiteName:\n"),
                      QByteArray("\r\r\r\n\n\rTime: 9999/99/99 99:99:99\nTimeStamp: x\n")));
