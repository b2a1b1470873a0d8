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
    for (const char *folder : {"platforms/Alpha Pro/pvs/platform", "platforms/Beta", "platforms/Gamma pro",
                               "tests/kit1", "tests/kit2", "handsets/not-a-handset"})
        QDir().mkpath(root + u'/' + QLatin1String(folder));
    testutil::WriteFile(root + u"/handsets/zeta/handset.ini"_s, "[General]\ndescription=Second phone\n");
    testutil::WriteFile(root + u"/handsets/alpha/handset.ini"_s, "[General]\nplatform=arm\n");

    QProcessEnvironment env = QProcessEnvironment::systemEnvironment();
    env.insert(u"KESTIX_PLATFORMS_ALL"_s, root + u"/platforms"_s);
    env.insert(u"KESTIX_PLATFORM"_s, root + u"/platforms/Gamma pro/"_s);
    env.insert(u"KESTIX_TESTSETS_ALL"_s, root + u"/tests"_s);
    env.insert(u"KESTIX_TESTSET"_s, root + u"/tests/kit2"_s);
    env.insert(u"KESTIX_HANDSETS"_s, root + u"/handsets"_s);
    EXPECT_EQ(OutputOf(RunTool(Args("kits"), env)),
              u"  kit1\t%1/tests/kit1\n* kit2\t%1/tests/kit2\n"_s.arg(root).toUtf8());
    EXPECT_EQ(OutputOf(RunTool(Args("platforms"), env)),
              u"  Alpha\t%1/platforms/Alpha Pro\n* Gamma\t%1/platforms/Gamma pro\n"_s.arg(root).toUtf8());
    EXPECT_EQ(OutputOf(RunTool(Args("targets"), env)), QByteArray("alpha\talpha\nzeta\tSecond phone\n"));
}

} // namespace
