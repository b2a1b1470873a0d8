#include "cli_test.h"

#include "support/testutil.h"

#include <QDir>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

TEST(ListingTool, KitsPlatformsAndTargetsComeFromTheEnvironment)
{
    QTemporaryDir dir;
    const QString root = dir.path();
    for (const char *folder :
         {"platforms/Alpha Pro/pvs/platform", "platforms/Beta", "platforms/Gamma pro", "tests/kit1", "tests/kit2"})
        QDir().mkpath(root + u'/' + QLatin1String(folder));
    testutil::WriteFile(root + u"/handsets/zeta/handset.ini"_s, "[General]\ndescription=Second phone\n");
    testutil::WriteFile(root + u"/handsets/alpha/handset.ini"_s, "[General]\nplatform=arm\n");
    QDir().mkpath(root + u"/handsets/not-a-handset"_s);

    QProcessEnvironment env = QProcessEnvironment::systemEnvironment();
    env.insert(u"KESTIX_PLATFORMS_ALL"_s, root + u"/platforms"_s);
    env.insert(u"KESTIX_PLATFORM"_s, root + u"/platforms/Gamma pro/"_s);
    env.insert(u"KESTIX_TESTSETS_ALL"_s, root + u"/tests"_s);
    env.insert(u"KESTIX_TESTSET"_s, root + u"/tests/kit2"_s);
    env.insert(u"KESTIX_HANDSETS"_s, root + u"/handsets"_s);

    const ToolResult kits = RunTool({u"kits"_s}, env);
    ASSERT_EQ(kits.status, 0) << kits.err.constData();
    EXPECT_EQ(QString::fromUtf8(kits.out), u"  kit1\t%1/tests/kit1\n* kit2\t%1/tests/kit2\n"_s.arg(root));

    const ToolResult platforms = RunTool({u"platforms"_s}, env);
    ASSERT_EQ(platforms.status, 0);
    EXPECT_EQ(QString::fromUtf8(platforms.out),
              u"  Alpha\t%1/platforms/Alpha Pro\n* Gamma\t%1/platforms/Gamma pro\n"_s.arg(root));

    const ToolResult targets = RunTool({u"targets"_s}, env);
    ASSERT_EQ(targets.status, 0);
    EXPECT_EQ(targets.out, QByteArray("alpha\talpha\nzeta\tSecond phone\n"));
}

} // namespace
