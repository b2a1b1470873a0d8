#include "device/device.h"
#include "handset/emulatedhandset.h"

#include "support/handsetfixture.h"
#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>

#include <gtest/gtest.h>

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
        folder = fixture.AddHandset(QStringLiteral("phone"));
        device = fixture.Connect(QStringLiteral("phone"));
        ASSERT_TRUE(device);
        outside = fixture.WorkFolder() + QStringLiteral("/outside");
        testutil::WriteFile(outside + QStringLiteral("/keep.txt"), "keep");
    }

    QString Host(const char *handsetPath) const
    {
        return fixture.HostPath(QStringLiteral("phone"), QString::fromUtf8(handsetPath));
    }
    QString Work(const char *name) const { return fixture.WorkFolder() + QLatin1Char('/') + QString::fromUtf8(name); }

    HandsetFixture fixture;
    QString folder;
    QString outside;
    HandsetFixture::Device device;
};

TEST_F(EmulatedHandsetTest, CopiesListsDeletesAndRemovesFiles)
{
    testutil::WriteFile(Work("a.log"), "alpha");
    testutil::WriteFile(Work("B.log"), "bravo");
    EXPECT_EQ(device->CopyFileToDevice(Work("a.log"), QStringLiteral("fs:/usermods/x/a.log")), 0u);
    EXPECT_EQ(device->CopyFileToDevice(Work("B.log"), QStringLiteral("fs:/usermods/x/B.log")), 0u);
    EXPECT_EQ(device->CopyFileToDevice(Work("a.log"), QStringLiteral("fs:/usermods/x/sub/c.log")), 0u);
    EXPECT_TRUE(device->FileExists(QStringLiteral("fs:/usermods/x/a.log")));
    EXPECT_TRUE(device->FileExists(QStringLiteral("fs:/usermods/x/sub")));

    QSharedPointer<_DirectoryInfo> info;
    ASSERT_EQ(device->ListDirectory(QStringLiteral("fs:/usermods/x/"), info), 0u);
    ASSERT_TRUE(info);
    EXPECT_EQ(FileNames(info),
              (QStringList{QStringLiteral("fs:/usermods/x/a.log"), QStringLiteral("fs:/usermods/x/B.log")}));
    EXPECT_EQ(info->files.first().size, 5);

    EXPECT_EQ(device->CopyFileFromDevice(QStringLiteral("fs:/usermods/x/B.log"), Work("back/B.log")), 0u);
    EXPECT_EQ(testutil::ReadFile(Work("back/B.log")), QByteArray("bravo"));
    EXPECT_TRUE(device->CopyOnDevice(QStringLiteral("fs:/usermods/x/B.log"), QStringLiteral("fs:/mif/B.log")));
    EXPECT_EQ(testutil::ReadFile(Host("fs:/mif/B.log")), QByteArray("bravo"));

    EXPECT_EQ(device->DeleteFile(QStringLiteral("fs:/usermods/x/a.log")), 0u);
    EXPECT_FALSE(device->FileExists(QStringLiteral("fs:/usermods/x/a.log")));
    EXPECT_EQ(device->RemoveDirectory(QStringLiteral("fs:/usermods/x")), 0u);
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/usermods/x")));
    EXPECT_TRUE(QFileInfo::exists(Host("fs:/mif/B.log")));
    EXPECT_EQ(device->lastError, 0u);
}

TEST_F(EmulatedHandsetTest, CopyReplacesAnExistingFile)
{
    testutil::WriteFile(Work("long"), "a much longer text");
    testutil::WriteFile(Work("short"), "short");
    ASSERT_EQ(device->CopyFileToDevice(Work("long"), QStringLiteral("fs:/f")), 0u);
    ASSERT_EQ(device->CopyFileToDevice(Work("short"), QStringLiteral("fs:/f")), 0u);
    EXPECT_EQ(testutil::ReadFile(Host("fs:/f")), QByteArray("short"));
}

TEST_F(EmulatedHandsetTest, ListingShowsOnlyPlainFiles)
{
    testutil::WriteFile(Host("fs:/d/file"), "x");
    testutil::WriteFile(Host("fs:/d/.hidden"), "x");
    QDir().mkpath(Host("fs:/d/folder"));
    ASSERT_TRUE(QFile::link(Host("fs:/d/file"), Host("fs:/d/link")));
    QSharedPointer<_DirectoryInfo> info;
    ASSERT_EQ(device->ListDirectory(QStringLiteral("fs:/d"), info), 0u);
    EXPECT_EQ(FileNames(info), (QStringList{QStringLiteral("fs:/d/.hidden"), QStringLiteral("fs:/d/file")}));

    QDir().mkpath(Host("fs:/empty"));
    ASSERT_EQ(device->ListDirectory(QStringLiteral("fs:/empty"), info), 0u);
    EXPECT_FALSE(info->HasFiles());
}

struct FailureCase
{
    const char *what;
    unsigned int error;
    std::function<unsigned int(IKestoDevice &, const QString &work)> call;
};

