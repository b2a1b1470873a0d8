#include "support/shardkit.h"

#include "controller/harness.h"

#include <QDir>

namespace shardkit {
namespace {

// %1 module name, %2 seconds to sleep, %3 the commands that write the log.
const char kBehaviour[] = R"SH(
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

constexpr unsigned int kFirstClassId = 0x01500000;

} // namespace

ShardKit::ShardKit(const QString &root, int ctfModules, int appletModules, const QString &seconds)
    : m_kit(root + QStringLiteral("/kit"))
{
    const QStringList verdicts{QStringLiteral("Pass"), QStringLiteral("Fail"),
                               QStringLiteral("Unsupported")};
    for (int i = 0; i < ctfModules + appletModules; ++i) {
        const bool applet = i >= ctfModules;
        const QString name = (applet ? QStringLiteral("App%1") : QStringLiteral("Ctf%1"))
                                 .arg(applet ? i - ctfModules : i, 2, 10, QLatin1Char('0'));
        const QString log = QStringLiteral("Suite: %1\nTest: first\nResult: Pass\nTest: second\n"
                                           "Result: %2\n[/VERBOSE]\n")
                                .arg(name, verdicts.at(i % 3));
        const QString write =
            applet ? QStringLiteral("printf '%1' > \"$HANDSET_MODULE_DIR/%2_k.log\"")
                         .arg(QString(log).replace(QLatin1Char('\n'), QStringLiteral("\\n")), name.toLower())
                   : QStringLiteral("mkdir -p usermods/CTF\nprintf '%1' > usermods/CTF/CTF.log")
                         .arg(QString(log).replace(QLatin1Char('\n'), QStringLiteral("\\n")));

        kitbuilder::Module module;
        module.kind = applet ? QStringLiteral("ctfapplet") : QStringLiteral("ctf");
        module.name = name;
        module.family = QStringLiteral("shard");
        module.testCases = {QStringLiteral("first"), QStringLiteral("second")};
        module.variants = {QStringLiteral("Win32_Debug")};
        module.package.directory = name;
        if (applet)
            module.package.appletIds = {kFirstClassId + unsigned(i)};
        else
            module.package.classIds = {kFirstClassId + unsigned(i)};
        if (!applet)
            module.package.programs = {{name + QStringLiteral("_k"), QStringLiteral("-v")}};
        module.package.behaviour = QString::fromLatin1(kBehaviour).arg(name, seconds, write).toLatin1();
        m_kit.AddSourceModule(QStringLiteral("tests/") + name.toLower(), module);
        m_names.append(name);
    }
    for (const char *framework : {"ctf", "ctfapplet"})
        m_kit.AddFrameworkPackage(QStringLiteral("testframeworks"), QString::fromLatin1(framework),
                                  QStringLiteral("Win32"), QStringLiteral("Debug"));
}

QStringList ShardKit::AddHandsets(testutil::HandsetFixture &fixture, int count, const QString &prefix)
{
    QStringList names;
    for (int i = 1; i <= count; ++i) {
        names.append(prefix + QString::number(i));
        fixture.AddHandset(names.last(), QStringLiteral("Emulated ") + names.last(), QStringLiteral("win32"));
    }
    return names;
}

void ShardKit::Configure(Harness &harness, const QString &handset, const QString &logRoot, Log *log) const
{
    harness.SetLogger(log);
    harness.SetTestkit(KitPath());
    harness.SetTarget(handset);
    const QString logs = logRoot + QLatin1Char('/') + handset;
    QDir().mkpath(logs);
    harness.SetLogOutputPath(logs);
}

QStringList ShardKit::Runs(const testutil::HandsetFixture &fixture)
{
    return QString::fromLatin1(testutil::ReadFile(fixture.HandsetsFolder() + QStringLiteral("/runs.txt")))
        .split(QLatin1Char('\n'), Qt::SkipEmptyParts);
}

} // namespace shardkit
