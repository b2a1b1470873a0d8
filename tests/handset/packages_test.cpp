#include "device/device.h"
#include "handset/emulatedhandset.h"
#include "log/log.h"

#include "support/handsetfixture.h"
#include "support/testutil.h"

#include <QDir>
#include <QDirIterator>
#include <QFile>
#include <QFileInfo>

#include <gtest/gtest.h>

#include <chrono>
#include <thread>

#include <signal.h>
#include <unistd.h>

namespace {

using testutil::HandsetFixture;
using testutil::ModuleSpec;

constexpr unsigned int kClass = 0x01020304;
constexpr unsigned int kApplet = 0x0103abcd;

// Every file and folder below a folder, relative, sorted.
QStringList Tree(const QString &folder)
{
    QStringList entries;
    QDirIterator it(folder, QDir::AllEntries | QDir::NoDotAndDotDot | QDir::Hidden | QDir::System,
                    QDirIterator::Subdirectories);
    while (it.hasNext())
        entries.append(QDir(folder).relativeFilePath(it.next()));
    entries.sort();
    return entries;
}

class PackageTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        fixture.AddHandset(QStringLiteral("phone"));
        device = fixture.Connect(QStringLiteral("phone"));
        ASSERT_TRUE(device);
        layout.directory = QStringLiteral("ctfmod");
        layout.classIds = {kClass, 0x01020305};
        layout.appletIds = {kApplet};
        layout.programs = {{QStringLiteral("ctfmod_k"), QStringLiteral("-v")}};
        layout.files = {{QStringLiteral("data/table.txt"), "rows"}};
    }

    QString Host(const char *handsetPath) const
    {
        return fixture.HostPath(QStringLiteral("phone"), QString::fromUtf8(handsetPath));
    }
    QString Fs() const { return fixture.HandsetFolder(QStringLiteral("phone")) + QStringLiteral("/fs"); }

    HandsetFixture fixture;
    HandsetFixture::Device device;
    ModuleSpec layout;
};

TEST_F(PackageTest, InstalledModuleIsFoundByClassAndAppletAndByItsClassDirectory)
{
    const QString package = fixture.MakePackage(QStringLiteral("ctfmod.kestix"), layout);
    ASSERT_EQ(device->InstallPackage(package), 0u);
    EXPECT_EQ(testutil::ReadFile(Host("fs:/usermods/ctfmod/data/table.txt")), QByteArray("rows"));

    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), 0u);
    EXPECT_EQ(directory, QStringLiteral("fs:/usermods/ctfmod/"));
    directory.clear();
    EXPECT_EQ(device->FindModule(kApplet, directory), 0u);
    EXPECT_EQ(directory, QStringLiteral("fs:/usermods/ctfmod/"));
    EXPECT_NE(device->FindModule(0x0badc0de, directory), 0u);

    QSharedPointer<_DirectoryInfo> info;
    ASSERT_EQ(device->ListDirectory(QStringLiteral("fs:/~0x0103abcd"), info), 0u);
    ASSERT_TRUE(info->HasFiles());
    EXPECT_EQ(info->FirstFile()->fileName, QStringLiteral("fs:/usermods/ctfmod/ctfmod.mif"));
    EXPECT_TRUE(device->FileExists(QStringLiteral("fs:/~0x01020304/data/table.txt")));
    EXPECT_TRUE(device->CopyOnDevice(QStringLiteral("fs:/~0x01020304/ctfmod.mif"), QStringLiteral("fs:/mif/ctfmod.mif")));

    // A copy of the module information elsewhere does not make a second module.
    EXPECT_EQ(device->DeleteDirectory(kApplet), 0u);
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/usermods/ctfmod")));
    EXPECT_NE(device->FindModule(kClass, directory), 0u);
    EXPECT_TRUE(directory.isEmpty());
    EXPECT_TRUE(QFileInfo::exists(Host("fs:/mif/ctfmod.mif")));
}

TEST_F(PackageTest, PackageMadeByTheTarProgramInstalls)
{
    if (!testutil::HaveProgram(QStringLiteral("tar")))
        GTEST_SKIP() << "tar is not installed";
    const QString source = fixture.WorkFolder() + QStringLiteral("/src");
    for (const auto &member : testutil::ModuleMembers(layout))
        testutil::WriteFile(source + QLatin1Char('/') + member.first, member.second);
    // Two links to one file: GNU tar stores the second as a hard link.
    ASSERT_EQ(::link(QFile::encodeName(source + QStringLiteral("/ctfmod/data/table.txt")).constData(),
                     QFile::encodeName(source + QStringLiteral("/ctfmod/data/same.txt")).constData()),
              0);
    const QString package = fixture.WorkFolder() + QStringLiteral("/gnu.kestix");
    ASSERT_EQ(testutil::RunProgram(QStringLiteral("tar"), {QStringLiteral("-cf"), package, QStringLiteral("-C"),
                                                           source, QStringLiteral(".")}),
              0);
    ASSERT_EQ(device->InstallPackage(package), 0u);
    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), 0u);
    EXPECT_EQ(directory, QStringLiteral("fs:/usermods/ctfmod/"));
    EXPECT_EQ(testutil::ReadFile(Host("fs:/usermods/ctfmod/data/same.txt")), QByteArray("rows"));
    EXPECT_EQ(testutil::ReadFile(Host("fs:/usermods/ctfmod/data/table.txt")), QByteArray("rows"));
}

