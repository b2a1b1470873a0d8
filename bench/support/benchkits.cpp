#include "support/benchkits.h"

#include "support/benchutil.h"
#include "support/kitbuilder.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QStringList>

namespace benchkits {

namespace {

const char *const kKinds[] = {"ctf", "ctfapplet", "oat", "uitf", "secondary"};
const char *const kTags[] = {"Ctf", "Applet", "Oat", "Ut", "Sec"};

// A generated folder is complete when its marker exists: an interrupted
// generation is redone.
bool Complete(const QString &folder)
{
    return QFileInfo::exists(folder + QStringLiteral("/.complete"));
}

bool MarkComplete(const QString &folder)
{
    QFile marker(folder + QStringLiteral("/.complete"));
    return marker.open(QIODevice::WriteOnly);
}

bool WriteText(const QString &path, const QByteArray &bytes)
{
    QFile file(path);
    return file.open(QIODevice::WriteOnly | QIODevice::Truncate) && file.write(bytes) == bytes.size();
}

QByteArray LogOf(const ModuleInfo &module, int index)
{
    const QByteArray name = module.name.toUtf8();
    QByteArray log;
    const auto verdict = [index](int testCase, const char *pass, const char *fail) {
        return (testCase + index) % 7 == 0 ? fail : pass;
    };
    if (module.kind == QLatin1String("ctf") || module.kind == QLatin1String("ctfapplet")) {
        log += "Suite: " + name + "\nTime: 2026/12/03 14:05:09\n";
        for (int t = 0; t < module.testCases; ++t)
            log += "Test: " + TestCaseName(t).toUtf8() + "\nResult: " + verdict(t, "Pass", "Fail") + "\n";
        log += "[/VERBOSE]\n";
    } else if (module.kind == QLatin1String("oat")) {
        log += "@#" + name + "#\nTimeStamp: 14:05:09 12-03-2026\n";
        for (int t = 0; t < module.testCases; ++t)
            log += "@" + QByteArray::number(t + 1) + ": " + TestCaseName(t).toUtf8()
                + "\nStatus: " + verdict(t, "Success", "Failed") + "\n";
        log += "TEST RESULT: done\n";
    } else {
        log += "SuiteName: UT" + name + " 14:05:09 03-Dec-2026\n---- results\n";
        for (int t = 0; t < module.testCases; ++t)
            log += TestCaseName(t).toUtf8() + " " + verdict(t, "PASSED", "FAILED") + " 12 ms\n";
        log += "----------\nElapsed Time: 12s\n";
    }
    return log;
}

QString LogName(const ModuleInfo &module)
{
    if (module.kind == QLatin1String("ctf"))
        return module.name + QStringLiteral("-CTF-1.log");
    if (module.kind == QLatin1String("ctfapplet"))
        return module.name + QStringLiteral("-1.log");
    if (module.kind == QLatin1String("oat"))
        return module.name + QStringLiteral(".oat");
    return module.name + QStringLiteral(".txt");
}

} // namespace

ModuleInfo ModuleAt(int index)
{
    const int kind = index % 5;
    ModuleInfo info;
    info.kind = QLatin1String(kKinds[kind]);
    info.name = QStringLiteral("%1Module%2").arg(QLatin1String(kTags[kind])).arg(index, 5, 10, QLatin1Char('0'));
    info.folder = QStringLiteral("tests/family%1/sub%2/%3").arg(index % 16).arg(index % 5).arg(info.name);
    info.testCases = 20 + (index * 7) % 31;
    return info;
}

QString TestCaseName(int index)
{
    return QStringLiteral("Case%1").arg(index, 2, 10, QLatin1Char('0'));
}

QString Kit(int modules, QString *error)
{
    QString ignored;
    if (!error)
        error = &ignored;
    const QString root = benchutil::WorkFolder() + QStringLiteral("/kit-%1").arg(modules);
    if (Complete(root))
        return root;
    QDir(root).removeRecursively();
    kitbuilder::KitBuilder kit(root);
    for (const char *framework : {"ctf", "ctfapplet", "oat", "uitf"}) {
        for (const char *variant : {"Win32_Debug", "RVCT22arm9_Release"}) {
            const QStringList parts = QString::fromLatin1(variant).split(QLatin1Char('_'));
            kit.AddFrameworkPackage(QStringLiteral("testframeworks"), QLatin1String(framework), parts[0], parts[1]);
        }
    }
    for (int i = 0; i < modules && kit.Ok(); ++i) {
        const ModuleInfo info = ModuleAt(i);
        kitbuilder::Module module;
        module.kind = info.kind;
        module.name = info.name;
        // Half of the descriptions name their family; the others take it
        // from the path.
        if (i % 2 == 0) {
            module.family = QStringLiteral("Family%1").arg(i % 16);
            module.subFamily = QStringLiteral("Sub%1").arg(i % 5);
        }
        for (int t = 0; t < info.testCases; ++t)
            module.testCases << TestCaseName(t);
        module.package.classIds = {0x10000000u + unsigned(i), 0x18000000u + unsigned(i)};
        if (info.kind == QLatin1String("ctfapplet"))
            module.package.appletIds = {0x20000000u + unsigned(i)};
        kit.AddSourceModule(info.folder, module);
        if (i % 25 == 24) {
            // Libraries shipped as packages only: secondary modules.
            kitbuilder::Module library;
            library.name = QStringLiteral("Library%1").arg(i, 5, 10, QLatin1Char('0'));
            library.package.classIds = {0x30000000u + unsigned(i)};
            kit.AddModulePackages(QStringLiteral("libraries/%1/package").arg(library.name), library);
        }
    }
    if (!kit.Ok() || !MarkComplete(root)) {
        *error = kit.Errors().value(0, QStringLiteral("cannot mark %1 complete").arg(root));
        return QString();
    }
    return root;
}

QString Logs(int modules, QString *error)
{
    QString ignored;
    if (!error)
        error = &ignored;
    const QString root = benchutil::WorkFolder() + QStringLiteral("/logs-%1").arg(modules);
    if (Complete(root))
        return root;
    QDir(root).removeRecursively();
    if (!QDir().mkpath(root)) {
        *error = QStringLiteral("cannot create %1").arg(root);
        return QString();
    }
    if (!QDir().mkpath(root + QStringLiteral("/rerun"))) {
        *error = QStringLiteral("cannot create %1/rerun").arg(root);
        return QString();
    }
    for (int i = 0; i < modules; ++i) {
        ModuleInfo info = ModuleAt(i);
        QString folder = root;
        int run = i;
        if (info.kind == QLatin1String("secondary")) {
            // Secondary modules leave no log of their own; their place is
            // taken by a second run of one of the four modules before.
            run = i - 1 - (i / 5) % 4;
            info = ModuleAt(run);
            folder = root + QStringLiteral("/rerun");
        }
        if (!WriteText(folder + QLatin1Char('/') + LogName(info), LogOf(info, i))) {
            *error = QStringLiteral("cannot write the log of %1").arg(info.name);
            return QString();
        }
    }
    if (!MarkComplete(root)) {
        *error = QStringLiteral("cannot mark %1 complete").arg(root);
        return QString();
    }
    return root;
}

void KitSizes(benchmark::internal::Benchmark *benchmark)
{
    benchmark->ArgName("modules")->Unit(benchmark::kMillisecond);
    benchmark->Arg(500);
    benchmark->Arg(2000);
    benchmark->Arg(8000);
    benchutil::SetMinTime(benchmark, 0.5);
}

QStringList LogFiles(const QString &folder)
{
    QStringList files;
    const QFileInfoList entries = QDir(folder).entryInfoList(
        {QStringLiteral("*.oat"), QStringLiteral("*.log"), QStringLiteral("*.txt")}, QDir::Files, QDir::Name);
    for (const QFileInfo &entry : entries)
        files << entry.absoluteFilePath();
    const QFileInfoList folders = QDir(folder).entryInfoList(QDir::Dirs | QDir::NoDotAndDotDot, QDir::Name);
    for (const QFileInfo &sub : folders) {
        if (sub.fileName() != QLatin1String("oatRawLogs") && sub.fileName() != QLatin1String("ProcessedResults"))
            files << LogFiles(sub.absoluteFilePath());
    }
    return files;
}

} // namespace benchkits
