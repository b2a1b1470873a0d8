// The results of several hosts' shards merged into one report.

#include "controllertest.h"

#include "controller/moduletimings.h"
#include "controller/resultsmerge.h"

#include <QTimeZone>

namespace {

// A processed-results file of one module "M" (source KVK) whose test cases carry the given verdicts, and a module
// "Idle" that did not run.
QByteArray ResultsFile(const QStringList &verdicts, const QByteArray &kitHash = "#1")
{
    QByteArray text = "<testmodules kvkHash=\"" + kitHash
        + "\" platformHash=\"\">\n"
          " <module family=\"f\" id_hash=\"#9\" name=\"M\" source=\"KVK\" subfamily=\"s\">\n";
    for (qsizetype i = 0; i < verdicts.size(); ++i)
        text += "  <testcase name=\"t" + QByteArray::number(i) + "\" result=\"" + verdicts.at(i).toLatin1() + "\"/>\n";
    return text
        + " </module>\n <module name=\"Idle\" source=\"KVK\" id_hash=\"#8\">\n"
          "  <testcase name=\"t0\" result=\"unexecuted\"/>\n </module>\n</testmodules>\n";
}

TEST(ResultsMergeTest, AModuleRunTwiceKeepsTheVerdictThatWins)
{
    QTemporaryDir dir;
    const QString first = dir.filePath(u"data/Norvane/Targets/My%20Phone/Logs/ProcessedResults/ProcessedResults.xml"_s);
    const QString second = dir.filePath(u"b.xml"_s);
    // The verdict kept of each pair is the stronger one.
    WriteFile(first, ResultsFile({u"pass"_s, u"fail"_s, u"unexecuted"_s}));
    WriteFile(second, ResultsFile({u"fail"_s, u"pass"_s, u"unexecuted"_s}));
    ASSERT_TRUE(ModuleTimings::Record(QFileInfo(second).absolutePath() + u"/Timings.json"_s, u"m"_s, u"KVK"_s,
                                      {5, u"h2"_s, u"lab-2"_s, QDateTime::currentDateTimeUtc()}));

    ResultsMerge merge;
    ASSERT_TRUE(merge.Add(first, QString(), u"lab-1"_s)) << merge.ErrorString().toStdString();
    ASSERT_TRUE(merge.Add(second)) << merge.ErrorString().toStdString();
    merge.Expect({{u"Other"_s, u"PVS"_s, u"g"_s, QString(), {u"x"_s}}, {u"M"_s, u"KVK"_s, QString(), QString(), {}}});
    const QList<ResultsMerge::Row> rows = merge.Rows();
    ASSERT_EQ(rows.size(), 2); // "Idle" ran nowhere and was not expected
    EXPECT_EQ(rows.at(0).name, u"Other"_s);
    EXPECT_FALSE(rows.at(0).ran);
    EXPECT_EQ(rows.at(0).testCases, (QList<QPair<QString, QString>>{{u"x"_s, u"unexecuted"_s}}));
    const ResultsMerge::Row &m = rows.at(1);
    EXPECT_TRUE(m.ran);
    EXPECT_EQ(m.family, u"f"_s);
    EXPECT_EQ(m.handset, u"My Phone, h2"_s);
    EXPECT_EQ(m.host, u"lab-1, lab-2"_s);
    EXPECT_EQ(m.testCases,
              (QList<QPair<QString, QString>>{{u"t0"_s, u"pass"_s}, {u"t1"_s, u"pass"_s}, {u"t2"_s, u"unexecuted"_s}}));
    EXPECT_EQ(merge.NotRun(), QStringList{u"Other"_s});
    EXPECT_EQ(merge.Timings().ExpectedMs(u"M"_s, u"KVK"_s), 5);
}

TEST(ResultsMergeTest, RefusesFilesItCannotMergeAndKeepsWhatItHas)
{
    QTemporaryDir dir;
    const QString good = dir.filePath(u"good.xml"_s);
    WriteFile(good, ResultsFile({u"pass"_s}));
    const QList<QPair<QByteArray, const char *>> rows{
        {"<testmodules><module name=", "is not a processed-results file"},
        {"<manifest/>", "its root is <manifest>"},
        {ResultsFile({u"fail"_s}, "#2"), "another test kit"},
    };
    for (const auto &[bytes, message] : rows) {
        const QString bad = dir.filePath(u"bad.xml"_s);
        WriteFile(bad, bytes);
        ResultsMerge merge;
        ASSERT_TRUE(merge.Add(good));
        EXPECT_FALSE(merge.Add(bad)) << message;
        EXPECT_TRUE(merge.ErrorString().contains(QLatin1String(message))) << merge.ErrorString().toStdString();
        ASSERT_EQ(merge.Rows().size(), 1);
        EXPECT_EQ(merge.Rows().at(0).testCases.at(0).second, u"pass"_s) << message;
    }
    ResultsMerge merge;
    EXPECT_FALSE(merge.Add(dir.filePath(u"missing.xml"_s)));
    WriteFile(dir.filePath(u"Timings.json"_s), "{}");
    EXPECT_FALSE(merge.Add(good)); // a damaged timings file beside it
    EXPECT_TRUE(merge.ErrorString().contains(u"not a timings file"_s));
}

} // namespace