TEST_F(PackageTest, ModuleInformationDirectlyInUsermodsNamesNoModule)
{
    layout.directory.clear();
    layout.mifName = QStringLiteral("loose.mif");
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(QStringLiteral("loose.kestix"), layout)), 0u);
    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), HANDSET_ERROR_NOT_FOUND);
}

TEST_F(PackageTest, FirstModuleByPathWinsWhenTwoListTheSameClass)
{
    ModuleSpec other = layout;
    other.directory = QStringLiteral("aaa");
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(QStringLiteral("b.kestix"), layout)), 0u);
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(QStringLiteral("a.kestix"), other)), 0u);
    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), 0u);
    EXPECT_EQ(directory, QStringLiteral("fs:/usermods/aaa/"));
}

struct BadPackage
{
    const char *what;
    std::vector<const char *> names; // created with the tar program, -P keeps them as given
};

class HostilePackage : public PackageTest, public ::testing::WithParamInterface<BadPackage> {};

TEST_P(HostilePackage, IsRefusedAsAWholeAndLeavesNothingBehind)
{
    if (!testutil::HaveProgram(QStringLiteral("tar")))
        GTEST_SKIP() << "tar is not installed";
    // The members are real files below work/a/b so that "../" names resolve.
    const QString base = fixture.WorkFolder() + QStringLiteral("/a/b");
    testutil::WriteFile(base + QStringLiteral("/good/good.txt"), "good");
    testutil::WriteFile(fixture.WorkFolder() + QStringLiteral("/a/evil.txt"), "evil");
    QStringList arguments{QStringLiteral("-P"), QStringLiteral("-cf"), fixture.WorkFolder() + QStringLiteral("/bad.tar"),
                          QStringLiteral("good/good.txt")};
    for (const char *name : GetParam().names)
        arguments.append(QString::fromUtf8(name).replace(QStringLiteral("@WORK@"), fixture.WorkFolder()));
    ASSERT_EQ(testutil::RunProgram(QStringLiteral("tar"), arguments, nullptr, base), 0);

    QDir().mkpath(Host("fs:/usermods/existing"));
    const QStringList before = Tree(Fs());
    EXPECT_EQ(device->InstallPackage(fixture.WorkFolder() + QStringLiteral("/bad.tar")), HANDSET_ERROR_BAD_PACKAGE);
    EXPECT_EQ(device->lastError, HANDSET_ERROR_BAD_PACKAGE);
    EXPECT_EQ(Tree(Fs()), before);
    EXPECT_FALSE(QFileInfo::exists(fixture.HandsetsFolder() + QStringLiteral("/phone/fs/evil.txt")));
    EXPECT_FALSE(QFileInfo::exists(fixture.HandsetsFolder() + QStringLiteral("/phone/evil.txt")));
}

INSTANTIATE_TEST_SUITE_P(Members, HostilePackage,
                         ::testing::Values(BadPackage{"DotDot", {"../evil.txt"}},
                                           BadPackage{"DotDotInside", {"good/../../evil.txt"}},
                                           BadPackage{"Absolute", {"@WORK@/a/evil.txt"}}),
                         [](const auto &info) { return std::string(info.param.what); });

TEST_F(PackageTest, MemberLeadingThroughALinkOutOfTheHandsetRefusesThePackage)
{
    const QString outside = fixture.WorkFolder() + QStringLiteral("/outside");
    QDir().mkpath(outside);
    QDir().mkpath(Host("fs:/usermods"));
    ASSERT_TRUE(QFile::link(outside, Host("fs:/usermods/ctfmod")));
    EXPECT_EQ(device->InstallPackage(fixture.MakePackage(QStringLiteral("p.kestix"), layout)), HANDSET_ERROR_BAD_PACKAGE);
    EXPECT_TRUE(QDir(outside).isEmpty());
    EXPECT_EQ(Tree(Fs()), (QStringList{QStringLiteral("usermods"), QStringLiteral("usermods/ctfmod")}));
}

