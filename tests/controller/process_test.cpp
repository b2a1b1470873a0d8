// Reprocessing a saved log tree into the processed-results file.

#include "controllertest.h"

#include <QDir>

namespace {

QByteArray CtfLog(const char *suite, const QList<QPair<const char *, const char *>> &cases)
{
    QByteArray log = "Suite: " + QByteArray(suite) + "\n";
    for (const auto &c : cases)
        log += "Test: " + QByteArray(c.first) + "\nResult: " + QByteArray(c.second) + "\n";
    return log + "[/VERBOSE]\n";
}

QByteArray UtLog(const char *suite, const QList<QPair<const char *, const char *>> &rows)
{
    QByteArray log = "SuiteName: UT" + QByteArray(suite)
        + " 10:00:00 03-Dec-2026\n"
          "Case Result Time Note\n----\n";
    for (const auto &row : rows)
        log += QByteArray(row.first) + " " + row.second + " 1 ok\n";
    return log + "----\nElapsed Time: 3\n";
}

class ProcessTest : public CatalogueHarnessTest
{
protected:
    void SetUp() override
    {
        UseCatalogues({CatalogueModule(u"Audio"_s, u"#101"_s, {u"a"_s, u"b"_s, u"c"_s}),
                       CatalogueModule(u"Menu"_s, u"#102"_s, {u"m1"_s, u"m2"_s}, QString(), u"uitf"_s)},
                      {});
        m_harness.SetLogOutputPath(LogFolder());

        // The saved tree; the folders of raw OAT logs and of results hold logs that must not be read.
        Log(u"audio-ctf-2026-12-03.log"_s, CtfLog("Audio", {{"a", "Fail"}, {"b", "Fail"}}));
        Log(u"menu-2026-12-03.txt"_s, UtLog("Menu", {{"m1", "PASS"}, {"m2", "FAIL"}}));
        Log(u"readme.dat"_s, "Suite: Audio\n");
        Log(u"b-run/audio-ctf-2026-12-04.log"_s,
            CtfLog("Audio", {{"a", "Pass"}, {"b", "Unsupported"}, {"c.1", "Fail"}}));
        Log(u"b-run/deeper/ghost-ctf-1.log"_s, CtfLog("Ghost", {{"g", "Pass"}}));
        Log(u"a-run/menu-2026-12-05.txt"_s, UtLog("Menu", {{"m2", "PASS"}}));
        Log(u"oatRawLogs/trap-ctf-1.log"_s, CtfLog("Audio", {{"trap", "Pass"}}));
        Log(u"ProcessedResults/trap-ctf-2.log"_s, CtfLog("Audio", {{"trap", "Pass"}}));
    }

    void Log(const QString &relative, const QByteArray &content) { WriteFile(LogFolder() + u'/' + relative, content); }
    QString LogFolder() const { return m_dir.filePath(u"logs"_s); }
};

TEST_F(ProcessTest, WholeTreeFeedsOneResultsFileWithIndentedMessagesAndALinkBackUpIsNotFollowed)
{
    ASSERT_TRUE(QFile::link(LogFolder(), LogFolder() + u"/b-run/loop"_s));
    ASSERT_TRUE(m_harness.Process(0));

    const QString results = LogFolder() + u"/ProcessedResults/ProcessedResults.xml"_s;
    EXPECT_EQ(Env().value(u"ProcessedResultsPath"_s), results);
    EXPECT_EQ(Env().value(u"LogPath"_s), LogFolder());
    EXPECT_EQ(ReadResults(results).verdicts,
              (QMap<QString, QString>{{u"Audio/a"_s, u"pass"_s},
                                      {u"Audio/b"_s, u"unsupported"_s},
                                      {u"Audio/c.1"_s, u"fail"_s},
                                      {u"Menu/m1"_s, u"pass"_s},
                                      {u"Menu/m2"_s, u"pass"_s}}));

    const QString a = LogFolder() + u"/a-run"_s, b = LogFolder() + u"/b-run"_s;
    const QString expected = QStringLiteral("   Parsing Logs"
                                            "   Processing Log audio-ctf-2026-12-03.log"
                                            "   Processing Log menu-2026-12-03.txt"
                                            "   Processing Sub Directory %1"
                                            "      Parsing Logs"
                                            "      Processing Log menu-2026-12-05.txt"
                                            "      Process Complete"
                                            "   Processing Sub Directory %2"
                                            "      Parsing Logs"
                                            "      Processing Log audio-ctf-2026-12-04.log"
                                            "      Processing Sub Directory %2/deeper"
                                            "         Parsing Logs"
                                            "         Processing Log ghost-ctf-1.log"
                                            "   Warning: Module Name:Ghost not found in the manifests.\n"
                                            "         Process Complete"
                                            "      Process Complete"
                                            "   Process Complete")
                                 .arg(a, b);
    EXPECT_EQ(m_log.Text(), expected);
    // Nothing else was written into the tree.
    EXPECT_EQ(QDir(LogFolder() + u"/ProcessedResults"_s).entryList(QDir::Files),
              (QStringList{u"ProcessedResults.xml"_s, u"trap-ctf-2.log"_s}));
}

TEST_F(ProcessTest, SetupFailureOrNoLogFolderRecordsNothing)
{
    CapturedLog log;
    Harness harness;
    harness.SetLogger(log.log());
    harness.SetLogOutputPath(LogFolder());
    // No kit anywhere: set-up cannot succeed.
    EXPECT_FALSE(harness.Process(0));
    EXPECT_TRUE(log.Text().endsWith(u"Harness::Process Setup failed."_s));
    EXPECT_FALSE(QFileInfo::exists(LogFolder() + u"/ProcessedResults/ProcessedResults.xml"_s));

    Harness unplaced;
    HarnessTestAccess::SetCatalogues(unplaced, m_kit, m_platform);
    EXPECT_FALSE(unplaced.Process(0));
    EXPECT_FALSE(HarnessTestAccess::Environment(unplaced).contains(u"ProcessedResultsPath"_s));
}

} // namespace
