#include "support/shardkit.h"

#include "controller/harness.h"

#include <QDir>

using namespace Qt::StringLiterals;

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
    : m_kit(root + u"/kit"_s)
{
    const QStringList verdicts{u"Pass"_s, u"Fail"_s, u"Unsupported"_s};
    for (int i = 0; i < ctfModules + appletModules; ++i) {
        const bool applet = i >= ctfModules;
        const QString name = (applet ? u"App%1"_s : u"Ctf%1"_s).arg(applet ? i - ctfModules : i, 2, 10, u'0');
        const QString log = QStringLiteral("Suite: %1\nTest: first\nResult: Pass\nTest: second\n"
                                           "Result: %2\n[/VERBOSE]\n")
                                .arg(name, verdicts.at(i % 3));
        const QString write = applet
            ? u"printf '%1' > \"$HANDSET_MODULE_DIR/%2_k.log\""_s.arg(QString(log).replace(u'\n', u"\\n"_s),
                                                                      name.toLower())
            : u"mkdir -p usermods/CTF\nprintf '%1' > usermods/CTF/CTF.log"_s.arg(QString(log).replace(u'\n', u"\\n"_s));

        kitbuilder::Module module;
        module.kind = applet ? u"ctfapplet"_s : u"ctf"_s;
        module.name = name;
        module.family = u"shard"_s;
        module.testCases = {u"first"_s, u"second"_s};
        module.variants = {u"Win32_Debug"_s};
        module.package.directory = name;
        if (applet)
            module.package.appletIds = {kFirstClassId + unsigned(i)};
        else
            module.package.classIds = {kFirstClassId + unsigned(i)};
        if (!applet)
            module.package.programs = {{name + u"_k"_s, u"-v"_s}};
        module.package.behaviour = QString::fromLatin1(kBehaviour).arg(name, seconds, write).toLatin1();
        m_kit.AddSourceModule(u"tests/"_s + name.toLower(), module);
        m_names.append(name);
    }
    for (const char *framework : {"ctf", "ctfapplet"})
        m_kit.AddFrameworkPackage(u"testframeworks"_s, QString::fromLatin1(framework), u"Win32"_s, u"Debug"_s);
}

QStringList ShardKit::AddHandsets(testutil::HandsetFixture &fixture, int count, const QString &prefix)
{
    QStringList names;
    for (int i = 1; i <= count; ++i) {
        names.append(prefix + QString::number(i));
        fixture.AddHandset(names.last(), u"Emulated "_s + names.last(), u"win32"_s);
    }
    return names;
}

void ShardKit::Configure(Harness &harness, const QString &handset, const QString &logRoot, Log *log) const
{
    harness.SetLogger(log);
    harness.SetTestkit(KitPath());
    harness.SetTarget(handset);
    const QString logs = logRoot + u'/' + handset;
    QDir().mkpath(logs);
    harness.SetLogOutputPath(logs);
}

QStringList ShardKit::Runs(const testutil::HandsetFixture &fixture)
{
    return QString::fromLatin1(testutil::ReadFile(fixture.HandsetsFolder() + u"/runs.txt"_s))
        .split(u'\n', Qt::SkipEmptyParts);
}

} // namespace shardkit
