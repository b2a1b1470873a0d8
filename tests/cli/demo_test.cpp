#include "cli_test.h"

#include "support/testutil.h"

#include "archive/tar.h"
#include "resources/kestoresources.h"

#include <QDir>
#include <QDirIterator>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;
using testutil::RunProgram;

namespace {

// A demo environment in a folder whose name has blanks; the test's folder is the current one.
class DemoInit : public ::testing::Test
{
protected:
    void SetUp() override
    {
        const ToolResult r = Tool("demo init", root);
        ASSERT_EQ(r.status, 0) << r.err.constData();
        env = r.out;
    }

    // The files below the demo whose names match pattern.
    QStringList Files(const QString &pattern) const
    {
        QStringList found;
        for (QDirIterator it(root, {pattern}, QDir::Files, QDirIterator::Subdirectories); it.hasNext();)
            found << it.next();
        return found;
    }

    QTemporaryDir dir;
    testutil::CurrentDirectory current{dir.path()};
    const QString root = dir.filePath(u"demo with blanks"_s);
    QByteArray env;
};

TEST_F(DemoInit, PrintsTheVariablesThatPointAtIt)
{
    ExpectContains(env,
                   {u"export KESTIX_TESTSET='%1/kits/DemoKit'\n"_s.arg(root).toUtf8(),
                    u"export KESTIX_PLATFORM='%1/platforms/Kesto5 Pro/'\n"_s.arg(root).toUtf8()});
    EXPECT_EQ(testutil::ReadFile(root + u"/env.sh"_s), env);
    // A second init into the same folder is refused rather than mixed in; an empty folder is taken.
    ExpectRefused(Tool("demo init", root), "exists and is not empty");
    ASSERT_TRUE(QDir().mkpath(u"empty"_s));
    EXPECT_EQ(Tool("demo init empty").status, 0);
}

TEST_F(DemoInit, PackagesScriptsAndDescriptionsAreWhatTarShPerlAndXmllintRead)
{
    const QStringList packages = Files(u"*.kestix"_s);
    EXPECT_EQ(packages.size(), 4 + 6 + 1); // frameworks; the kit's modules, a secondary one among them; the platform's
    for (const QString &path : packages) {
        SCOPED_TRACE(path.toStdString());
        testutil::ExpectProgramAccepts(u"tar"_s, {u"-tf"_s, path});
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
            QVector<quint16> programs;
            mif.GetMifClasses(classes);
            mif.GetMifApplets(applets);
            mif.GetIDs(KestoResources::kTypeSysResource, programs);
            EXPECT_FALSE(classes.isEmpty() && applets.isEmpty() && programs.isEmpty()) << entry.name.toStdString();
            haveMif = true;
        }
        EXPECT_TRUE(haveMif);
    }
    // Scripts are valid shell and Perl, descriptions valid XML.
    const QStringList descriptions = Files(u"*module.xml"_s);
    EXPECT_EQ(descriptions.size(), 6);
    for (const QString &path : descriptions)
        testutil::ExpectXmllintAccepts(path);
    for (const QString &path : Files(u"*.exe"_s))
        EXPECT_EQ(RunProgram(u"sh"_s, {u"-n"_s, path}), 0) << path.toStdString();
    const QString postProcess = root + u"/kits/DemoKit/testframeworks/oat/tools/bin/PostProcess3.pl"_s;
    testutil::ExpectProgramAccepts(u"perl"_s, {u"-c"_s, postProcess});
}

TEST_F(DemoInit, StandInCompilersProduceRealResourceFiles)
{
    // A tool of the demo's tool set run to success; what it printed.
    const auto tool = [this](const QString &name, const QStringList &arguments) {
        QByteArray out;
        EXPECT_EQ(RunProgram(root + u"/toolset/bin/"_s + name, arguments, &out), 0) << out.constData();
        return out;
    };
    ExpectContains(
        tool(u"kestormc.exe"_s, Args("-convert -infile", root + u"/testdata/demo.ksx"_s, "-outfile demo.car")),
        {"Successfully converted file"});
    ExpectContains(tool(u"kestormc.exe"_s, Args("-compile -infile demo.car -outfile demo.kar")),
                   {"Successfully compiled"});
    KestoResources data;
    ASSERT_TRUE(data.Read(u"demo.kar"_s));
    quint16 format = 0;
    QString text;
    ASSERT_TRUE(data.GetString(KestoResources::kTypeStrings, 2, &format, text));
    EXPECT_EQ(text, u"\u30c6\u30b9\u30c8"_s);

    tool(u"deprecated/ResourceEditor/kestorc.exe"_s,
         Args("-nh -o device.kar",
              root + u"/platforms/Kesto5 Pro/pvs/platform/testframeworks/oat/tools/reference/deviceref.dso"_s));
    EXPECT_TRUE(KestoResources().Read(u"device.kar"_s));
}

} // namespace
