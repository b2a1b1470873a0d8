#include "cli_test.h"

#include "support/testutil.h"

#include "archive/tar.h"
#include "resources/kestoresources.h"

#include <QDir>
#include <QDirIterator>
#include <QTemporaryDir>

#include <gtest/gtest.h>

namespace {

class DemoInit : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(dir.isValid());
        root = dir.filePath(QStringLiteral("demo with blanks"));
        const ToolResult r = RunTool({QStringLiteral("demo"), QStringLiteral("init"), root});
        ASSERT_EQ(r.status, 0) << r.err.constData();
        env = QString::fromUtf8(r.out);
    }
    QTemporaryDir dir;
    QString root;
    QString env;
};

TEST_F(DemoInit, PrintsTheVariablesThatPointAtIt)
{
    EXPECT_TRUE(env.contains(QStringLiteral("export KESTIX_TESTSET='%1/kits/DemoKit'\n").arg(root)))
        << env.toStdString();
    EXPECT_TRUE(env.contains(QStringLiteral("export KESTIX_PLATFORM='%1/platforms/Kesto5 Pro/'\n").arg(root)));
    EXPECT_EQ(testutil::ReadFile(root + QStringLiteral("/env.sh")), env.toUtf8());
    // A second init into the same folder is refused rather than mixed in;
    // an empty folder is taken.
    EXPECT_EQ(RunTool({QStringLiteral("demo"), QStringLiteral("init"), root}).status, 2);
    const QString empty = root + QStringLiteral("-empty");
    ASSERT_TRUE(QDir().mkpath(empty));
    EXPECT_EQ(RunTool({QStringLiteral("demo"), QStringLiteral("init"), empty}).status, 0);
}

TEST_F(DemoInit, PackagesAreTarArchivesWithReadableModuleInformation)
{
    int packages = 0;
    QDirIterator it(root, {QStringLiteral("*.kestix")}, QDir::Files, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString path = it.next();
        ++packages;
        if (testutil::HaveProgram(QStringLiteral("tar"))) {
            QByteArray listing;
            EXPECT_EQ(testutil::RunProgram(QStringLiteral("tar"), {QStringLiteral("-tf"), path}, &listing), 0)
                << path.toStdString() << listing.constData();
        }
        Tar tar;
        ASSERT_TRUE(tar.Open(QIODevice::ReadOnly, path));
        bool haveMif = false;
        for (unsigned int i = 0; i < tar.EntryCount(); ++i) {
            TarFileEntry entry = tar.Entry(i);
            if (!entry.name.endsWith(QLatin1String(".mif")))
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
    if (testutil::HaveProgram(QStringLiteral("xmllint"))) {
        int descriptions = 0;
        QDirIterator xml(root, {QStringLiteral("*module.xml")}, QDir::Files, QDirIterator::Subdirectories);
        while (xml.hasNext()) {
            QByteArray out;
            ++descriptions;
            EXPECT_EQ(testutil::RunProgram(QStringLiteral("xmllint"), {QStringLiteral("--noout"), xml.next()}, &out), 0)
                << out.constData();
        }
        EXPECT_EQ(descriptions, 6);
    }
    QDirIterator it(root, {QStringLiteral("*.exe")}, QDir::Files, QDirIterator::Subdirectories);
    while (it.hasNext()) {
        const QString path = it.next();
        QByteArray out;
        EXPECT_EQ(testutil::RunProgram(QStringLiteral("sh"), {QStringLiteral("-n"), path}, &out), 0) << out.constData();
    }
    if (testutil::HaveProgram(QStringLiteral("perl"))) {
        QByteArray out;
        EXPECT_EQ(
            testutil::RunProgram(QStringLiteral("perl"),
                                 {QStringLiteral("-c"),
                                  root + QStringLiteral("/kits/DemoKit/testframeworks/oat/tools/bin/PostProcess3.pl")},
                                 &out),
            0)
            << out.constData();
    }
}

TEST_F(DemoInit, StandInCompilersProduceRealResourceFiles)
{
    const QString tools = root + QStringLiteral("/toolset/bin");
    const QString car = dir.filePath(QStringLiteral("demo.car"));
    const QString kar = dir.filePath(QStringLiteral("demo.kar"));
    const QString dso = dir.filePath(QStringLiteral("device.kar"));
    QByteArray out;
    ASSERT_EQ(testutil::RunProgram(tools + QStringLiteral("/kestormc.exe"),
                                   {QStringLiteral("-convert"), QStringLiteral("-infile"),
                                    root + QStringLiteral("/testdata/demo.ksx"), QStringLiteral("-outfile"), car},
                                   &out),
              0);
    EXPECT_TRUE(out.contains("Successfully converted file")) << out.constData();
    ASSERT_EQ(testutil::RunProgram(
                  tools + QStringLiteral("/kestormc.exe"),
                  {QStringLiteral("-compile"), QStringLiteral("-infile"), car, QStringLiteral("-outfile"), kar}, &out),
              0);
    EXPECT_TRUE(out.contains("Successfully compiled")) << out.constData();
    KestoResources data;
    ASSERT_TRUE(data.Read(kar));
    quint16 format = 0;
    QString text;
    ASSERT_TRUE(data.GetString(KestoResources::kTypeStrings, 2, &format, text));
    EXPECT_EQ(text, QStringLiteral("\u30c6\u30b9\u30c8"));

    ASSERT_EQ(testutil::RunProgram(
                  tools + QStringLiteral("/deprecated/ResourceEditor/kestorc.exe"),
                  {QStringLiteral("-nh"), QStringLiteral("-o"), dso,
                   root
                       + QStringLiteral(
                           "/platforms/Kesto5 Pro/pvs/platform/testframeworks/oat/tools/reference/deviceref.dso")},
                  &out),
              0)
        << out.constData();
    KestoResources pack;
    EXPECT_TRUE(pack.Read(dso));
}

} // namespace
