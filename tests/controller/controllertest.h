#pragma once

// Fixture pieces for the selection, run, results and reprocessing tests: access to the Harness's private operations, a
// scripted test module, and catalogues filled in memory.

#include "harnesstest.h"

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "catalogue/testresults.h"
#include "controller/harness.h"

#include <QDomDocument>
#include <QSharedPointer>

using namespace Qt::StringLiterals;

namespace controllertest {

// A module whose log parser answers with a prepared record (or fails when it must not parse), and whose run steps
// do nothing.
class ScriptedModule : public _TestModule
{
public:
    explicit ScriptedModule(const QString &name, const QString &type = u"ctf"_s) : m_type(type) { moduleName = name; }

    QString TestType() override { return m_type; }
    bool Run(IKestoDevice *, const QMap<QString, QString> &) override { return true; }
    bool GetLogFilePaths(IKestoDevice *, QStringList &) override { return false; }
    bool IsLogComplete(IKestoDevice *) override { return true; }
    bool ParseLog(TestResults &results) override { return parses && (results = parsed, true); }
    bool ParseLog(const QString &, TestResults &) override { return false; }
    void PostProcess(QMap<QString, QString> &) override { }
    QString ModuleName() override { return moduleName; }
    QString ModuleXMLName() override { return u"scripted.xml"_s; }
    bool ProcessModuleMIF(const QString &) override { return false; }

    // Makes the log report these verdicts for the module named name.
    void Report(const QString &name, const QList<TestCaseResult> &verdicts, const QString &hash = QString())
    {
        parsed.manifestName = name;
        parsed.idHash = hash;
        parsed.caseResults = verdicts;
    }

    bool parses = true;
    TestResults parsed;

private:
    unsigned int KestoID() override { return 0; }
    QString m_type;
};

// A catalogue module with test cases.
inline QSharedPointer<ScriptedModule> CatalogueModule(const QString &name, const QString &hash,
                                                      const QStringList &cases, const QString &family = QString(),
                                                      const QString &type = u"ctf"_s)
{
    QSharedPointer<ScriptedModule> module(new ScriptedModule(name, type));
    module->idHash = hash;
    module->family = family;
    module->subFamily = family.isEmpty() ? QString() : family + u"-sub"_s;
    for (const QString &testCase : cases)
        module->testCases.append(TestCase(testCase, u"auto"_s));
    return module;
}

// A catalogue held in memory only (its cache folder is created below the test's data root).
inline QSharedPointer<Manifest> MakeCatalogue(const QString &path, bool isPlatform,
                                              const QList<QSharedPointer<ScriptedModule>> &modules)
{
    QSharedPointer<Manifest> catalogue(new Manifest(path, isPlatform));
    for (const QSharedPointer<ScriptedModule> &module : modules) {
        if (module->TestType() == u"secondary"_s)
            module->selectable = false;
        catalogue->testModules.insert(module->moduleName.toLower(), module);
    }
    return catalogue;
}

} // namespace controllertest

using namespace controllertest;

// A Harness logging to a captured log, with catalogues held in memory below a temporary folder.
class CatalogueHarnessTest : public ::testing::Test
{
protected:
    CatalogueHarnessTest() { m_harness.SetLogger(m_log.log()); }

    // Gives the harness a kit (in the folder kitName) and a platform holding these modules.
    void UseCatalogues(const QList<QSharedPointer<ScriptedModule>> &kit,
                       const QList<QSharedPointer<ScriptedModule>> &platform, const QString &kitName = u"kit"_s)
    {
        m_kit = MakeCatalogue(m_dir.filePath(kitName), false, kit);
        m_platform = MakeCatalogue(m_dir.filePath(u"platform"_s), true, platform);
        HarnessTestAccess::SetCatalogues(m_harness, m_kit, m_platform);
    }
    QMap<QString, QString> &Env() { return HarnessTestAccess::Environment(m_harness); }

    QTemporaryDir m_dir;
    CapturedLog m_log;
    Harness m_harness;
    QSharedPointer<Manifest> m_kit, m_platform;
};
