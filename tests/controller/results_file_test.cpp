#include "controllertest.h"

#include "controller/processedresults.h"

#include <QDir>
#include <QRandomGenerator>

namespace {

TEST(ResultPrecedence, KeepsTheStrongerVerdict)
{
    // Stored, reported, kept.
    const char *rows[][3] = {{"", "unexecuted", "unexecuted"},
                             {"pass", "fail", "pass"},
                             {"fail", "pass", "pass"},
                             {"fail", "unsupported", "unsupported"},
                             {"fail", "crashed", "fail"},
                             {"unsupported", "fail", "fail"},
                             {"unsupported", "unexecuted", "unsupported"},
                             {"crashed", "timeout", "timeout"}};
    for (const auto &row : rows)
        EXPECT_EQ(ProcessedResults::Precedence(QString::fromLatin1(row[0]), QString::fromLatin1(row[1])),
                  QLatin1String(row[2]))
            << row[0] << " then " << row[1];
}

class ResultsFileTest : public CatalogueHarnessTest
{
protected:
    void SetUp() override
    {
        Env()[u"LogPath"_s] = m_dir.filePath(u"logs"_s);
        UseCatalogues(u"kit"_s);
    }

    // Kit: Audio (a, b, c), Video (x), a secondary module and a framework module; platform: Shell (s1).
    void UseCatalogues(const QString &kitName)
    {
        CatalogueHarnessTest::UseCatalogues(
            {CatalogueModule(u"Audio"_s, u"#11"_s, {u"a"_s, u"b"_s, u"c"_s}, u"media"_s),
             CatalogueModule(u"Video"_s, u"#12"_s, {u"x"_s}),
             CatalogueModule(u"Helper"_s, u"#13"_s, {u"h"_s}, QString(), u"secondary"_s),
             CatalogueModule(u"CtfRunner"_s, u"#14"_s, {u"r"_s}, u"TestFrameworks"_s)},
            {CatalogueModule(u"Shell"_s, u"#21"_s, {u"s1"_s})}, kitName);
    }

    // Records a run module whose log reports verdicts of the named module, or cannot be parsed.
    QSharedPointer<ScriptedModule> Record(const QString &name, const QList<TestCaseResult> &verdicts,
                                          const QString &hash = QString(), bool parses = true)
    {
        QSharedPointer<ScriptedModule> module(new ScriptedModule(name));
        module->Report(name, verdicts, hash);
        module->parses = parses;
        HarnessTestAccess::Update(m_harness, module);
        return module;
    }

    QString ResultsPath() const
    {
        return QDir::cleanPath(m_dir.filePath(u"logs/processedResults/ProcessedResults.xml"_s));
    }
};

TEST_F(ResultsFileTest, FirstUpdateWritesTheSkeletonOfBothCataloguesBelowTheLogFolder)
{
    Record(u"Audio"_s, {{u"b"_s, u"pass"_s}});

    EXPECT_EQ(Env().value(u"ProcessedResultsPath"_s), ResultsPath());
    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.root.tagName(), u"testmodules"_s);
    EXPECT_EQ(view.root.attribute(u"kvkHash"_s), m_kit->RootHash());
    EXPECT_EQ(view.root.attribute(u"platformHash"_s), m_platform->RootHash());
    // Neither the secondary module nor the framework's own module is listed.
    EXPECT_EQ(view.modules.keys(), (QStringList{u"Audio"_s, u"Shell"_s, u"Video"_s}));
    const QDomElement audio = view.modules.value(u"Audio"_s);
    EXPECT_EQ(audio.attribute(u"id_hash"_s), u"#11"_s);
    EXPECT_EQ(audio.attribute(u"family"_s), u"media"_s);
    EXPECT_EQ(audio.attribute(u"subfamily"_s), u"media-sub"_s);
    EXPECT_EQ(audio.attribute(u"source"_s), u"KVK"_s);
    EXPECT_EQ(view.modules.value(u"Shell"_s).attribute(u"source"_s), u"PVS"_s);
    EXPECT_EQ(view.verdicts,
              (QMap<QString, QString>{{u"Audio/a"_s, u"unexecuted"_s},
                                      {u"Audio/b"_s, u"pass"_s},
                                      {u"Audio/c"_s, u"unexecuted"_s},
                                      {u"Shell/s1"_s, u"unexecuted"_s},
                                      {u"Video/x"_s, u"unexecuted"_s}}));

