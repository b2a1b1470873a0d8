// Parsing of copied handset logs in every module kind's format.

#include "moduletest.h"

#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"

#include <QDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using namespace moduletest;

using LogFiles = moduletest::ModuleFolder;

} // namespace

// Each kind's own format: CTF pairs results with test names in either order, the applet takes the first word of a test
// name and drops "_K" from the suite, OAT maps status words and marks cases without one unexecuted, UT reads the result
// table between its rules and drops the "UT" prefix.
TEST_F(LogFiles, EachKindReadsItsHeaderAndPairsItsVerdicts)
{
    CtfTestModule ctf;
    CtfAppletTestModule applet;
    OatTestModule oat;
    UTTestModule ut;
    const QDateTime time(QDate(2026, 12, 3), QTime(14, 5, 9));
    const QByteArray ctfLog
        = "Suite: A\r\nTime: 2026/12/03 14:05:09\r\nResult: PASS\r\nTest: t1\r\ntest:  t2 with words \r\n"
          "RESULT: Failed\r\nSuite: ignored\r\nManifest Name: B\r\nID Hash: #123\r\n[/verbose]\r\n";
    const QByteArray oatLog
        = "@#OatTimer#\n@Another\nTimeStamp: 14:05:09 12-03-2026\n@1: #t1@\n@2: t2\nStatus: Success\n"
          "@3: t3\nstatus: FAILED\n@4: t4\nStatus: unsupported\n@5: t5\nStatus: error\n@6: t6\n"
          "ID Hash: #9\nTEST RESULT: done\n";
    const QByteArray utLog
        = "SuiteName: UTTimer 14:05:09 03-Dec-2026 extra\nID Hash: #77\n---- results\nt1 PASSED 12 ms\n"
          "t2 FAILED\nt3 Failed 1 ms\nt4 UNSUPPORTED 0 ms\nt5 skipped 0 ms\n----------\nt6 PASSED 1 ms\n"
          "Elapsed Time: 12s\n";
    const QByteArray appletLog
        = "Suite: foo_K\nTime: 2026/12/03 14:05:09\nTest: t1 extra words\nResult: Pass\nTest:\nResult: x\n";
    const Pairs oatVerdicts{
        {"t1", "unexecuted"}, {"t2", "pass"}, {"t3", "fail"}, {"t4", "unsupported"}, {"t5", "unexecuted"}};
    const Pairs utVerdicts{{"t1", "pass"}, {"t3", "fail"}, {"t4", "unsupported"}, {"t5", "unexecuted"}};
    // Module, log file, text; manifest name, ID hash, complete, time stamp, verdicts.
    const std::tuple<_TestModule *, QString, QByteArray, QString, QString, bool, QDateTime, Pairs> rows[]
        = {{&ctf, u"a.LOG"_s, ctfLog, u"B"_s, u"#123"_s, true, time, {{"t1", "pass"}, {"t2 with words", "failed"}}},
           {&applet, u"s.log"_s, appletLog, u"foo"_s, QString(), false, time, {{"t1", "pass"}}},
           {&oat, u"timer_u.OAT"_s, oatLog, u"OatTimer"_s, u"#9"_s, true, time, oatVerdicts},
           {&ut, u"ut.TXT"_s, utLog, u"Timer"_s, u"#77"_s, true, time, utVerdicts}};
    for (const auto &[module, file, text, name, idHash, complete, stamp, verdicts] : rows) {
        SCOPED_TRACE(file.toStdString());
        TestResults results;
        ASSERT_TRUE(module->ParseLog(Write(file, text), results));
        EXPECT_EQ(results.manifestName, name);
        EXPECT_EQ(results.idHash, idHash);
        EXPECT_EQ(results.complete, complete);
        EXPECT_EQ(results.timeStamp, stamp);
        EXPECT_EQ(PairsOf(results), verdicts);
    }
    // The first suite line names the module.
    EXPECT_EQ(ctf.moduleName, u"A"_s);
    EXPECT_EQ(oat.moduleName, u"OatTimer"_s);

    // A stamped manifest name replaces the suite line; a log of another kind
    // is not read; a unit test run without its closing line did not complete.
    TestResults results;
    ASSERT_TRUE(applet.ParseLog(Write(u"m.log"_s, "Suite: foo_k\nManifest Name: foo_k\n"), results));
    EXPECT_EQ(results.manifestName, u"foo_k"_s);
    ASSERT_TRUE(oat.ParseLog(Write(u"a.oat"_s, "@suite\nManifest Name: Timer\n"), results));
    EXPECT_EQ(results.manifestName, u"Timer"_s);
    EXPECT_FALSE(oat.ParseLog(Write(u"a.log"_s, "@suite\n"), results));
    EXPECT_FALSE(ut.ParseLog(Write(u"ut.xml"_s, "<TestRunLog/>"), results));
    TestResults cut;
    ASSERT_TRUE(ut.ParseLog(Write(u"cut.txt"_s, "Kesto unit test run\nSuiteName: UTTimer\n"), cut));
    EXPECT_FALSE(cut.complete);
}

