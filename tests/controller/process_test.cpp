// Reprocessing a saved log tree into the processed-results file.

#include "controllertest.h"

#include <QDir>

namespace {

using controllertest::CatalogueModule;
using controllertest::MakeCatalogue;
using controllertest::ReadResults;
using controllertest::ResultsView;
using harnesstest::CapturedLog;
using testutil::ReadFile;
using testutil::WriteFile;

QByteArray CtfLog(const char *suite, const QList<QPair<const char *, const char *>> &cases)
{
    QByteArray log = "Suite: " + QByteArray(suite) + "\n";
    for (const auto &c : cases)
        log += "Test: " + QByteArray(c.first) + "\nResult: " + QByteArray(c.second) + "\n";
    return log + "[/VERBOSE]\n";
}

QByteArray UtLog(const char *suite, const QList<QPair<const char *, const char *>> &rows)
{
    QByteArray log = "SuiteName: UT" + QByteArray(suite) + " 10:00:00 03-Dec-2026\n"
                     "Case Result Time Note\n----\n";
    for (const auto &row : rows)
        log += QByteArray(row.first) + " " + row.second + " 1 ok\n";
    return log + "----\nElapsed Time: 3\n";
}

class ProcessTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        m_kit = MakeCatalogue(
            m_dir.filePath(QStringLiteral("kit")), false,
            {CatalogueModule(QStringLiteral("Audio"), QStringLiteral("#101"),
                             {QStringLiteral("a"), QStringLiteral("b"), QStringLiteral("c")}),
             CatalogueModule(QStringLiteral("Menu"), QStringLiteral("#102"),
                             {QStringLiteral("m1"), QStringLiteral("m2")}, QString(),
                             QStringLiteral("uitf"))});
        m_platform = MakeCatalogue(m_dir.filePath(QStringLiteral("platform")), true, {});

        // The saved tree; the folders of raw OAT logs and of results hold
        // logs that must not be read.
        Log(QStringLiteral("audio-ctf-2026-12-03.log"),
            CtfLog("Audio", {{"a", "Fail"}, {"b", "Fail"}}));
        Log(QStringLiteral("menu-2026-12-03.txt"), UtLog("Menu", {{"m1", "PASS"}, {"m2", "FAIL"}}));
        Log(QStringLiteral("readme.dat"), "Suite: Audio\n");
        Log(QStringLiteral("b-run/audio-ctf-2026-12-04.log"),
            CtfLog("Audio", {{"a", "Pass"}, {"b", "Unsupported"}, {"c.1", "Fail"}}));
        Log(QStringLiteral("b-run/deeper/ghost-ctf-1.log"), CtfLog("Ghost", {{"g", "Pass"}}));
        Log(QStringLiteral("a-run/menu-2026-12-05.txt"), UtLog("Menu", {{"m2", "PASS"}}));
        Log(QStringLiteral("oatRawLogs/trap-ctf-1.log"), CtfLog("Audio", {{"trap", "Pass"}}));
        Log(QStringLiteral("ProcessedResults/trap-ctf-2.log"), CtfLog("Audio", {{"trap", "Pass"}}));
    }

    void Log(const QString &relative, const QByteArray &content)
    {
        WriteFile(m_dir.filePath(QStringLiteral("logs/") + relative), content);
    }
    QString LogFolder() const { return m_dir.filePath(QStringLiteral("logs")); }

    void Prepare(Harness &harness, CapturedLog &log)
    {
        harness.SetLogger(log.log());
        harness.SetLogOutputPath(LogFolder());
        HarnessControllerAccess::SetCatalogues(harness, m_kit, m_platform);
    }

    QTemporaryDir m_dir;
    QSharedPointer<Manifest> m_kit;
    QSharedPointer<Manifest> m_platform;
};