    testutil::ExpectXmllintAccepts(ResultsPath());
}

TEST_F(ResultsFileTest, ModuleMissingFromTheFileIsAddedWithTheCatalogueFamily)
{
    Record(u"Audio"_s, {{u"a"_s, u"pass"_s}});
    // The file loses Audio (an older file, say); the next report adds it again.
    QDomDocument document;
    ASSERT_TRUE(document.setContent(ReadFile(ResultsPath())));
    QDomElement root = document.documentElement();
    root.removeChild(root.firstChildElement(u"module"_s));
    WriteFile(ResultsPath(), document.toByteArray(1));

    QSharedPointer<ScriptedModule> run = Record(u"AUDIO"_s, {{u"z"_s, u"fail"_s}});
    const ResultsView view = ReadResults(ResultsPath());
    const QDomElement added = view.modules.value(u"AUDIO"_s);
    ASSERT_FALSE(added.isNull());
    EXPECT_EQ(added.attribute(u"id_hash"_s), u"#11"_s);
    EXPECT_EQ(added.attribute(u"family"_s), u"media"_s);
    EXPECT_FALSE(added.hasAttribute(u"source"_s));
    EXPECT_EQ(view.caseOrder.value(u"AUDIO"_s), QStringList{u"z"_s});
    // The run's module took the catalogue's identity.
    EXPECT_EQ(run->idHash, u"#11"_s);
    EXPECT_EQ(run->subFamily, u"media-sub"_s);
}

TEST_F(ResultsFileTest, UnknownModuleIsWarnedAndOnlyTheSkeletonWrittenButTheLogIdHashFindsAModuleWhateverItsName)
{
    Record(u"Ghost"_s, {{u"g"_s, u"pass"_s}});
    EXPECT_TRUE(m_log.Text().contains(u"   Warning: Module Name:Ghost not found in the manifests.\n"_s));
    ResultsView view = ReadResults(ResultsPath());
    EXPECT_FALSE(view.modules.contains(u"Ghost"_s));
    EXPECT_EQ(view.verdicts.value(u"Audio/a"_s), u"unexecuted"_s);

    // The log's hash names Video although the log states Audio.
    Record(u"Audio"_s, {{u"x"_s, u"pass"_s}}, u"#12"_s);
    view = ReadResults(ResultsPath());
    EXPECT_EQ(view.verdicts.value(u"Video/x"_s), u"pass"_s);
    EXPECT_FALSE(view.verdicts.contains(u"Audio/x"_s));
}

TEST_F(ResultsFileTest, NewKitRebuildsTheSkeletonWithEveryCaseUnexecutedOnceALogIsParsed)
{
    Record(u"Audio"_s, {{u"a"_s, u"pass"_s}});
    const QByteArray before = ReadFile(ResultsPath());
    UseCatalogues(u"another-kit"_s);
    Record(u"Audio"_s, {}, QString(), false);
    EXPECT_EQ(ReadFile(ResultsPath()), before);
    Record(u"Video"_s, {{u"x"_s, u"fail"_s}});

    const ResultsView view = ReadResults(ResultsPath());
    EXPECT_EQ(view.root.attribute(u"kvkHash"_s), m_kit->RootHash());
    EXPECT_EQ(view.verdicts.value(u"Audio/a"_s), u"unexecuted"_s);
    EXPECT_EQ(view.verdicts.value(u"Video/x"_s), u"fail"_s);
    // A rebuilt skeleton is not a damaged file: nothing is kept aside.
    EXPECT_EQ(QDir(QFileInfo(ResultsPath()).path()).entryList(QDir::Files), QStringList{u"ProcessedResults.xml"_s});
}

