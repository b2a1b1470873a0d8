// The run-time behaviour the kinds share and the parts of each kind that a
// real handset cannot provoke (failing copies, modules that never stop, logs
// that never complete), driven through a mock handset.

#include "moduletest.h"

#include "log/log.h"
#include "modules/ctfapplettestmodule.h"
#include "modules/ctftestmodule.h"
#include "modules/oattestmodule.h"
#include "modules/secondarymodule.h"
#include "modules/uttestmodule.h"
#include "support/mockdevice.h"
#include "support/testutil.h"

#include <QDir>
#include <QDomDocument>
#include <QRegularExpression>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using ::testing::_;
using ::testing::AnyNumber;
using ::testing::DoAll;
using ::testing::Invoke;
using ::testing::NiceMock;
using ::testing::Return;
using ::testing::SetArgReferee;

namespace {

const QString kStamp = QStringLiteral("-\\d{4}-\\d\\d-\\d\\d-\\d\\d-\\d\\d-\\d\\d\\.");

// A CopyFileFromDevice action that writes content to the host path.
auto CopiesContent(const QByteArray &content)
{
    return [content](const QString &, const QString &host) -> unsigned int {
        QFile file(host);
        if (!file.open(QIODevice::WriteOnly))
            return 1;
        file.write(content);
        return 0;
    };
}

using moduletest::AppletWithId;
using moduletest::Target;

class RunContract : public ::testing::Test
{
protected:
    void SetUp() override
    {
        logPath = dir.filePath(QStringLiteral("log.txt"));
        log.SetLogPath(logPath);
        env.insert(QStringLiteral("LogPath"), dir.filePath(QStringLiteral("logs")));
        env.insert(QStringLiteral("TestRunID"), QStringLiteral("{run-1}"));
        QDir().mkpath(env.value(QStringLiteral("LogPath")));
    }
    QString LogText() { return QString::fromLatin1(testutil::ReadFile(logPath)); }
    QString Write(const QString &name, const QByteArray &bytes)
    {
        const QString path = dir.filePath(name);
        testutil::WriteFile(path, bytes);
        return path;
    }

    QTemporaryDir dir;
    QString logPath;
    Log log;
    QMap<QString, QString> env;
    NiceMock<MockDevice> device;
};

} // namespace

TEST_F(RunContract, CopyLogSkipsMalformedPathsAndStampsEveryDot)
{
    UTTestModule module;
    module.SetLogger(&log);
    module.applets << AppletWithId(0x10);
    module.deviceDirectory = QStringLiteral("fs:/usermods/ut/");
    module.desktopLogFiles << QStringLiteral("stale");
    EXPECT_CALL(device, ListDirectory(QStringLiteral("fs:/usermods/ut/log"), _))
        .WillRepeatedly(ListingOf({QStringLiteral("nodirectory.txt"), QStringLiteral("fs:/usermods/ut/log/run.1.xml"),
                                   QStringLiteral("fs:/usermods/ut/log/broken.txt")}));
    EXPECT_CALL(device, CopyFileFromDevice(QStringLiteral("fs:/usermods/ut/log/run.1.xml"), _))
        .WillOnce(Invoke(CopiesContent("<TestRunLog/>")));
    EXPECT_CALL(device, CopyFileFromDevice(QStringLiteral("fs:/usermods/ut/log/broken.txt"), _)).WillOnce(Return(5u));

    ASSERT_TRUE(module.CopyLog(&device, env));
    ASSERT_EQ(module.desktopLogFiles.size(), 1);
    const QString copied = module.desktopLogFiles.first();
    EXPECT_TRUE(QFileInfo(copied).fileName().contains(QRegularExpression(QStringLiteral("^run") + kStamp + QStringLiteral("1")
                                                                         + kStamp + QStringLiteral("xml$"))))
        << copied.toStdString();
    EXPECT_EQ(QFileInfo(copied).absolutePath(), env.value(QStringLiteral("LogPath")));
    const QString text = LogText();
    EXPECT_TRUE(text.contains(QStringLiteral("   Malformed source path nodirectory.txt\n")));
    EXPECT_TRUE(text.contains(QStringLiteral("   Log fs:/usermods/ut/log/run.1.xml copied to ") + copied + QStringLiteral("\n")));
    EXPECT_TRUE(text.contains(QStringLiteral("   Log fs:/usermods/ut/log/broken.txt not copied to ")));
}

