#include "cli_test.h"

#include "support/testutil.h"

#include <QDomDocument>
#include <QJsonArray>
#include <QJsonDocument>
#include <QJsonObject>
#include <QRegularExpression>
#include <QTemporaryDir>

#include <gtest/gtest.h>

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
        results = dir.filePath(QStringLiteral("ProcessedResults.xml"));
        testutil::WriteFile(results, kResults);
    }
    QTemporaryDir dir;
    QString results;
};

TEST_F(ReportTool, SummarisesExecutedModulesAndFailsWhenATestCaseFailed)
{
    const ToolResult r = RunTool({QStringLiteral("report"), results});
    EXPECT_EQ(r.status, 1) << r.err.constData();
    const QString out = QString::fromUtf8(r.out);
    EXPECT_TRUE(out.contains(QRegularExpression(QStringLiteral("audio\\s+1\\s+1\\s+1\\s+1\\n")))) << r.out.constData();
    EXPECT_FALSE(out.contains(QLatin1String("socket")));
    EXPECT_TRUE(out.contains(QRegularExpression(QStringLiteral("Total \\(1 module\\)\\s+1\\s+1\\s+1\\s+1"))));

    const ToolResult all = RunTool({QStringLiteral("report"), QStringLiteral("--all"), results});
    EXPECT_TRUE(all.out.contains("socket"));
}

TEST_F(ReportTool, JUnitReportReadsBackAndIsWellFormed)
{
    const QString junit = dir.filePath(QStringLiteral("junit.xml"));
    const ToolResult r
        = RunTool({QStringLiteral("report"), QStringLiteral("--all"), QStringLiteral("--junit"), junit, results});
    ASSERT_EQ(r.status, 1) << r.err.constData();

    QDomDocument doc;
    ASSERT_TRUE(doc.setContent(testutil::ReadFile(junit)));
    const QDomElement suites = doc.documentElement();
    EXPECT_EQ(suites.tagName(), QStringLiteral("testsuites"));
    EXPECT_EQ(suites.attribute(QStringLiteral("tests")), QStringLiteral("5"));
    EXPECT_EQ(suites.attribute(QStringLiteral("failures")), QStringLiteral("1"));
    const QDomNodeList suiteList = suites.elementsByTagName(QStringLiteral("testsuite"));
    ASSERT_EQ(suiteList.size(), 2);
    const QDomElement audio = suiteList.at(0).toElement();
    EXPECT_EQ(audio.attribute(QStringLiteral("name")), QStringLiteral("audio"));
    EXPECT_EQ(audio.attribute(QStringLiteral("skipped")), QStringLiteral("2"));
    const QDomNodeList cases = audio.elementsByTagName(QStringLiteral("testcase"));
    ASSERT_EQ(cases.size(), 4);
    EXPECT_TRUE(cases.at(0).firstChildElement().isNull());
    EXPECT_EQ(cases.at(1).firstChildElement().tagName(), QStringLiteral("failure"));
    EXPECT_EQ(cases.at(2).toElement().attribute(QStringLiteral("name")), QStringLiteral("loop & stop"));
    EXPECT_EQ(cases.at(2).firstChildElement().tagName(), QStringLiteral("skipped"));
    EXPECT_EQ(cases.at(2).firstChildElement().attribute(QStringLiteral("message")), QStringLiteral("unsupported"));
    EXPECT_EQ(cases.at(3).firstChildElement().attribute(QStringLiteral("message")), QStringLiteral("unexecuted"));

    if (testutil::HaveProgram(QStringLiteral("xmllint"))) {
        QByteArray lint;
        EXPECT_EQ(testutil::RunProgram(QStringLiteral("xmllint"), {QStringLiteral("--noout"), junit}, &lint), 0)
            << lint.constData();
    }
}

TEST_F(ReportTool, JsonSummaryCarriesCountsAndTotals)
{
    const QString json = dir.filePath(QStringLiteral("summary.json"));
    ASSERT_EQ(RunTool({QStringLiteral("report"), QStringLiteral("--json"), json, results}).status, 1);
    const QJsonObject root = QJsonDocument::fromJson(testutil::ReadFile(json)).object();
    const QJsonArray modules = root.value(QStringLiteral("modules")).toArray();
    ASSERT_EQ(modules.size(), 1);
    EXPECT_EQ(modules.at(0).toObject().value(QStringLiteral("failed")).toInt(), 1);
    EXPECT_EQ(root.value(QStringLiteral("totals")).toObject().value(QStringLiteral("passed")).toInt(), 1);
}

TEST_F(ReportTool, UnreadableOrForeignFilesAreUsageErrors)
{
    testutil::WriteFile(dir.filePath(QStringLiteral("cut.xml")), QByteArray(kResults).left(100));
    testutil::WriteFile(dir.filePath(QStringLiteral("other.xml")), "<manifest/>");
    for (const QString &name :
         {QStringLiteral("cut.xml"), QStringLiteral("other.xml"), QStringLiteral("missing.xml")}) {
        const ToolResult r = RunTool({QStringLiteral("report"), dir.filePath(name)});
        EXPECT_EQ(r.status, 2) << name.toStdString();
        EXPECT_TRUE(r.err.startsWith("harness report: ")) << r.err.constData();
    }
}

} // namespace
