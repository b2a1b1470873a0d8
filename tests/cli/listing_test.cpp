#include "cli_test.h"

#include "support/testutil.h"

#include <QDir>
#include <QTemporaryDir>

#include <gtest/gtest.h>

namespace {

TEST(ListingTool, KitsPlatformsAndTargetsComeFromTheEnvironment)
{
    QTemporaryDir dir;
    const QString root = dir.path();
    for (const char *folder :
         {"platforms/Alpha Pro/pvs/platform", "platforms/Beta", "platforms/Gamma pro", "tests/kit1", "tests/kit2"})
        QDir().mkpath(root + QLatin1Char('/') + QLatin1String(folder));
    testutil::WriteFile(root + QStringLiteral("/handsets/zeta/handset.ini"), "[General]\ndescription=Second phone\n");
    testutil::WriteFile(root + QStringLiteral("/handsets/alpha/handset.ini"), "[General]\nplatform=arm\n");
    QDir().mkpath(root + QStringLiteral("/handsets/not-a-handset"));

    QProcessEnvironment env = QProcessEnvironment::systemEnvironment();
    env.insert(QStringLiteral("KESTIX_PLATFORMS_ALL"), root + QStringLiteral("/platforms"));
    env.insert(QStringLiteral("KESTIX_PLATFORM"), root + QStringLiteral("/platforms/Gamma pro/"));
    env.insert(QStringLiteral("KESTIX_TESTSETS_ALL"), root + QStringLiteral("/tests"));
    env.insert(QStringLiteral("KESTIX_TESTSET"), root + QStringLiteral("/tests/kit2"));
    env.insert(QStringLiteral("KESTIX_HANDSETS"), root + QStringLiteral("/handsets"));

    const ToolResult kits = RunTool({QStringLiteral("kits")}, env);
    ASSERT_EQ(kits.status, 0) << kits.err.constData();
    EXPECT_EQ(QString::fromUtf8(kits.out), QStringLiteral("  kit1\t%1/tests/kit1\n* kit2\t%1/tests/kit2\n").arg(root));

    const ToolResult platforms = RunTool({QStringLiteral("platforms")}, env);
    ASSERT_EQ(platforms.status, 0);
    EXPECT_EQ(QString::fromUtf8(platforms.out),
              QStringLiteral("  Alpha\t%1/platforms/Alpha Pro\n* Gamma\t%1/platforms/Gamma pro\n").arg(root));

    const ToolResult targets = RunTool({QStringLiteral("targets")}, env);
    ASSERT_EQ(targets.status, 0);
    EXPECT_EQ(targets.out, QByteArray("alpha\talpha\nzeta\tSecond phone\n"));
}

} // namespace
