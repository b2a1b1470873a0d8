#include "cli_test.h"

#include "support/testutil.h"

#include "archive/tar.h"
#include "resources/kestoresources.h"

#include <QDir>
#include <QDirIterator>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

class DemoInit : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(dir.isValid());
        root = dir.filePath(u"demo with blanks"_s);
        const ToolResult r = RunTool({u"demo"_s, u"init"_s, root});
        ASSERT_EQ(r.status, 0) << r.err.constData();
        env = QString::fromUtf8(r.out);
    }
    QTemporaryDir dir;
    QString root;
    QString env;
};

TEST_F(DemoInit, PrintsTheVariablesThatPointAtIt)
{
    EXPECT_TRUE(env.contains(u"export KESTIX_TESTSET='%1/kits/DemoKit'\n"_s.arg(root))) << env.toStdString();
    EXPECT_TRUE(env.contains(u"export KESTIX_PLATFORM='%1/platforms/Kesto5 Pro/'\n"_s.arg(root)));
    EXPECT_EQ(testutil::ReadFile(root + u"/env.sh"_s), env.toUtf8());
    // A second init into the same folder is refused rather than mixed in;
    // an empty folder is taken.
    EXPECT_EQ(RunTool({u"demo"_s, u"init"_s, root}).status, 2);
    const QString empty = root + u"-empty"_s;
    ASSERT_TRUE(QDir().mkpath(empty));
    EXPECT_EQ(RunTool({u"demo"_s, u"init"_s, empty}).status, 0);
}

TEST_F(DemoInit, PackagesAreTarArchivesWithReadableModuleInformation)
{
    int packages = 0;
    QDirIterator it(root, {u"*.kestix"_s}, QDir::Files, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString path = it.next();
        ++packages;
        if (testutil::HaveProgram(u"tar"_s)) {
            QByteArray listing;
            EXPECT_EQ(testutil::RunProgram(u"tar"_s, {u"-tf"_s, path}, &listing), 0)
                << path.toStdString() << listing.constData();
        }
        Tar tar;
        ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, path));
        bool haveMif = false;
        for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
            TarFileEntry entry = tar.Entry(i);
            if (!entry.name.endsWith(u".mif"_s))
                continue;
            KestoResources mif;
            ASSERT_TRUE(mif.LoadFrom(tar.EntryData(entry))) << entry.name.toStdString();
            QVector<unsigned int> classes;
            QVector<Applet> applets;
            mif.GetMifClasses(classes);
            mif.GetMifApplets(applets);
            QVector<quint16> programs;
            mif.GetIDs(KestoResources::kTypeSysResource, programs);
            EXPECT_FALSE(classes.isEmpty() && applets.isEmpty() && programs.isEmpty()) << entry.name.toStdString();
            haveMif = true;
        }
        EXPECT_TRUE(haveMif) << path.toStdString();
    }
    EXPECT_EQ(packages, 4 + 6 + 1); // frameworks; the kit's modules, a secondary one among them; the platform's module
}

TEST_F(DemoInit, ScriptsAreValidShellAndPerlAndDescriptionsValidXml)
{
    if (testutil::HaveProgram(u"xmllint"_s)) {
        int descriptions = 0;
        QDirIterator xml(root, {u"*module.xml"_s}, QDir::Files, QDirIterator::Subdirectories);
        while (xml.hasNext()) {
            QByteArray out;
            ++descriptions;
            EXPECT_EQ(testutil::RunProgram(u"xmllint"_s, {u"--noout"_s, xml.next()}, &out), 0) << out.constData();
        }
        EXPECT_EQ(descriptions, 6);
    }
    QDirIterator it(root, {u"*.exe"_s}, QDir::Files, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString path = it.next();
        QByteArray out;
        EXPECT_EQ(testutil::RunProgram(u"sh"_s, {u"-n"_s, path}, &out), 0) << out.constData();
    }
    if (testutil::HaveProgram(u"perl"_s)) {
        QByteArray out;
        EXPECT_EQ(
            testutil::RunProgram(
                u"perl"_s, {u"-c"_s, root + u"/kits/DemoKit/testframeworks/oat/tools/bin/PostProcess3.pl"_s}, &out),
            0)
            << out.constData();
    }
}

TEST_F(DemoInit, StandInCompilersProduceRealResourceFiles)
{
    const QString tools = root + u"/toolset/bin"_s;
    const QString car = dir.filePath(u"demo.car"_s);
    const QString kar = dir.filePath(u"demo.kar"_s);
    const QString dso = dir.filePath(u"device.kar"_s);
    QByteArray out;
    ASSERT_EQ(testutil::RunProgram(tools + u"/kestormc.exe"_s,
                                   {u"-convert"_s, u"-infile"_s, root + u"/testdata/demo.ksx"_s, u"-outfile"_s, car},
                                   &out),
              0);
    EXPECT_TRUE(out.contains("Successfully converted file")) << out.constData();
    ASSERT_EQ(
        testutil::RunProgram(tools + u"/kestormc.exe"_s, {u"-compile"_s, u"-infile"_s, car, u"-outfile"_s, kar}, &out),
        0);
    EXPECT_TRUE(out.contains("Successfully compiled")) << out.constData();
    KestoResources data;
    ASSERT_TRUE(data.Read(kar));
    quint16 format = 0;
    QString text;
    ASSERT_TRUE(data.GetString(KestoResources::kTypeStrings, 2, &format, text));
    EXPECT_EQ(text, u"\u30c6\u30b9\u30c8"_s);

    ASSERT_EQ(testutil::RunProgram(
                  tools + u"/deprecated/ResourceEditor/kestorc.exe"_s,
                  {u"-nh"_s, u"-o"_s, dso,
                   root + u"/platforms/Kesto5 Pro/pvs/platform/testframeworks/oat/tools/reference/deviceref.dso"_s},
                  &out),
              0)
        << out.constData();
    KestoResources pack;
    EXPECT_TRUE(pack.Read(dso));
}

} // namespace
