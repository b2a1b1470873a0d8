#include "cli/commands.h"
#include "cli/options.h"

#include "archive/tar.h"
#include "resources/mifbuilder.h"

#include <QCoreApplication>
#include <QDir>
#include <QFile>
#include <QFileInfo>

namespace {

// Class IDs of the demo's frameworks and modules.
constexpr unsigned int kCtfFramework = 0x0102F2AA;
constexpr unsigned int kCtfAppletFramework = 0x010C02E5;
constexpr unsigned int kUtFramework = 0x010421E8;
constexpr unsigned int kOatFramework = 0x0107556B;
constexpr unsigned int kOatFrameworkApplet = 0x01010001;

class DemoWriter
{
public:
    explicit DemoWriter(const QString &root) : m_root(QDir::cleanPath(QDir(root).absolutePath())) {}

    bool Write(QString *error);
    QString Root() const { return m_root; }
    QString Kit() const { return m_root + QStringLiteral("/kits/DemoKit"); }
    QString PlatformDir() const { return m_root + QStringLiteral("/platforms/Kesto5 Pro"); }
    QString PlatformTree() const { return PlatformDir() + QStringLiteral("/pvs/platform"); }
    QString EnvironmentText() const;

private:
    bool Text(const QString &path, const QByteArray &text, bool executable = false);
    bool Package(const QString &path, const QList<QPair<QString, QByteArray>> &members);
    bool Framework(const QString &name, unsigned int classId, const QList<QPair<QString, QByteArray>> &extra,
                   unsigned int applet = 0);
    bool Module(const QString &tree, const QString &folder, const QString &descriptionFile, const QString &name,
                const QString &family, const QString &subFamily, const QStringList &testCases,
                const QByteArray &extraXml, const QString &handsetDir, const QByteArray &mif,
                const QList<QPair<QString, QByteArray>> &files);

