// The emulated handset: finding and connecting handsets, the operations on
// files, packages and programs, and losing the connection.

#include "device/device.h"
#include "handset/connectfactory.h"
#include "handset/emulatedhandset.h"
#include "log/log.h"

#include "support/handsetfixture.h"
#include "support/testutil.h"

#include <QDir>
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
using testutil::Tree;

constexpr unsigned int kClass = 0x01020304;
constexpr unsigned int kApplet = 0x0103abcd;

QStringList FileNames(const QSharedPointer<_DirectoryInfo> &info)
{
    QStringList names;
    for (auto it = info->FirstFile(); it != info->LastFile(); ++it)
        names.append(it->fileName);
    return names;
}

class EmulatedHandsetTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        folder = fixture.AddHandset(u"phone"_s);
        log.SetLogPath(fixture.WorkFolder() + u"/log.txt"_s);
        device = fixture.Connect(u"phone"_s, &log);
        ASSERT_TRUE(device);
        outside = fixture.WorkFolder() + u"/outside"_s;
        testutil::WriteFile(outside + u"/keep.txt"_s, "keep");
        layout.directory = u"ctfmod"_s;
        layout.classIds = {kClass, 0x01020305};
        layout.appletIds = {kApplet};
        layout.programs = {{u"ctfmod_k"_s, u"-v"_s}};
        layout.files = {{u"data/table.txt"_s, "rows"}};
    }

    QString Host(const char *handsetPath) const { return fixture.HostPath(u"phone"_s, QString::fromUtf8(handsetPath)); }
    QString Work(const char *name) const { return fixture.WorkFolder() + u'/' + QString::fromUtf8(name); }
    QString Fs() const { return folder + u"/fs"_s; }
    QString LogText() const { return QString::fromLatin1(testutil::ReadFile(Work("log.txt"))); }

    HandsetFixture fixture;
    Log log;
    QString folder, outside;
    HandsetFixture::Device device;
    ModuleSpec layout;
};

TEST_F(EmulatedHandsetTest, CopiesListsDeletesAndRemovesFiles)
{
    testutil::WriteFile(Work("a.log"), "alpha");
    testutil::WriteFile(Work("B.log"), "bravo");
    EXPECT_EQ(device->CopyFileToDevice(Work("a.log"), u"fs:/usermods/x/a.log"_s), 0u);
    EXPECT_EQ(device->CopyFileToDevice(Work("B.log"), u"fs:/usermods/x/B.log"_s), 0u);
    EXPECT_EQ(device->CopyFileToDevice(Work("a.log"), u"fs:/usermods/x/sub/c.log"_s), 0u);
    EXPECT_TRUE(device->FileExists(u"fs:/usermods/x/sub"_s));

    QSharedPointer<_DirectoryInfo> info;
    ASSERT_EQ(device->ListDirectory(u"fs:/usermods/x/"_s, info), 0u);
    ASSERT_TRUE(info);
    EXPECT_EQ(FileNames(info), (QStringList{u"fs:/usermods/x/a.log"_s, u"fs:/usermods/x/B.log"_s}));
    EXPECT_EQ(info->files.first().size, 5);

    EXPECT_EQ(device->CopyFileFromDevice(u"fs:/usermods/x/B.log"_s, Work("back/B.log")), 0u);
    EXPECT_EQ(testutil::ReadFile(Work("back/B.log")), QByteArray("bravo"));
    EXPECT_TRUE(device->CopyOnDevice(u"fs:/usermods/x/B.log"_s, u"fs:/mif/B.log"_s));
    EXPECT_EQ(testutil::ReadFile(Host("fs:/mif/B.log")), QByteArray("bravo"));
    // A shorter file replaces a longer one whole.
    testutil::WriteFile(Work("short"), "sh");
    ASSERT_EQ(device->CopyFileToDevice(Work("short"), u"fs:/mif/B.log"_s), 0u);
    EXPECT_EQ(testutil::ReadFile(Host("fs:/mif/B.log")), QByteArray("sh"));

    EXPECT_EQ(device->DeleteFile(u"fs:/usermods/x/a.log"_s), 0u);
    EXPECT_FALSE(device->FileExists(u"fs:/usermods/x/a.log"_s));
    EXPECT_EQ(device->RemoveDirectory(u"fs:/usermods/x"_s), 0u);
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/usermods/x")));
    EXPECT_TRUE(QFileInfo::exists(Host("fs:/mif/B.log")));
    EXPECT_EQ(device->lastError, 0u);
}

