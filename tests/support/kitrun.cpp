#include "support/kitrun.h"

#include "catalogue/testmodule.h"
#include "controller/harness.h"
#include "environment/testdirectories.h"

#include <QDir>
#include <QDomDocument>

#include <gtest/gtest.h>

namespace testutil {

ResultsView ReadResults(const QString &path)
{
    ResultsView view;
    QDomDocument document;
    if (!document.setContent(ReadFile(path)))
        return view;
    view.ok = true;
    view.root = document.documentElement();
    for (QDomElement module = view.root.firstChildElement(u"module"_s); !module.isNull();
         module = module.nextSiblingElement(u"module"_s)) {
        const QString name = module.attribute(u"name"_s);
        view.modules.insert(name, module);
        for (QDomElement testCase = module.firstChildElement(u"testcase"_s); !testCase.isNull();
             testCase = testCase.nextSiblingElement(u"testcase"_s)) {
            const QString caseName = testCase.attribute(u"name"_s);
            view.verdicts.insert(name + u'/' + caseName, testCase.attribute(u"result"_s));
            view.caseOrder[name].append(caseName);
        }
    }
    return view;
}

KitRun::KitRun() : m_env("KESTIX_DATA_ROOT", m_dir.filePath(u"data"_s)), m_kit(m_dir.filePath(u"kit"_s))
{
    EXPECT_TRUE(m_dir.isValid());
}

KitRun::~KitRun()
{
    for (const std::unique_ptr<Harness> &harness : m_harnesses)
        harness->DisconnectTarget();
}

bool KitRun::KitOk() const
{
    EXPECT_TRUE(m_kit.Ok()) << m_kit.Errors().join(u'\n').toStdString();
    return m_kit.Ok();
}

QStringList KitRun::AddHandsets(int count, const QString &prefix)
{
    QStringList names;
    for (int i = 1; i <= count; ++i) {
        names.append(prefix + QString::number(i));
        AddHandset(names.last());
    }
    return names;
}

void KitRun::Configure(Harness &harness, const QString &handset, Log *log) const
{
    harness.SetLogger(log);
    harness.SetTestkit(m_kit.Root());
    harness.SetTarget(handset);
    QDir().mkpath(LogFolder(handset));
    harness.SetLogOutputPath(LogFolder(handset));
}

Harness &KitRun::NewHarness(const QString &handset, Log *log)
{
    m_harnesses.push_back(std::make_unique<Harness>());
    Configure(*m_harnesses.back(), handset, log ? log : m_log.log());
    return *m_harnesses.back();
}

QList<QSharedPointer<_TestModule>> KitRun::Select(const QString &filter)
{
    Harness selector;
    Configure(selector, QString(), nullptr);
    QList<QSharedPointer<_TestModule>> modules;
    selector.GetTestModules(modules, {filter}, QString(), QString());
    return modules;
}

bool KitRun::RunModules(Harness &harness, const QStringList &names)
{
    for (const QString &name : names) {
        QList<QSharedPointer<_TestModule>> found;
        harness.GetTestModules(found, QStringList{name}, QString(), QString());
        EXPECT_EQ(found.size(), 1) << name.toStdString();
        for (const QSharedPointer<_TestModule> &module : found)
            harness.AddTest(module);
    }
    const bool result = harness.Run();
    harness.DisconnectTarget();
    return result;
}

QString KitRun::ResultsPath(const QString &handset) const
{
    return TestDirectories::GetProcessResultsPath(handset);
}

QStringList KitRun::Runs() const
{
    return QString::fromLatin1(ReadFile(m_handsets.HandsetsFolder() + u"/runs.txt"_s)).split(u'\n', Qt::SkipEmptyParts);
}

namespace {

// %1 module name, %2 seconds to sleep, %3 the commands that write the log.
const char kShardBehaviour[] = R"SH(
handset_dir=$(cd "$HANDSET_FS/.." && pwd)
handset=$(basename "$handset_dir")
runs="$handset_dir/../runs.txt"
echo "start %1 $handset" >> "$runs"
count=$(cat "$handset_dir/count" 2>/dev/null || echo 0)
count=$((count + 1))
echo "$count" > "$handset_dir/count"
if [ -f "$handset_dir/drop-at" ] && [ "$count" -ge "$(cat "$handset_dir/drop-at")" ]; then
    : > "$handset_dir/offline"
    exit 0
fi
sleep %2
%3
echo "done %1 $handset" >> "$runs"
)SH";

constexpr unsigned int kFirstShardClassId = 0x01500000;

} // namespace

QStringList AddShardModules(kitbuilder::KitBuilder &kit, int ctfModules, int appletModules, const QString &seconds)
{
    const QStringList verdicts{u"Pass"_s, u"Fail"_s, u"Unsupported"_s};
    QStringList names;
    for (int i = 0; i < ctfModules + appletModules; ++i) {
        const bool applet = i >= ctfModules;
        const QString name = (applet ? u"App%1"_s : u"Ctf%1"_s).arg(applet ? i - ctfModules : i, 2, 10, QChar(u'0'));
        const QString log = u"Suite: %1\\nTest: first\\nResult: Pass\\nTest: second\\nResult: %2\\n[/VERBOSE]\\n"_s.arg(
            name, verdicts.at(i % 3));
        const QString write = applet ? u"printf '%1' > \"$HANDSET_MODULE_DIR/%2_k.log\""_s.arg(log, name.toLower())
                                     : u"mkdir -p usermods/CTF\nprintf '%1' > usermods/CTF/CTF.log"_s.arg(log);

        kitbuilder::Module module;
        module.kind = applet ? u"ctfapplet"_s : u"ctf"_s;
        module.name = name;
        module.family = u"shard"_s;
        module.testCases = {u"first"_s, u"second"_s};
        module.variants = {u"Win32_Debug"_s};
        module.package.directory = name;
        if (applet) {
            module.package.appletIds = {kFirstShardClassId + unsigned(i)};
        } else {
            module.package.classIds = {kFirstShardClassId + unsigned(i)};
            module.package.programs = {{name + u"_k"_s, u"-v"_s}};
        }
        module.package.behaviour = QString::fromLatin1(kShardBehaviour).arg(name, seconds, write).toLatin1();
        kit.AddSourceModule(u"tests/"_s + name.toLower(), module);
        names.append(name);
    }
    for (const QString &framework : {u"ctf"_s, u"ctfapplet"_s})
        kit.AddFrameworkPackage(u"testframeworks"_s, framework, u"Win32"_s, u"Debug"_s);
    return names;
}

} // namespace testutil
