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

using namespace Qt::StringLiterals;

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
        fixture.AddHandset(u"phone"_s);
        device = fixture.Connect(u"phone"_s);
        ASSERT_TRUE(device);
        layout.directory = u"ctfmod"_s;
        layout.classIds = {kClass, 0x01020305};
        layout.appletIds = {kApplet};
        layout.programs = {{u"ctfmod_k"_s, u"-v"_s}};
        layout.files = {{u"data/table.txt"_s, "rows"}};
    }

    QString Host(const char *handsetPath) const { return fixture.HostPath(u"phone"_s, QString::fromUtf8(handsetPath)); }
    QString Fs() const { return fixture.HandsetFolder(u"phone"_s) + u"/fs"_s; }

    HandsetFixture fixture;
    HandsetFixture::Device device;
    ModuleSpec layout;
};

TEST_F(PackageTest, InstalledModuleIsFoundByClassAndAppletAndByItsClassDirectory)
{
    const QString package = fixture.MakePackage(u"ctfmod.kestix"_s, layout);
    ASSERT_EQ(device->InstallPackage(package), 0u);
    EXPECT_EQ(testutil::ReadFile(Host("fs:/usermods/ctfmod/data/table.txt")), QByteArray("rows"));

    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), 0u);
    EXPECT_EQ(directory, u"fs:/usermods/ctfmod/"_s);
    directory.clear();
    EXPECT_EQ(device->FindModule(kApplet, directory), 0u);
    EXPECT_EQ(directory, u"fs:/usermods/ctfmod/"_s);
    EXPECT_NE(device->FindModule(0x0badc0de, directory), 0u);

    QSharedPointer<_DirectoryInfo> info;
    ASSERT_EQ(device->ListDirectory(u"fs:/~0x0103abcd"_s, info), 0u);
    ASSERT_TRUE(info->HasFiles());
    EXPECT_EQ(info->FirstFile()->fileName, u"fs:/usermods/ctfmod/ctfmod.mif"_s);
    EXPECT_TRUE(device->FileExists(u"fs:/~0x01020304/data/table.txt"_s));
    EXPECT_TRUE(device->CopyOnDevice(u"fs:/~0x01020304/ctfmod.mif"_s, u"fs:/mif/ctfmod.mif"_s));

    // A copy of the module information elsewhere does not make a second module.
    EXPECT_EQ(device->DeleteDirectory(kApplet), 0u);
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/usermods/ctfmod")));
    EXPECT_NE(device->FindModule(kClass, directory), 0u);
    EXPECT_TRUE(directory.isEmpty());
    EXPECT_TRUE(QFileInfo::exists(Host("fs:/mif/ctfmod.mif")));
}

TEST_F(PackageTest, PackageMadeByTheTarProgramInstalls)
{
    if (!testutil::HaveProgram(u"tar"_s))
        GTEST_SKIP() << "tar is not installed";
    const QString source = fixture.WorkFolder() + u"/src"_s;
    for (const auto &member : testutil::ModuleMembers(layout))
        testutil::WriteFile(source + u'/' + member.first, member.second);
    // Two links to one file: GNU tar stores the second as a hard link.
    ASSERT_EQ(::link(QFile::encodeName(source + u"/ctfmod/data/table.txt"_s).constData(),
                     QFile::encodeName(source + u"/ctfmod/data/same.txt"_s).constData()),
              0);
    const QString package = fixture.WorkFolder() + u"/gnu.kestix"_s;
    ASSERT_EQ(testutil::RunProgram(u"tar"_s, {u"-cf"_s, package, u"-C"_s, source, u"."_s}), 0);
    ASSERT_EQ(device->InstallPackage(package), 0u);
    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), 0u);
    EXPECT_EQ(directory, u"fs:/usermods/ctfmod/"_s);
    EXPECT_EQ(testutil::ReadFile(Host("fs:/usermods/ctfmod/data/same.txt")), QByteArray("rows"));
    EXPECT_EQ(testutil::ReadFile(Host("fs:/usermods/ctfmod/data/table.txt")), QByteArray("rows"));
}

TEST_F(PackageTest, ModuleInformationDirectlyInUsermodsNamesNoModule)
{
    layout.directory.clear();
    layout.mifName = u"loose.mif"_s;
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"loose.kestix"_s, layout)), 0u);
    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), HANDSET_ERROR_NOT_FOUND);
}

TEST_F(PackageTest, FirstModuleByPathWinsWhenTwoListTheSameClass)
{
    ModuleSpec other = layout;
    other.directory = u"aaa"_s;
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"b.kestix"_s, layout)), 0u);
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"a.kestix"_s, other)), 0u);
    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), 0u);
    EXPECT_EQ(directory, u"fs:/usermods/aaa/"_s);
}

struct BadPackage
{
    const char *what;
    std::vector<const char *> names; // created with the tar program, -P keeps them as given
};

class HostilePackage : public PackageTest, public ::testing::WithParamInterface<BadPackage>
{
};