TEST_F(ProcessTest, WholeTreeFeedsOneResultsFileWithIndentedMessages)
{
    CapturedLog log;
    Harness harness;
    Prepare(harness, log);
    ASSERT_TRUE(harness.Process(0));

    const QString results = LogFolder() + QStringLiteral("/ProcessedResults/ProcessedResults.xml");
    auto &env = HarnessControllerAccess::Environment(harness);
    EXPECT_EQ(env.value(QStringLiteral("ProcessedResultsPath")), results);
    EXPECT_EQ(env.value(QStringLiteral("LogPath")), LogFolder());
    const ResultsView view = ReadResults(results);
    ASSERT_TRUE(view.ok);
    EXPECT_EQ(view.verdicts,
              (QMap<QString, QString>{{QStringLiteral("Audio/a"), QStringLiteral("pass")},
                                      {QStringLiteral("Audio/b"), QStringLiteral("unsupported")},
                                      {QStringLiteral("Audio/c.1"), QStringLiteral("fail")},
                                      {QStringLiteral("Menu/m1"), QStringLiteral("pass")},
                                      {QStringLiteral("Menu/m2"), QStringLiteral("pass")}}));

    const QString a = LogFolder() + QStringLiteral("/a-run");
    const QString b = LogFolder() + QStringLiteral("/b-run");
    const QString expected =
        QStringLiteral("   Parsing Logs"
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
    EXPECT_EQ(log.Text(), expected);
    // Nothing else was written into the tree.
    EXPECT_EQ(QDir(LogFolder() + QStringLiteral("/ProcessedResults")).entryList(QDir::Files),
              (QStringList{QStringLiteral("ProcessedResults.xml"), QStringLiteral("trap-ctf-2.log")}));
}

TEST_F(ProcessTest, GivesTheSameFileAsRecordingTheLogsOneByOne)
{
    CapturedLog batchLog;
    Harness batch;
    Prepare(batch, batchLog);
    ASSERT_TRUE(batch.Process(0));
    const QByteArray processed =
        ReadFile(LogFolder() + QStringLiteral("/ProcessedResults/ProcessedResults.xml"));

    CapturedLog singleLog;
    Harness single;
    Prepare(single, singleLog);
    const QString separate = m_dir.filePath(QStringLiteral("separate.xml"));
    HarnessControllerAccess::Environment(single).insert(QStringLiteral("ProcessedResultsPath"), separate);
    for (const char *relative :
         {"audio-ctf-2026-12-03.log", "menu-2026-12-03.txt", "a-run/menu-2026-12-05.txt",
          "b-run/audio-ctf-2026-12-04.log", "b-run/deeper/ghost-ctf-1.log"}) {
        const QString path = LogFolder() + QLatin1Char('/') + QString::fromLatin1(relative);
        QSharedPointer<_TestModule> module = Manifest::CreateTestModuleFromLog(path);
        ASSERT_TRUE(module);
        module->AddDesktopLogFile(path);
        HarnessControllerAccess::Update(single, module);
        // Every step left a complete file behind.
        EXPECT_TRUE(ReadResults(separate).ok);
    }
    EXPECT_EQ(ReadFile(separate), processed);
}

TEST_F(ProcessTest, DamagedResultsFileIsKeptAsideOnce)
{
    Log(QStringLiteral("ProcessedResults/ProcessedResults.xml"), "<testmodules kvkHash=\"#1\"><mod");
    CapturedLog log;
    Harness harness;
    Prepare(harness, log);
    ASSERT_TRUE(harness.Process(0));
    const QDir folder(LogFolder() + QStringLiteral("/ProcessedResults"));
    EXPECT_EQ(folder.entryList({QStringLiteral("*.unreadable-*")}, QDir::Files).size(), 1);
    EXPECT_EQ(ReadResults(folder.filePath(QStringLiteral("ProcessedResults.xml")))
                  .verdicts.value(QStringLiteral("Audio/a")),
              QStringLiteral("pass"));
}

TEST_F(ProcessTest, SetupFailureRecordsNothing)
{
    CapturedLog log;
    Harness harness;
    harness.SetLogger(log.log());
    harness.SetLogOutputPath(LogFolder());
    // No kit anywhere: set-up cannot succeed.
    EXPECT_FALSE(harness.Process(0));
    EXPECT_TRUE(log.Text().endsWith(QStringLiteral("Harness::Process Setup failed.")));
    EXPECT_FALSE(QFileInfo::exists(LogFolder() + QStringLiteral("/ProcessedResults/ProcessedResults.xml")));
}

TEST_F(ProcessTest, WithoutALogFolderNothingIsCreated)
{
    CapturedLog log;
    Harness harness;
    harness.SetLogger(log.log());
    HarnessControllerAccess::SetCatalogues(harness, m_kit, m_platform);
    EXPECT_FALSE(harness.Process(0));
    EXPECT_FALSE(HarnessControllerAccess::Environment(harness).contains(
        QStringLiteral("ProcessedResultsPath")));
}

TEST_F(ProcessTest, LinkBackUpTheTreeIsNotFollowed)
{
    ASSERT_TRUE(QFile::link(LogFolder(), LogFolder() + QStringLiteral("/b-run/loop")));
    CapturedLog log;
    Harness harness;
    Prepare(harness, log);
    EXPECT_TRUE(harness.Process(0));
    EXPECT_FALSE(log.Text().contains(QStringLiteral("loop")));
}

} // namespace
