#include "device/device.h"
#include "handset/emulatedhandset.h"

#include "support/handsetfixture.h"
#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using testutil::HandsetFixture;

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
        device = fixture.Connect(u"phone"_s);
        ASSERT_TRUE(device);
        outside = fixture.WorkFolder() + u"/outside"_s;
        testutil::WriteFile(outside + u"/keep.txt"_s, "keep");
    }

    QString Host(const char *handsetPath) const { return fixture.HostPath(u"phone"_s, QString::fromUtf8(handsetPath)); }
    QString Work(const char *name) const { return fixture.WorkFolder() + u'/' + QString::fromUtf8(name); }

    HandsetFixture fixture;
    QString folder;
    QString outside;
    HandsetFixture::Device device;
};

TEST_F(EmulatedHandsetTest, CopiesListsDeletesAndRemovesFiles)
{
    testutil::WriteFile(Work("a.log"), "alpha");
    testutil::WriteFile(Work("B.log"), "bravo");
    EXPECT_EQ(device->CopyFileToDevice(Work("a.log"), u"fs:/usermods/x/a.log"_s), 0u);
    EXPECT_EQ(device->CopyFileToDevice(Work("B.log"), u"fs:/usermods/x/B.log"_s), 0u);
    EXPECT_EQ(device->CopyFileToDevice(Work("a.log"), u"fs:/usermods/x/sub/c.log"_s), 0u);
    EXPECT_TRUE(device->FileExists(u"fs:/usermods/x/a.log"_s));
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
    device->lastError = 0;
    EXPECT_EQ(GetParam().call(*device, fixture.WorkFolder()), GetParam().error);
    EXPECT_EQ(device->lastError, GetParam().error);
    EXPECT_FALSE(device->connectionLost);
    EXPECT_EQ(testutil::ReadFile(outside + u"/keep.txt"_s), QByteArray("keep"));
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
    Case("InstallNotATar", HANDSET_ERROR_BAD_PACKAGE,
         [](D d, Work w) { return d.InstallPackage(w + u"/outside/keep.txt"_s); }),
};

INSTANTIATE_TEST_SUITE_P(Operations, EmulatedHandsetFailure, ::testing::ValuesIn(kFailures),
                         [](const auto &info) { return std::string(info.param.what); });

TEST_F(EmulatedHandsetTest, SymbolicLinksOutOfTheHandsetAreNeverFollowed)
{
    QDir().mkpath(Host("fs:/usermods"));
    ASSERT_TRUE(QFile::link(outside, Host("fs:/usermods/escape")));
    ASSERT_TRUE(QFile::link(outside + u"/keep.txt"_s, Host("fs:/leak")));
    testutil::WriteFile(Work("new"), "new");

    QSharedPointer<_DirectoryInfo> info;
    EXPECT_EQ(device->ListDirectory(u"fs:/usermods/escape"_s, info), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->DeleteFile(u"fs:/usermods/escape/keep.txt"_s), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->DeleteFile(u"fs:/leak"_s), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->RemoveDirectory(u"fs:/usermods/escape"_s), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->CopyFileToDevice(Work("new"), u"fs:/usermods/escape/keep.txt"_s), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->CopyFileToDevice(Work("new"), u"fs:/leak"_s), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->CopyFileFromDevice(u"fs:/leak"_s, Work("copy")), HANDSET_ERROR_BAD_PATH);
    EXPECT_FALSE(device->FileExists(u"fs:/usermods/escape/keep.txt"_s));
    EXPECT_FALSE(QFileInfo::exists(Work("copy")));
    EXPECT_EQ(testutil::ReadFile(outside + u"/keep.txt"_s), QByteArray("keep"));
    EXPECT_EQ(QDir(outside).entryList(QDir::Files), QStringList{u"keep.txt"_s});
}

TEST_F(EmulatedHandsetTest, OfflineFileAppearingMidSessionLosesTheConnectionForGood)
{
    testutil::WriteFile(Work("a"), "a");
    ASSERT_EQ(device->CopyFileToDevice(Work("a"), u"fs:/a"_s), 0u);
    testutil::WriteFile(folder + u"/offline"_s, "");
    EXPECT_TRUE(device->FileExists(u"fs:/a"_s) == false);
    EXPECT_TRUE(device->connectionLost);
    EXPECT_EQ(device->lastError, HANDSET_ERROR_CONNECTION_LOST);

    // Even when the handset comes back, this connection stays lost.
    ASSERT_TRUE(QFile::remove(folder + u"/offline"_s));
    QString version;
    QString directory;
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
    EXPECT_FALSE(device->IsProgramRunning(u"p"_s));
    EXPECT_FALSE(device->IsAppletRunning(1));
    EXPECT_FALSE(device->CopyOnDevice(u"fs:/a"_s, u"fs:/c"_s));
    EXPECT_EQ(device->lastError, HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_TRUE(QFileInfo::exists(Host("fs:/a")));
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/c")));

    // A new connection works again.
    auto again = fixture.Connect(u"phone"_s);
    ASSERT_TRUE(again);
    EXPECT_TRUE(again->FileExists(u"fs:/a"_s));
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

TEST_F(EmulatedHandsetTest, VanishedHandsetFolderLosesTheConnection)
{
    ASSERT_TRUE(QDir(folder).removeRecursively());
    QString version;
    EXPECT_EQ(device->GetPlatformVersion(version), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_TRUE(device->connectionLost);
    testutil::WriteFile(Work("a"), "a");
    EXPECT_EQ(device->CopyFileToDevice(Work("a"), u"fs:/a"_s), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_FALSE(QFileInfo::exists(folder));
}

} // namespace
