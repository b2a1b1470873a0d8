#include "controllertest.h"

#include "controller/processedresults.h"

#include <QRandomGenerator>
#include <QDir>

namespace {

using controllertest::CatalogueModule;
using controllertest::MakeCatalogue;
using controllertest::ReadResults;
using controllertest::ResultsView;
using controllertest::ScriptedModule;
using harnesstest::CapturedLog;
using testutil::ReadFile;
using testutil::WriteFile;

// ---- Result precedence ----

struct PrecedenceCase
{
    const char *stored;
    const char *reported;
    const char *kept;
};

class ResultPrecedence : public ::testing::TestWithParam<PrecedenceCase>
{
};

TEST_P(ResultPrecedence, KeepsTheStrongerVerdict)
{
    const PrecedenceCase &c = GetParam();
    EXPECT_EQ(ProcessedResults::Precedence(QString::fromLatin1(c.stored),
                                           QString::fromLatin1(c.reported)),
              QString::fromLatin1(c.kept))
        << c.stored << " then " << c.reported;
}

INSTANTIATE_TEST_SUITE_P(
    Verdicts, ResultPrecedence,
    ::testing::Values(PrecedenceCase{"", "fail", "fail"}, PrecedenceCase{"", "unexecuted", "unexecuted"},
                      PrecedenceCase{"pass", "fail", "pass"},
                      PrecedenceCase{"pass", "unsupported", "pass"},
                      PrecedenceCase{"fail", "pass", "pass"},
                      PrecedenceCase{"unexecuted", "pass", "pass"},
                      PrecedenceCase{"fail", "unsupported", "unsupported"},
                      PrecedenceCase{"fail", "unexecuted", "fail"},
                      PrecedenceCase{"fail", "crashed", "fail"},
                      PrecedenceCase{"unexecuted", "fail", "fail"},
                      PrecedenceCase{"unsupported", "fail", "fail"},
                      PrecedenceCase{"unsupported", "unexecuted", "unsupported"},
                      PrecedenceCase{"unexecuted", "unexecuted", "unexecuted"},
                      PrecedenceCase{"crashed", "timeout", "timeout"}));

// ---- The results file through the Harness ----

class ResultsFileTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(m_dir.isValid());
        m_harness.SetLogger(m_log.log());
        Env()[QStringLiteral("LogPath")] = m_dir.filePath(QStringLiteral("logs"));
        UseCatalogues(QStringLiteral("kit"));
    }

    QMap<QString, QString> &Env() { return HarnessControllerAccess::Environment(m_harness); }

    // Kit: Audio (a, b, c), Video (x), a secondary module and a framework
    // module; platform: Shell (s1).
    void UseCatalogues(const QString &kitName)
    {
        m_kit = MakeCatalogue(
            m_dir.filePath(kitName), false,
            {CatalogueModule(QStringLiteral("Audio"), QStringLiteral("#11"),
                             {QStringLiteral("a"), QStringLiteral("b"), QStringLiteral("c")},
                             QStringLiteral("media")),
             CatalogueModule(QStringLiteral("Video"), QStringLiteral("#12"), {QStringLiteral("x")}),
             CatalogueModule(QStringLiteral("Helper"), QStringLiteral("#13"), {QStringLiteral("h")},
                             QString(), QStringLiteral("secondary")),
             CatalogueModule(QStringLiteral("CtfRunner"), QStringLiteral("#14"),
                             {QStringLiteral("r")}, QStringLiteral("TestFrameworks"))});
        m_platform = MakeCatalogue(
            m_dir.filePath(QStringLiteral("platform")), true,
            {CatalogueModule(QStringLiteral("Shell"), QStringLiteral("#21"), {QStringLiteral("s1")})});
        HarnessControllerAccess::SetCatalogues(m_harness, m_kit, m_platform);
    }

    // A run module whose log reports verdicts of the named module.
    QSharedPointer<ScriptedModule> Logged(const QString &name, const QList<TestCaseResult> &verdicts,
                                          const QString &hash = QString())
    {
        QSharedPointer<ScriptedModule> module(new ScriptedModule(name));
        module->Report(name, verdicts, hash);
        return module;
    }

    void Record(const QString &name, const QList<TestCaseResult> &verdicts)
    {
        HarnessControllerAccess::Update(m_harness, Logged(name, verdicts));
    }

    QString ResultsPath() const
    {
        return QDir::cleanPath(m_dir.filePath(QStringLiteral("logs/processedResults/ProcessedResults.xml")));
    }

    QTemporaryDir m_dir;
    CapturedLog m_log;
    Harness m_harness;
    QSharedPointer<Manifest> m_kit;
    QSharedPointer<Manifest> m_platform;
};

