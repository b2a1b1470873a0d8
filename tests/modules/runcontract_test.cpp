// The run-time behaviour the kinds share and the parts of each kind that a real handset cannot provoke (failing copies,
// modules that never stop, logs that never complete), driven through a mock handset.

#include "moduletest.h"

#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"
#include "support/mockdevice.h"

#include <QDir>
#include <QDomDocument>
#include <QRegularExpression>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

using ::testing::_;
using ::testing::DoAll;
using ::testing::Invoke;
using ::testing::NiceMock;
using ::testing::Return;
using ::testing::SetArgReferee;

namespace {

// True when the file name of path matches pattern, in which '@' stands for
// a copy's time stamp ("-2026-12-03-14-05-09.").
bool Named(const QString &path, QString pattern)
{
    pattern.replace(u'@', u"-\\d{4}-\\d\\d-\\d\\d-\\d\\d-\\d\\d-\\d\\d\\."_s);
    return QFileInfo(path).fileName().contains(QRegularExpression(u'^' + pattern + u'$'));
}

// A CopyFileFromDevice action that writes content to the host path.
auto CopiesContent(const QByteArray &content)
{
    return [content](const QString &, const QString &host) -> unsigned int {
        testutil::WriteFile(host, content);
        return 0;
    };
}

using namespace moduletest;

class RunContract : public moduletest::ModuleFolder
{
protected:
    void SetUp() override
    {
        env.insert(u"LogPath"_s, dir.filePath(u"logs"_s));
        env.insert(u"TestRunID"_s, u"{run-1}"_s);
        QDir().mkpath(env.value(u"LogPath"_s));
    }
    QMap<QString, QString> env;
    NiceMock<MockDevice> device;
};

} // namespace

TEST_F(RunContract, CopyLogSkipsMalformedPathsAndStampsEveryDot)
{
    UTTestModule module;
    module.SetLogger(&log);
    module.applets << AppletWithId(0x10);
    module.deviceDirectory = u"fs:/usermods/ut/"_s;
    module.desktopLogFiles << u"stale"_s;
    EXPECT_CALL(device, ListDirectory(u"fs:/usermods/ut/log"_s, _))
        .WillRepeatedly(
            ListingOf({u"nodirectory.txt"_s, u"fs:/usermods/ut/log/run.1.xml"_s, u"fs:/usermods/ut/log/broken.txt"_s}));
    EXPECT_CALL(device, CopyFileFromDevice(u"fs:/usermods/ut/log/run.1.xml"_s, _))
        .WillOnce(Invoke(CopiesContent("<TestRunLog/>")));
    EXPECT_CALL(device, CopyFileFromDevice(u"fs:/usermods/ut/log/broken.txt"_s, _)).WillOnce(Return(5u));

    ASSERT_TRUE(module.CopyLog(&device, env));
    ASSERT_EQ(module.desktopLogFiles.size(), 1);
    const QString copied = module.desktopLogFiles.first();
    EXPECT_TRUE(Named(copied, u"run@1@xml"_s)) << copied.toStdString();
    EXPECT_EQ(QFileInfo(copied).absolutePath(), env.value(u"LogPath"_s));
    const QString text = LogText();
    EXPECT_TRUE(text.contains(u"   Malformed source path nodirectory.txt\n"_s));
    EXPECT_TRUE(text.contains(u"   Log fs:/usermods/ut/log/run.1.xml copied to "_s + copied + u"\n"_s));
    EXPECT_TRUE(text.contains(u"   Log fs:/usermods/ut/log/broken.txt not copied to "_s));
}

TEST_F(RunContract, KindsRenameTheirLogsOnTheHost)
{
    CtfTestModule ctf;
    ctf.moduleName = u"ITimer"_s;
    ctf.logPaths << u"fs:/usermods/CTF/CTF.log"_s << u"fs:/usermods/ctf/ctf.log"_s;
    EXPECT_CALL(device, CopyFileFromDevice(_, _)).WillRepeatedly(Invoke(CopiesContent("x")));
    ASSERT_TRUE(ctf.CopyLog(&device, env));
    ASSERT_EQ(ctf.desktopLogFiles.size(), 2);
    EXPECT_TRUE(Named(ctf.desktopLogFiles[0], u"ITimer-CTF@log"_s));
    EXPECT_TRUE(Named(ctf.desktopLogFiles[1], u"ctf@log"_s));

    CtfAppletTestModule applet;
    applet.applets << AppletWithId(0x20);
    EXPECT_EQ(applet.ModuleName(), u"0X00000020"_s);
    EXPECT_CALL(device, FindModule(0x20u, _)).WillRepeatedly(DoAll(SetArgReferee<1>(u"fs:/usermods/a/"_s), Return(0u)));
    EXPECT_CALL(device, ListDirectory(u"fs:/usermods/a/"_s, _))
        .WillRepeatedly(ListingOf(
            {u"fs:/usermods/a/suite_K.LOG"_s, u"fs:/usermods/a/other_k.log"_s, u"fs:/usermods/a/notes.txt"_s}));
    ASSERT_TRUE(applet.CopyLog(&device, env));
    ASSERT_EQ(applet.desktopLogFiles.size(), 2);
    // "_K." passes the test but only the exact "_k." is replaced.
    EXPECT_TRUE(Named(applet.desktopLogFiles[0], u"suite_K@LOG"_s));
    EXPECT_TRUE(Named(applet.desktopLogFiles[1], u"other@log"_s));
}