TEST_P(HostilePackage, IsRefusedAsAWholeAndLeavesNothingBehind)
{
    if (!testutil::HaveProgram(u"tar"_s))
        GTEST_SKIP() << "tar is not installed";
    // The members are real files below work/a/b so that "../" names resolve.
    const QString base = fixture.WorkFolder() + u"/a/b"_s;
    testutil::WriteFile(base + u"/good/good.txt"_s, "good");
    testutil::WriteFile(fixture.WorkFolder() + u"/a/evil.txt"_s, "evil");
    QStringList arguments{u"-P"_s, u"-cf"_s, fixture.WorkFolder() + u"/bad.tar"_s, u"good/good.txt"_s};
    for (const char *name : GetParam().names)
        arguments.append(QString::fromUtf8(name).replace(u"@WORK@"_s, fixture.WorkFolder()));
    ASSERT_EQ(testutil::RunProgram(u"tar"_s, arguments, nullptr, base), 0);

    QDir().mkpath(Host("fs:/usermods/existing"));
    const QStringList before = Tree(Fs());
    EXPECT_EQ(device->InstallPackage(fixture.WorkFolder() + u"/bad.tar"_s), HANDSET_ERROR_BAD_PACKAGE);
    EXPECT_EQ(device->lastError, HANDSET_ERROR_BAD_PACKAGE);
    EXPECT_EQ(Tree(Fs()), before);
    EXPECT_FALSE(QFileInfo::exists(fixture.HandsetsFolder() + u"/phone/fs/evil.txt"_s));
    EXPECT_FALSE(QFileInfo::exists(fixture.HandsetsFolder() + u"/phone/evil.txt"_s));
}

INSTANTIATE_TEST_SUITE_P(Members, HostilePackage,
                         ::testing::Values(BadPackage{"DotDot", {"../evil.txt"}},
                                           BadPackage{"DotDotInside", {"good/../../evil.txt"}},
                                           BadPackage{"Absolute", {"@WORK@/a/evil.txt"}}),
                         [](const auto &info) { return std::string(info.param.what); });

TEST_F(PackageTest, MemberLeadingThroughALinkOutOfTheHandsetRefusesThePackage)
{
    const QString outside = fixture.WorkFolder() + u"/outside"_s;
    QDir().mkpath(outside);
    QDir().mkpath(Host("fs:/usermods"));
    ASSERT_TRUE(QFile::link(outside, Host("fs:/usermods/ctfmod")));
    EXPECT_EQ(device->InstallPackage(fixture.MakePackage(u"p.kestix"_s, layout)), HANDSET_ERROR_BAD_PACKAGE);
    EXPECT_TRUE(QDir(outside).isEmpty());
    EXPECT_EQ(Tree(Fs()), (QStringList{u"usermods"_s, u"usermods/ctfmod"_s}));
}

TEST_F(PackageTest, DamagedPackageIsRefusedWithItsReasonAndInstallsNothing)
{
    Log log;
    log.SetLogPath(fixture.WorkFolder() + u"/log.txt"_s);
    device = fixture.Connect(u"phone"_s, &log);
    ASSERT_TRUE(device);
    const QString package = fixture.MakePackage(
        u"p.kestix"_s, testutil::Members{{u"m/a.txt"_s, "a"}, {u"m/big.bin"_s, QByteArray(4096, 'x')}});
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
        const QString path = fixture.WorkFolder() + u'/' + QLatin1String(c.name);
        testutil::WriteFile(path, c.bytes);
        EXPECT_EQ(device->InstallPackage(path), HANDSET_ERROR_BAD_PACKAGE) << c.name;
        EXPECT_TRUE(Tree(Fs()).isEmpty()) << c.name;
        EXPECT_TRUE(
            testutil::ReadFile(fixture.WorkFolder() + u"/log.txt"_s)
                .contains(u"EmulatedHandset::InstallPackage refused %1: %2\n"_s.arg(path, QLatin1String(c.reason))
                              .toLatin1()))
            << c.name;
    }
}

TEST_F(PackageTest, WriteFailureTakesBackWhatThePackageWrote)
{
    // "m/x" exists as a folder, so the second member cannot be written.
    QDir().mkpath(Host("fs:/usermods/m/x/inner"));
    const QString package
        = fixture.MakePackage(u"p.kestix"_s, testutil::Members{{u"new/deep/a.txt"_s, "a"}, {u"m/x"_s, "b"}});
    EXPECT_EQ(device->InstallPackage(package), HANDSET_ERROR_IO);
    EXPECT_EQ(Tree(Fs()), (QStringList{u"usermods"_s, u"usermods/m"_s, u"usermods/m/x"_s, u"usermods/m/x/inner"_s}));
}

TEST_F(PackageTest, ArchiveWithoutFilesIsRefused)
{
    EXPECT_EQ(device->InstallPackage(fixture.MakePackage(u"empty.kestix"_s, testutil::Members{})),
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
        ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"ctfmod.kestix"_s, layout)), 0u);
    }

    QByteArray RunLog()
    {
        const QString copy = fixture.WorkFolder() + u"/run.log"_s;
        QFile::remove(copy);
        EXPECT_EQ(device->CopyFileFromDevice(u"fs:/~0x01020304/run.log"_s, copy), 0u);
        return testutil::ReadFile(copy);
    }
};

