// Files found by the fuzz targets (fuzz/) that once made a reader or a writer misbehave, kept under
// tests/data/<format>/ and replayed here the way the target used them.

#include "catalogue/manifest.h"
#include "catalogue/testmodule.h"
#include "modules/ctftestmodule.h"
#include "support/testutil.h"

#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

// A cached catalogue written and read back keeps every module, and from the second write on its bytes no longer change,
// so a catalogue never drifts from run to run. Properties without values are written as an empty list once and then no
// more.
TEST(HostileManifest, ProgramWhosePropertiesHaveNoValuesSettlesAfterOneWrite)
{
    QTemporaryDir dir;
    Manifest catalogue(dir.filePath(u"kit"_s), false);
    catalogue.cacheFile = testutil::DataPath(u"manifest/program-properties-without-values.xml"_s);
    ASSERT_TRUE(catalogue.ReadManifest());
    ASSERT_EQ(catalogue.testModules.size(), 1);

    // Each generation is written, read back, and written again.
    QByteArray written[3];
    for (int i = 0; i < 3; ++i) {
        const QString path = dir.filePath(u"written%1.xml"_s.arg(i));
        ASSERT_TRUE(catalogue.WriteManifest(path));
        written[i] = testutil::ReadFile(path);
        catalogue = Manifest(dir.filePath(u"kit"_s), false);
        catalogue.cacheFile = path;
        ASSERT_TRUE(catalogue.ReadManifest());
    }
    EXPECT_TRUE(written[0].contains("<properties/>"));
    EXPECT_EQ(written[1], written[2]);

    auto *timer = dynamic_cast<CtfTestModule *>(catalogue.FindTestModule(u"timer"_s).data());
    ASSERT_NE(timer, nullptr);
    ASSERT_EQ(timer->programs.size(), 1);
    EXPECT_EQ(timer->programs.first().type, 16972535u);
    EXPECT_EQ(timer->programs.first().keysize, 8);
}