class EmulatedHandsetFailure : public EmulatedHandsetTest, public ::testing::WithParamInterface<FailureCase> {};

TEST_P(EmulatedHandsetFailure, FailsWithItsErrorNumber)
{
    testutil::WriteFile(Host("fs:/file"), "x");
    device->lastError = 0;
    EXPECT_EQ(GetParam().call(*device, fixture.WorkFolder()), GetParam().error);
    EXPECT_EQ(device->lastError, GetParam().error);
    EXPECT_FALSE(device->connectionLost);
    EXPECT_EQ(testutil::ReadFile(outside + QStringLiteral("/keep.txt")), QByteArray("keep"));
}

const FailureCase kFailures[] = {
    {"ListMissing", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) {
         QSharedPointer<_DirectoryInfo> info;
         const unsigned int result = d.ListDirectory(QStringLiteral("fs:/none"), info);
         return info && !info->HasFiles() ? result : 99u;
     }},
    {"ListAFile", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) {
         QSharedPointer<_DirectoryInfo> info;
         return d.ListDirectory(QStringLiteral("fs:/file"), info);
     }},
    {"ListOutside", HANDSET_ERROR_BAD_PATH,
     [](IKestoDevice &d, const QString &) {
         QSharedPointer<_DirectoryInfo> info;
         return d.ListDirectory(QStringLiteral("fs:/../../../work/outside"), info);
     }},
    {"ListNoPrefix", HANDSET_ERROR_BAD_PATH,
     [](IKestoDevice &d, const QString &work) {
         QSharedPointer<_DirectoryInfo> info;
         return d.ListDirectory(work, info);
     }},
    {"DeleteMissing", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) { return d.DeleteFile(QStringLiteral("fs:/none")); }},
    {"DeleteOutside", HANDSET_ERROR_BAD_PATH,
     [](IKestoDevice &d, const QString &) { return d.DeleteFile(QStringLiteral("fs:/../../../work/outside/keep.txt")); }},
    {"RemoveMissing", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) { return d.RemoveDirectory(QStringLiteral("fs:/none")); }},
    {"RemoveParent", HANDSET_ERROR_BAD_PATH,
     [](IKestoDevice &d, const QString &) { return d.RemoveDirectory(QStringLiteral("fs:/..")); }},
    {"CopyFromMissingHostFile", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &work) {
         return d.CopyFileToDevice(work + QStringLiteral("/none"), QStringLiteral("fs:/x"));
     }},
    {"CopyToOutside", HANDSET_ERROR_BAD_PATH,
     [](IKestoDevice &d, const QString &work) {
         return d.CopyFileToDevice(work + QStringLiteral("/outside/keep.txt"), QStringLiteral("fs:/../../../work/outside/keep.txt"));
     }},
    {"CopyMissingFromDevice", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &work) {
         return d.CopyFileFromDevice(QStringLiteral("fs:/none"), work + QStringLiteral("/x"));
     }},
    {"CopyFromOutsideOfDevice", HANDSET_ERROR_BAD_PATH,
     [](IKestoDevice &d, const QString &work) {
         return d.CopyFileFromDevice(QStringLiteral("fs:/../handset.ini"), work + QStringLiteral("/x"));
     }},
    {"ExistsOutside", HANDSET_ERROR_BAD_PATH,
     [](IKestoDevice &d, const QString &) {
         return d.FileExists(QStringLiteral("fs:/../handset.ini")) ? 99u : d.lastError;
     }},
    {"ExistsMissing", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) { return d.FileExists(QStringLiteral("fs:/none")) ? 99u : d.lastError; }},
    {"CopyOnDeviceMissing", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) {
         return d.CopyOnDevice(QStringLiteral("fs:/none"), QStringLiteral("fs:/y")) ? 99u : d.lastError;
     }},
    {"CopyOnDeviceToOutside", HANDSET_ERROR_BAD_PATH,
     [](IKestoDevice &d, const QString &) {
         return d.CopyOnDevice(QStringLiteral("fs:/file"), QStringLiteral("fs:/../../../work/outside/keep.txt")) ? 99u
                                                                                                      : d.lastError;
     }},
    {"FindModuleNone", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) {
         QString directory = QStringLiteral("stale");
         const unsigned int result = d.FindModule(0x01010001, directory);
         return directory.isEmpty() ? result : 99u;
     }},
    {"FindModuleZero", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) {
         QString directory;
         return d.FindModule(0, directory);
     }},
    {"ListUnknownClass", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) {
         QSharedPointer<_DirectoryInfo> info;
         return d.ListDirectory(QStringLiteral("fs:/~0x01010001"), info);
     }},
    {"DeleteDirectoryUnknownClass", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) { return d.DeleteDirectory(0x01010001); }},
    {"StartUnknownProgram", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) { return d.StartProgram(QStringLiteral("nothing"), QString()); }},
    {"StartUnknownApplet", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &) { return d.StartApplet(0x1234, QString()); }},
    {"InstallMissingPackage", HANDSET_ERROR_NOT_FOUND,
     [](IKestoDevice &d, const QString &work) { return d.InstallPackage(work + QStringLiteral("/none.kestix")); }},
    {"InstallNotATar", HANDSET_ERROR_BAD_PACKAGE,
     [](IKestoDevice &d, const QString &work) { return d.InstallPackage(work + QStringLiteral("/outside/keep.txt")); }},
};