TEST_F(RunContract, RemoveTestFallsBackToTheNamedDirectory)
{
    SecondaryModule module;
    module.moduleName = u"helper"_s;
    module.secondaryModules << u"dep"_s;
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/helper"_s)).WillOnce(Return(0u));
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/dep"_s)).WillOnce(Return(0u));
    EXPECT_FALSE(module.RemoveTest(&device));

    SecondaryModule byClass;
    byClass.classids << 7u;
    byClass.applets << AppletWithId(9);
    EXPECT_CALL(device, FindModule(7u, _)).WillOnce(Return(1u));
    EXPECT_CALL(device, FindModule(9u, _)).WillOnce(DoAll(SetArgReferee<1>(u"fs:/usermods/nine/"_s), Return(0u)));
    EXPECT_CALL(device, RemoveDirectory(u"fs:/usermods/nine/"_s)).WillOnce(Return(0u));
    EXPECT_TRUE(byClass.RemoveTest(&device));
}

TEST_F(RunContract, InstallTestNeedsATargetForThePlatform)
{
    SecondaryModule module;
    device.platform = IKestoDevice::PLATFORM_ARM;
    module.targets.insert(u"t"_s, Target(u"/p.kestix"_s, IKestoDevice::PLATFORM_WIN32));
    EXPECT_CALL(device, InstallPackage(_)).Times(0);
    EXPECT_FALSE(module.InstallTest(&device));

    module.targets.insert(u"t"_s, Target(u"/p.kestix"_s, IKestoDevice::PLATFORM_ARM));
    ::testing::Mock::VerifyAndClearExpectations(&device);
    EXPECT_CALL(device, InstallPackage(u"/p.kestix"_s)).WillOnce(Return(0u));
    EXPECT_CALL(device, FindModule(0u, _)).WillOnce(DoAll(SetArgReferee<1>(u"fs:/usermods/h/"_s), Return(0u)));
    EXPECT_TRUE(module.InstallTest(&device));
    EXPECT_EQ(module.deviceDirectory, u"fs:/usermods/h/"_s);
    // A secondary module is never run itself.
    EXPECT_FALSE(module.Run(&device, env));
}

TEST_F(RunContract, EachKindStampsItsHeaderAtItsAnchorAndKeepsTheBytes)
{
    CtfTestModule ctf;
    OatTestModule oat;
    UTTestModule ut;
    const QByteArray header = "GUID:{run-1}\nManifest Name:Timer\nID Hash:#5\n";
    const QByteArray latin = "Suite: caf\xe9\r\n";
    // Module, log file, its text, and the text once stamped: CTF after the suite line or at the end, OAT before the
    // last module version line ahead of any header, UT text after the first line. No Perl cache: OAT logs are only
    // stamped.
    const std::tuple<_TestModule *, QString, QByteArray, QByteArray> rows[]
        = {{&ctf, u"a.log"_s, latin + "Test: t1\nTest: t2\n", latin + header + "Test: t1\nTest: t2\n\n"},
           {&ctf, u"b.log"_s, "no anchor", "no anchor\n" + header},
           {&oat, u"t.oat"_s, "@Timer\nModuleVer: 1\nModuleVer: 2\nGUID:old\nModuleVer: 3\n",
            "@Timer\nModuleVer: 1\n" + header + "ModuleVer: 2\nGUID:old\nModuleVer: 3\n\n"},
           {&ut, u"r.TXT"_s, "first\nsecond\n", "first\n" + header + "second\n\n"}};
    for (const auto &[module, file, text, stamped] : rows) {
        module->moduleName = u"Timer"_s;
        module->idHash = u"#5"_s;
        module->AddDesktopLogFile(Write(file, text));
    }
    ut.AddDesktopLogFile(Write(u"r.xml"_s, "<TestRunLog guid='old'><case name='t1'/></TestRunLog>"));
    ut.AddDesktopLogFile(Write(u"bad.xml"_s, "<TestRunLog>"));
    ctf.PostProcess(env);
    oat.PostProcess(env);
    ut.PostProcess(env);
    for (const auto &[module, file, text, stamped] : rows)
        EXPECT_EQ(testutil::ReadFile(dir.filePath(file)), stamped) << file.toStdString();

    QDomDocument document;
    ASSERT_TRUE(document.setContent(testutil::ReadFile(dir.filePath(u"r.xml"_s))));
    const QDomElement root = document.documentElement();
    EXPECT_EQ(root.attribute(u"guid"_s), u"{run-1}"_s);
    EXPECT_EQ(root.attribute(u"manifest_name"_s), u"Timer"_s);
    EXPECT_EQ(root.attribute(u"id_hash"_s), u"#5"_s);
    EXPECT_EQ(root.firstChildElement().attribute(u"name"_s), u"t1"_s);
    EXPECT_EQ(testutil::ReadFile(dir.filePath(u"bad.xml"_s)), QByteArray("<TestRunLog>"));

    // A second stamping finds the first header and appends another at the end; the parser reads the header back.
    ctf.PostProcess(env);
    const QByteArray twice = testutil::ReadFile(dir.filePath(u"a.log"_s));
    EXPECT_EQ(twice.count("GUID:{run-1}"), 2);
    EXPECT_TRUE(twice.endsWith("Test: t2\n\n\n" + header));
    TestResults results;
    ASSERT_TRUE(ctf.ParseLog(dir.filePath(u"a.log"_s), results));
    EXPECT_EQ(results.manifestName, u"Timer"_s);
    EXPECT_EQ(results.idHash, u"#5"_s);
}