TEST_F(EmulatedHandsetTest, ListingShowsOnlyPlainFiles)
{
    testutil::WriteFile(Host("fs:/d/file"), "x");
    testutil::WriteFile(Host("fs:/d/.hidden"), "x");
    QDir().mkpath(Host("fs:/d/folder"));
    ASSERT_TRUE(QFile::link(Host("fs:/d/file"), Host("fs:/d/link")));
    QSharedPointer<_DirectoryInfo> info;
    ASSERT_EQ(device->ListDirectory(u"fs:/d"_s, info), 0u);
    EXPECT_EQ(FileNames(info), (QStringList{u"fs:/d/.hidden"_s, u"fs:/d/file"_s}));

    QDir().mkpath(Host("fs:/empty"));
    ASSERT_EQ(device->ListDirectory(u"fs:/empty"_s, info), 0u);
    EXPECT_FALSE(info->HasFiles());
}

struct FailureCase
{
    const char *what;
    unsigned int error;
    std::function<unsigned int(IKestoDevice &, const QString &)> call;
};

class EmulatedHandsetFailure : public EmulatedHandsetTest, public ::testing::WithParamInterface<FailureCase>
{
};

TEST_P(EmulatedHandsetFailure, FailsWithItsErrorNumber)
{
    testutil::WriteFile(Host("fs:/file"), "x");
    testutil::WriteFile(Work("new"), "new");
    ASSERT_TRUE(KitWriter::WritePackage(Work("empty.kestix"), {}));
    // Symbolic links out of the handset are never followed.
    QDir().mkpath(Host("fs:/usermods"));
    ASSERT_TRUE(QFile::link(outside, Host("fs:/usermods/escape")));
    ASSERT_TRUE(QFile::link(outside + u"/keep.txt"_s, Host("fs:/leak")));
    device->lastError = 0;
    EXPECT_EQ(GetParam().call(*device, fixture.WorkFolder()), GetParam().error);
    EXPECT_EQ(device->lastError, GetParam().error);
    EXPECT_FALSE(device->connectionLost);
    EXPECT_EQ(testutil::ReadFile(outside + u"/keep.txt"_s), QByteArray("keep"));
    EXPECT_EQ(QDir(outside).entryList(QDir::Files), QStringList{u"keep.txt"_s});
    EXPECT_FALSE(QFileInfo::exists(Work("copy")));
}

// The error of a listing, or 99 when a failed listing left no empty result.
unsigned int List(IKestoDevice &d, const QString &path)
{
    QSharedPointer<_DirectoryInfo> info;
    const unsigned int result = d.ListDirectory(path, info);
    return info && !info->HasFiles() ? result : 99u;
}

// The error of a module search, or 99 when a failed search left the folder set.
unsigned int Find(IKestoDevice &d, unsigned int classId)
{
    QString directory = u"stale"_s;
    const unsigned int result = d.FindModule(classId, directory);
    return directory.isEmpty() ? result : 99u;
}

// The error a false result left, or 99 for a true one.
unsigned int ErrorOf(IKestoDevice &d, bool result)
{
    return result ? 99u : d.lastError;
}

using D = IKestoDevice &;
using Work = const QString &;
FailureCase Case(const char *what, unsigned int error, std::function<unsigned int(D, Work)> call)
{
    return {what, error, std::move(call)};
}