TEST_F(LogFiles, CtfLogWithoutSuiteOrManifestNameIsNotRecognised)
{
    CtfTestModule module;
    TestResults results;
    results.caseResults.append(TestCaseResult(u"old"_s, u"pass"_s));
    EXPECT_FALSE(module.ParseLog(Write(u"x.log"_s, "Test: t1\nResult: pass\n"), results));
    EXPECT_EQ(results.caseResults.size(), 1); // this log's own entry only
    EXPECT_FALSE(module.ParseLog(Write(u"x.txt"_s, "Suite: A\n"), results));
    EXPECT_FALSE(module.ParseLog(dir.filePath(u"missing.log"_s), results));
    ASSERT_TRUE(QDir().mkpath(dir.filePath(u"folder.log"_s)));
    EXPECT_FALSE(module.ParseLog(dir.filePath(u"folder.log"_s), results));
    // A link to an endless device is no log.
    const QString zero = dir.filePath(u"zero.oat"_s);
    if (QFile::link(u"/dev/zero"_s, zero)) {
        OatTestModule oat;
        EXPECT_FALSE(oat.ParseLog(zero, results));
    }
}

TEST_F(LogFiles, LastLineWithoutLineEndIsReadWhole)
{
    CtfTestModule module;
    TestResults results;
    ASSERT_TRUE(module.ParseLog(Write(u"a.log"_s, "Suite: A\r\nTest: t1\nResult: pass"), results));
    EXPECT_EQ(PairsOf(results), (Pairs{{"t1", "pass"}}));
}

TEST_F(LogFiles, BaseParseStopsAtTheFirstRecognisedLogAndSecondaryModulesParseNothing)
{
    CtfTestModule module;
    TestResults results;
    EXPECT_FALSE(module.ParseLog(results));
    EXPECT_TRUE(results.manifestName.isEmpty());
    module.AddDesktopLogFile(Write(u"a.txt"_s, "Suite: wrong kind\n"));
    module.AddDesktopLogFile(Write(u"b.log"_s, "Suite: first\n"));
    module.AddDesktopLogFile(Write(u"c.log"_s, "Suite: second\n"));
    ASSERT_TRUE(module.ParseLog(results));
    EXPECT_EQ(results.manifestName, u"first"_s);

    SecondaryModule secondary;
    secondary.AddDesktopLogFile(Write(u"a.log"_s, "Suite: x\n"));
    EXPECT_FALSE(secondary.ParseLog(results));
}

// Whatever a handset leaves in a log file, the parsers return and keep what they can read.
TEST_F(LogFiles, HostileBytesLeaveEveryParserStanding)
{
    const QByteArray rows[] = {QByteArray(),
                               QByteArray("\0\0Test:\0x\0\n", 12),
                               QByteArray("\xff\xfe\xc3(\x80 Result:\xed\xa0\x80"),
                               QByteArray(3 * 1024 * 1024, 'A'),
                               QByteArray("@:::::\nStatus:\n----\n----\nSuiteName:\n"),
                               QByteArray("\r\r\r\n\n\rTime: 9999/99/99 99:99:99\nTimeStamp: x\n")};
    CtfTestModule ctf;
    CtfAppletTestModule applet;
    OatTestModule oat;
    UTTestModule ut;
    for (const QByteArray &bytes : rows) {
        SCOPED_TRACE(bytes.left(40).toStdString());
        TestResults results;
        const QByteArray named = "Suite: S\nSuiteName: S\n@S\n" + bytes + "\nTest: t\nResult: pass\n";
        EXPECT_TRUE(ctf.ParseLog(Write(u"h.log"_s, named), results));
        EXPECT_EQ(results.caseResults.last().testCase, u"t"_s);
        EXPECT_TRUE(applet.ParseLog(Write(u"h.log"_s, named), results));
        EXPECT_TRUE(oat.ParseLog(Write(u"h.oat"_s, named), results));
        EXPECT_TRUE(ut.ParseLog(Write(u"h.txt"_s, named), results));
        ctf.ParseLog(Write(u"raw.log"_s, bytes), results);
        oat.ParseLog(Write(u"raw.oat"_s, bytes), results);
        ut.ParseLog(Write(u"raw.txt"_s, bytes), results);
    }
}