TEST_F(ResultsFileTest, DamagedOrForeignFileIsKeptAsideAndReplacedByACompleteOne)
{
    Record(u"Audio"_s, {{u"a"_s, u"pass"_s}});
    const QByteArray whole = ReadFile(ResultsPath());
    const QDir folder(QFileInfo(ResultsPath()).path());
    // Written back with its indentation, a file nested a hundred thousand levels deep would need tens of gigabytes.
    const QByteArray deep = "<testmodules kvkHash=\"" + m_kit->RootHash().toUtf8() + "\" platformHash=\""
        + m_platform->RootHash().toUtf8() + "\">" + QByteArray("<m>").repeated(100000)
        + QByteArray("</m>").repeated(100000) + "</testmodules>";
    for (const QByteArray &damaged : {whole.left(whole.size() / 2), QByteArray("<report><entry/></report>"), deep}) {
        SCOPED_TRACE(damaged.left(100).toStdString());
        for (const QString &old : folder.entryList({u"*.unreadable-*"_s}, QDir::Files))
            ASSERT_TRUE(QFile::remove(folder.filePath(old)));
        WriteFile(ResultsPath(), damaged);

        Record(u"Video"_s, {{u"x"_s, u"fail"_s}});

        const QStringList aside = folder.entryList({u"ProcessedResults.xml.unreadable-*"_s}, QDir::Files);
        ASSERT_EQ(aside.size(), 1);
        EXPECT_EQ(ReadFile(folder.filePath(aside.first())), damaged);
        EXPECT_TRUE(m_log.Text().contains(folder.filePath(aside.first())));
        const ResultsView view = ReadResults(ResultsPath());
        EXPECT_EQ(view.verdicts.value(u"Video/x"_s), u"fail"_s);
        EXPECT_EQ(view.verdicts.value(u"Audio/a"_s), u"unexecuted"_s);
        EXPECT_EQ(view.modules.size(), 3);
    }
}

TEST_F(ResultsFileTest, GivenResultsPathIsUsedAndItsFolderCreatedOrItsFailureReported)
{
    const QString path = m_dir.filePath(u"elsewhere/deep/results.xml"_s);
    Env()[u"ProcessedResultsPath"_s] = path;
    Record(u"Video"_s, {{u"x"_s, u"pass"_s}});
    EXPECT_EQ(ReadResults(path).verdicts.value(u"Video/x"_s), u"pass"_s);
    EXPECT_FALSE(QFileInfo::exists(m_dir.filePath(u"logs/processedResults"_s)));

    // A results path naming a folder, which no file can replace.
    const QString taken = m_dir.filePath(u"taken"_s);
    QDir().mkpath(taken + u"/inside"_s);
    Env()[u"ProcessedResultsPath"_s] = taken;
    Record(u"Video"_s, {{u"x"_s, u"pass"_s}});
    EXPECT_TRUE(m_log.Text().contains(u"could not"_s));
    EXPECT_TRUE(QFileInfo(taken + u"/inside"_s).isDir());
}

// A results file "r.xml" of module "M" (hash "#1") without catalogues.
class ProcessedResultsDocument : public ::testing::Test
{
protected:
    // Records one verdict into file and saves it.
    static bool RecordOne(const QString &file, const QString &testCase, const QString &family = QString())
    {
        ProcessedResults results;
        results.Open(file, nullptr, nullptr, nullptr);
        results.Record(u"#1"_s, u"M"_s, family, family, testCase, u"pass"_s);
        return results.Save();
    }

    QTemporaryDir dir;
    const QString path = dir.filePath(u"r.xml"_s);
};

