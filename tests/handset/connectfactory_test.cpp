#include "handset/connectfactory.h"
#include "handset/emulatedhandset.h"
#include "log/log.h"

#include "support/handsetfixture.h"
#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

QStringList Names(const QList<ConnectTarget> &targets)
{
    QStringList names;
    for (const ConnectTarget &target : targets)
        names.append(target.name + u'|' + target.description);
    return names;
}

TEST(ConnectFactory, ListsHandsetsSortedByNameIgnoringCaseWithTheirDescriptions)
{
    testutil::HandsetFixture fixture;
    fixture.AddHandset(u"beta"_s);
    fixture.AddHandset(u"Alpha"_s, u"Lab phone 1"_s, u"arm"_s);
    fixture.AddHandset(u"charlie"_s, QString(), u"1"_s);
    QDir().mkpath(fixture.HandsetsFolder() + u"/not-a-handset/fs"_s);
    testutil::WriteFile(fixture.HandsetsFolder() + u"/stray.ini"_s, "x");

    ASSERT_TRUE(ConnectFactory::Initialize());
    QList<ConnectTarget> targets{ConnectTarget(u"left"_s, u"over"_s)};
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 3u);
    EXPECT_EQ(Names(targets), (QStringList{u"Alpha|Lab phone 1"_s, u"beta|beta"_s, u"charlie|charlie"_s}));
    ConnectFactory::Uninitialize();
}

TEST(ConnectFactory, ReadsPlatformAndVersionWithDefaults)
{
    testutil::HandsetFixture fixture;
    const QString ini = fixture.AddHandset(u"phone"_s) + u"/handset.ini"_s;
    using P = IKestoDevice::Platform;
    const std::tuple<QByteArray, P, const char *> rows[] = {
        {"", P::PLATFORM_WIN32, ""},
        {"platform=ARM\nversion=4.1.7\n", P::PLATFORM_ARM, "4.1.7"},
        {"platform=z80\n", P::PLATFORM_UNKNOWN, ""},
        {"platform=\nversion=\n", P::PLATFORM_WIN32, ""},
    };
    for (const auto &[text, platform, expectedVersion] : rows) {
        testutil::WriteFile(ini, text);
        auto device = fixture.Connect(u"phone"_s);
        ASSERT_TRUE(device) << text.constData();
        EXPECT_EQ(device->platform, platform) << text.constData();
        QString version = u"stale"_s;
        EXPECT_EQ(device->GetPlatformVersion(version), 0u);
        EXPECT_EQ(version, QString::fromLatin1(expectedVersion));
        EXPECT_EQ(device->GetConnectTarget().name, u"phone"_s);
    }
}

TEST(ConnectFactory, DefaultHandsetsFolderLiesBelowTheDataRoot)
{
    QTemporaryDir root;
    testutil::EnvGuard env("KESTIX_DATA_ROOT", root.path());
    env.Unset("KESTIX_HANDSETS");
    testutil::WriteFile(root.path() + u"/Norvane/Handsets/phone/handset.ini"_s, "");
    QList<ConnectTarget> targets;
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);
    EXPECT_EQ(Names(targets), QStringList{u"phone|phone"_s});

    env.Set("KESTIX_HANDSETS", QString());
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);

    env.Set("KESTIX_HANDSETS", root.filePath(u"none"_s));
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 0u);
    EXPECT_TRUE(targets.isEmpty());
}

class ConnectFactoryRefusal : public ::testing::Test
{
protected:
    void SetUp() override
    {
        fixture.AddHandset(u"phone"_s);
        log.SetLogPath(logDir.filePath(u"log.txt"_s));
    }

    QString LogText() { return QString::fromLatin1(testutil::ReadFile(logDir.filePath(u"log.txt"_s))); }

    testutil::HandsetFixture fixture;
    QTemporaryDir logDir;
    Log log;
};

TEST_F(ConnectFactoryRefusal, UnknownHandsetsAndNamesThatAreNoPlainFolderNameGiveNull)
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
}

TEST_F(ConnectFactoryRefusal, OfflineHandsetIsListedButRefusesTheConnection)
{
    testutil::WriteFile(fixture.HandsetFolder(u"phone"_s) + u"/offline"_s, "");
    QList<ConnectTarget> targets;
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);
    EXPECT_EQ(ConnectFactory::ConnectToTarget(targets.first(), &log), nullptr);
    EXPECT_TRUE(LogText().contains(u"Handset phone is offline."_s));
}

} // namespace