TEST_F(RunContract, KindsRenameTheirLogsOnTheHost)
{
    CtfTestModule ctf;
    ctf.moduleName = QStringLiteral("ITimer");
    ctf.logPaths << QStringLiteral("fs:/usermods/CTF/CTF.log") << QStringLiteral("fs:/usermods/ctf/ctf.log");
    EXPECT_CALL(device, CopyFileFromDevice(_, _)).WillRepeatedly(Invoke(CopiesContent("x")));
    ASSERT_TRUE(ctf.CopyLog(&device, env));
    ASSERT_EQ(ctf.desktopLogFiles.size(), 2);
    EXPECT_TRUE(QFileInfo(ctf.desktopLogFiles[0]).fileName().contains(QRegularExpression(QStringLiteral("^ITimer-CTF") + kStamp + QStringLiteral("log$"))));
    EXPECT_TRUE(QFileInfo(ctf.desktopLogFiles[1]).fileName().contains(QRegularExpression(QStringLiteral("^ctf") + kStamp + QStringLiteral("log$"))));

    CtfAppletTestModule applet;
    applet.applets << AppletWithId(0x20);
    EXPECT_CALL(device, FindModule(0x20u, _))
        .WillRepeatedly(DoAll(SetArgReferee<1>(QStringLiteral("fs:/usermods/a/")), Return(0u)));
    EXPECT_CALL(device, ListDirectory(QStringLiteral("fs:/usermods/a/"), _))
        .WillRepeatedly(ListingOf({QStringLiteral("fs:/usermods/a/suite_K.LOG"), QStringLiteral("fs:/usermods/a/other_k.log"),
                                   QStringLiteral("fs:/usermods/a/notes.txt")}));
    ASSERT_TRUE(applet.CopyLog(&device, env));
    ASSERT_EQ(applet.desktopLogFiles.size(), 2);
    // "_K." passes the test but only the exact "_k." is replaced.
    EXPECT_TRUE(QFileInfo(applet.desktopLogFiles[0]).fileName().startsWith(QStringLiteral("suite_K-")));
    EXPECT_TRUE(QFileInfo(applet.desktopLogFiles[1]).fileName().contains(QRegularExpression(QStringLiteral("^other") + kStamp + QStringLiteral("log$"))));
}

TEST_F(RunContract, RemoveTestFallsBackToTheNamedDirectory)
{
    SecondaryModule module;
    module.moduleName = QStringLiteral("helper");
    module.secondaryModules << QStringLiteral("dep");
    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/helper"))).WillOnce(Return(0u));
    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/dep"))).WillOnce(Return(0u));
    EXPECT_FALSE(module.RemoveTest(&device));

    SecondaryModule byClass;
    byClass.classids << 7u;
    byClass.applets << AppletWithId(9);
    EXPECT_CALL(device, FindModule(7u, _)).WillOnce(Return(1u));
    EXPECT_CALL(device, FindModule(9u, _)).WillOnce(DoAll(SetArgReferee<1>(QStringLiteral("fs:/usermods/nine/")), Return(0u)));
    EXPECT_CALL(device, RemoveDirectory(QStringLiteral("fs:/usermods/nine/"))).WillOnce(Return(0u));
    EXPECT_TRUE(byClass.RemoveTest(&device));
}