TEST_F(RunContract, LogWaitsGiveUpWhenTheEndMarkerNeverComes)
{
    CtfTestModule ctf;
    ctf.SetLogger(&log);
    ctf.logPaths << u"fs:/usermods/CTF/CTF.log"_s;
    int copies = 0;
    EXPECT_CALL(device, CopyFileFromDevice(u"fs:/usermods/CTF/CTF.log"_s, _))
        .WillRepeatedly(Invoke([&copies](const QString &, const QString &host) {
            return CopiesContent(QByteArray(++copies, 'x'))(QString(), host);
        }));
    testing::internal::CaptureStdout();
    EXPECT_FALSE(ctf.IsLogComplete(&device));
    // A dot whenever the log grew, forty to a line.
    const QList<QByteArray> lines = QByteArray::fromStdString(testing::internal::GetCapturedStdout()).split('\n');
    ASSERT_GT(lines.size(), 2);
    EXPECT_EQ(lines.at(0), QByteArray(39, '.'));
    EXPECT_EQ(lines.at(1), "   " + QByteArray(40, '.'));
    // Delays of 100, 200, ... 2000 ms, then 2000 ms each, until ten minutes.
    EXPECT_GT(copies, 300);
    EXPECT_LT(copies, 330);

    OatTestModule oat;
    oat.moduleName = u"OatTimer"_s;
    EXPECT_CALL(device, FileExists(u"fs:/shared/pek/log/timer_u.oat"_s)).WillRepeatedly(Return(true));
    EXPECT_CALL(device, CopyFileFromDevice(u"fs:/shared/pek/log/timer_u.oat"_s, _))
        .WillOnce(Return(1u))
        .WillOnce(Invoke(CopiesContent("@Timer\n")))
        .WillOnce(Invoke(CopiesContent("@Timer\nRESULT: done\n")));
    EXPECT_TRUE(oat.IsLogComplete(&device));
}

TEST_F(RunContract, ScratchCopiesArePrivateAndRemoved)
{
    CtfTestModule ctf;
    ctf.logPaths << u"fs:/usermods/CTF/CTF.log"_s;
    QStringList scratch;
    EXPECT_CALL(device, CopyFileFromDevice(_, _))
        .WillRepeatedly(Invoke([&scratch](const QString &, const QString &host) -> unsigned int {
            scratch << host;
            return CopiesContent(scratch.size() < 3 ? "Test: t\n" : "[/VERBOSE]\n")(QString(), host);
        }));
    EXPECT_TRUE(ctf.IsLogComplete(&device));
    ASSERT_EQ(scratch.size(), 3);
    EXPECT_NE(scratch[0], scratch[1]);
    for (const QString &path : scratch)
        EXPECT_FALSE(QFile::exists(path));
}

