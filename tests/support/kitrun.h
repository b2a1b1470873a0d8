#pragma once

// A kit on emulated handsets, run through the Harness as a user runs it:
//
//     testutil::KitRun run;                      // private data root and handsets
//     run.Kit().AddSourceModule("tests/audio", audio);
//     run.Kit().AddFrameworkPackage("testframeworks", "ctf", "Win32", "Debug");
//     run.AddHandset("phone");
//     ASSERT_TRUE(run.RunModules(run.NewHarness("phone"), {"Audio"}));
//     EXPECT_EQ(run.Verdicts("phone").value("Audio/play"), "pass");

#include "support/kitbuilder.h"

#include "log/log.h"

#include <QDomElement>
#include <QMap>
#include <QSharedPointer>
#include <QString>
#include <QStringList>
#include <QTemporaryDir>

#include <memory>
#include <vector>

class Harness;
class _TestModule;

namespace testutil {

// A log of its own in a temporary folder.
class CapturedLog
{
public:
    CapturedLog() { m_log.SetLogPath(m_dir.filePath(u"log.txt"_s)); }
    Log *log() { return &m_log; }
    QString Text() const { return QString::fromLatin1(ReadFile(m_dir.filePath(u"log.txt"_s))); }

private:
    QTemporaryDir m_dir;
    Log m_log;
};

// The verdicts of a processed-results file: "module/testcase" -> result,
// the order of the test case names per module and the module elements.
struct ResultsView
{
    bool ok = false;
    QDomElement root;
    QMap<QString, QString> verdicts;
    QMap<QString, QStringList> caseOrder;
    QMap<QString, QDomElement> modules;
};
ResultsView ReadResults(const QString &path);

class KitRun
{
public:
    KitRun();
    ~KitRun();
    KitRun(const KitRun &) = delete;
    KitRun &operator=(const KitRun &) = delete;

    // A path in the run's temporary folder.
    QString Path(const QString &relative) const { return m_dir.filePath(relative); }
    kitbuilder::KitBuilder &Kit() { return m_kit; }
    HandsetFixture &Handsets() { return m_handsets; }
    // Fails the test (and returns false) when the kit could not be written.
    bool KitOk() const;

    // Adds a win32 handset; returns its folder.
    QString AddHandset(const QString &name) { return m_handsets.AddHandset(name, u"Emulated "_s + name, u"win32"_s); }
    // Adds handsets "<prefix>1" ... "<prefix>count"; returns their names.
    QStringList AddHandsets(int count, const QString &prefix = QStringLiteral("h"));
    QString HandsetFolder(const QString &name) const { return m_handsets.HandsetFolder(name); }

    // Where the logs of runs on the handset are copied.
    QString LogFolder(const QString &handset) const { return m_dir.filePath(u"logs/"_s + handset); }
    // Sets harness up for the kit and handset, logging to log.
    void Configure(Harness &harness, const QString &handset, Log *log) const;
    // A harness set up for the handset, logging to the run's log unless told
    // otherwise; the run disconnects it at the end.
    Harness &NewHarness(const QString &handset, Log *log = nullptr);
    // Every module of the kit (and platform) the filter selects.
    QList<QSharedPointer<_TestModule>> Select(const QString &filter = QStringLiteral("*"));
    // Queues the modules of those names (each must exist once), runs them and disconnects; the result of Harness::Run.
    bool RunModules(Harness &harness, const QStringList &names);

    Log *log() { return m_log.log(); }
    QString LogText() const { return m_log.Text(); }
    // The verdicts of the handset's processed-results file.
    QString ResultsPath(const QString &handset) const;
    QMap<QString, QString> Verdicts(const QString &handset) const { return ReadResults(ResultsPath(handset)).verdicts; }
    // The lines the shard kit's behaviours wrote to runs.txt.
    QStringList Runs() const;

private:
    QTemporaryDir m_dir;
    EnvGuard m_env;
    HandsetFixture m_handsets;
    kitbuilder::KitBuilder m_kit;
    CapturedLog m_log;
    std::vector<std::unique_ptr<Harness>> m_harnesses;
};

// Adds CTF modules "Ctf00", "Ctf01", ... and CTF applet modules "App00", ... with their frameworks to kit; returns the
// module names. Each behaviour sleeps `seconds` (a text for sleep(1)), reports test case "first" passed and "second"
// passed, failed or unsupported for module i modulo 3 equal to 0, 1 or 2, and appends "start <module> <handset>" and,
// once its log is written, "done <module> <handset>" to runs.txt in the handsets folder. A handset folder holding
// "drop-at" (a number n) goes offline in the n-th module it starts, before that module writes its log.
QStringList AddShardModules(kitbuilder::KitBuilder &kit, int ctfModules, int appletModules, const QString &seconds);

} // namespace testutil
