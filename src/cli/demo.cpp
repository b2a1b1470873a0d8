#include "cli/commands.h"
#include "cli/options.h"

#include "catalogue/modulekind.h"
#include "modules/kitwriter.h"
#include "modules/oatframework.h"
#include "modules/oattestmodule.h"

#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QRegularExpression>

namespace {

const QString kKit = QStringLiteral("kits/DemoKit");
const QString kPlatformDir = QStringLiteral("platforms/Kesto5 Pro");
const QString kPlatformTree = kPlatformDir + QStringLiteral("/pvs/platform");

// One test module of the demo. Its behaviour script (a file of the tool's
// resources, see demo/) stands in for the test program: the emulated handset
// runs it, and it writes the log the real test framework writes. In the
// script, @SUITE@ and @LOG@ stand for suite and log, @CASES@ for the cases as
// NAME=RESULT words.
struct DemoModule
{
    QString tree; // the kit or the platform, below the demo folder
    QString folder; // below tree
    QString kind; // the module kind's type word
    QString name;
    QString family;
    QString subFamily;
    QString handsetDir; // the module's folder on the handset
    unsigned int classId; // 0: none
    unsigned int appletId; // 0: none
    KitProgram program; // no name: none
    QString suiteProgram; // OAT suite program key; empty: none
    QString script; // the behaviour script's resource name
    QString scriptMember; // its package member: "behaviour" or a suite script
    QString suite;
    QString log;
    QList<QPair<QString, QString>> cases;
    QStringList secondaryModules;
    QByteArray baseLine; // written as <name>.baseline when not empty
};

QList<DemoModule> DemoModules()
{
    const QString tests = kKit + QStringLiteral("/tests");
    const QString behaviour = QStringLiteral("behaviour");
    return {
        {kPlatformTree + QStringLiteral("/tests"),
         QStringLiteral("core/version/PlatformVersion"),
         QStringLiteral("ctf"),
         QStringLiteral("PlatformVersion"),
         QStringLiteral("core"),
         QStringLiteral("version"),
         QStringLiteral("platformversion"),
         0x20000040,
         0,
         {QStringLiteral("PlatformVersion_k"), QStringLiteral("-report")},
         QString(),
         QStringLiteral("ctf-program.sh"),
         behaviour,
         QStringLiteral("PlatformVersion"),
         QString(),
         {{QStringLiteral("ReportVersion"), QStringLiteral("PASS")},
          {QStringLiteral("CheckBuildDate"), QStringLiteral("PASS")}},
         {},
         {}},
        {tests,
         QStringLiteral("system/timer/ITimer"),
         QStringLiteral("ctf"),
         QStringLiteral("ITimer"),
         QStringLiteral("system"),
         QStringLiteral("timer"),
         QStringLiteral("itimer"),
         0x20000001,
         0,
         {QStringLiteral("ITimer_k"), QStringLiteral("-all")},
         QString(),
         QStringLiteral("ctf-program.sh"),
         behaviour,
         QStringLiteral("ITimer"),
         QString(),
         {{QStringLiteral("CreateTimer"), QStringLiteral("PASS")},
          {QStringLiteral("StartStop"), QStringLiteral("PASS")},
          {QStringLiteral("Expiry"), QStringLiteral("FAIL")},
          {QStringLiteral("HighResolution"), QStringLiteral("UNSUPPORTED")},
          {QStringLiteral("HelperPresent"), QStringLiteral("HELPER")}},
         {QStringLiteral("Helper")},
         {}},
        {tests,
         QStringLiteral("system/clock/IClock"),
         QStringLiteral("ctf"),
         QStringLiteral("IClock"),
         QStringLiteral("system"),
         QStringLiteral("clock"),
         QStringLiteral("iclock"),
         0x20000002,
         0,
         {QStringLiteral("IClock_k"), QString()},
         QString(),
         QStringLiteral("ctf-program.sh"),
         behaviour,
         QStringLiteral("IClock"),
         QString(),
         {{QStringLiteral("ReadClock"), QStringLiteral("PASS")},
          {QStringLiteral("SetAlarm"), QStringLiteral("PASS")},
          {QStringLiteral("TimeZones"), QStringLiteral("PASS")}},
         {},
         {}},
        {tests,
         QStringLiteral("ui/widgets/Widgets"),
         QStringLiteral("ctfapplet"),
         QStringLiteral("Widgets"),
         QStringLiteral("ui"),
         QStringLiteral("widgets"),
         QStringLiteral("widgets"),
         0,
         0x20000010,
         {},
         QString(),
         QStringLiteral("ctf-applet.sh"),
         behaviour,
         QStringLiteral("Widgets_k"),
         QStringLiteral("widgets_k.log"),
         {{QStringLiteral("ButtonPress"), QStringLiteral("PASS")},
          {QStringLiteral("ListScroll"), QStringLiteral("PASS")},
          {QStringLiteral("TextInput"), QStringLiteral("FAIL")}},
         {},
         {}},
        {tests,
         QStringLiteral("media/audio/OatAudio"),
         QStringLiteral("oat"),
         QStringLiteral("OatAudio"),
         QStringLiteral("media"),
         QStringLiteral("audio"),
         QStringLiteral("oataudio"),
         0x20000020,
         0,
         {},
         QStringLiteral("kesto:oat:AudioSuite"),
         QStringLiteral("oat-suite.sh"),
         QStringLiteral("suite-AudioSuite.sh"),
         QStringLiteral("OatAudio"),
         QStringLiteral("audio"),
         {{QStringLiteral("PlayTone"), QStringLiteral("Success")},
          {QStringLiteral("RecordClip"), QStringLiteral("Failed")},
          {QStringLiteral("Mixer"), QStringLiteral("Unsupported")},
          {QStringLiteral("Equalizer"), QStringLiteral("Success")}},
         {},
         "PlayTone 440Hz\n"},
        {tests,
         QStringLiteral("net/sockets/Sockets"),
         QStringLiteral("uitf"),
         QStringLiteral("Sockets"),
         QStringLiteral("net"),
         QStringLiteral("sockets"),
         QStringLiteral("utsockets"),
         0,
         0x20000030,
         {},
         QString(),
         QStringLiteral("ut-applet.sh"),
         behaviour,
         QStringLiteral("UTSockets"),
         QStringLiteral("sockets"),
         {{QStringLiteral("OpenSocket"), QStringLiteral("PASSED")},
          {QStringLiteral("Connect"), QStringLiteral("PASSED")},
          {QStringLiteral("SendReceive"), QStringLiteral("FAILED")},
          {QStringLiteral("Ipv6"), QStringLiteral("UNSUPPORTED")}},
         {},
         {}},
    };
}

QByteArray ShellQuote(const QString &text)
{
    QString quoted = text;
    quoted.replace(QLatin1Char('\''), QStringLiteral("'\\''"));
    return (QLatin1Char('\'') + quoted + QLatin1Char('\'')).toUtf8();
}

class DemoWriter
{
public:
    explicit DemoWriter(const QString &root) : m_kit(root) { }

