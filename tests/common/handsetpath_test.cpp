#include "common/handsetpath.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

struct CleanCase
{
    const char *path;
    const char *cleaned; // "" when refused
};

class HandsetPathClean : public ::testing::TestWithParam<CleanCase>
{
};

TEST_P(HandsetPathClean, KeepsPathsInsideTheFileSystemAndRefusesTheRest)
{
    EXPECT_EQ(HandsetPath::Clean(QString::fromUtf8(GetParam().path)), QString::fromUtf8(GetParam().cleaned));
}

INSTANTIATE_TEST_SUITE_P(Paths, HandsetPathClean,
                         ::testing::Values(CleanCase{"fs:/usermods/ctf/CTF.log", "fs:/usermods/ctf/CTF.log"},
                                           CleanCase{"fs:/usermods/oat/", "fs:/usermods/oat"},
                                           CleanCase{"fs:/a//b/./../c/", "fs:/a/c"}, CleanCase{"fs:/", "fs:/"},
                                           CleanCase{"fs:/a/..", "fs:/"}, CleanCase{"fs:/../x", ""},
                                           CleanCase{"fs:/a/../../x", ""}, CleanCase{"fs:/..", ""},
                                           CleanCase{"fs:", ""}, CleanCase{"FS:/a", ""}, CleanCase{"/etc/passwd", ""},
                                           CleanCase{"usermods/a", ""}, CleanCase{"", ""},
                                           CleanCase{"fs:/my file $x", "fs:/my file $x"}),
                         [](const auto &info) { return std::to_string(info.index); });

class HandsetPathHost : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(QDir().mkpath(handset + u"/fs/usermods"_s));
        testutil::WriteFile(outside + u"/secret"_s, "secret");
    }

    QString Host(const char *path) { return HandsetPath::ToHost(handset, QString::fromUtf8(path)); }

    QTemporaryDir dir;
    const QString handset = dir.filePath(u"phone"_s), outside = dir.filePath(u"outside"_s);
};

TEST_F(HandsetPathHost, MapsPathsBelowTheFsFolderBothWaysAndRefusesTheRest)
{
    EXPECT_EQ(Host("fs:/usermods/x/a.log"), handset + u"/fs/usermods/x/a.log"_s);
    EXPECT_EQ(Host("fs:/"), handset + u"/fs"_s);
    EXPECT_EQ(Host("fs:/new/deeper/file"), handset + u"/fs/new/deeper/file"_s);
    EXPECT_EQ(Host("fs:/a/../usermods"), handset + u"/fs/usermods"_s);
    EXPECT_TRUE(HandsetPath::Clean(u"fs:/a"_s + QChar(0) + u"b"_s).isEmpty());
    EXPECT_TRUE(Host("fs:/../outside/secret").isEmpty());
    EXPECT_TRUE(Host("fs:/usermods/../../handset.ini").isEmpty());
    EXPECT_TRUE(Host("/etc/passwd").isEmpty());
    EXPECT_TRUE(HandsetPath::ToHost(QString(), u"fs:/a"_s).isEmpty());
    EXPECT_EQ(HandsetPath::FromHost(handset, handset + u"/fs/usermods/x/a.log"_s), u"fs:/usermods/x/a.log"_s);
    EXPECT_EQ(HandsetPath::FromHost(handset, handset + u"/fs"_s), u"fs:/"_s);
    EXPECT_TRUE(HandsetPath::FromHost(handset, handset + u"/fsx/a"_s).isEmpty());
    EXPECT_TRUE(HandsetPath::FromHost(handset, handset + u"/handset.ini"_s).isEmpty());
    EXPECT_TRUE(HandsetPath::FromHost(handset, handset + u"/fs/../offline"_s).isEmpty());
}

TEST_F(HandsetPathHost, RefusesSymbolicLinksThatLeadOutOfTheHandset)
{
    ASSERT_TRUE(QFile::link(outside, handset + u"/fs/usermods/escape"_s));
    ASSERT_TRUE(QFile::link(outside + u"/secret"_s, handset + u"/fs/leak"_s));
    ASSERT_TRUE(QFile::link(outside + u"/missing"_s, handset + u"/fs/dangling"_s));
    EXPECT_TRUE(Host("fs:/usermods/escape").isEmpty());
    EXPECT_TRUE(Host("fs:/usermods/escape/secret").isEmpty());
    EXPECT_TRUE(Host("fs:/usermods/escape/new/file").isEmpty());
    EXPECT_TRUE(Host("fs:/leak").isEmpty());
    EXPECT_TRUE(Host("fs:/dangling").isEmpty());
    // Nor is an fs folder that is a dangling link.
    ASSERT_TRUE(QDir().mkpath(dir.filePath(u"other"_s)));
    ASSERT_TRUE(QFile::link(outside + u"/nowhere"_s, dir.filePath(u"other/fs"_s)));
    EXPECT_TRUE(HandsetPath::ToHost(dir.filePath(u"other"_s), u"fs:/a"_s).isEmpty());
    // Links that stay inside are followed.
    ASSERT_TRUE(QFile::link(handset + u"/fs/usermods"_s, handset + u"/fs/mods"_s));
    EXPECT_EQ(Host("fs:/mods/a"), handset + u"/fs/mods/a"_s);
}

} // namespace
