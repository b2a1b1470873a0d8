#include "cli_test.h"

#include "support/testutil.h"

#include <QDomDocument>
#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QRegularExpression>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

const char kResults[] = "<testmodules kvkHash=\"#1\" platformHash=\"\">\n"
                        " <module family=\"media\" id_hash=\"#5\" name=\"audio\" source=\"KVK\" subfamily=\"mp3\">\n"
                        "  <testcase name=\"play\" result=\"pass\"/>\n"
                        "  <testcase name=\"seek\" result=\"fail\"/>\n"
                        "  <testcase name=\"loop &amp; stop\" result=\"unsupported\"/>\n"
                        "  <testcase name=\"eject\" result=\"unexecuted\"/>\n"
                        " </module>\n"
                        " <module family=\"net\" id_hash=\"#6\" name=\"socket\" source=\"PVS\" subfamily=\"\">\n"
                        "  <testcase name=\"open\" result=\"unexecuted\"/>\n"
                        " </module>\n"
                        "</testmodules>\n";

class ReportTool : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(dir.isValid());
        results = dir.filePath(u"ProcessedResults.xml"_s);
        testutil::WriteFile(results, kResults);
    }
    QTemporaryDir dir;
    QString results;
};

TEST_F(ReportTool, SummarisesExecutedModulesAndFailsWhenATestCaseFailed)
{
    const ToolResult r = RunTool({u"report"_s, results});
    EXPECT_EQ(r.status, 1) << r.err.constData();
    const QString out = QString::fromUtf8(r.out);
    EXPECT_TRUE(out.contains(QRegularExpression(u"audio\\s+1\\s+1\\s+1\\s+1\\n"_s))) << r.out.constData();
    EXPECT_FALSE(out.contains(u"socket"_s));
    EXPECT_TRUE(out.contains(QRegularExpression(u"Total \\(1 module\\)\\s+1\\s+1\\s+1\\s+1"_s)));

    const ToolResult all = RunTool({u"report"_s, u"--all"_s, results});
    EXPECT_TRUE(all.out.contains("socket"));
}

TEST_F(ReportTool, JUnitReportReadsBackAndIsWellFormed)
{
    const QString junit = dir.filePath(u"junit.xml"_s);
    const ToolResult r = RunTool({u"report"_s, u"--all"_s, u"--junit"_s, junit, results});
    ASSERT_EQ(r.status, 1) << r.err.constData();

    QDomDocument doc;
    ASSERT_TRUE(doc.setContent(testutil::ReadFile(junit)));
    const QDomElement suites = doc.documentElement();
    EXPECT_EQ(suites.tagName(), u"testsuites"_s);
    EXPECT_EQ(suites.attribute(u"tests"_s), u"5"_s);
    EXPECT_EQ(suites.attribute(u"failures"_s), u"1"_s);
    const QDomNodeList suiteList = suites.elementsByTagName(u"testsuite"_s);
    ASSERT_EQ(suiteList.size(), 2);
    const QDomElement audio = suiteList.at(0).toElement();
    EXPECT_EQ(audio.attribute(u"name"_s), u"audio"_s);
    EXPECT_EQ(audio.attribute(u"skipped"_s), u"2"_s);
    const QDomNodeList cases = audio.elementsByTagName(u"testcase"_s);
    ASSERT_EQ(cases.size(), 4);
    EXPECT_TRUE(cases.at(0).firstChildElement().isNull());
    EXPECT_EQ(cases.at(1).firstChildElement().tagName(), u"failure"_s);
    EXPECT_EQ(cases.at(2).toElement().attribute(u"name"_s), u"loop & stop"_s);
    EXPECT_EQ(cases.at(2).firstChildElement().tagName(), u"skipped"_s);
    EXPECT_EQ(cases.at(2).firstChildElement().attribute(u"message"_s), u"unsupported"_s);
    EXPECT_EQ(cases.at(3).firstChildElement().attribute(u"message"_s), u"unexecuted"_s);

    if (testutil::HaveProgram(u"xmllint"_s)) {
        QByteArray lint;
        EXPECT_EQ(testutil::RunProgram(u"xmllint"_s, {u"--noout"_s, junit}, &lint), 0) << lint.constData();
    }
}

TEST_F(ReportTool, JsonSummaryCarriesCountsAndTotals)
{
    const QString json = dir.filePath(u"summary.json"_s);
    ASSERT_EQ(RunTool({u"report"_s, u"--json"_s, json, results}).status, 1);
    const QJsonObject root = QJsonDocument::fromJson(testutil::ReadFile(json)).object();
    const QJsonArray modules = root.value(u"modules"_s).toArray();
    ASSERT_EQ(modules.size(), 1);
    EXPECT_EQ(modules.at(0).toObject().value(u"failed"_s).toInt(), 1);
    EXPECT_EQ(root.value(u"totals"_s).toObject().value(u"passed"_s).toInt(), 1);
}

TEST_F(ReportTool, UnreadableOrForeignFilesAreUsageErrors)
{
    testutil::WriteFile(dir.filePath(u"cut.xml"_s), QByteArray(kResults).left(100));
    testutil::WriteFile(dir.filePath(u"other.xml"_s), "<manifest/>");
    for (const QString &name : {u"cut.xml"_s, u"other.xml"_s, u"missing.xml"_s}) {
        const ToolResult r = RunTool({u"report"_s, dir.filePath(name)});
        EXPECT_EQ(r.status, 2) << name.toStdString();
        EXPECT_TRUE(r.err.startsWith("harness report: ")) << r.err.constData();
    }
}

} // namespace