TEST_F(RunContract, UtCompletionNeedsBothMarkers)
{
    UTTestModule ut;
    ut.applets << AppletWithId(0x30);
    ut.deviceDirectory = u"fs:/usermods/ut/"_s;
    EXPECT_CALL(device, ListDirectory(_, _))
        .WillRepeatedly(ListingOf({u"fs:/usermods/ut/log/r.txt"_s, u"fs:/usermods/ut/log/r.xml"_s}));
    int textCopies = 0;
    EXPECT_CALL(device, CopyFileFromDevice(u"fs:/usermods/ut/log/r.xml"_s, _))
        .WillOnce(Invoke(CopiesContent("<TestRunLog>")))
        .WillOnce(Invoke(CopiesContent("<TestRunLog></TestRunLog>")));
    EXPECT_CALL(device, CopyFileFromDevice(u"fs:/usermods/ut/log/r.txt"_s, _))
        .WillRepeatedly(Invoke([&textCopies](const QString &, const QString &host) {
            const QByteArray text = ++textCopies < 4 ? "elapsed time: lower case\n" : "Elapsed Time: 1s\n";
            return CopiesContent(text)(QString(), host);
        }));
    EXPECT_TRUE(ut.IsLogComplete(&device));
    EXPECT_EQ(textCopies, 4);

    // A single log listed: nothing to wait for.
    UTTestModule single;
    single.applets << AppletWithId(0x31);
    single.deviceDirectory = u"fs:/usermods/s/"_s;
    EXPECT_CALL(device, ListDirectory(u"fs:/usermods/s/log"_s, _))
        .WillRepeatedly(ListingOf({u"fs:/usermods/s/log/r.txt"_s, u"fs:/usermods/s/log/core.bin"_s}));
    QStringList paths;
    EXPECT_TRUE(single.GetLogFilePaths(&device, paths));
    EXPECT_TRUE(paths.isEmpty());
    EXPECT_TRUE(single.IsLogComplete(&device));
}

TEST_F(RunContract, AppletsThatNeverStopTimeOut)
{
    CtfAppletTestModule applet;
    applet.SetLogger(&log);
    EXPECT_FALSE(applet.Run(&device, env)); // no applets: nothing installed
    applet.applets << AppletWithId(0xff);
    applet.targets.insert(u"t"_s, Target(u"/a.kestix"_s, IKestoDevice::PLATFORM_UNKNOWN));
    EXPECT_CALL(device, InstallPackage(_)).WillRepeatedly(Return(0u));
    EXPECT_CALL(device, StartApplet(0xffu, QString())).WillOnce(Return(0u)).WillOnce(Return(3u));
    EXPECT_CALL(device, IsAppletRunning(0xffu)).Times(660001).WillRepeatedly(Return(true));
    EXPECT_FALSE(applet.Run(&device, env));

    device.lastError = 255;
    EXPECT_FALSE(applet.Run(&device, env));
    EXPECT_TRUE(LogText().contains(u"CtfAppletTestModule::Run error: 255(0x      ff)"_s));
}

TEST_F(RunContract, CtfRunResetsTheLogAndStartsThePreferredProgram)
{
    CtfTestModule ctf;
    ctf.SetLogger(&log);
    ctf.moduleName = u"foo"_s;
    for (const char *key : {"Bar", "Foo_k_main", "Baz"}) {
        SysResource program;
        program.type = 0x0102FAF7;
        program.SetProperty("Key", QByteArray(key));
        program.SetProperty("Arguments", QByteArray("-v"));
        ctf.programs << program;
    }
    EXPECT_EQ(ctf.ModuleName(), u"Foo_k_main"_s);
    ctf.targets.insert(u"t"_s, Target(u"/c.kestix"_s, IKestoDevice::PLATFORM_UNKNOWN));
    env.insert(u"DataCachePath"_s, dir.path());

    EXPECT_CALL(device, CopyFileToDevice(QDir::cleanPath(dir.path()) + u"/CTF.log"_s, u"fs:/usermods/CTF/CTF.log"_s))
        .WillRepeatedly(Return(0u));
    EXPECT_CALL(device, InstallPackage(_)).WillRepeatedly(Return(0u));
    EXPECT_CALL(device, StartProgram(u"Foo_k_main"_s, u"-v"_s)).WillOnce(Return(0u)).WillOnce(Return(2u));
    EXPECT_CALL(device, IsProgramRunning(_)).WillRepeatedly(Return(true));
    EXPECT_TRUE(ctf.Run(&device, env)); // still running at the limit: true all the same
    EXPECT_TRUE(QFile::exists(dir.filePath(u"CTF.log"_s)));
    device.lastError = 2;
    EXPECT_FALSE(ctf.Run(&device, env));
    EXPECT_TRUE(LogText().contains(u"CtfTestModule::Run error: Foo_k_main 2(0x       2)"_s));

    ctf.programs.removeAt(1);
    EXPECT_EQ(ctf.ModuleName(), u"Bar"_s);
}
