// One selection run on several emulated handsets at once: a shared queue, one Harness per handset in its own thread,
// handsets dropping out.

#include "controllertest.h"

#include "controller/moduletimings.h"
#include "controller/shardedrun.h"

#include <QDir>
#include <QRegularExpression>

namespace {

constexpr int kCtfModules = 20;
constexpr int kAppletModules = 4;

class ShardedRunTest : public ::testing::Test
{
protected:
    void SetUp() override { ASSERT_TRUE(m_run.KitOk()); }

    // One configured Harness per handset, added to run.
    QList<Harness *> AddWorkers(ShardedRun &run, const QStringList &handsets)
    {
        QList<Harness *> workers;
        for (const QString &handset : handsets) {
            workers.append(&m_run.NewHarness(handset));
            run.AddHandset(workers.last());
        }
        return workers;
    }

    // The verdicts of the handset's results file, of the modules that ran there.
    QMap<QString, QString> Verdicts(const QString &handset, const QStringList &modules)
    {
        QMap<QString, QString> verdicts = m_run.Verdicts(handset);
        verdicts.removeIf([&](auto it) { return !modules.contains(it.key().section(u'/', 0, 0)); });
        return verdicts;
    }

    // How often each module's behaviour ran to the end, and on which handsets.
    QMap<QString, QStringList> Completions() const
    {
        QMap<QString, QStringList> done;
        for (const QString &line : m_run.Runs().filter(QRegularExpression(u"^done \\S+ \\S+$"_s)))
            done[line.section(u' ', 1, 1)].append(line.section(u' ', 2));
        return done;
    }