TEST_F(ProcessedResultsDocument, SameDocumentGivesTheSameBytesAndWithoutACatalogueVerdictsAccumulate)
{
    EXPECT_TRUE(RecordOne(path, u"t"_s, u"f"_s));
    EXPECT_TRUE(RecordOne(path + u".2"_s, u"t"_s, u"f"_s));
    EXPECT_EQ(ReadFile(path), ReadFile(path + u".2"_s));
    EXPECT_FALSE(ReadFile(path).startsWith("<?xml"));
    ASSERT_TRUE(RecordOne(path, u"two"_s));
    EXPECT_EQ(ReadResults(path).caseOrder.value(u"M"_s), (QStringList{u"t"_s, u"two"_s}));
}

TEST_F(ProcessedResultsDocument, WhatTheFileHoldsBesideVerdictsIsKept)
{
    // Notes a user added by hand, in any form XML has, survive the rewrite.
    const QByteArray file = "<testmodules kvkHash=\"\" platformHash=\"\">\n"
                            " <!-- checked by hand -->\n"
                            " <module id_hash=\"#1\" name=\"M\" note=\"caf\xC3\xA9 &amp; more\">\n"
                            "  <?review done?>\n"
                            "  <testcase name=\"t\" result=\"fail\"><![CDATA[<see bug 12>]]></testcase>\n"
                            " </module>\n"
                            "</testmodules>\n";
    WriteFile(path, file);
    ASSERT_TRUE(RecordOne(path, u"t"_s));
    EXPECT_EQ(ReadFile(path), QByteArray(file).replace("result=\"fail\"", "result=\"pass\""));
}

TEST_F(ProcessedResultsDocument, LongRunsOfRenamesAndNewCasesMatchTheRules)
{
    // Verdicts at random against the rules applied to a plain list: the first case in the module named as reported, or
    // as reported without a ".1" or "_1" ending, takes the verdict (renamed and moved last when the names differ); no
    // match appends a case.
    QRandomGenerator random(7);
    const QStringList verdicts{u"pass"_s, u"fail"_s, u"unsupported"_s, u"unexecuted"_s};
    QList<QPair<QString, QString>> model;
    QByteArray file = "<testmodules kvkHash=\"\" platformHash=\"\"><module id_hash=\"#1\" name=\"M\">";
    for (int i = 0; i < 300; ++i) {
        const QString name = u"c%1"_s.arg(random.bounded(200));
        model.append({name, u"unexecuted"_s});
        file += "<testcase name=\"" + name.toUtf8() + "\" result=\"unexecuted\"/>";
    }
    file += "</module></testmodules>";
    WriteFile(path, file);

    ProcessedResults results;
    results.Open(path, nullptr, nullptr, nullptr);
    const QStringList endings{QString(), u".1"_s, u"_1"_s};
    for (int step = 0; step < 3000; ++step) {
        const QString reported = u"c%1"_s.arg(random.bounded(260)) + endings.at(random.bounded(int(endings.size())));
        const QString verdict = verdicts.at(random.bounded(int(verdicts.size())));
        results.Record(u"#1"_s, u"M"_s, QString(), QString(), reported, verdict);

        qsizetype match = -1;
        for (qsizetype i = 0; i < model.size() && match < 0; ++i) {
            const QString &stored = model.at(i).first;
            if (stored == reported
                || ((reported.endsWith(u".1"_s) || reported.endsWith(u"_1"_s)) && stored == reported.chopped(2)))
                match = i;
        }
        if (match < 0) {
            model.append({reported, verdict});
            continue;
        }
        model[match].second = ProcessedResults::Precedence(model.at(match).second, verdict);
        if (model.at(match).first != reported)
            model.append({reported, model.takeAt(match).second});
    }
    ASSERT_TRUE(results.Save());

    QDomDocument document;
    ASSERT_TRUE(document.setContent(ReadFile(path)));
    QList<QPair<QString, QString>> written;
    for (QDomElement c = document.documentElement().firstChildElement().firstChildElement(); !c.isNull();
         c = c.nextSiblingElement())
        written.append({c.attribute(u"name"_s), c.attribute(u"result"_s)});
    EXPECT_EQ(written, model);
}

} // namespace