TEST_F(ResultsFileTest, FirstUpdateWritesTheSkeletonOfBothCataloguesBelowTheLogFolder)
{
    Record(QStringLiteral("Audio"), {{QStringLiteral("b"), QStringLiteral("pass")}});

    EXPECT_EQ(Env().value(QStringLiteral("ProcessedResultsPath")), ResultsPath());
    const ResultsView view = ReadResults(ResultsPath());
    ASSERT_TRUE(view.ok);
    EXPECT_EQ(view.root.tagName(), QStringLiteral("testmodules"));
    EXPECT_EQ(view.root.attribute(QStringLiteral("kvkHash")), m_kit->RootHash());
    EXPECT_EQ(view.root.attribute(QStringLiteral("platformHash")), m_platform->RootHash());
    // Neither the secondary module nor the framework's own module is listed.
    EXPECT_EQ(view.modules.keys(),
              (QStringList{QStringLiteral("Audio"), QStringLiteral("Shell"), QStringLiteral("Video")}));
    const QDomElement audio = view.modules.value(QStringLiteral("Audio"));
    EXPECT_EQ(audio.attribute(QStringLiteral("id_hash")), QStringLiteral("#11"));
    EXPECT_EQ(audio.attribute(QStringLiteral("family")), QStringLiteral("media"));
    EXPECT_EQ(audio.attribute(QStringLiteral("subfamily")), QStringLiteral("media-sub"));
    EXPECT_EQ(audio.attribute(QStringLiteral("source")), QStringLiteral("KVK"));
    EXPECT_EQ(view.modules.value(QStringLiteral("Shell")).attribute(QStringLiteral("source")),
              QStringLiteral("PVS"));
    EXPECT_EQ(view.verdicts,
              (QMap<QString, QString>{{QStringLiteral("Audio/a"), QStringLiteral("unexecuted")},
                                      {QStringLiteral("Audio/b"), QStringLiteral("pass")},
                                      {QStringLiteral("Audio/c"), QStringLiteral("unexecuted")},
                                      {QStringLiteral("Shell/s1"), QStringLiteral("unexecuted")},
                                      {QStringLiteral("Video/x"), QStringLiteral("unexecuted")}}));

    if (testutil::HaveProgram(QStringLiteral("xmllint"))) {
        QByteArray output;
        EXPECT_EQ(testutil::RunProgram(QStringLiteral("xmllint"), {QStringLiteral("--noout"), ResultsPath()},
                                       &output),
                  0)
            << output.toStdString();
    }
}

TEST_F(ResultsFileTest, VerdictsFollowThePrecedenceAcrossRuns)
{
    Record(QStringLiteral("Audio"), {{QStringLiteral("a"), QStringLiteral("pass")},
                                     {QStringLiteral("b"), QStringLiteral("fail")},
                                     {QStringLiteral("c"), QStringLiteral("fail")}});
    Record(QStringLiteral("audio"), {{QStringLiteral("a"), QStringLiteral("fail")},
                                     {QStringLiteral("b"), QStringLiteral("unsupported")},
                                     {QStringLiteral("c"), QStringLiteral("unexecuted")}});

    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/a")), QStringLiteral("pass"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/b")), QStringLiteral("unsupported"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/c")), QStringLiteral("fail"));
}

TEST_F(ResultsFileTest, StoredCaseTakesTheReportedNameWithItsEndingAndMovesLast)
{
    Record(QStringLiteral("Audio"), {{QStringLiteral("a.1"), QStringLiteral("pass")},
                                     {QStringLiteral("b_1"), QStringLiteral("fail")},
                                     {QStringLiteral("new"), QStringLiteral("fail")},
                                     {QStringLiteral("c.2"), QStringLiteral("pass")}});

    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.caseOrder.value(QStringLiteral("Audio")),
              (QStringList{QStringLiteral("c"), QStringLiteral("a.1"), QStringLiteral("b_1"),
                           QStringLiteral("new"), QStringLiteral("c.2")}));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/a.1")), QStringLiteral("pass"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/b_1")), QStringLiteral("fail"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/c")), QStringLiteral("unexecuted"));

    // The renamed case is found under its new name on the next run.
    Record(QStringLiteral("Audio"), {{QStringLiteral("b_1"), QStringLiteral("unsupported")}});
    EXPECT_EQ(ReadResults(ResultsPath()).verdicts.value(QStringLiteral("Audio/b_1")),
              QStringLiteral("unsupported"));
}

