#include "resources/kestoresources.h"
#include "resources/mifbuilder.h"

#include <gtest/gtest.h>

namespace {

TEST(MifBuilder, WritesWhatTheModuleInformationQueriesReadBack)
{
    MifBuilder mif;
    mif.AddClass(0x0102F2AA);
    mif.AddClass(0x10203040);
    mif.AddApplet(0x0A0B0C0D, 3, 1200);
    mif.AddProgram(QStringLiteral("ITimer_k"), QStringLiteral("-v -n 3"));
    mif.AddProgram(QStringLiteral("abc"), QString(), SysResource::kTypeProgram);  // a key of four bytes with its NUL
    mif.AddSuiteProgram(QStringLiteral("oat:suite:AudioSuite"));

    KestoResources resources;
    ASSERT_TRUE(resources.LoadFrom(mif.Build()));
    QVector<unsigned int> classes;
    ASSERT_TRUE(resources.GetMifClasses(classes));
    EXPECT_EQ(classes, (QVector<unsigned int>{0x0102F2AA, 0x10203040}));
    QVector<Applet> applets;
    ASSERT_TRUE(resources.GetMifApplets(applets));
    ASSERT_EQ(applets.size(), 1);
    EXPECT_EQ(applets.at(0).appletid, 0x0A0B0C0Du);
    EXPECT_EQ(applets.at(0).apptype, 3);
    EXPECT_EQ(applets.at(0).baseid, 1200);

    SysResource program;
    ASSERT_TRUE(resources.GetSysResource(1, program));
    EXPECT_TRUE(program.IsProgram());
    EXPECT_EQ(program.Property("Key").toString(), QStringLiteral("ITimer_k"));
    EXPECT_EQ(program.Property("Arguments").toString(), QStringLiteral("-v -n 3"));
    SysResource shortKey;
    ASSERT_TRUE(resources.GetSysResource(2, shortKey));
    EXPECT_EQ(shortKey.type, SysResource::kTypeProgram);
    EXPECT_EQ(shortKey.Property("Key").toString(), QStringLiteral("abc"));
    SysResource suite;
    ASSERT_TRUE(resources.GetSysResource(3, suite));
    EXPECT_EQ(suite.Property("Program Name").toString(), QStringLiteral("AudioSuite"));
}

TEST(MifBuilder, AnEmptyModuleStillHasItsHeader)
{
    KestoResources resources;
    ASSERT_TRUE(resources.LoadFrom(MifBuilder().Build()));
    MifHeader header;
    EXPECT_TRUE(resources.GetMifHeader(header));
    QVector<unsigned int> classes{7};
    resources.GetMifClasses(classes);
    EXPECT_TRUE(classes.isEmpty());
}

} // namespace