const QString kOut = u"fs:/../../../work/outside/keep.txt"_s;
constexpr unsigned int kNotFound = HANDSET_ERROR_NOT_FOUND;
constexpr unsigned int kBadPath = HANDSET_ERROR_BAD_PATH;
constexpr unsigned int kBadPackage = HANDSET_ERROR_BAD_PACKAGE;

const FailureCase kFailures[] = {
    Case("ListMissing", kNotFound, [](D d, Work) { return List(d, u"fs:/none"_s); }),
    Case("ListAFile", kNotFound, [](D d, Work) { return List(d, u"fs:/file"_s); }),
    Case("ListOutside", kBadPath, [](D d, Work) { return List(d, u"fs:/../../../work/outside"_s); }),
    Case("ListNoPrefix", kBadPath, [](D d, Work work) { return List(d, work); }),
    Case("ListUnknownClass", kNotFound, [](D d, Work) { return List(d, u"fs:/~0x01010001"_s); }),
    Case("DeleteMissing", kNotFound, [](D d, Work) { return d.DeleteFile(u"fs:/none"_s); }),
    Case("DeleteOutside", kBadPath, [](D d, Work) { return d.DeleteFile(kOut); }),
    Case("RemoveMissing", kNotFound, [](D d, Work) { return d.RemoveDirectory(u"fs:/none"_s); }),
    Case("RemoveParent", kBadPath, [](D d, Work) { return d.RemoveDirectory(u"fs:/.."_s); }),
    Case("CopyFromMissingHostFile", kNotFound,
         [](D d, Work w) { return d.CopyFileToDevice(w + u"/none"_s, u"fs:/x"_s); }),
    Case("CopyToOutside", kBadPath, [](D d, Work w) { return d.CopyFileToDevice(w + u"/outside/keep.txt"_s, kOut); }),
    Case("CopyMissingFromDevice", kNotFound,
         [](D d, Work w) { return d.CopyFileFromDevice(u"fs:/none"_s, w + u"/x"_s); }),
    Case("CopyFromOutsideOfDevice", kBadPath,
         [](D d, Work w) { return d.CopyFileFromDevice(u"fs:/../handset.ini"_s, w + u"/x"_s); }),
    Case("ExistsOutside", kBadPath, [](D d, Work) { return ErrorOf(d, d.FileExists(u"fs:/../handset.ini"_s)); }),
    Case("ExistsMissing", kNotFound, [](D d, Work) { return ErrorOf(d, d.FileExists(u"fs:/none"_s)); }),
    Case("CopyOnDeviceMissing", kNotFound,
         [](D d, Work) { return ErrorOf(d, d.CopyOnDevice(u"fs:/none"_s, u"fs:/y"_s)); }),
    Case("CopyOnDeviceToOutside", kBadPath, [](D d, Work) { return ErrorOf(d, d.CopyOnDevice(u"fs:/file"_s, kOut)); }),
    Case("FindModuleNone", kNotFound, [](D d, Work) { return Find(d, 0x01010001); }),
    Case("FindModuleZero", kNotFound, [](D d, Work) { return Find(d, 0); }),
    Case("DeleteDirectoryUnknownClass", kNotFound, [](D d, Work) { return d.DeleteDirectory(0x01010001); }),
    Case("StartUnknownProgram", kNotFound, [](D d, Work) { return d.StartProgram(u"nothing"_s, QString()); }),
    Case("StartUnknownApplet", kNotFound, [](D d, Work) { return d.StartApplet(0x1234, QString()); }),
    Case("InstallMissingPackage", kNotFound, [](D d, Work w) { return d.InstallPackage(w + u"/none.kestix"_s); }),
    Case("ListThroughLink", kBadPath, [](D d, Work) { return List(d, u"fs:/usermods/escape"_s); }),
    Case("DeleteThroughLink", kBadPath, [](D d, Work) { return d.DeleteFile(u"fs:/usermods/escape/keep.txt"_s); }),
    Case("DeleteLink", kBadPath, [](D d, Work) { return d.DeleteFile(u"fs:/leak"_s); }),
    Case("RemoveLink", kBadPath, [](D d, Work) { return d.RemoveDirectory(u"fs:/usermods/escape"_s); }),
    Case("CopyThroughLink", kBadPath,
         [](D d, Work w) { return d.CopyFileToDevice(w + u"/new"_s, u"fs:/usermods/escape/keep.txt"_s); }),
    Case("CopyOntoLink", kBadPath, [](D d, Work w) { return d.CopyFileToDevice(w + u"/new"_s, u"fs:/leak"_s); }),
    Case("CopyFromLink", kBadPath, [](D d, Work w) { return d.CopyFileFromDevice(u"fs:/leak"_s, w + u"/copy"_s); }),
    Case("ExistsThroughLink", kBadPath,
         [](D d, Work) { return ErrorOf(d, d.FileExists(u"fs:/usermods/escape/keep.txt"_s)); }),
    Case("InstallEmptyArchive", kBadPackage, [](D d, Work w) { return d.InstallPackage(w + u"/empty.kestix"_s); }),
    Case("InstallNotATar", kBadPackage, [](D d, Work w) { return d.InstallPackage(w + u"/outside/keep.txt"_s); })};