TEST_F(ResultsFileTest, RenamedCaseNoLongerAnswersToItsOldName)
{
    Record(QStringLiteral("Audio"), {{QStringLiteral("b.1"), QStringLiteral("fail")}});
    Record(QStringLiteral("Audio"), {{QStringLiteral("b"), QStringLiteral("pass")},
                                     {QStringLiteral("b.1"), QStringLiteral("unsupported")}});
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.caseOrder.value(QStringLiteral("Audio")),
              (QStringList{QStringLiteral("a"), QStringLiteral("c"), QStringLiteral("b.1"),
                           QStringLiteral("b")}));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/b.1")), QStringLiteral("unsupported"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/b")), QStringLiteral("pass"));
}

TEST_F(ResultsFileTest, LogIdHashFindsTheModuleWhateverItsName)
{
    // The log's hash names Video although the log states Audio.
    HarnessControllerAccess::Update(
        m_harness, Logged(QStringLiteral("Audio"), {{QStringLiteral("x"), QStringLiteral("pass")}},
                          QStringLiteral("#12")));
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Video/x")), QStringLiteral("pass"));
    EXPECT_FALSE(view.verdicts.contains(QStringLiteral("Audio/x")));
}

TEST_F(ResultsFileTest, ModuleMissingFromTheFileIsAddedWithTheCatalogueFamily)
{
    Record(QStringLiteral("Audio"), {{QStringLiteral("a"), QStringLiteral("pass")}});
    // The file loses Audio (an older file, say); the next report adds it again.
    QDomDocument document;
    ASSERT_TRUE(document.setContent(ReadFile(ResultsPath())));
    QDomElement root = document.documentElement();
    root.removeChild(root.firstChildElement(QStringLiteral("module")));
    WriteFile(ResultsPath(), document.toByteArray(1));

    QSharedPointer<ScriptedModule> run = Logged(QStringLiteral("AUDIO"), {{QStringLiteral("z"), QStringLiteral("fail")}});
    HarnessControllerAccess::Update(m_harness, run);
    const ResultsView view = ReadResults(ResultsPath());
    const QDomElement added = view.modules.value(QStringLiteral("AUDIO"));
    ASSERT_FALSE(added.isNull());
    EXPECT_EQ(added.attribute(QStringLiteral("id_hash")), QStringLiteral("#11"));
    EXPECT_EQ(added.attribute(QStringLiteral("family")), QStringLiteral("media"));
    EXPECT_FALSE(added.hasAttribute(QStringLiteral("source")));
    EXPECT_EQ(view.caseOrder.value(QStringLiteral("AUDIO")), QStringList{QStringLiteral("z")});
    // The run's module took the catalogue's identity.
    EXPECT_EQ(run->idHash, QStringLiteral("#11"));
    EXPECT_EQ(run->subFamily, QStringLiteral("media-sub"));
}

TEST_F(ResultsFileTest, UnknownModuleIsWarnedAndOnlyTheSkeletonWritten)
{
    Record(QStringLiteral("Ghost"), {{QStringLiteral("g"), QStringLiteral("pass")}});
    EXPECT_TRUE(m_log.Text().contains(
        QStringLiteral("   Warning: Module Name:Ghost not found in the manifests.\n")));
    const ResultsView view = ReadResults(ResultsPath());
    ASSERT_TRUE(view.ok);
    EXPECT_FALSE(view.modules.contains(QStringLiteral("Ghost")));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/a")), QStringLiteral("unexecuted"));
}

TEST_F(ResultsFileTest, UnparsedLogLeavesTheFileUntouched)
{
    Record(QStringLiteral("Audio"), {{QStringLiteral("a"), QStringLiteral("pass")}});
    const QByteArray before = ReadFile(ResultsPath());
    UseCatalogues(QStringLiteral("another-kit"));

    QSharedPointer<ScriptedModule> run = Logged(QStringLiteral("Audio"), {});
    run->parses = false;
    HarnessControllerAccess::Update(m_harness, run);
    EXPECT_EQ(run->parseCalls, 1);
    EXPECT_EQ(ReadFile(ResultsPath()), before);
}