    // Writes the whole environment; false with ErrorString() on failure.
    bool Write();
    QString ErrorString() const { return m_error.isEmpty() ? m_kit.ErrorString() : m_error; }
    QString EnvironmentText() const;

private:
    QString Root() const { return m_kit.Root(); }
    bool Fail(const QString &error);
    // A file of the tool's resources with every @KEY@ of values replaced.
    QByteArray Resource(const QString &name, const QList<QPair<QString, QByteArray>> &values = {});
    bool Copy(const QString &resource, const QString &relative, bool executable = false);

    bool WriteToolSet();
    bool WriteHandsetAndData();
    bool WriteFrameworks();
    bool WriteModule(const DemoModule &module);
    bool WriteSecondaryModule();

    KitWriter m_kit;
    QString m_error;
};

bool DemoWriter::Fail(const QString &error)
{
    if (m_error.isEmpty())
        m_error = error;
    return false;
}

QByteArray DemoWriter::Resource(const QString &name, const QList<QPair<QString, QByteArray>> &values)
{
    QFile file(QStringLiteral(":/demo/") + name);
    if (!file.open(QIODevice::ReadOnly)) {
        Fail(QStringLiteral("the tool lacks its demo file %1").arg(name));
        return QByteArray();
    }
    QByteArray text = file.readAll();
    for (const auto &value : values)
        text.replace('@' + value.first.toUtf8() + '@', value.second);
    return text;
}

bool DemoWriter::Copy(const QString &resource, const QString &relative, bool executable)
{
    const QByteArray text = Resource(resource);
    return !text.isEmpty() && !m_kit.AddFile(relative, text, executable).isEmpty();
}

bool DemoWriter::WriteToolSet()
{
    // Stand-in resource compilers built on `harness res compile`.
    const QList<QPair<QString, QByteArray>> harness{
        {QStringLiteral("HARNESS"), ShellQuote(QCoreApplication::applicationFilePath())}};
    for (const auto &tool : {qMakePair(QStringLiteral("kestormc.sh"), QStringLiteral("toolset/bin/kestormc.exe")),
                             qMakePair(QStringLiteral("kestorc.sh"),
                                       QStringLiteral("toolset/bin/deprecated/ResourceEditor/kestorc.exe"))}) {
        const QByteArray text = Resource(tool.first, harness);
        if (text.isEmpty() || m_kit.AddFile(tool.second, text, true).isEmpty())
            return false;
    }
    return true;
}

bool DemoWriter::WriteHandsetAndData()
{
    // Test data for the tool set to convert and compile, one emulated
    // handset, and the platform's default device pack.
    const QString reference = kPlatformTree + QStringLiteral("/testframeworks/oat/tools/reference/");
    return Copy(QStringLiteral("demo.ksx"), QStringLiteral("testdata/demo.ksx"))
        && Copy(QStringLiteral("handset.ini"), QStringLiteral("handsets/demo-phone/handset.ini"))
        && Copy(QStringLiteral("deviceref.dso"), reference + QStringLiteral("deviceref.dso"))
        && Copy(QStringLiteral("peripherals.ent"), reference + QStringLiteral("peripherals.ent"));
}

bool DemoWriter::WriteFrameworks()
{
    const QString frameworks = kKit + QStringLiteral("/testframeworks");
    for (const ModuleKind &kind : ModuleKinds()) {
        if (kind.frameworkClassId == 0)
            continue;
        KitPackage layout;
        layout.directory = kind.type;
        layout.classIds = {kind.frameworkClassId};
        if (kind.type == OatTestModule::Type()) {
            // The OAT framework runs the suites as an applet of its own.
            layout.appletIds = {_OatFramework::kClassId};
            layout.behaviour = Resource(QStringLiteral("oat-framework.sh"));
            if (layout.behaviour.isEmpty())
                return false;
        }
        if (m_kit
                .AddFrameworkPackage(frameworks, kind.type, QStringLiteral("Win32"), QStringLiteral("Release"), &layout)
                .isEmpty())
            return false;
    }
    return Copy(QStringLiteral("PostProcess3.pl"), frameworks + QStringLiteral("/oat/tools/bin/PostProcess3.pl"), true);
}

bool DemoWriter::WriteModule(const DemoModule &module)
{
    // Suite and log names go into the scripts as they are.
    static const QRegularExpression plain(QStringLiteral("^[A-Za-z0-9_.-]*$"));
    if (!plain.match(module.suite).hasMatch() || !plain.match(module.log).hasMatch())
        return Fail(QStringLiteral("the demo module %1 has an unusable suite or log name").arg(module.name));
    QByteArray cases;
    for (const auto &c : module.cases)
        cases += (cases.isEmpty() ? "" : " ") + ShellQuote(c.first + QLatin1Char('=') + c.second);
    const QByteArray script = Resource(module.script,
                                       {{QStringLiteral("SUITE"), module.suite.toUtf8()},
                                        {QStringLiteral("LOG"), module.log.toUtf8()},
                                        {QStringLiteral("CASES"), cases}});
    if (script.isEmpty())
        return false;

    KitModule kit;
    kit.kind = module.kind;
    kit.name = module.name;
    kit.family = module.family;
    kit.subFamily = module.subFamily;
    for (const auto &c : module.cases)
        kit.testCases << c.first;
    kit.secondaryModules = module.secondaryModules;
    kit.variants = {QStringLiteral("Win32_Release")};
    kit.source = "/* Sources of the " + module.name.toUtf8() + " test module. */\n";
    kit.package.directory = module.handsetDir;
    kit.package.mifName = module.name + QStringLiteral(".mif");
    if (module.classId != 0)
        kit.package.classIds = {module.classId};
    if (module.appletId != 0)
        kit.package.appletIds = {module.appletId};
    if (!module.program.name.isEmpty())
        kit.package.programs = {module.program};
    if (!module.suiteProgram.isEmpty())
        kit.package.suitePrograms = {module.suiteProgram};
    if (module.scriptMember == QLatin1String("behaviour"))
        kit.package.behaviour = script;
    else
        kit.package.files = {{module.scriptMember, script}};

    const QString folder = module.tree + QLatin1Char('/') + module.folder;
    if (m_kit.AddSourceModule(folder, kit).isEmpty())
        return false;
    return module.baseLine.isEmpty()
        || !m_kit.AddFile(folder + QLatin1Char('/') + module.name + QStringLiteral(".baseline"), module.baseLine)
                .isEmpty();
}

bool DemoWriter::WriteSecondaryModule()
{
    // A package without a description, needed by ITimer.
    KitPackage helper;
    helper.directory = QStringLiteral("Helper");
    helper.classIds = {0x20000050};
    helper.files = {{QStringLiteral("helper.dat"), "helper data for ITimer\n"}};
    return !m_kit
                .AddPackage(kKit + QStringLiteral("/tests/common/Helper/package"),
                            QStringLiteral("Helper_Win32_Release"), helper.Members())
                .isEmpty();
}

bool DemoWriter::Write()
{
    if (!m_kit.Ok() || !WriteToolSet() || !WriteHandsetAndData() || !WriteFrameworks())
        return false;
    for (const DemoModule &module : DemoModules()) {
        if (!WriteModule(module))
            return false;
    }
    return WriteSecondaryModule() && !m_kit.AddFile(QStringLiteral("env.sh"), EnvironmentText().toUtf8()).isEmpty()
        && !m_kit.AddDirectory(QStringLiteral("data")).isEmpty();
}

QString DemoWriter::EnvironmentText() const
{
    auto line = [](const char *name, const QString &value) {
        return QStringLiteral("export %1=%2\n").arg(QLatin1String(name), QString::fromUtf8(ShellQuote(value)));
    };
    return line("KESTIX_DATA_ROOT", m_kit.Path(QStringLiteral("data")))
        + line("KESTIX_HANDSETS", m_kit.Path(QStringLiteral("handsets")))
        + line("KESTIX_TOOLSET", m_kit.Path(QStringLiteral("toolset")))
        + line("KESTIX_PLATFORMS_ALL", m_kit.Path(QStringLiteral("platforms")))
        + line("KESTIX_PLATFORM", m_kit.Path(kPlatformDir) + QLatin1Char('/'))
        + line("KESTIX_TESTSETS_ALL", m_kit.Path(QStringLiteral("kits"))) + line("KESTIX_TESTSET", m_kit.Path(kKit));
}

int DemoCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(
        QStringLiteral("demo init DIR: writes a complete demo environment into DIR (a new or empty folder): a "
                       "professional platform, a test kit with frameworks and modules of every kind, a stand-in SDK "
                       "tool set, test data and one emulated handset. Prints the environment variables that point at "
                       "it (also written to DIR/env.sh)."));
    parser.addPositionalArgument(QStringLiteral("init"), QStringLiteral("The action."));
    parser.addPositionalArgument(QStringLiteral("DIR"), QStringLiteral("The folder to create."));
    int status = ExitSuccess;
    if (!ParseArguments(parser, arguments, status, 2, 2))
        return status;
    if (parser.positionalArguments().at(0) != QLatin1String("init")) {
        Err(arguments.at(0) + QStringLiteral(": expected 'init DIR'\n"));
        return ExitUsage;
    }
    const QString dir = parser.positionalArguments().at(1);
    if (QFileInfo::exists(dir) && !QDir(dir).isEmpty(QDir::AllEntries | QDir::NoDotAndDotDot | QDir::Hidden)) {
        Err(arguments.at(0) + QStringLiteral(": %1 exists and is not empty\n").arg(dir));
        return ExitUsage;
    }
    DemoWriter writer(dir);
    if (!writer.Write()) {
        Err(arguments.at(0) + QStringLiteral(": ") + writer.ErrorString() + QLatin1Char('\n'));
        return ExitUsage;
    }
    Out(writer.EnvironmentText());
    return ExitSuccess;
}

} // namespace

QList<Command> DemoCommands()
{
    return {
        {"demo", "Write a demo environment: platform, test kit, tool set and handset", DemoCommand},
    };
}