INSTANTIATE_TEST_SUITE_P(Operations, EmulatedHandsetFailure, ::testing::ValuesIn(kFailures),
                         [](const auto &info) { return std::string(info.param.what); });

TEST_F(EmulatedHandsetTest, OfflineFileOrVanishedFolderLosesTheConnectionForGood)
{
    testutil::WriteFile(Work("a"), "a");
    ASSERT_EQ(device->CopyFileToDevice(Work("a"), u"fs:/a"_s), 0u);
    testutil::WriteFile(folder + u"/offline"_s, "");
    EXPECT_TRUE(device->FileExists(u"fs:/a"_s) == false);
    EXPECT_TRUE(device->connectionLost);
    EXPECT_EQ(device->lastError, HANDSET_ERROR_CONNECTION_LOST);

    // Even when the handset comes back, this connection stays lost.
    ASSERT_TRUE(QFile::remove(folder + u"/offline"_s));
    QString version, directory;
    QSharedPointer<_DirectoryInfo> info;
    EXPECT_EQ(device->GetPlatformVersion(version), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->CopyFileToDevice(Work("a"), u"fs:/b"_s), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->CopyFileFromDevice(u"fs:/a"_s, Work("b")), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->ListDirectory(u"fs:/"_s, info), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->DeleteFile(u"fs:/a"_s), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->RemoveDirectory(u"fs:/"_s), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->InstallPackage(Work("a")), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->FindModule(1, directory), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->StartProgram(u"p"_s, QString()), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->StartApplet(1, QString()), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_FALSE(device->CopyOnDevice(u"fs:/a"_s, u"fs:/c"_s));
    EXPECT_EQ(device->lastError, HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/c")));

    auto again = fixture.Connect(u"phone"_s);
    ASSERT_TRUE(again);
    EXPECT_TRUE(again->FileExists(u"fs:/a"_s));

    // A vanished handset folder loses the connection too, writing nothing.
    ASSERT_TRUE(QDir(folder).removeRecursively());
    EXPECT_EQ(again->CopyFileToDevice(Work("a"), u"fs:/a"_s), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_TRUE(again->connectionLost);
    EXPECT_FALSE(QFileInfo::exists(folder));
}

TEST_F(EmulatedHandsetTest, HandsetCountsOperationsBeforeDroppingOut)
{
    testutil::WriteFile(folder + u"/handset.ini"_s, "offlineAfter=2\n");
    auto counted = fixture.Connect(u"phone"_s);
    ASSERT_TRUE(counted);
    QString version;
    EXPECT_EQ(counted->GetPlatformVersion(version), 0u);
    EXPECT_FALSE(counted->FileExists(u"fs:/nothing"_s));
    EXPECT_FALSE(counted->connectionLost);
    EXPECT_NE(counted->GetPlatformVersion(version), 0u);
    EXPECT_TRUE(counted->connectionLost);
    EXPECT_TRUE(QFileInfo::exists(folder + u"/offline"_s));
    // Later connections find it unplugged.
    EXPECT_FALSE(fixture.Connect(u"phone"_s));
}

using PackageTest = EmulatedHandsetTest;

TEST_F(PackageTest, InstalledModuleIsFoundByClassAndAppletAndByItsClassDirectory)
{
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"ctfmod.kestix"_s, layout)), 0u);
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
    EXPECT_EQ(FileNames(info).value(0), u"fs:/usermods/ctfmod/ctfmod.mif"_s);
    EXPECT_TRUE(device->FileExists(u"fs:/~0x01020304/data/table.txt"_s));
    EXPECT_TRUE(device->CopyOnDevice(u"fs:/~0x01020304/ctfmod.mif"_s, u"fs:/mif/ctfmod.mif"_s));

    // A copy of the module information elsewhere does not make a second module.
    EXPECT_EQ(device->DeleteDirectory(kApplet), 0u);
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/usermods/ctfmod")));
    EXPECT_NE(device->FindModule(kClass, directory), 0u);
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

TEST_F(PackageTest, FirstModuleByPathWinsWhenTwoListTheSameClass)
{
    // Module information directly in usermods names no module.
    ModuleSpec loose = layout;
    loose.directory.clear();
    loose.mifName = u"loose.mif"_s;
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"loose.kestix"_s, loose)), 0u);
    QString directory;
    EXPECT_EQ(device->FindModule(kClass, directory), HANDSET_ERROR_NOT_FOUND);

    ModuleSpec other = layout;
    other.directory = u"aaa"_s;
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"b.kestix"_s, layout)), 0u);
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"a.kestix"_s, other)), 0u);
    EXPECT_EQ(device->FindModule(kClass, directory), 0u);
    EXPECT_EQ(directory, u"fs:/usermods/aaa/"_s);
}