TEST_F(ResultsFileTest, NewKitRebuildsTheSkeletonWithEveryCaseUnexecuted)
{
    Record(QStringLiteral("Audio"), {{QStringLiteral("a"), QStringLiteral("pass")}});
    UseCatalogues(QStringLiteral("another-kit"));
    Record(QStringLiteral("Video"), {{QStringLiteral("x"), QStringLiteral("fail")}});

    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.root.attribute(QStringLiteral("kvkHash")), m_kit->RootHash());
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/a")), QStringLiteral("unexecuted"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Video/x")), QStringLiteral("fail"));
    // A rebuilt skeleton is not a damaged file: nothing is kept aside.
    EXPECT_EQ(QDir(QFileInfo(ResultsPath()).path()).entryList(QDir::Files),
              QStringList{QStringLiteral("ProcessedResults.xml")});
}

TEST_F(ResultsFileTest, GivenResultsPathIsUsedAndItsFolderCreated)
{
    const QString path = m_dir.filePath(QStringLiteral("elsewhere/deep/results.xml"));
    Env()[QStringLiteral("ProcessedResultsPath")] = path;
    Record(QStringLiteral("Video"), {{QStringLiteral("x"), QStringLiteral("pass")}});
    EXPECT_EQ(ReadResults(path).verdicts.value(QStringLiteral("Video/x")), QStringLiteral("pass"));
    EXPECT_FALSE(QFileInfo::exists(m_dir.filePath(QStringLiteral("logs/processedResults"))));
}

TEST_F(ResultsFileTest, FileCutOffMidWriteIsKeptAsideAndReplacedByACompleteOne)
{
    Record(QStringLiteral("Audio"), {{QStringLiteral("a"), QStringLiteral("pass")}});
    const QByteArray whole = ReadFile(ResultsPath());
    const QByteArray cut = whole.left(whole.size() / 2);
    WriteFile(ResultsPath(), cut);

    Record(QStringLiteral("Video"), {{QStringLiteral("x"), QStringLiteral("fail")}});

    const QDir folder(QFileInfo(ResultsPath()).path());
    const QStringList aside =
        folder.entryList({QStringLiteral("ProcessedResults.xml.unreadable-*")}, QDir::Files);
    ASSERT_EQ(aside.size(), 1);
    EXPECT_EQ(ReadFile(folder.filePath(aside.first())), cut);
    EXPECT_TRUE(m_log.Text().contains(folder.filePath(aside.first())));

    const ResultsView view = ReadResults(ResultsPath());
    ASSERT_TRUE(view.ok);
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Video/x")), QStringLiteral("fail"));
    EXPECT_EQ(view.verdicts.value(QStringLiteral("Audio/a")), QStringLiteral("unexecuted"));
    EXPECT_EQ(view.modules.size(), 3);
}

TEST_F(ResultsFileTest, ForeignXmlIsNotOverwrittenWithoutAKeptCopy)
{
    QDir().mkpath(QFileInfo(ResultsPath()).path());
    WriteFile(ResultsPath(), "<report><entry/></report>");
    Record(QStringLiteral("Video"), {{QStringLiteral("x"), QStringLiteral("pass")}});
    const QStringList aside = QDir(QFileInfo(ResultsPath()).path())
                                  .entryList({QStringLiteral("*.unreadable-*")}, QDir::Files);
    EXPECT_EQ(aside.size(), 1);
    EXPECT_EQ(ReadResults(ResultsPath()).verdicts.value(QStringLiteral("Video/x")),
              QStringLiteral("pass"));
}

TEST_F(ResultsFileTest, UnwritableResultsFileIsReported)
{
    // The results path names a folder, which no file can replace.
    const QString path = m_dir.filePath(QStringLiteral("taken"));
    QDir().mkpath(path + QStringLiteral("/inside"));
    Env()[QStringLiteral("ProcessedResultsPath")] = path;
    Record(QStringLiteral("Video"), {{QStringLiteral("x"), QStringLiteral("pass")}});
    EXPECT_TRUE(m_log.Text().contains(QStringLiteral("could not")));
    EXPECT_TRUE(QFileInfo(path + QStringLiteral("/inside")).isDir());
}

// ---- The document on its own ----