TEST_F(RunContract, InstallTestNeedsATargetForThePlatform)
{
    SecondaryModule module;
    device.platform = IKestoDevice::PLATFORM_ARM;
    module.targets.insert(QStringLiteral("t"), Target(QStringLiteral("/p.kestix"), IKestoDevice::PLATFORM_WIN32));
    EXPECT_CALL(device, InstallPackage(_)).Times(0);
    EXPECT_FALSE(module.InstallTest(&device));

    module.targets.insert(QStringLiteral("t"), Target(QStringLiteral("/p.kestix"), IKestoDevice::PLATFORM_ARM));
    ::testing::Mock::VerifyAndClearExpectations(&device);
    EXPECT_CALL(device, InstallPackage(QStringLiteral("/p.kestix"))).WillOnce(Return(0u));
    EXPECT_CALL(device, FindModule(0u, _)).WillOnce(DoAll(SetArgReferee<1>(QStringLiteral("fs:/usermods/h/")), Return(0u)));
    EXPECT_TRUE(module.InstallTest(&device));
    EXPECT_EQ(module.deviceDirectory, QStringLiteral("fs:/usermods/h/"));
    EXPECT_FALSE(module.Run(&device, env));
    EXPECT_TRUE(module.IsLogComplete(&device));
}

TEST_F(RunContract, StampingPutsTheHeaderBeforeTheAnchorAndKeepsTheBytes)
{
    CtfTestModule ctf;
    ctf.moduleName = QStringLiteral("ITimer");
    ctf.idHash = QStringLiteral("#42");
    const QByteArray latin = "Suite: caf\xe9\r\n";
    ctf.AddDesktopLogFile(Write(QStringLiteral("a.log"), latin + "Test: t1\nResult: pass\nTest: t2\n"));
    ctf.AddDesktopLogFile(Write(QStringLiteral("b.log"), "no anchor"));
    ctf.PostProcess(env);
    EXPECT_EQ(testutil::ReadFile(ctf.desktopLogFiles[0]),
              latin + "GUID:{run-1}\nManifest Name:ITimer\nID Hash:#42\nTest: t1\nResult: pass\nTest: t2\n\n");
    EXPECT_EQ(testutil::ReadFile(ctf.desktopLogFiles[1]),
              QByteArray("no anchor\nGUID:{run-1}\nManifest Name:ITimer\nID Hash:#42\n"));

    // A second stamping finds the first header and appends another at the end.
    ctf.PostProcess(env);
    const QByteArray twice = testutil::ReadFile(ctf.desktopLogFiles[0]);
    EXPECT_EQ(twice.count("GUID:{run-1}"), 2);
    EXPECT_TRUE(twice.endsWith("Test: t2\n\n\nGUID:{run-1}\nManifest Name:ITimer\nID Hash:#42\n"));
    TestResults results;
    ASSERT_TRUE(ctf.ParseLog(ctf.desktopLogFiles[0], results));
    EXPECT_EQ(results.manifestName, QStringLiteral("ITimer"));
    EXPECT_EQ(results.idHash, QStringLiteral("#42"));
}

TEST_F(RunContract, OatStampsBeforeTheLastModuleVerLine)
{
    OatTestModule oat;
    oat.moduleName = QStringLiteral("Timer");
    oat.AddDesktopLogFile(Write(QStringLiteral("t.oat"), "@Timer\nModuleVer: 1\nModuleVer: 2\nGUID:old\nModuleVer: 3\n"));
    oat.PostProcess(env); // no Perl cache: stamping only
    EXPECT_EQ(testutil::ReadFile(oat.desktopLogFiles[0]),
              QByteArray("@Timer\nModuleVer: 1\nGUID:{run-1}\nManifest Name:Timer\nID Hash:\nModuleVer: 2\nGUID:old\nModuleVer: 3\n\n"));
}