TEST_F(PackageTest, HostilePackageIsRefusedAsAWholeAndLeavesNothingBehind)
{
    if (!testutil::HaveProgram(u"tar"_s))
        GTEST_SKIP() << "tar is not installed";
    // The members are real files below work/a/b so that "../" names resolve;
    // the tar program's -P keeps the names as given.
    const QString base = fixture.WorkFolder() + u"/a/b"_s;
    testutil::WriteFile(base + u"/good/good.txt"_s, "good");
    testutil::WriteFile(fixture.WorkFolder() + u"/a/evil.txt"_s, "evil");
    QDir().mkpath(Host("fs:/usermods/existing"));
    const QStringList before = Tree(Fs());
    for (const QString &name : {u"../evil.txt"_s, u"good/../../evil.txt"_s, fixture.WorkFolder() + u"/a/evil.txt"_s}) {
        SCOPED_TRACE(name.toStdString());
        const QString tar = fixture.WorkFolder() + u"/bad.tar"_s;
        ASSERT_EQ(testutil::RunProgram(u"tar"_s, {u"-P"_s, u"-cf"_s, tar, u"good/good.txt"_s, name}, nullptr, base), 0);
        EXPECT_EQ(device->InstallPackage(tar), HANDSET_ERROR_BAD_PACKAGE);
        EXPECT_EQ(device->lastError, HANDSET_ERROR_BAD_PACKAGE);
        EXPECT_EQ(Tree(Fs()), before);
        EXPECT_FALSE(QFileInfo::exists(folder + u"/evil.txt"_s));
    }
}