    QString m_root;
    QString m_error;
};

QByteArray ShellQuote(const QString &text)
{
    QString quoted = text;
    quoted.replace(QLatin1Char('\''), QStringLiteral("'\\''"));
    return (QLatin1Char('\'') + quoted + QLatin1Char('\'')).toUtf8();
}

bool DemoWriter::Text(const QString &path, const QByteArray &text, bool executable)
{
    if (!QDir().mkpath(QFileInfo(path).absolutePath())) {
        m_error = QStringLiteral("cannot create the folder of %1").arg(path);
        return false;
    }
    QFile file(path);
    if (!file.open(QIODevice::WriteOnly | QIODevice::Truncate) || file.write(text) != text.size()) {
        m_error = QStringLiteral("cannot write %1").arg(path);
        return false;
    }
    file.close();
    if (executable)
        file.setPermissions(file.permissions() | QFileDevice::ExeOwner | QFileDevice::ExeGroup | QFileDevice::ExeOther);
    return true;
}

bool DemoWriter::Package(const QString &path, const QList<QPair<QString, QByteArray>> &members)
{
    if (!QDir().mkpath(QFileInfo(path).absolutePath())) {
        m_error = QStringLiteral("cannot create the folder of %1").arg(path);
        return false;
    }
    Tar tar;
    for (const auto &member : members)
        tar.AddFile(member.first, member.second);
    if (!tar.Write(path)) {
        m_error = QStringLiteral("cannot write the package %1").arg(path);
        return false;
    }
    return true;
}

bool DemoWriter::Framework(const QString &name, unsigned int classId,
                           const QList<QPair<QString, QByteArray>> &extra, unsigned int applet)
{
    MifBuilder mif;
    mif.AddClass(classId);
    if (applet != 0)
        mif.AddApplet(applet);
    QList<QPair<QString, QByteArray>> members{{name + QLatin1Char('/') + name + QStringLiteral(".mif"), mif.Build()}};
    for (const auto &file : extra)
        members.append({name + QLatin1Char('/') + file.first, file.second});
    return Package(Kit() + QStringLiteral("/testframeworks/run/%1_Win32_Release.kestix").arg(name), members);
}

bool DemoWriter::Module(const QString &tree, const QString &folder, const QString &descriptionFile,
                        const QString &name, const QString &family, const QString &subFamily,
                        const QStringList &testCases, const QByteArray &extraXml, const QString &handsetDir,
                        const QByteArray &mif, const QList<QPair<QString, QByteArray>> &files)
{
    const QString dir = tree + QLatin1Char('/') + folder;
    QByteArray xml = "<module>\n <suite NAME=\"" + name.toUtf8() + "\" FAMILY=\"" + family.toUtf8()
        + "\" SUBFAMILY=\"" + subFamily.toUtf8() + "\">\n";
    for (const QString &testCase : testCases)
        xml += "  <testcase NAME=\"" + testCase.toUtf8() + "\" TYPE=\"auto\"/>\n";
    xml += extraXml + " </suite>\n</module>\n";
    QList<QPair<QString, QByteArray>> members{{handsetDir + QLatin1Char('/') + name + QStringLiteral(".mif"), mif}};
    for (const auto &file : files)
        members.append({handsetDir + QLatin1Char('/') + file.first, file.second});
    return Text(dir + QLatin1Char('/') + descriptionFile, xml)
        && Text(dir + QStringLiteral("/src/") + name.toLower() + QStringLiteral(".c"),
                "/* Sources of the " + name.toUtf8() + " test module. */\n")
        && Package(dir + QStringLiteral("/package/%1_Win32_Release.kestix").arg(name), members);
}

// The behaviour scripts stand in for the test programs: the emulated handset
// runs them as "sh behaviour program NAME ARGS" or "sh behaviour applet
// 0xCLASSID ARGS" inside its file system, and they write the logs the real
// test frameworks write.

QByteArray CtfProgramBehaviour(const QString &suite, const QList<QPair<QString, QString>> &cases)
{
    QByteArray script = "#!/bin/sh\n"
                        "# The " + suite.toUtf8() + " CTF test program: writes the CTF log.\n"
                        "log=\"$HANDSET_FS/usermods/CTF/CTF.log\"\n"
                        "mkdir -p \"$(dirname \"$log\")\"\n"
                        "helper=FAIL\n"
                        "[ -e \"$HANDSET_FS/usermods/Helper/helper.dat\" ] && helper=PASS\n"
                        "{\n"
                        "echo '[VERBOSE]'\n"
                        "echo 'Suite: " + suite.toUtf8() + "'\n"
                        "echo \"Time: $(date '+%Y/%m/%d %H:%M:%S')\"\n";
    for (const auto &c : cases) {
        script += "echo 'Test: " + c.first.toUtf8() + "'\n";
        if (c.second == QLatin1String("$helper"))
            script += "echo \"Result: $helper\"\n";
        else
            script += "echo 'Result: " + c.second.toUtf8() + "'\n";
    }
    script += "echo '[/VERBOSE]'\n} > \"$log\"\n";
    return script;
}

QByteArray CtfAppletBehaviour(const QString &suite, const QString &logName, const QList<QPair<QString, QString>> &cases)
{
    QByteArray script = "#!/bin/sh\n"
                        "# The " + suite.toUtf8() + " CTF applet: writes its log beside itself.\n"
                        "{\n"
                        "echo '[VERBOSE]'\n"
                        "echo 'Suite: " + suite.toUtf8() + "'\n"
                        "echo \"Time: $(date '+%Y/%m/%d %H:%M:%S')\"\n";
    for (const auto &c : cases)
        script += "echo 'Test: " + c.first.toUtf8() + " (applet run)'\necho 'Result: " + c.second.toUtf8() + "'\n";
    script += "echo '[/VERBOSE]'\n} > \"$HANDSET_MODULE_DIR/" + logName.toUtf8() + "\"\n";
    return script;
}

QByteArray OatFrameworkBehaviour()
{
    return "#!/bin/sh\n"
           "# The OAT framework applet: started as \"applet 0x01010001 -dk MODE PROGRAM[,CASE...]\",\n"
           "# runs the suite script that the module providing PROGRAM installed.\n"
           "mode=$4\n"
           "layout=$5\n"
           "program=${layout%%,*}\n"
           "cases=\n"
           "[ \"$program\" != \"$layout\" ] && cases=${layout#*,}\n"
           "for dir in \"$HANDSET_FS\"/usermods/*/; do\n"
           "  if [ -f \"$dir/suite-$program.sh\" ]; then\n"
           "    exec sh \"$dir/suite-$program.sh\" \"$mode\" \"$cases\"\n"
           "  fi\n"
           "done\n"
           "echo \"OAT: no suite $program\" >&2\n"
           "exit 1\n";
}

QByteArray OatSuiteScript(const QString &module, const QString &logBase, const QList<QPair<QString, QString>> &cases)
{
    QByteArray script = "#!/bin/sh\n"
                        "# The " + module.toUtf8() + " OAT suite: MODE [CASE,CASE...]; writes the .oat log.\n"
                        "cases=\",$2,\"\n"
                        "log=\"$HANDSET_FS/shared/pek/log/" + logBase.toUtf8() + ".oat\"\n"
                        "mkdir -p \"$(dirname \"$log\")\"\n"
                        "run() { [ \"$cases\" = \",,\" ] || case \"$cases\" in *,$1,*) ;; *) return 1;; esac; }\n"
                        "{\n"
                        "echo '@" + module.toUtf8() + "'\n"
                        "echo 'ModuleVer: 1.2.0'\n"
                        "echo \"TimeStamp: $(date '+%H:%M:%S %m-%d-%Y')\"\n";
    for (const auto &c : cases)
        script += "run '" + c.first.toUtf8() + "' && { echo '@Case:" + c.first.toUtf8() + "'; echo 'Status: "
            + c.second.toUtf8() + "'; }\n";
    script += "echo 'RESULT: complete'\n} > \"$log\"\n";
    return script;
}

QByteArray UtBehaviour(const QString &suite, const QString &logName, const QList<QPair<QString, QString>> &cases)
{
    QByteArray script = "#!/bin/sh\n"
                        "# The " + suite.toUtf8() + " unit test applet: writes a text and an XML log.\n"
                        "dir=\"$HANDSET_MODULE_DIR/log\"\n"
                        "mkdir -p \"$dir\"\n"
                        "{\n"
                        "echo 'Kesto unit test run'\n"
                        "echo \"SuiteName: " + suite.toUtf8() + " $(LC_ALL=C date '+%H:%M:%S %d-%b-%Y')\"\n"
                        "echo '---------------------------------------------'\n";
    QByteArray xml;
    int ms = 7;
    for (const auto &c : cases) {
        script += "echo '" + c.first.toUtf8() + " " + c.second.toUtf8() + " " + QByteArray::number(ms) + " ms'\n";
        xml += "echo ' <test name=\"" + c.first.toUtf8() + "\" result=\"" + c.second.toLower().toUtf8() + "\"/>'\n";
        ms += 11;
    }
    script += "echo '---------------------------------------------'\n"
              "echo 'Elapsed Time: 0.2 s'\n"
              "} > \"$dir/" + logName.toUtf8() + ".txt\"\n"
              "{\n"
              "echo '<TestRunLog suite=\"" + suite.toUtf8() + "\">'\n" + xml +
              "echo '</TestRunLog>'\n"
              "} > \"$dir/" + logName.toUtf8() + ".xml\"\n";
    return script;
}

QByteArray PostProcessScript()
{
    return "#!/usr/bin/env perl\n"
           "# OAT post-processing of the demo kit.\n"
           "#   PostProcess3.pl SOURCE TEMP DEVICEPACK PLATFORM\n"
           "# Reads every raw .oat log in SOURCE, writes the processed log (a header\n"
           "# naming the device pack and platform, then the log) into TEMP, and moves the\n"
           "# raw log into SOURCE/processed so that each log is processed once.\n"
           "use strict;\n"
           "use warnings;\n"
           "use File::Copy qw(move);\n"
           "use File::Path qw(make_path);\n"
           "\n"
           "my ($source, $temp, $devicePack, $platform) = @ARGV;\n"
           "die \"usage: PostProcess3.pl SOURCE TEMP DEVICEPACK PLATFORM\\n\" unless defined $platform;\n"
           "make_path(\"$source/processed\", $temp);\n"
           "opendir(my $dir, $source) or die \"PostProcess3: cannot read $source: $!\\n\";\n"
           "my @logs = sort grep { /\\.oat$/i && -f \"$source/$_\" } readdir($dir);\n"
           "closedir($dir);\n"
           "for my $log (@logs) {\n"
           "    open(my $in, '<', \"$source/$log\") or die \"PostProcess3: cannot read $log: $!\\n\";\n"
           "    my @lines = <$in>;\n"
           "    close($in);\n"
           "    open(my $out, '>', \"$temp/$log\") or die \"PostProcess3: cannot write $log: $!\\n\";\n"
           "    print $out \"# processed for $platform with $devicePack\\n\", @lines;\n"
           "    close($out);\n"
           "    move(\"$source/$log\", \"$source/processed/$log\");\n"
           "}\n"
           "printf(\"   PostProcess3: %d log(s) processed\\n\", scalar(@logs));\n";
}

bool DemoWriter::Write(QString *error)
{
    const QString harnessPath = QCoreApplication::applicationFilePath();
    const QByteArray harness = ShellQuote(harnessPath);
    auto fail = [&]() {
        *error = m_error;
        return false;
    };

    // The SDK tool set: stand-in resource compilers built on `harness res compile`.
    const QByteArray current =
        "#!/bin/sh\n"
        "# Stand-in for the SDK resource compiler:\n"
        "#   kestormc.exe -convert -infile SOURCE.ksx -outfile OUT.car   (copies the source)\n"
        "#   kestormc.exe -compile -infile SOURCE -outfile OUT            (harness res compile)\n"
        "action=; in=; out=\n"
        "while [ $# -gt 0 ]; do\n"
        "  case \"$1\" in\n"
        "    -convert) action=convert ;;\n"
        "    -compile) action=compile ;;\n"
        "    -infile) in=$2; shift ;;\n"
        "    -outfile) out=$2; shift ;;\n"
        "  esac\n"
        "  shift\n"
        "done\n"
        "case \"$action\" in\n"
        "  convert) cp \"$in\" \"$out\" && echo \"Successfully converted file $in\" ;;\n"
        "  compile) exec " + harness + " res compile \"$in\" \"$out\" ;;\n"
        "  *) echo \"kestormc: nothing to do\"; exit 2 ;;\n"
        "esac\n";
    const QByteArray older = "#!/bin/sh\n"
                             "# Stand-in for the older SDK resource compiler: kestorc.exe -nh -o OUT SOURCE\n"
                             "[ \"$1\" = -nh ] && shift\n"
                             "[ \"$1\" = -o ] || { echo \"kestorc: expected -o OUT SOURCE\"; exit 2; }\n"
                             "exec " + harness + " res compile \"$3\" \"$2\"\n";
    if (!Text(m_root + QStringLiteral("/toolset/bin/kestormc.exe"), current, true)
        || !Text(m_root + QStringLiteral("/toolset/bin/deprecated/ResourceEditor/kestorc.exe"), older, true))
        return fail();

    // Test data: a resource source converted and compiled by the tool set.
    if (!Text(m_root + QStringLiteral("/testdata/demo.ksx"),
              "<resources>\n"
              " <string id=\"1\" format=\"UTF-8\">Kesto demo test data</string>\n"
              " <string id=\"2\" format=\"S-JIS\">\xe3\x83\x86\xe3\x82\xb9\xe3\x83\x88</string>\n"
              " <object id=\"1\" mime=\"text/plain\">tone=440Hz;length=2s</object>\n"
              "</resources>\n"))
        return fail();

    // The handset.
    if (!Text(m_root + QStringLiteral("/handsets/demo-phone/handset.ini"),
              "[General]\ndescription=Kesto 5 demo handset (emulated)\nplatform=win32\nversion=5.0.1\n"))
        return fail();

    // The professional platform with its default device pack and a module of its own.
    if (!Text(PlatformTree() + QStringLiteral("/testframeworks/oat/tools/reference/deviceref.dso"),
              "<?xml version=\"1.0\"?>\n"
              "<!DOCTYPE devicepack [\n"
              "<!ENTITY peripherals SYSTEM \"peripherals.ent\">\n"
              "]>\n"
              "<devicepack name=\"Kesto 5 reference\">\n"
              " <display width=\"240\" height=\"320\"/>\n"
              " <audio codecs=\"pcm,mp3\"/>\n"
              " &peripherals;\n"
              " <display depth=\"16\"/>\n"
              "</devicepack>\n")
        || !Text(PlatformTree() + QStringLiteral("/testframeworks/oat/tools/reference/peripherals.ent"),
                 "<peripherals><keypad keys=\"12\"/><camera megapixels=\"2\"/></peripherals>\n"))
        return fail();
    {
        MifBuilder mif;
        mif.AddClass(0x20000040);
        mif.AddProgram(QStringLiteral("PlatformVersion_k"), QStringLiteral("-report"));
        if (!Module(PlatformTree() + QStringLiteral("/tests"), QStringLiteral("core/version/PlatformVersion"),
                    QStringLiteral("ctfmodule.xml"), QStringLiteral("PlatformVersion"), QStringLiteral("core"),
                    QStringLiteral("version"), {QStringLiteral("ReportVersion"), QStringLiteral("CheckBuildDate")},
                    QByteArray(), QStringLiteral("platformversion"), mif.Build(),
                    {{QStringLiteral("behaviour"),
                      CtfProgramBehaviour(QStringLiteral("PlatformVersion"),
                                          {{QStringLiteral("ReportVersion"), QStringLiteral("PASS")},
                                           {QStringLiteral("CheckBuildDate"), QStringLiteral("PASS")}})}}))
            return fail();
    }

    // The test kit: frameworks, tools and modules of every kind.
    if (!Framework(QStringLiteral("ctf"), kCtfFramework, {})
        || !Framework(QStringLiteral("ctfapplet"), kCtfAppletFramework, {})
        || !Framework(QStringLiteral("uitf"), kUtFramework, {})
        || !Framework(QStringLiteral("oat"), kOatFramework, {{QStringLiteral("behaviour"), OatFrameworkBehaviour()}},
                      kOatFrameworkApplet)
        || !Text(Kit() + QStringLiteral("/testframeworks/oat/tools/bin/PostProcess3.pl"), PostProcessScript(), true))
        return fail();

    const QString tests = Kit() + QStringLiteral("/tests");
    {
        MifBuilder mif;
        mif.AddClass(0x20000001);
        mif.AddProgram(QStringLiteral("ITimer_k"), QStringLiteral("-all"));
        const QList<QPair<QString, QString>> cases{{QStringLiteral("CreateTimer"), QStringLiteral("PASS")},
                                                   {QStringLiteral("StartStop"), QStringLiteral("PASS")},
                                                   {QStringLiteral("Expiry"), QStringLiteral("FAIL")},
                                                   {QStringLiteral("HighResolution"), QStringLiteral("UNSUPPORTED")},
                                                   {QStringLiteral("HelperPresent"), QStringLiteral("$helper")}};
        QStringList names;
        for (const auto &c : cases)
            names << c.first;
        if (!Module(tests, QStringLiteral("system/timer/ITimer"), QStringLiteral("ctfmodule.xml"),
                    QStringLiteral("ITimer"), QStringLiteral("system"), QStringLiteral("timer"), names,
                    "  <secondary_modules>Helper</secondary_modules>\n", QStringLiteral("itimer"), mif.Build(),
                    {{QStringLiteral("behaviour"), CtfProgramBehaviour(QStringLiteral("ITimer"), cases)}}))
            return fail();
    }
    {
        MifBuilder mif;
        mif.AddClass(0x20000002);
        mif.AddProgram(QStringLiteral("IClock_k"));
        const QList<QPair<QString, QString>> cases{{QStringLiteral("ReadClock"), QStringLiteral("PASS")},
                                                   {QStringLiteral("SetAlarm"), QStringLiteral("PASS")},
                                                   {QStringLiteral("TimeZones"), QStringLiteral("PASS")}};
        if (!Module(tests, QStringLiteral("system/clock/IClock"), QStringLiteral("ctfmodule.xml"),
                    QStringLiteral("IClock"), QStringLiteral("system"), QStringLiteral("clock"),
                    {QStringLiteral("ReadClock"), QStringLiteral("SetAlarm"), QStringLiteral("TimeZones")},
                    QByteArray(), QStringLiteral("iclock"), mif.Build(),
                    {{QStringLiteral("behaviour"), CtfProgramBehaviour(QStringLiteral("IClock"), cases)}}))
            return fail();
    }
    {
        MifBuilder mif;
        mif.AddApplet(0x20000010);
        const QList<QPair<QString, QString>> cases{{QStringLiteral("ButtonPress"), QStringLiteral("PASS")},
                                                   {QStringLiteral("ListScroll"), QStringLiteral("PASS")},
                                                   {QStringLiteral("TextInput"), QStringLiteral("FAIL")}};
        if (!Module(tests, QStringLiteral("ui/widgets/Widgets"), QStringLiteral("ctfappletmodule.xml"),
                    QStringLiteral("Widgets"), QStringLiteral("ui"), QStringLiteral("widgets"),
                    {QStringLiteral("ButtonPress"), QStringLiteral("ListScroll"), QStringLiteral("TextInput")},
                    QByteArray(), QStringLiteral("widgets"), mif.Build(),
                    {{QStringLiteral("behaviour"),
                      CtfAppletBehaviour(QStringLiteral("Widgets_k"), QStringLiteral("widgets_k.log"), cases)}}))
            return fail();
    }
    {
        MifBuilder mif;
        mif.AddClass(0x20000020);
        mif.AddSuiteProgram(QStringLiteral("kesto:oat:AudioSuite"));
        const QList<QPair<QString, QString>> cases{{QStringLiteral("PlayTone"), QStringLiteral("Success")},
                                                   {QStringLiteral("RecordClip"), QStringLiteral("Failed")},
                                                   {QStringLiteral("Mixer"), QStringLiteral("Unsupported")},
                                                   {QStringLiteral("Equalizer"), QStringLiteral("Success")}};
        if (!Module(tests, QStringLiteral("media/audio/OatAudio"), QStringLiteral("oatmodule.xml"),
                    QStringLiteral("OatAudio"), QStringLiteral("media"), QStringLiteral("audio"),
                    {QStringLiteral("PlayTone"), QStringLiteral("RecordClip"), QStringLiteral("Mixer"),
                     QStringLiteral("Equalizer")},
                    QByteArray(), QStringLiteral("oataudio"), mif.Build(),
                    {{QStringLiteral("suite-AudioSuite.sh"), OatSuiteScript(QStringLiteral("OatAudio"), QStringLiteral("audio"), cases)}})
            || !Text(tests + QStringLiteral("/media/audio/OatAudio/OatAudio.baseline"), "PlayTone 440Hz\n"))
            return fail();
    }
    {
        MifBuilder mif;
        mif.AddApplet(0x20000030);
        const QList<QPair<QString, QString>> cases{{QStringLiteral("OpenSocket"), QStringLiteral("PASSED")},
                                                   {QStringLiteral("Connect"), QStringLiteral("PASSED")},
                                                   {QStringLiteral("SendReceive"), QStringLiteral("FAILED")},
                                                   {QStringLiteral("Ipv6"), QStringLiteral("UNSUPPORTED")}};
        if (!Module(tests, QStringLiteral("net/sockets/Sockets"), QStringLiteral("utmodule.xml"),
                    QStringLiteral("Sockets"), QStringLiteral("net"), QStringLiteral("sockets"),
                    {QStringLiteral("OpenSocket"), QStringLiteral("Connect"), QStringLiteral("SendReceive"),
                     QStringLiteral("Ipv6")},
                    QByteArray(), QStringLiteral("utsockets"), mif.Build(),
                    {{QStringLiteral("behaviour"), UtBehaviour(QStringLiteral("UTSockets"), QStringLiteral("sockets"), cases)}}))
            return fail();
    }
    {
        // A secondary module: a package without a description, needed by ITimer.
        MifBuilder mif;
        mif.AddClass(0x20000050);
        if (!Package(tests + QStringLiteral("/common/Helper/package/Helper_Win32_Release.kestix"),
                     {{QStringLiteral("Helper/Helper.mif"), mif.Build()},
                      {QStringLiteral("Helper/helper.dat"), "helper data for ITimer\n"}}))
            return fail();
    }
    if (!Text(m_root + QStringLiteral("/env.sh"), EnvironmentText().toUtf8()))
        return fail();
    QDir().mkpath(m_root + QStringLiteral("/data"));
    return true;
}

QString DemoWriter::EnvironmentText() const
{
    auto line = [](const char *name, const QString &value) {
        return QStringLiteral("export %1=%2\n").arg(QLatin1String(name), QString::fromUtf8(ShellQuote(value)));
    };
    return line("KESTIX_DATA_ROOT", m_root + QStringLiteral("/data"))
        + line("KESTIX_HANDSETS", m_root + QStringLiteral("/handsets"))
        + line("KESTIX_TOOLSET", m_root + QStringLiteral("/toolset"))
        + line("KESTIX_PLATFORMS_ALL", m_root + QStringLiteral("/platforms"))
        + line("KESTIX_PLATFORM", PlatformDir() + QLatin1Char('/'))
        + line("KESTIX_TESTSETS_ALL", m_root + QStringLiteral("/kits"))
        + line("KESTIX_TESTSET", Kit());
}

int DemoCommand(const QStringList &arguments)
{
    QCommandLineParser parser;
    parser.setApplicationDescription(QStringLiteral(
        "demo init DIR: writes a complete demo environment into DIR (a new or empty folder): a "
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
    QString error;
    if (!writer.Write(&error)) {
        Err(arguments.at(0) + QStringLiteral(": ") + error + QLatin1Char('\n'));
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
