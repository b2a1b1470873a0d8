#include "cli_test.h"

#include "support/testutil.h"

#include <QJsonDocument>
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

// A processed-results file with a failed test case, in the current folder.
class ReportTool : public ::testing::Test
{
protected:
    void SetUp() override { testutil::WriteFile(u"ProcessedResults.xml"_s, kResults); }
    QTemporaryDir dir;
    testutil::CurrentDirectory current{dir.path()};
};

TEST_F(ReportTool, SummarisesExecutedModulesAndFailsWhenATestCaseFailed)
{
    const ToolResult r = Tool("report ProcessedResults.xml");
    EXPECT_EQ(r.status, 1) << r.err.constData();
    EXPECT_EQ(Rows(r.out), (QMap<QString, QString>{{u"audio"_s, u"1 1 1 1"_s}})) << r.out.constData();
    EXPECT_TRUE(QString::fromUtf8(r.out).contains(QRegularExpression(u"Total \\(1 module\\)\\s+1\\s+1\\s+1\\s+1"_s)));
    EXPECT_EQ(Rows(Tool("report --all ProcessedResults.xml").out).value(u"socket"_s), u"0 0 0 1"_s);
}

TEST_F(ReportTool, JUnitAndJsonFilesCarryTheVerdicts)
{
    ASSERT_EQ(Tool("report --all --junit junit.xml --json summary.json ProcessedResults.xml").status, 1);
    testutil::ExpectXmllintAccepts(u"junit.xml"_s);
    const QDomElement suites = ReadXml(u"junit.xml"_s).documentElement();
    EXPECT_EQ(suites.tagName(), u"testsuites"_s);
    EXPECT_EQ(suites.attribute(u"tests"_s), u"5"_s);
    EXPECT_EQ(suites.attribute(u"failures"_s), u"1"_s);
    const QDomNodeList suiteList = suites.elementsByTagName(u"testsuite"_s);
    ASSERT_EQ(suiteList.size(), 2);
    const QDomElement audio = suiteList.at(0).toElement();
    EXPECT_EQ(audio.attribute(u"name"_s), u"audio"_s);
    EXPECT_EQ(audio.attribute(u"skipped"_s), u"2"_s);
    QStringList cases; // "name: verdict element, its message"
    for (QDomElement c = audio.firstChildElement(); !c.isNull(); c = c.nextSiblingElement())
        cases << c.attribute(u"name"_s) + u": "_s + c.firstChildElement().tagName() + u", "_s
                + c.firstChildElement().attribute(u"message"_s);
    EXPECT_EQ(cases,
              (QStringList{u"play: , "_s, u"seek: failure, test case seek failed"_s,
                           u"loop & stop: skipped, unsupported"_s, u"eject: skipped, unexecuted"_s}));

    const QJsonDocument json = QJsonDocument::fromJson(testutil::ReadFile(u"summary.json"_s));
    EXPECT_EQ(json[u"modules"][0][u"failed"].toInt(), 1);
    EXPECT_EQ(json[u"totals"][u"passed"].toInt(), 1);
}

TEST_F(ReportTool, TheHtmlPageEscapesNamesAndSaysThatNoHistoryIsRecorded)
{
    testutil::WriteFile(
        u"results.xml"_s,
        "<testmodules><module name=\"&lt;script&gt;alert(1)&lt;/script&gt;\" family=\"a&amp;b\" source=\"KVK\">"
        "<testcase name=\"&lt;img src=x onerror=alert(2)&gt;\" result=\"fail\"/></module></testmodules>");
    EXPECT_EQ(Tool("report results.xml --html history.html").status, 1);
    const QByteArray page = testutil::ReadFile(u"history.html"_s);
    ExpectContains(page,
                   {"&lt;script&gt;alert(1)&lt;/script&gt;", "&lt;img src=x onerror=alert(2)&gt;", "a&amp;b",
                    "no history across runs is recorded"});
    ExpectLacks(page, {"<script>alert", "<img", ">Duration</th>"});
    EXPECT_EQ(page.count("<script>"), 1); // the page's own
}

TEST_F(ReportTool, UnreadableOrForeignFilesAreUsageErrors)
{
    testutil::WriteFile(u"cut.xml"_s, QByteArray(kResults).left(100));
    testutil::WriteFile(u"other.xml"_s, "<manifest/>");
    for (const char *name : {"cut.xml", "other.xml", "missing.xml"}) {
        const ToolResult r = Tool("report", name);
        ExpectRefused(r, name);
        EXPECT_TRUE(r.err.startsWith("harness report: ")) << r.err.constData();
    }
}

} // namespace