TEST_F(PackageTest, MemberThroughALinkOutOfTheHandsetOrAFailedWriteLeavesNothingBehind)
{
    QDir().mkpath(Host("fs:/usermods"));
    ASSERT_TRUE(QFile::link(outside, Host("fs:/usermods/ctfmod")));
    EXPECT_EQ(device->InstallPackage(fixture.MakePackage(u"p.kestix"_s, layout)), HANDSET_ERROR_BAD_PACKAGE);
    EXPECT_EQ(Tree(outside), QStringList{u"keep.txt"_s});
    EXPECT_EQ(Tree(Fs()), (QStringList{u"usermods"_s, u"usermods/ctfmod"_s}));

    // A failure to write takes back what the package wrote: "m/x" exists as a
    // folder, so the second member cannot be written.
    QDir().mkpath(Host("fs:/usermods/m/x/inner"));
    const QString package
        = fixture.MakePackage(u"p2.kestix"_s, testutil::Members{{u"new/deep/a.txt"_s, "a"}, {u"m/x"_s, "b"}});
    EXPECT_EQ(device->InstallPackage(package), HANDSET_ERROR_IO);
    EXPECT_EQ(Tree(Fs()),
              (QStringList{"usermods", "usermods/ctfmod", "usermods/m", "usermods/m/x", "usermods/m/x/inner"}));
}

TEST_F(PackageTest, DamagedPackageIsRefusedWithItsReasonAndInstallsNothing)
{
    const QString package = fixture.MakePackage(
        u"p.kestix"_s, testutil::Members{{u"m/a.txt"_s, "a"}, {u"m/big.bin"_s, QByteArray(4096, 'x')}});
    const QByteArray bytes = testutil::ReadFile(package);
    const std::tuple<const char *, QByteArray, const char *> damaged[]
        = {{"cut.kestix", bytes.left(512 + 512 + 512 + 1000), "unexpected end of archive at offset 2536"},
           {"sum.kestix", bytes.left(1024) + "junk" + bytes.mid(1028), "checksum error at offset 1024"},
           {"text.kestix", QByteArray("m/a.txt\n").repeated(100), "does not look like a tar archive"}};
    for (const auto &[name, content, reason] : damaged) {
        const QString path = Work(name);
        testutil::WriteFile(path, content);
        EXPECT_EQ(device->InstallPackage(path), HANDSET_ERROR_BAD_PACKAGE) << name;
        EXPECT_TRUE(Tree(Fs()).isEmpty()) << name;
        EXPECT_TRUE(LogText().contains(u"EmulatedHandset::InstallPackage refused %1: %2\n"_s.arg(path, reason)))
            << name;
    }
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
    EXPECT_TRUE(FileNames(info).contains(u"fs:/usermods/ctfmod/run.log"_s));
    EXPECT_EQ(device->DeleteFile(u"fs:/usermods/ctfmod/run.log"_s), 0u);
    EXPECT_FALSE(device->FileExists(u"fs:/~0x01020304/run.log"_s));

    // An applet runs it with its class ID.
    ASSERT_EQ(device->StartApplet(kApplet, QString()), 0u);
    EXPECT_FALSE(device->IsAppletRunning(kApplet));
    EXPECT_TRUE(RunLog().startsWith("applet 0x0103abcd [] []"));
}

TEST_F(BehaviourTest, ProgramsOfEitherProgramTypeAreFoundByTheirExactName)
{
    // A module without behaviour starts and ends at once.
    ModuleSpec quiet;
    quiet.directory = u"quiet"_s;
    quiet.appletIds = {0x77};
    ASSERT_EQ(device->InstallPackage(fixture.MakePackage(u"quiet.kestix"_s, quiet)), 0u);
    EXPECT_EQ(device->StartApplet(0x77, QString()), 0u);

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

QStringList Names(const QList<ConnectTarget> &targets)
{
    QStringList names;
    for (const ConnectTarget &target : targets)
        names.append(target.name + u'|' + target.description);
    return names;
}

using ConnectFactoryTest = EmulatedHandsetTest;

TEST_F(ConnectFactoryTest, ListsHandsetsSortedByNameIgnoringCaseWithTheirDescriptions)
{
    fixture.AddHandset(u"beta"_s);
    fixture.AddHandset(u"Alpha"_s, u"Lab phone 1"_s, u"arm"_s);
    fixture.AddHandset(u"charlie"_s, QString(), u"1"_s);
    QDir().mkpath(fixture.HandsetsFolder() + u"/not-a-handset/fs"_s);
    testutil::WriteFile(fixture.HandsetsFolder() + u"/stray.ini"_s, "x");

    ASSERT_TRUE(ConnectFactory::Initialize());
    QList<ConnectTarget> targets{ConnectTarget(u"left"_s, u"over"_s)};
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 4u);
    EXPECT_EQ(Names(targets), (QStringList{"Alpha|Lab phone 1", "beta|beta", "charlie|charlie", "phone|phone"}));
    ConnectFactory::Uninitialize();
}