TEST_F(PackageTest, DamagedPackageIsRefusedWithItsReasonAndInstallsNothing)
{
    Log log;
    log.SetLogPath(fixture.WorkFolder() + QStringLiteral("/log.txt"));
    device = fixture.Connect(QStringLiteral("phone"), &log);
    ASSERT_TRUE(device);
    const QString package = fixture.MakePackage(QStringLiteral("p.kestix"),
                                                testutil::Members{{QStringLiteral("m/a.txt"), "a"},
                                                                  {QStringLiteral("m/big.bin"), QByteArray(4096, 'x')}});
    QByteArray bytes = testutil::ReadFile(package);
    const struct
    {
        const char *name;
        QByteArray bytes;
        const char *reason;
    } damaged[] = {
        {"cut.kestix", bytes.left(512 + 512 + 512 + 1000), "unexpected end of archive at offset 2536"},
        {"sum.kestix", bytes.left(1024) + "junk" + bytes.mid(1028), "checksum error at offset 1024"},
        {"text.kestix", QByteArray("m/a.txt\n").repeated(100), "does not look like a tar archive"},
    };
    for (const auto &c : damaged) {
        const QString path = fixture.WorkFolder() + QLatin1Char('/') + QLatin1String(c.name);
        testutil::WriteFile(path, c.bytes);
        EXPECT_EQ(device->InstallPackage(path), HANDSET_ERROR_BAD_PACKAGE) << c.name;
        EXPECT_TRUE(Tree(Fs()).isEmpty()) << c.name;
        EXPECT_TRUE(testutil::ReadFile(fixture.WorkFolder() + QStringLiteral("/log.txt"))
                        .contains(QStringLiteral("EmulatedHandset::InstallPackage refused %1: %2\n")
                                      .arg(path, QLatin1String(c.reason))
                                      .toLatin1()))
            << c.name;
    }
}

TEST_F(PackageTest, WriteFailureTakesBackWhatThePackageWrote)
{
    // "m/x" exists as a folder, so the second member cannot be written.
    QDir().mkpath(Host("fs:/usermods/m/x/inner"));
    const QString package = fixture.MakePackage(QStringLiteral("p.kestix"),
                                                testutil::Members{{QStringLiteral("new/deep/a.txt"), "a"},
                                                                  {QStringLiteral("m/x"), "b"}});
    EXPECT_EQ(device->InstallPackage(package), HANDSET_ERROR_IO);
    EXPECT_EQ(Tree(Fs()), (QStringList{QStringLiteral("usermods"), QStringLiteral("usermods/m"),
                                       QStringLiteral("usermods/m/x"), QStringLiteral("usermods/m/x/inner")}));
}

TEST_F(PackageTest, ArchiveWithoutFilesIsRefused)
{
    EXPECT_EQ(device->InstallPackage(fixture.MakePackage(QStringLiteral("empty.kestix"), testutil::Members{})),
              HANDSET_ERROR_BAD_PACKAGE);
}

class BehaviourTest : public PackageTest
{
protected:
    void SetUp() override
    {
        PackageTest::SetUp();
        // Logs what it was asked and where it ran.
        layout.behaviour = "echo \"$1 $2 [$3] [$4] $(pwd) $HANDSET_FS\" > \"$HANDSET_MODULE_DIR/run.log\"\n"
                         "echo '[/VERBOSE]' >> \"$HANDSET_MODULE_DIR/run.log\"\n";
        ASSERT_EQ(device->InstallPackage(fixture.MakePackage(QStringLiteral("ctfmod.kestix"), layout)), 0u);
    }

    QByteArray RunLog()
    {
        const QString copy = fixture.WorkFolder() + QStringLiteral("/run.log");
        QFile::remove(copy);
        EXPECT_EQ(device->CopyFileFromDevice(QStringLiteral("fs:/~0x01020304/run.log"), copy), 0u);
        return testutil::ReadFile(copy);
    }
};

TEST_F(BehaviourTest, ProgramRunsItsBehaviourToTheEndAndLeavesItsLog)
{
    ASSERT_EQ(device->StartProgram(QStringLiteral("ctfmod_k"), QStringLiteral("  -v  two words ")), 0u);
    EXPECT_FALSE(device->IsProgramRunning(QStringLiteral("ctfmod_k")));
    const QByteArray fs = QDir(Fs()).canonicalPath().toUtf8();
    EXPECT_EQ(RunLog(), "program ctfmod_k [-v] [two] " + fs + " " + Fs().toUtf8() + "\n[/VERBOSE]\n");

    QSharedPointer<_DirectoryInfo> info;
    ASSERT_EQ(device->ListDirectory(QStringLiteral("fs:/~0x01020304"), info), 0u);
    QStringList names;
    for (auto it = info->FirstFile(); it != info->LastFile(); ++it)
        names.append(it->fileName);
    EXPECT_TRUE(names.contains(QStringLiteral("fs:/usermods/ctfmod/run.log")));
    EXPECT_EQ(device->DeleteFile(QStringLiteral("fs:/usermods/ctfmod/run.log")), 0u);
    EXPECT_FALSE(device->FileExists(QStringLiteral("fs:/~0x01020304/run.log")));
}

