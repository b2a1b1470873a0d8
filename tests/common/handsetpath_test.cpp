#include "common/handsetpath.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QTemporaryDir>

#include <gtest/gtest.h>

namespace {

struct CleanCase
{
    const char *path;
    const char *cleaned; // "" when refused
};

class HandsetPathClean : public ::testing::TestWithParam<CleanCase> {};

TEST_P(HandsetPathClean, KeepsPathsInsideTheFileSystemAndRefusesTheRest)
{
    EXPECT_EQ(HandsetPath::Clean(QString::fromUtf8(GetParam().path)),
              QString::fromUtf8(GetParam().cleaned));
}

INSTANTIATE_TEST_SUITE_P(
    Paths, HandsetPathClean,
    ::testing::Values(CleanCase{"fs:/usermods/ctf/CTF.log", "fs:/usermods/ctf/CTF.log"},
                      CleanCase{"fs:/usermods/oat/", "fs:/usermods/oat"},
                      CleanCase{"fs:/a//b/./../c/", "fs:/a/c"},
                      CleanCase{"fs:/", "fs:/"}, CleanCase{"fs:/a/..", "fs:/"},
                      CleanCase{"fs:/../x", ""}, CleanCase{"fs:/a/../../x", ""},
                      CleanCase{"fs:/..", ""}, CleanCase{"fs:", ""}, CleanCase{"FS:/a", ""},
                      CleanCase{"/etc/passwd", ""}, CleanCase{"usermods/a", ""},
                      CleanCase{"", ""}, CleanCase{"fs:/my file $x", "fs:/my file $x"}),
    [](const auto &info) { return std::to_string(info.index); });

TEST(HandsetPath, NulCharacterIsRefused)
{
    EXPECT_TRUE(HandsetPath::Clean(QStringLiteral("fs:/a") + QChar(0) + QStringLiteral("b")).isEmpty());
}

class HandsetPathHost : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(dir.isValid());
        handset = dir.filePath(QStringLiteral("phone"));
        outside = dir.filePath(QStringLiteral("outside"));
        ASSERT_TRUE(QDir().mkpath(handset + QStringLiteral("/fs/usermods")));
        ASSERT_TRUE(QDir().mkpath(outside));
        testutil::WriteFile(outside + QStringLiteral("/secret"), "secret");
    }

    QString Host(const char *path) { return HandsetPath::ToHost(handset, QString::fromUtf8(path)); }

    QTemporaryDir dir;
    QString handset;
    QString outside;
};

TEST_F(HandsetPathHost, MapsHandsetPathsBelowTheFsFolder)
{
    EXPECT_EQ(Host("fs:/usermods/x/a.log"), handset + QStringLiteral("/fs/usermods/x/a.log"));
    EXPECT_EQ(Host("fs:/"), handset + QStringLiteral("/fs"));
    EXPECT_EQ(Host("fs:/new/deeper/file"), handset + QStringLiteral("/fs/new/deeper/file"));
    EXPECT_EQ(Host("fs:/a/../usermods"), handset + QStringLiteral("/fs/usermods"));
}

TEST_F(HandsetPathHost, RefusesPathsThatClimbOutOfTheHandset)
{
    EXPECT_TRUE(Host("fs:/../outside/secret").isEmpty());
    EXPECT_TRUE(Host("fs:/usermods/../../handset.ini").isEmpty());
    EXPECT_TRUE(Host("/etc/passwd").isEmpty());
    EXPECT_TRUE(HandsetPath::ToHost(QString(), QStringLiteral("fs:/a")).isEmpty());
}

TEST_F(HandsetPathHost, RefusesSymbolicLinksThatLeadOutOfTheHandset)
{
    ASSERT_TRUE(QFile::link(outside, handset + QStringLiteral("/fs/usermods/escape")));
    ASSERT_TRUE(QFile::link(outside + QStringLiteral("/secret"), handset + QStringLiteral("/fs/leak")));
    ASSERT_TRUE(QFile::link(outside + QStringLiteral("/missing"), handset + QStringLiteral("/fs/dangling")));
    EXPECT_TRUE(Host("fs:/usermods/escape").isEmpty());
    EXPECT_TRUE(Host("fs:/usermods/escape/secret").isEmpty());
    EXPECT_TRUE(Host("fs:/usermods/escape/new/file").isEmpty());
    EXPECT_TRUE(Host("fs:/leak").isEmpty());
    EXPECT_TRUE(Host("fs:/dangling").isEmpty());
}

TEST_F(HandsetPathHost, AcceptsSymbolicLinksThatStayInside)
{
    ASSERT_TRUE(QFile::link(handset + QStringLiteral("/fs/usermods"), handset + QStringLiteral("/fs/mods")));
    EXPECT_EQ(Host("fs:/mods/a"), handset + QStringLiteral("/fs/mods/a"));
}

TEST_F(HandsetPathHost, RefusesAnFsFolderThatIsADanglingLink)
{
    const QString other = dir.filePath(QStringLiteral("other"));
    ASSERT_TRUE(QDir().mkpath(other));
    ASSERT_TRUE(QFile::link(outside + QStringLiteral("/nowhere"), other + QStringLiteral("/fs")));
    EXPECT_TRUE(HandsetPath::ToHost(other, QStringLiteral("fs:/a")).isEmpty());
}

TEST_F(HandsetPathHost, MapsHostPathsBack)
{
    EXPECT_EQ(HandsetPath::FromHost(handset, handset + QStringLiteral("/fs/usermods/x/a.log")),
              QStringLiteral("fs:/usermods/x/a.log"));
    EXPECT_EQ(HandsetPath::FromHost(handset, handset + QStringLiteral("/fs")), QStringLiteral("fs:/"));
    EXPECT_TRUE(HandsetPath::FromHost(handset, handset + QStringLiteral("/fsx/a")).isEmpty());
    EXPECT_TRUE(HandsetPath::FromHost(handset, handset + QStringLiteral("/handset.ini")).isEmpty());
    EXPECT_TRUE(HandsetPath::FromHost(handset, handset + QStringLiteral("/fs/../offline")).isEmpty());
}

} // namespace