TEST_F(ConnectFactoryTest, ReadsPlatformAndVersionWithDefaults)
{
    using P = IKestoDevice::Platform;
    const std::tuple<QByteArray, P, const char *> rows[] = {{"", P::PLATFORM_WIN32, ""},
                                                            {"platform=ARM\nversion=4.1.7\n", P::PLATFORM_ARM, "4.1.7"},
                                                            {"platform=z80\n", P::PLATFORM_UNKNOWN, ""},
                                                            {"platform=\nversion=\n", P::PLATFORM_WIN32, ""}};
    for (const auto &[text, platform, expectedVersion] : rows) {
        testutil::WriteFile(folder + u"/handset.ini"_s, text);
        auto device = fixture.Connect(u"phone"_s);
        ASSERT_TRUE(device) << text.constData();
        EXPECT_EQ(device->platform, platform) << text.constData();
        QString version = u"stale"_s;
        EXPECT_EQ(device->GetPlatformVersion(version), 0u);
        EXPECT_EQ(version, QString::fromLatin1(expectedVersion));
        EXPECT_EQ(device->GetConnectTarget().name, u"phone"_s);
    }
}

TEST_F(ConnectFactoryTest, DefaultHandsetsFolderLiesBelowTheDataRoot)
{
    testutil::EnvGuard env("KESTIX_DATA_ROOT", Work("data"));
    env.Unset("KESTIX_HANDSETS");
    testutil::WriteFile(Work("data/Norvane/Handsets/phone/handset.ini"), "");
    QList<ConnectTarget> targets;
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);
    EXPECT_EQ(Names(targets), QStringList{u"phone|phone"_s});

    env.Set("KESTIX_HANDSETS", QString());
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);

    env.Set("KESTIX_HANDSETS", Work("none"));
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 0u);
    EXPECT_TRUE(targets.isEmpty());
}

TEST_F(ConnectFactoryTest, UnknownOfflineAndEscapingHandsetsGiveNull)
{
    EXPECT_EQ(ConnectFactory::ConnectToTarget(ConnectTarget(u"nokia"_s, QString()), &log), nullptr);
    EXPECT_TRUE(LogText().contains(u"Handset nokia not found"_s));
    EXPECT_EQ(ConnectFactory::ConnectToTarget(ConnectTarget(u"nokia"_s, QString()), nullptr), nullptr);
    ConnectFactory::DisconnectTarget(nullptr);

    // A handset one level up must not be reachable through "..".
    testutil::WriteFile(fixture.HandsetsFolder() + u"/../handset.ini"_s, "");
    for (const char *name : {"..", ".", "", "phone/fs", "../handsets/phone"})
        EXPECT_EQ(ConnectFactory::ConnectToTarget(ConnectTarget(QString::fromUtf8(name), QString()), &log), nullptr)
            << name;

    // An offline handset is listed but refuses the connection.
    testutil::WriteFile(fixture.HandsetFolder(u"phone"_s) + u"/offline"_s, "");
    QList<ConnectTarget> targets;
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);
    EXPECT_EQ(ConnectFactory::ConnectToTarget(targets.first(), &log), nullptr);
    EXPECT_TRUE(LogText().contains(u"Handset phone is offline."_s));
}

} // namespace