TEST_F(RunContract, UtStampsTextAfterTheFirstLineAndXmlOnTheRoot)
{
    UTTestModule ut;
    ut.moduleName = QStringLiteral("UTTimer");
    ut.idHash = QStringLiteral("#5");
    ut.AddDesktopLogFile(Write(QStringLiteral("r.TXT"), "first\nsecond\n"));
    ut.AddDesktopLogFile(Write(QStringLiteral("r.xml"), "<TestRunLog guid='old'><case name='t1'/></TestRunLog>"));
    ut.AddDesktopLogFile(Write(QStringLiteral("bad.xml"), "<TestRunLog>"));
    ut.PostProcess(env);
    EXPECT_EQ(testutil::ReadFile(ut.desktopLogFiles[0]),
              QByteArray("first\nGUID:{run-1}\nManifest Name:UTTimer\nID Hash:#5\nsecond\n\n"));
    QDomDocument document;
    ASSERT_TRUE(document.setContent(testutil::ReadFile(ut.desktopLogFiles[1])));
    const QDomElement root = document.documentElement();
    EXPECT_EQ(root.attribute(QStringLiteral("guid")), QStringLiteral("{run-1}"));
    EXPECT_EQ(root.attribute(QStringLiteral("manifest_name")), QStringLiteral("UTTimer"));
    EXPECT_EQ(root.attribute(QStringLiteral("id_hash")), QStringLiteral("#5"));
    EXPECT_EQ(root.firstChildElement().attribute(QStringLiteral("name")), QStringLiteral("t1"));
    EXPECT_EQ(testutil::ReadFile(ut.desktopLogFiles[2]), QByteArray("<TestRunLog>"));
}

TEST_F(RunContract, LogWaitsGiveUpWhenTheEndMarkerNeverComes)
{
    CtfTestModule ctf;
    ctf.SetLogger(&log);
    ctf.logPaths << QStringLiteral("fs:/usermods/CTF/CTF.log");
    int copies = 0;
    EXPECT_CALL(device, CopyFileFromDevice(QStringLiteral("fs:/usermods/CTF/CTF.log"), _))
        .WillRepeatedly(Invoke([&copies](const QString &, const QString &host) -> unsigned int {
            ++copies;
            return CopiesContent(QByteArray(copies, 'x'))(QString(), host);
        }));
    EXPECT_FALSE(ctf.IsLogComplete(&device));
    // Delays of 100, 200, ... 2000 ms, then 2000 ms each, until ten minutes.
    EXPECT_GT(copies, 300);
    EXPECT_LT(copies, 330);

    OatTestModule oat;
    oat.moduleName = QStringLiteral("OatTimer");
    EXPECT_CALL(device, FileExists(QStringLiteral("fs:/shared/pek/log/timer_u.oat"))).WillRepeatedly(Return(true));
    EXPECT_CALL(device, CopyFileFromDevice(QStringLiteral("fs:/shared/pek/log/timer_u.oat"), _))
        .WillOnce(Return(1u))
        .WillOnce(Invoke(CopiesContent("@Timer\n")))
        .WillOnce(Invoke(CopiesContent("@Timer\nRESULT: done\n")));
    EXPECT_TRUE(oat.IsLogComplete(&device));
}

TEST_F(RunContract, ScratchCopiesArePrivateAndRemoved)
{
    CtfTestModule ctf;
    ctf.logPaths << QStringLiteral("fs:/usermods/CTF/CTF.log");
    QStringList scratch;
    EXPECT_CALL(device, CopyFileFromDevice(_, _))
        .WillRepeatedly(Invoke([&scratch](const QString &, const QString &host) -> unsigned int {
            scratch << host;
            return CopiesContent(scratch.size() < 3 ? "Test: t\n" : "[/VERBOSE]\n")(QString(), host);
        }));
    EXPECT_TRUE(ctf.IsLogComplete(&device));
    ASSERT_EQ(scratch.size(), 3);
    EXPECT_NE(scratch[0], scratch[1]);
    for (const QString &path : scratch) {
        EXPECT_FALSE(QFile::exists(path));
        EXPECT_NE(QFileInfo(path).fileName(), QStringLiteral("foobar.txt"));
    }
}

