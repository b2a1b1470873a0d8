#include "resources/kestoresources.h"
#include "resources/mifbuilder.h"

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

TEST(MifBuilder, WritesWhatTheModuleInformationQueriesReadBack)
{
    MifBuilder mif;
    mif.AddClass(0x0102F2AA);
    mif.AddClass(0x10203040);
    mif.AddApplet(0x0A0B0C0D, 3, 1200);
    mif.AddProgram(u"ITimer_k"_s, u"-v -n 3"_s);
    mif.AddProgram(u"abc"_s, QString(), SysResource::kTypeProgram); // a key of four bytes with its NUL
    mif.AddSuiteProgram(u"oat:suite:AudioSuite"_s);

    KestoResources resources;
    ASSERT_TRUE(resources.LoadFrom(mif.Build()));
    MifHeader header;
    EXPECT_TRUE(resources.GetMifHeader(header));
    QVector<unsigned int> classes;
    ASSERT_TRUE(resources.GetMifClasses(classes));
    EXPECT_EQ(classes, (QVector<unsigned int>{0x0102F2AA, 0x10203040}));
    QVector<Applet> applets;
    ASSERT_TRUE(resources.GetMifApplets(applets));
    ASSERT_EQ(applets.size(), 1);
    const Applet &a = applets.at(0);
    EXPECT_EQ(std::tie(a.appletid, a.apptype, a.baseid), std::make_tuple(0x0A0B0C0Du, quint16(3), quint16(1200)));

    SysResource program;
    ASSERT_TRUE(resources.GetSysResource(1, program));
    EXPECT_TRUE(program.IsProgram());
    EXPECT_EQ(program.Property("Key").toString(), u"ITimer_k"_s);
    EXPECT_EQ(program.Property("Arguments").toString(), u"-v -n 3"_s);
    ASSERT_TRUE(resources.GetSysResource(2, program));
    EXPECT_EQ(program.type, SysResource::kTypeProgram);
    EXPECT_EQ(program.Property("Key").toString(), u"abc"_s);
    ASSERT_TRUE(resources.GetSysResource(3, program));
    EXPECT_EQ(program.Property("Program Name").toString(), u"AudioSuite"_s);
}

} // namespace