INSTANTIATE_TEST_SUITE_P(Operations, EmulatedHandsetFailure, ::testing::ValuesIn(kFailures),
                         [](const auto &info) { return std::string(info.param.what); });

TEST_F(EmulatedHandsetTest, SymbolicLinksOutOfTheHandsetAreNeverFollowed)
{
    QDir().mkpath(Host("fs:/usermods"));
    ASSERT_TRUE(QFile::link(outside, Host("fs:/usermods/escape")));
    ASSERT_TRUE(QFile::link(outside + QStringLiteral("/keep.txt"), Host("fs:/leak")));
    testutil::WriteFile(Work("new"), "new");

    QSharedPointer<_DirectoryInfo> info;
    EXPECT_EQ(device->ListDirectory(QStringLiteral("fs:/usermods/escape"), info), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->DeleteFile(QStringLiteral("fs:/usermods/escape/keep.txt")), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->DeleteFile(QStringLiteral("fs:/leak")), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->RemoveDirectory(QStringLiteral("fs:/usermods/escape")), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->CopyFileToDevice(Work("new"), QStringLiteral("fs:/usermods/escape/keep.txt")),
              HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->CopyFileToDevice(Work("new"), QStringLiteral("fs:/leak")), HANDSET_ERROR_BAD_PATH);
    EXPECT_EQ(device->CopyFileFromDevice(QStringLiteral("fs:/leak"), Work("copy")), HANDSET_ERROR_BAD_PATH);
    EXPECT_FALSE(device->FileExists(QStringLiteral("fs:/usermods/escape/keep.txt")));
    EXPECT_FALSE(QFileInfo::exists(Work("copy")));
    EXPECT_EQ(testutil::ReadFile(outside + QStringLiteral("/keep.txt")), QByteArray("keep"));
    EXPECT_EQ(QDir(outside).entryList(QDir::Files), QStringList{QStringLiteral("keep.txt")});
}

TEST_F(EmulatedHandsetTest, OfflineFileAppearingMidSessionLosesTheConnectionForGood)
{
    testutil::WriteFile(Work("a"), "a");
    ASSERT_EQ(device->CopyFileToDevice(Work("a"), QStringLiteral("fs:/a")), 0u);
    testutil::WriteFile(folder + QStringLiteral("/offline"), "");
    EXPECT_TRUE(device->FileExists(QStringLiteral("fs:/a")) == false);
    EXPECT_TRUE(device->connectionLost);
    EXPECT_EQ(device->lastError, HANDSET_ERROR_CONNECTION_LOST);

    // Even when the handset comes back, this connection stays lost.
    ASSERT_TRUE(QFile::remove(folder + QStringLiteral("/offline")));
    QString version;
    QString directory;
    QSharedPointer<_DirectoryInfo> info;
    EXPECT_EQ(device->GetPlatformVersion(version), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->CopyFileToDevice(Work("a"), QStringLiteral("fs:/b")), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->CopyFileFromDevice(QStringLiteral("fs:/a"), Work("b")), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->ListDirectory(QStringLiteral("fs:/"), info), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->DeleteFile(QStringLiteral("fs:/a")), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->RemoveDirectory(QStringLiteral("fs:/")), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->InstallPackage(Work("a")), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->FindModule(1, directory), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->StartProgram(QStringLiteral("p"), QString()), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_EQ(device->StartApplet(1, QString()), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_FALSE(device->IsProgramRunning(QStringLiteral("p")));
    EXPECT_FALSE(device->IsAppletRunning(1));
    EXPECT_FALSE(device->CopyOnDevice(QStringLiteral("fs:/a"), QStringLiteral("fs:/c")));
    EXPECT_EQ(device->lastError, HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_TRUE(QFileInfo::exists(Host("fs:/a")));
    EXPECT_FALSE(QFileInfo::exists(Host("fs:/c")));

    // A new connection works again.
    auto again = fixture.Connect(QStringLiteral("phone"));
    ASSERT_TRUE(again);
    EXPECT_TRUE(again->FileExists(QStringLiteral("fs:/a")));
}

TEST_F(EmulatedHandsetTest, VanishedHandsetFolderLosesTheConnection)
{
    ASSERT_TRUE(QDir(folder).removeRecursively());
    QString version;
    EXPECT_EQ(device->GetPlatformVersion(version), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_TRUE(device->connectionLost);
    testutil::WriteFile(Work("a"), "a");
    EXPECT_EQ(device->CopyFileToDevice(Work("a"), QStringLiteral("fs:/a")), HANDSET_ERROR_CONNECTION_LOST);
    EXPECT_FALSE(QFileInfo::exists(folder));
}

} // namespace