TEST_F(RunContract, UtCompletionNeedsBothMarkers)
{
    UTTestModule ut;
    ut.applets << AppletWithId(0x30);
    ut.deviceDirectory = QStringLiteral("fs:/usermods/ut/");
    EXPECT_CALL(device, ListDirectory(_, _))
        .WillRepeatedly(ListingOf({QStringLiteral("fs:/usermods/ut/log/r.txt"), QStringLiteral("fs:/usermods/ut/log/r.xml")}));
    int textCopies = 0;
    EXPECT_CALL(device, CopyFileFromDevice(QStringLiteral("fs:/usermods/ut/log/r.xml"), _))
        .WillOnce(Invoke(CopiesContent("<TestRunLog>")))
        .WillOnce(Invoke(CopiesContent("<TestRunLog></TestRunLog>")));
    EXPECT_CALL(device, CopyFileFromDevice(QStringLiteral("fs:/usermods/ut/log/r.txt"), _))
        .WillRepeatedly(Invoke([&textCopies](const QString &, const QString &host) {
            return CopiesContent(++textCopies < 4 ? "elapsed time: lower case\n" : "Elapsed Time: 1s\n")(QString(), host);
        }));
    EXPECT_TRUE(ut.IsLogComplete(&device));
    EXPECT_EQ(textCopies, 4);

    // A single log listed: nothing to wait for.
    UTTestModule single;
    single.applets << AppletWithId(0x31);
    single.deviceDirectory = QStringLiteral("fs:/usermods/s/");
    EXPECT_CALL(device, ListDirectory(QStringLiteral("fs:/usermods/s/log"), _))
        .WillRepeatedly(ListingOf({QStringLiteral("fs:/usermods/s/log/r.txt"), QStringLiteral("fs:/usermods/s/log/core.bin")}));
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
    applet.targets.insert(QStringLiteral("t"), Target(QStringLiteral("/a.kestix"), IKestoDevice::PLATFORM_UNKNOWN));
    EXPECT_CALL(device, InstallPackage(_)).WillRepeatedly(Return(0u));
    EXPECT_CALL(device, StartApplet(0xffu, QString())).WillOnce(Return(0u)).WillOnce(Return(3u));
    int polls = 0;
    EXPECT_CALL(device, IsAppletRunning(0xffu)).WillRepeatedly(Invoke([&polls](unsigned int) {
        ++polls;
        return true;
    }));
    EXPECT_FALSE(applet.Run(&device, env));
    EXPECT_EQ(polls, 660001);

    device.lastError = 255;
    EXPECT_FALSE(applet.Run(&device, env));
    EXPECT_TRUE(LogText().contains(QStringLiteral("CtfAppletTestModule::Run error: 255(0x      ff)")));
}

TEST_F(RunContract, CtfRunResetsTheLogAndStartsThePreferredProgram)
{
    CtfTestModule ctf;
    ctf.SetLogger(&log);
    ctf.moduleName = QStringLiteral("foo");
    for (const char *key : {"Bar", "Foo_k_main", "Baz"}) {
        SysResource program;
        program.type = 0x0102FAF7;
        program.SetProperty("Key", QByteArray(key));
        program.SetProperty("Arguments", QByteArray("-v"));
        ctf.programs << program;
    }
    EXPECT_EQ(ctf.ModuleName(), QStringLiteral("Foo_k_main"));
    ctf.targets.insert(QStringLiteral("t"), Target(QStringLiteral("/c.kestix"), IKestoDevice::PLATFORM_UNKNOWN));
    env.insert(QStringLiteral("DataCachePath"), dir.path());

    EXPECT_CALL(device, CopyFileToDevice(QDir::cleanPath(dir.path()) + QStringLiteral("/CTF.log"),
                                         QStringLiteral("fs:/usermods/CTF/CTF.log"))).WillRepeatedly(Return(0u));
    EXPECT_CALL(device, InstallPackage(_)).WillRepeatedly(Return(0u));
    EXPECT_CALL(device, StartProgram(QStringLiteral("Foo_k_main"), QStringLiteral("-v")))
        .WillOnce(Return(0u))
        .WillOnce(Return(2u));
    EXPECT_CALL(device, IsProgramRunning(_)).WillRepeatedly(Return(true));
    EXPECT_TRUE(ctf.Run(&device, env)); // still running at the limit: true all the same
    EXPECT_TRUE(QFile::exists(dir.filePath(QStringLiteral("CTF.log"))));
    device.lastError = 2;
    EXPECT_FALSE(ctf.Run(&device, env));
    EXPECT_TRUE(LogText().contains(QStringLiteral("CtfTestModule::Run error: Foo_k_main 2(0x       2)")));

    ctf.programs.removeAt(1);
    EXPECT_EQ(ctf.ModuleName(), QStringLiteral("Bar"));
}