TEST(ProcessedResultsDocument, SameDocumentGivesTheSameBytes)
{
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("r.xml"));
    auto write = [&](const QString &file) {
        ProcessedResults results;
        results.Open(file, nullptr, nullptr, nullptr);
        results.Record(QStringLiteral("#1"), QStringLiteral("M"), QStringLiteral("f"),
                       QStringLiteral("s"), QStringLiteral("t"), QStringLiteral("pass"));
        EXPECT_TRUE(results.Save());
    };
    write(path);
    write(path + QStringLiteral(".2"));
    EXPECT_EQ(ReadFile(path), ReadFile(path + QStringLiteral(".2")));
    EXPECT_FALSE(ReadFile(path).startsWith("<?xml"));
}

TEST(ProcessedResultsDocument, EarliestCaseInTheModuleWinsAmongTheMatchingNames)
{
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("r.xml"));
    WriteFile(path, "<testmodules kvkHash=\"\" platformHash=\"\">"
                    "<module id_hash=\"#1\" name=\"M\">"
                    "<testcase name=\"t\" result=\"unexecuted\"/>"
                    "<testcase name=\"t.1\" result=\"unexecuted\"/>"
                    "<testcase name=\"u.1\" result=\"unexecuted\"/>"
                    "<testcase name=\"u\" result=\"unexecuted\"/>"
                    "</module></testmodules>");
    ProcessedResults results;
    results.Open(path, nullptr, nullptr, nullptr);
    const auto record = [&](const char *testCase, const char *verdict) {
        results.Record(QStringLiteral("#1"), QStringLiteral("M"), QString(), QString(),
                       QString::fromLatin1(testCase), QString::fromLatin1(verdict));
    };
    record("t.1", "fail"); // "t" comes first: renamed to "t.1" and moved last
    record("u.1", "pass"); // the exact name comes first
    ASSERT_TRUE(results.Save());

    const ResultsView view = ReadResults(path);
    EXPECT_EQ(view.caseOrder.value(QStringLiteral("M")),
              (QStringList{QStringLiteral("t.1"), QStringLiteral("u.1"), QStringLiteral("u"),
                           QStringLiteral("t.1")}));
    const QDomElement module = view.modules.value(QStringLiteral("M"));
    QStringList verdicts;
    for (QDomElement c = module.firstChildElement(); !c.isNull(); c = c.nextSiblingElement())
        verdicts << c.attribute(QStringLiteral("result"));
    EXPECT_EQ(verdicts, (QStringList{QStringLiteral("unexecuted"), QStringLiteral("pass"),
                                     QStringLiteral("unexecuted"), QStringLiteral("fail")}));
    // The file was current (no catalogues, no hashes): nothing was rebuilt.
    EXPECT_FALSE(module.hasAttribute(QStringLiteral("source")));
}

TEST(ProcessedResultsDocument, WithoutAKitCatalogueVerdictsAccumulate)
{
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("r.xml"));
    for (const char *testCase : {"one", "two"}) {
        ProcessedResults results;
        results.Open(path, nullptr, nullptr, nullptr);
        results.Record(QStringLiteral("#1"), QStringLiteral("M"), QString(), QString(),
                       QString::fromLatin1(testCase), QStringLiteral("pass"));
        ASSERT_TRUE(results.Save());
    }
    EXPECT_EQ(ReadResults(path).caseOrder.value(QStringLiteral("M")),
              (QStringList{QStringLiteral("one"), QStringLiteral("two")}));
}

} // namespace

namespace {

TEST(ProcessedResultsDocument, WhatTheFileHoldsBesideVerdictsIsKept)
{
    // Notes a user added by hand, in any form XML has, survive the rewrite.
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("r.xml"));
    WriteFile(path, "<testmodules kvkHash=\"\" platformHash=\"\">\n"
                    " <!-- checked by hand -->\n"
                    " <module id_hash=\"#1\" name=\"M\" note=\"caf\xC3\xA9 &amp; more\">\n"
                    "  <?review done?>\n"
                    "  <testcase name=\"t\" result=\"fail\"><![CDATA[<see bug 12>]]></testcase>\n"
                    " </module>\n"
                    "</testmodules>\n");
    ProcessedResults results;
    results.Open(path, nullptr, nullptr, nullptr);
    results.Record(QStringLiteral("#1"), QStringLiteral("M"), QString(), QString(),
                   QStringLiteral("t"), QStringLiteral("pass"));
    ASSERT_TRUE(results.Save());
    EXPECT_EQ(ReadFile(path),
              QByteArray("<testmodules kvkHash=\"\" platformHash=\"\">\n"
                         " <!-- checked by hand -->\n"
                         " <module id_hash=\"#1\" name=\"M\" note=\"caf\xC3\xA9 &amp; more\">\n"
                         "  <?review done?>\n"
                         "  <testcase name=\"t\" result=\"pass\"><![CDATA[<see bug 12>]]></testcase>\n"
                         " </module>\n"
                         "</testmodules>\n"));
}