    KitRun m_run;
    const QStringList m_names = AddShardModules(m_run.Kit(), kCtfModules, kAppletModules, u"0.05"_s);
};

TEST_F(ShardedRunTest, FourHandsetsShareTheQueueAndMatchAOneHandsetRun)
{
    const QStringList handsets = m_run.AddHandsets(4);
    m_run.AddHandsets(1, u"solo"_s);
    const QList<QSharedPointer<_TestModule>> selection = m_run.Select();
    ASSERT_EQ(selection.size(), kCtfModules + kAppletModules);

    // The reference: the same selection on one handset through Run().
    ASSERT_TRUE(m_run.RunModules(m_run.NewHarness(u"solo1"_s), m_names)) << m_run.LogText().toStdString();
    const QMap<QString, QString> reference = Verdicts(u"solo1"_s, m_names);
    ASSERT_EQ(reference.size(), 2 * selection.size());

    ShardedRun run(m_run.log());
    const QList<Harness *> workers = AddWorkers(run, handsets);
    ASSERT_TRUE(run.Run(selection)) << m_run.LogText().toStdString();

    // Every module ran once, on one handset, and its verdicts are in that handset's own results file.
    QMap<QString, QStringList> byHandset;
    const QList<ShardedRun::ModuleResult> modules = run.Modules();
    ASSERT_EQ(modules.size(), selection.size());
    for (const ShardedRun::ModuleResult &module : modules) {
        EXPECT_TRUE(module.ran) << module.name.toStdString();
        EXPECT_EQ(module.outcome, ModuleSource::Recorded) << module.name.toStdString();
        EXPECT_EQ(module.attempts, 1) << module.name.toStdString();
        byHandset[module.handset].append(module.name);
    }
    QMap<QString, QString> combined;
    for (auto it = byHandset.cbegin(); it != byHandset.cend(); ++it)
        combined.insert(Verdicts(it.key(), it.value()));
    EXPECT_EQ(combined, reference);
    EXPECT_GT(byHandset.size(), 1);

    const QMap<QString, QStringList> done = Completions();
    for (const QString &name : m_names) // once on the solo handset, once on one of the four
        EXPECT_EQ(done.value(name).size(), 2) << name.toStdString();
    for (const ShardedRun::HandsetResult &handset : run.Handsets()) {
        EXPECT_TRUE(handset.connected);
        EXPECT_FALSE(handset.lost);
        EXPECT_EQ(handset.modulesRun, byHandset.value(handset.handset).size());
        // Everything the run put on the handset is gone again.
        EXPECT_TRUE(QDir(m_run.Handsets().HostPath(handset.handset, u"fs:/usermods"_s))
                        .entryList(QDir::Dirs | QDir::NoDotAndDotDot)
                        .filter(QRegularExpression(u"^(ctf|ctfapplet|Ctf\\d+|App\\d+)$"_s))
                        .isEmpty())
            << handset.handset.toStdString();
    }
    EXPECT_TRUE(run.NotRun().isEmpty());
    // Each module's wall time was recorded beside the results of its handset.
    for (const ShardedRun::ModuleResult &module : modules) {
        ModuleTimings timings;
        ASSERT_TRUE(timings.Read(ModuleTimings::PathFor(module.handset))) << timings.ErrorString().toStdString();
        EXPECT_EQ(timings.Runs(module.name, module.source).size(), 1) << module.name.toStdString();
        EXPECT_EQ(timings.ExpectedMs(module.name, module.source), module.record.durationMs);
    }
    // Every worker closed the connection it opened.
    for (const Harness *harness : workers)
        EXPECT_TRUE(harness->ConnectedTarget().isEmpty());
}

TEST_F(ShardedRunTest, AHandsetGoingOfflineHandsItsModuleToTheOthers)
{
    const QStringList handsets = m_run.AddHandsets(2);
    // h2 goes offline while running its second module.
    WriteFile(m_run.HandsetFolder(u"h2"_s) + u"/drop-at"_s, "2\n");
    ShardedRun run(m_run.log());
    AddWorkers(run, handsets);
    ASSERT_TRUE(run.Run(m_run.Select())) << m_run.LogText().toStdString();

    const QList<ShardedRun::HandsetResult> results = run.Handsets();
    ASSERT_EQ(results.size(), 2);
    EXPECT_FALSE(results.at(0).lost);
    EXPECT_TRUE(results.at(1).lost);
    EXPECT_EQ(results.at(1).handset, u"h2"_s);
    EXPECT_EQ(results.at(1).modulesRun, 1);
    EXPECT_TRUE(results.at(1).lostAt.isValid());
    // Dropped at once, not after the ten minutes a log may take.
    EXPECT_LT(results.at(1).lostAfterMs, 600000);
    EXPECT_TRUE(m_run.LogText().contains(u"Handset h2 dropped out at "_s));

    // The module h2 had in hand started there, ran to the end on h1, and nothing ran to the end twice.
    QString interrupted;
    for (const QString &line : m_run.Runs()) {
        if (line.startsWith(u"start "_s) && line.endsWith(u" h2"_s))
            interrupted = line.section(u' ', 1, 1);
    }
    ASSERT_FALSE(interrupted.isEmpty());
    const QMap<QString, QStringList> done = Completions();
    for (const QString &name : m_names)
        EXPECT_EQ(done.value(name).size(), 1) << name.toStdString();
    EXPECT_EQ(done.value(interrupted), QStringList{u"h1"_s});
    for (const ShardedRun::ModuleResult &module : run.Modules()) {
        EXPECT_EQ(module.outcome, ModuleSource::Recorded) << module.name.toStdString();
        EXPECT_EQ(module.attempts, module.name == interrupted ? 2 : 1) << module.name.toStdString();
    }
    // h2's results file holds only the module it completed.
    const QMap<QString, QString> onH2 = Verdicts(u"h2"_s, m_names);
    EXPECT_EQ(onH2.size() - onH2.values().count(u"unexecuted"_s), 2);
    EXPECT_EQ(onH2.value(interrupted + u"/first"_s), u"unexecuted"_s);
}

TEST_F(ShardedRunTest, NothingToRunOrNoHandsetIsRefusedAndWhenEveryHandsetIsGoneTheModulesLeftAreListed)
{
    ShardedRun unstaffed(m_run.log());
    EXPECT_FALSE(unstaffed.Run({}));
    EXPECT_TRUE(m_run.LogText().contains(u"No modules to run."_s));
    EXPECT_FALSE(unstaffed.Run(m_run.Select()));
    EXPECT_TRUE(m_run.LogText().contains(u"No handsets to run on.\n"_s));
    EXPECT_EQ(unstaffed.NotRun().size(), kCtfModules + kAppletModules);

    const QStringList handsets = m_run.AddHandsets(3);
    WriteFile(m_run.HandsetFolder(u"h1"_s) + u"/drop-at"_s, "2\n");
    WriteFile(m_run.HandsetFolder(u"h2"_s) + u"/drop-at"_s, "1\n");
    // h3 refuses the connection from the start.
    WriteFile(m_run.HandsetFolder(u"h3"_s) + u"/offline"_s, "");
    ShardedRun run(m_run.log());
    AddWorkers(run, handsets);
    EXPECT_FALSE(run.Run(m_run.Select()));

    const QList<ShardedRun::HandsetResult> results = run.Handsets();
    for (const ShardedRun::HandsetResult &handset : results)
        EXPECT_TRUE(handset.lost) << handset.target.toStdString();
    EXPECT_FALSE(results.at(2).connected);
    EXPECT_EQ(results.at(2).modulesRun, 0);
    EXPECT_EQ(results.at(0).modulesRun + results.at(1).modulesRun, 1);

    const QStringList notRun = run.NotRun();
    EXPECT_EQ(notRun.size(), kCtfModules + kAppletModules - 1);
    for (const ShardedRun::ModuleResult &module : run.Modules())
        EXPECT_EQ(module.ran, !notRun.contains(module.name)) << module.name.toStdString();
    EXPECT_TRUE(
        m_run.LogText().contains(u"Every handset has dropped out; %1 modules never ran: "_s.arg(notRun.size())));
}

} // namespace