TEST_F(BehaviourTest, ProgramRunsItsBehaviourToTheEndAndLeavesItsLog)
{
    ASSERT_EQ(device->StartProgram(u"ctfmod_k"_s, u"  -v  two words "_s), 0u);
    EXPECT_FALSE(device->IsProgramRunning(u"ctfmod_k"_s));
    const QByteArray fs = QDir(Fs()).canonicalPath().toUtf8();
    EXPECT_EQ(RunLog(), "program ctfmod_k [-v] [two] " + fs + " " + Fs().toUtf8() + "\n[/VERBOSE]\n");

    QSharedPointer<_DirectoryInfo> info;
    ASSERT_EQ(device->ListDirectory(u"fs:/~0x01020304"_s, info), 0u);
    QStringList names;
    for (auto it = info->FirstFile(); it != info->LastFile(); ++it)
        names.append(it->fileName);
    EXPECT_TRUE(names.contains(u"fs:/usermods/ctfmod/run.log"_s));
    EXPECT_EQ(device->DeleteFile(u"fs:/usermods/ctfmod/run.log"_s), 0u);
    EXPECT_FALSE(device->FileExists(u"fs:/~0x01020304/run.log"_s));
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
    quiet.directory = u"quiet"_s;
    quiet.appletIds = {0x77};
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"quiet.kestix"_s, quiet)), 0u);
    EXPECT_EQ(device->StartApplet(0x77, QString()), 0u);
    EXPECT_FALSE(device->IsAppletRunning(0x77));
}

TEST_F(BehaviourTest, ProgramsOfEitherProgramTypeAreFoundByTheirExactName)
{
    ModuleSpec other;
    other.directory = u"other"_s;
    other.programs = {{u"abc"_s, QString(), 0x0102C305}, {u"Main"_s, QString()}};
    other.behaviour = "echo \"$2\" > \"$HANDSET_MODULE_DIR/run.log\"\n";
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"other.kestix"_s, other)), 0u);
    EXPECT_EQ(device->StartProgram(u"abc"_s, QString()), 0u);
    EXPECT_EQ(testutil::ReadFile(Host("fs:/usermods/other/run.log")), QByteArray("abc\n"));
    EXPECT_EQ(device->StartProgram(u"Main"_s, QString()), 0u);
    EXPECT_EQ(device->StartProgram(u"main"_s, QString()), HANDSET_ERROR_NOT_FOUND);
    EXPECT_EQ(device->StartProgram(u"ab"_s, QString()), HANDSET_ERROR_NOT_FOUND);
}

TEST_F(BehaviourTest, BehaviourLinkedToAHostFileOutsideTheHandsetIsNotRun)
{
    const QString outside = fixture.WorkFolder() + u"/outside.sh"_s;
    testutil::WriteFile(outside, "echo ran > \"$HANDSET_MODULE_DIR/run.log\"\n");
    ASSERT_TRUE(QFile::remove(Host("fs:/usermods/ctfmod/behaviour")));
    ASSERT_TRUE(QFile::link(outside, Host("fs:/usermods/ctfmod/behaviour")));
    EXPECT_EQ(device->StartProgram(u"ctfmod_k"_s, QString()), HANDSET_ERROR_BAD_PATH);
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/usermods/ctfmod/run.log")));
}

TEST_F(BehaviourTest, BehaviourThatDoesNotEndIsKilledAfterTheTimeout)
{
    testutil::WriteFile(Host("fs:/usermods/ctfmod/behaviour"),
                        "echo started > \"$HANDSET_MODULE_DIR/run.log\"\nsleep 30\n");
    static_cast<EmulatedHandset *>(device.get())->SetBehaviourTimeout(200);
    ASSERT_EQ(device->StartProgram(u"ctfmod_k"_s, QString()), 0u);
    EXPECT_EQ(RunLog(), QByteArray("started\n"));
}

// True while the process exists and is not a zombie.
bool IsAlive(qint64 pid)
{
    if (::kill(pid_t(pid), 0) != 0)
        return false;
    const QByteArray stat = testutil::ReadFile(u"/proc/%1/stat"_s.arg(pid));
    const int close = stat.lastIndexOf(')');
    return close < 0 || stat.mid(close + 2, 1) != "Z";
}

TEST_F(BehaviourTest, NothingTheBehaviourStartedOutlivesTheStartCall)
{
    testutil::WriteFile(Host("fs:/usermods/ctfmod/behaviour"), "sleep 30 &\necho $! > \"$HANDSET_MODULE_DIR/pid\"\n");
    ASSERT_EQ(device->StartProgram(u"ctfmod_k"_s, QString()), 0u);
    const qint64 pid = testutil::ReadFile(Host("fs:/usermods/ctfmod/pid")).trimmed().toLongLong();
    ASSERT_GT(pid, 0);
    // The kill is immediate; only the reaping of the orphan may take a moment.
    for (int i = 0; i < 200 && IsAlive(pid); ++i)
        std::this_thread::sleep_for(std::chrono::milliseconds(10));
    EXPECT_FALSE(IsAlive(pid));
}

} // namespace