TEST(ProcessedResultsDocument, FileNestedBeyondAnyResultsFileIsKeptAside)
{
    // Written back with its indentation, a file nested a hundred thousand
    // levels deep would need tens of gigabytes.
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("r.xml"));
    QByteArray deep = "<testmodules kvkHash=\"\" platformHash=\"\">";
    for (int i = 0; i < 100000; ++i)
        deep += "<m>";
    for (int i = 0; i < 100000; ++i)
        deep += "</m>";
    deep += "</testmodules>";
    WriteFile(path, deep);
    ProcessedResults results;
    results.Open(path, nullptr, nullptr, nullptr);
    results.Record(QStringLiteral("#1"), QStringLiteral("M"), QString(), QString(),
                   QStringLiteral("t"), QStringLiteral("pass"));
    ASSERT_TRUE(results.Save());
    const QStringList aside = QDir(dir.path()).entryList({QStringLiteral("r.xml.unreadable-*")}, QDir::Files);
    ASSERT_EQ(aside.size(), 1);
    EXPECT_EQ(ReadFile(dir.filePath(aside.first())), deep);
    EXPECT_EQ(ReadResults(path).verdicts.value(QStringLiteral("M/t")), QStringLiteral("pass"));
}

} // namespace

namespace {

TEST(ProcessedResultsDocument, LongRunsOfRenamesAndNewCasesMatchTheRules)
{
    // Verdicts at random against the rules applied to a plain list: the
    // first case in the module named as reported, or as reported without a
    // ".1" or "_1" ending, takes the verdict (renamed and moved last when
    // the names differ); no match appends a case.
    QTemporaryDir dir;
    const QString path = dir.filePath(QStringLiteral("r.xml"));
    QRandomGenerator random(7);
    const QStringList verdicts{QStringLiteral("pass"), QStringLiteral("fail"), QStringLiteral("unsupported"),
                               QStringLiteral("unexecuted")};
    QList<QPair<QString, QString>> model;
    QByteArray file = "<testmodules kvkHash=\"\" platformHash=\"\"><module id_hash=\"#1\" name=\"M\">";
    for (int i = 0; i < 300; ++i) {
        const QString name = QStringLiteral("c%1").arg(random.bounded(200));
        model.append({name, QStringLiteral("unexecuted")});
        file += "<testcase name=\"" + name.toUtf8() + "\" result=\"unexecuted\"/>";
    }
    file += "</module></testmodules>";
    WriteFile(path, file);

    ProcessedResults results;
    results.Open(path, nullptr, nullptr, nullptr);
    const QStringList endings{QString(), QStringLiteral(".1"), QStringLiteral("_1")};
    for (int step = 0; step < 3000; ++step) {
        const QString reported = QStringLiteral("c%1").arg(random.bounded(260))
                                 + endings.at(random.bounded(int(endings.size())));
        const QString verdict = verdicts.at(random.bounded(int(verdicts.size())));
        results.Record(QStringLiteral("#1"), QStringLiteral("M"), QString(), QString(), reported, verdict);

        qsizetype match = -1;
        for (qsizetype i = 0; i < model.size() && match < 0; ++i) {
            const QString &stored = model.at(i).first;
            if (stored == reported
                || ((reported.endsWith(QLatin1String(".1")) || reported.endsWith(QLatin1String("_1")))
                    && stored == reported.chopped(2)))
                match = i;
        }
        if (match < 0) {
            model.append({reported, verdict});
            continue;
        }
        QPair<QString, QString> found = model.at(match);
        found.second = ProcessedResults::Precedence(found.second, verdict);
        if (found.first != reported) {
            found.first = reported;
            model.removeAt(match);
            model.append(found);
        } else {
            model[match] = found;
        }
    }
    ASSERT_TRUE(results.Save());

    QDomDocument document;
    ASSERT_TRUE(document.setContent(ReadFile(path)));
    QList<QPair<QString, QString>> written;
    for (QDomElement c = document.documentElement().firstChildElement().firstChildElement(); !c.isNull();
         c = c.nextSiblingElement())
        written.append({c.attribute(QStringLiteral("name")), c.attribute(QStringLiteral("result"))});
    EXPECT_EQ(written, model);
}

} // namespace
