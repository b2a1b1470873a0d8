#include "handset/connectfactory.h"
#include "handset/emulatedhandset.h"
#include "log/log.h"

#include "support/handsetfixture.h"
#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QTemporaryDir>

#include <gtest/gtest.h>

namespace {

QStringList Names(const QList<ConnectTarget> &targets)
{
    QStringList names;
    for (const ConnectTarget &target : targets)
        names.append(target.name + QLatin1Char('|') + target.description);
    return names;
}

TEST(ConnectFactory, ListsHandsetsSortedByNameIgnoringCaseWithTheirDescriptions)
{
    testutil::HandsetFixture fixture;
    fixture.AddHandset(QStringLiteral("beta"));
    fixture.AddHandset(QStringLiteral("Alpha"), QStringLiteral("Lab phone 1"), QStringLiteral("arm"));
    fixture.AddHandset(QStringLiteral("charlie"), QString(), QStringLiteral("1"));
    QDir().mkpath(fixture.HandsetsFolder() + QStringLiteral("/not-a-handset/fs"));
    testutil::WriteFile(fixture.HandsetsFolder() + QStringLiteral("/stray.ini"), "x");

    ASSERT_TRUE(ConnectFactory::Initialize());
    QList<ConnectTarget> targets{ConnectTarget(QStringLiteral("left"), QStringLiteral("over"))};
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 3u);
    EXPECT_EQ(Names(targets), (QStringList{QStringLiteral("Alpha|Lab phone 1"), QStringLiteral("beta|beta"),
                                           QStringLiteral("charlie|charlie")}));
    ConnectFactory::Uninitialize();
}

TEST(ConnectFactory, ReadsPlatformAndVersionWithDefaults)
{
    testutil::HandsetFixture fixture;
    fixture.AddHandset(QStringLiteral("plain"));
    fixture.AddHandset(QStringLiteral("arm"), QString(), QStringLiteral("ARM"), QStringLiteral("4.1.7"));
    fixture.AddHandset(QStringLiteral("odd"), QString(), QStringLiteral("z80"));

    auto plain = fixture.Connect(QStringLiteral("plain"));
    ASSERT_TRUE(plain);
    EXPECT_EQ(plain->platform, IKestoDevice::PLATFORM_WIN32);
    QString version = QStringLiteral("stale");
    EXPECT_EQ(plain->GetPlatformVersion(version), 0u);
    EXPECT_TRUE(version.isEmpty());

    auto arm = fixture.Connect(QStringLiteral("arm"));
    ASSERT_TRUE(arm);
    EXPECT_EQ(arm->platform, IKestoDevice::PLATFORM_ARM);
    EXPECT_EQ(arm->GetPlatformVersion(version), 0u);
    EXPECT_EQ(version, QStringLiteral("4.1.7"));
    EXPECT_EQ(arm->GetConnectTarget().name, QStringLiteral("arm"));

    auto odd = fixture.Connect(QStringLiteral("odd"));
    ASSERT_TRUE(odd);
    EXPECT_EQ(odd->platform, IKestoDevice::PLATFORM_UNKNOWN);

    testutil::WriteFile(fixture.HandsetFolder(QStringLiteral("odd")) + QStringLiteral("/handset.ini"),
                        "platform=\nversion=\n");
    auto blank = fixture.Connect(QStringLiteral("odd"));
    ASSERT_TRUE(blank);
    EXPECT_EQ(blank->platform, IKestoDevice::PLATFORM_WIN32);
}

TEST(ConnectFactory, DefaultHandsetsFolderLiesBelowTheDataRoot)
{
    QTemporaryDir root;
    testutil::EnvGuard env("KESTIX_DATA_ROOT", root.path());
    env.Unset("KESTIX_HANDSETS");
    testutil::WriteFile(root.path() + QStringLiteral("/Norvane/Handsets/phone/handset.ini"), "");
    QList<ConnectTarget> targets;
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);
    EXPECT_EQ(Names(targets), QStringList{QStringLiteral("phone|phone")});

    env.Set("KESTIX_HANDSETS", QString());
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);
}

TEST(ConnectFactory, MissingHandsetsFolderListsNothing)
{
    QTemporaryDir root;
    testutil::EnvGuard env("KESTIX_HANDSETS", root.filePath(QStringLiteral("none")));
    QList<ConnectTarget> targets;
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 0u);
    EXPECT_TRUE(targets.isEmpty());
}

class ConnectFactoryRefusal : public ::testing::Test
{
protected:
    void SetUp() override
    {
        fixture.AddHandset(QStringLiteral("phone"));
        log.SetLogPath(logDir.filePath(QStringLiteral("log.txt")));
    }

    QString LogText() { return QString::fromLatin1(testutil::ReadFile(logDir.filePath(QStringLiteral("log.txt")))); }

    testutil::HandsetFixture fixture;
    QTemporaryDir logDir;
    Log log;
};

TEST_F(ConnectFactoryRefusal, UnknownHandsetGivesNullAndAMessage)
{
    EXPECT_EQ(ConnectFactory::ConnectToTarget(ConnectTarget(QStringLiteral("nokia"), QString()), &log), nullptr);
    EXPECT_TRUE(LogText().contains(QStringLiteral("Handset nokia not found")));
    EXPECT_EQ(ConnectFactory::ConnectToTarget(ConnectTarget(QStringLiteral("nokia"), QString()), nullptr), nullptr);
}

TEST_F(ConnectFactoryRefusal, NamesThatAreNoPlainFolderNameAreRefused)
{
    // A handset one level up must not be reachable through "..".
    testutil::WriteFile(fixture.HandsetsFolder() + QStringLiteral("/../handset.ini"), "");
    for (const char *name : {"..", ".", "", "phone/fs", "../handsets/phone"})
        EXPECT_EQ(ConnectFactory::ConnectToTarget(ConnectTarget(QString::fromUtf8(name), QString()), &log), nullptr)
            << name;
}

TEST_F(ConnectFactoryRefusal, OfflineHandsetIsListedButRefusesTheConnection)
{
    testutil::WriteFile(fixture.HandsetFolder(QStringLiteral("phone")) + QStringLiteral("/offline"), "");
    QList<ConnectTarget> targets;
    EXPECT_EQ(ConnectFactory::ListTargets(targets), 1u);
    EXPECT_EQ(ConnectFactory::ConnectToTarget(targets.first(), &log), nullptr);
    EXPECT_TRUE(LogText().contains(QStringLiteral("Handset phone is offline.")));
}

TEST(ConnectFactory, DisconnectAcceptsNull)
{
    ConnectFactory::DisconnectTarget(nullptr);
}

} // namespace