TEST_F(BehaviourTest, AppletRunsItsBehaviourWithTheClassId)
{
    ASSERT_EQ(device->StartApplet(kApplet, QString()), 0u);
    EXPECT_FALSE(device->IsAppletRunning(kApplet));
    EXPECT_TRUE(RunLog().startsWith("applet 0x0103abcd [] []"));
}

TEST_F(BehaviourTest, ModuleWithoutBehaviourStartsAndEndsAtOnce)
{
    ModuleSpec quiet;
    quiet.directory = QStringLiteral("quiet");
    quiet.appletIds = {0x77};
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(QStringLiteral("quiet.kestix"), quiet)), 0u);
    EXPECT_EQ(device->StartApplet(0x77, QString()), 0u);
    EXPECT_FALSE(device->IsAppletRunning(0x77));
}

TEST_F(BehaviourTest, ProgramsOfEitherProgramTypeAreFoundByTheirExactName)
{
    ModuleSpec other;
    other.directory = QStringLiteral("other");
    other.programs = {{QStringLiteral("abc"), QString(), 0x0102C305}, {QStringLiteral("Main"), QString()}};
    other.behaviour = "echo \"$2\" > \"$HANDSET_MODULE_DIR/run.log\"\n";
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(QStringLiteral("other.kestix"), other)), 0u);
    EXPECT_EQ(device->StartProgram(QStringLiteral("abc"), QString()), 0u);
    EXPECT_EQ(testutil::ReadFile(Host("fs:/usermods/other/run.log")), QByteArray("abc\n"));
    EXPECT_EQ(device->StartProgram(QStringLiteral("Main"), QString()), 0u);
    EXPECT_EQ(device->StartProgram(QStringLiteral("main"), QString()), HANDSET_ERROR_NOT_FOUND);
    EXPECT_EQ(device->StartProgram(QStringLiteral("ab"), QString()), HANDSET_ERROR_NOT_FOUND);
}

TEST_F(BehaviourTest, BehaviourLinkedToAHostFileOutsideTheHandsetIsNotRun)
{
    const QString outside = fixture.WorkFolder() + QStringLiteral("/outside.sh");
    testutil::WriteFile(outside, "echo ran > \"$HANDSET_MODULE_DIR/run.log\"\n");
    ASSERT_TRUE(QFile::remove(Host("fs:/usermods/ctfmod/behaviour")));
    ASSERT_TRUE(QFile::link(outside, Host("fs:/usermods/ctfmod/behaviour")));
    EXPECT_EQ(device->StartProgram(QStringLiteral("ctfmod_k"), QString()), HANDSET_ERROR_BAD_PATH);
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/usermods/ctfmod/run.log")));
}

TEST_F(BehaviourTest, BehaviourThatDoesNotEndIsKilledAfterTheTimeout)
{
    testutil::WriteFile(Host("fs:/usermods/ctfmod/behaviour"), "echo started > \"$HANDSET_MODULE_DIR/run.log\"\nsleep 30\n");
    static_cast<EmulatedHandset *>(device.get())->SetBehaviourTimeout(200);
    ASSERT_EQ(device->StartProgram(QStringLiteral("ctfmod_k"), QString()), 0u);
    EXPECT_EQ(RunLog(), QByteArray("started\n"));
}

// True while the process exists and is not a zombie.
bool IsAlive(qint64 pid)
{
    if (::kill(pid_t(pid), 0) != 0)
        return false;
    const QByteArray stat = testutil::ReadFile(QStringLiteral("/proc/%1/stat").arg(pid));
    const int close = stat.lastIndexOf(')');
    return close < 0 || stat.mid(close + 2, 1) != "Z";
}

TEST_F(BehaviourTest, NothingTheBehaviourStartedOutlivesTheStartCall)
{
    testutil::WriteFile(Host("fs:/usermods/ctfmod/behaviour"),
                        "sleep 30 &\necho $! > \"$HANDSET_MODULE_DIR/pid\"\n");
    ASSERT_EQ(device->StartProgram(QStringLiteral("ctfmod_k"), QString()), 0u);
    const qint64 pid = testutil::ReadFile(Host("fs:/usermods/ctfmod/pid")).trimmed().toLongLong();
    ASSERT_GT(pid, 0);
    // The kill is immediate; only the reaping of the orphan may take a moment.
    for (int i = 0; i < 200 && IsAlive(pid); ++i)
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    EXPECT_FALSE(IsAlive(pid));
}

} // namespace
