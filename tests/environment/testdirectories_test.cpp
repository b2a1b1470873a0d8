#include "environment/testdirectories.h"

#include "currentdirectory.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>

#include <gtest/gtest.h>

namespace {

class TestDirectoriesTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(temp.isValid());
        base = temp.path() + QStringLiteral("/data");
        env.Set("KESTIX_DATA_ROOT", base + QLatin1Char('/'));
        env.Unset("KESTIX_TESTSET");
        env.Unset("KESTIX_PLATFORMS_ALL");
        env.Unset("KESTIX_PLATFORM");
    }

    QTemporaryDir temp;
    QString base;
    testutil::EnvGuard env;
};

TEST_F(TestDirectoriesTest, CacheFoldersAreCreatedButNotTheirFiles)
{
    const QString manifests = TestDirectories::GetManifestDirectory(QStringLiteral("#42"));
    EXPECT_EQ(manifests, base + QStringLiteral("/Norvane/TestManifests/#42"));
    EXPECT_TRUE(QFileInfo(manifests).isDir());

    EXPECT_EQ(TestDirectories::GetTestDataPath(), base + QStringLiteral("/Norvane/TestDataCache"));

    const QString kar = TestDirectories::GetTestDataCacheFilePath(QStringLiteral("#7"));
    EXPECT_EQ(kar, base + QStringLiteral("/Norvane/TestDataCache/#7.kar"));
    EXPECT_FALSE(QFileInfo::exists(kar));

    const QString dso = TestDirectories::GetDSOCacheFilePath(QStringLiteral("#7"));
    EXPECT_EQ(dso, base + QStringLiteral("/Norvane/TestDataCache/DSOFiles/#7.dso"));
    EXPECT_TRUE(QFileInfo(QFileInfo(dso).path()).isDir());
    EXPECT_FALSE(QFileInfo::exists(dso));
}

TEST_F(TestDirectoriesTest, ProcessResultsPathCreatesFoldersButNotTheFile)
{
    const QString path = TestDirectories::GetProcessResultsPath(QStringLiteral("phone"));
    const QString logs = base + QStringLiteral("/Norvane/Targets/phone/Logs");
    EXPECT_EQ(path, logs + QStringLiteral("/ProcessedResults/ProcessedResults.xml"));
    EXPECT_TRUE(QFileInfo(logs + QStringLiteral("/ProcessedResults")).isDir());
    EXPECT_FALSE(QFileInfo::exists(path));
    EXPECT_EQ(TestDirectories::GetLogDirectory(QStringLiteral("phone")), logs);

    // Asking again leaves what is there alone.
    testutil::WriteFile(path, "<results/>");
    EXPECT_EQ(TestDirectories::GetProcessResultsPath(QStringLiteral("phone")), path);
    EXPECT_EQ(testutil::ReadFile(path), QByteArray("<results/>"));
}

TEST_F(TestDirectoriesTest, EmptyDataRootFallsBackToGenericDataLocation)
{
    const QString xdg = temp.path() + QStringLiteral("/xdg");
    ASSERT_TRUE(QDir().mkpath(xdg));
    env.Set("XDG_DATA_HOME", xdg);
    env.Set("KESTIX_DATA_ROOT", QString());
    EXPECT_EQ(TestDirectories::GetTestDataPath(), xdg + QStringLiteral("/Norvane/TestDataCache"));
}

struct TargetCase
{
    const char *target; // UTF-8
    const char *folder;
};

class TargetNameTest : public TestDirectoriesTest, public ::testing::WithParamInterface<TargetCase>
{
};

TEST_P(TargetNameTest, BecomesOneFolderBelowTargets)
{
    const QString targets = base + QStringLiteral("/Norvane/Targets");
    const QString directory = TestDirectories::GetTargetDirectory(QString::fromUtf8(GetParam().target));
    EXPECT_EQ(directory, targets + QLatin1Char('/') + QString::fromLatin1(GetParam().folder));
    EXPECT_EQ(QFileInfo(directory).path(), targets);
    EXPECT_TRUE(QFileInfo(directory).isDir());
}

INSTANTIATE_TEST_SUITE_P(
    Names, TargetNameTest,
    ::testing::Values(TargetCase{"My Phone:1", "My%20Phone%3A1"},
                      TargetCase{"a/b\\c", "a%2Fb%5Cc"},
                      TargetCase{"Az09-._~", "Az09-._~"},
                      TargetCase{"100%", "100%25"},
                      TargetCase{"..", "%2E%2E"},
                      TargetCase{".", "%2E"},
                      TargetCase{"a..b", "a..b"},
                      TargetCase{"T\xc3\xa9l\xc3\xa9phone", "T%E9l%E9phone"},
                      TargetCase{"\xe9\x9b\xbb\xe8\xa9\xb1", "%E9%9B%BB%E8%A9%B1"}));

class OatScriptsTest : public TestDirectoriesTest
{
protected:
    QString Scripts() const { return base + QStringLiteral("/Norvane/TestDataCache/PerlScripts"); }
    QString Tools() const { return temp.path() + QStringLiteral("/kit/testframeworks/oat/tools/bin"); }
};

TEST_F(OatScriptsTest, CopiesOnceAndNeverRefreshes)
{
    testutil::WriteFile(Tools() + QStringLiteral("/PostProcess3.pl"), "print 1;\n");
    testutil::WriteFile(Tools() + QStringLiteral("/helper.pm"), "1;\n");
    ASSERT_TRUE(QDir().mkpath(Tools() + QStringLiteral("/subdir")));
    env.Set("KESTIX_TESTSET", temp.path() + QStringLiteral("/kit"));

    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), Scripts());
    EXPECT_EQ(QDir(Scripts()).entryList(QDir::AllEntries | QDir::NoDotAndDotDot, QDir::Name | QDir::IgnoreCase),
              QStringList({"helper.pm", "PostProcess3.pl"}));

    testutil::WriteFile(Tools() + QStringLiteral("/PostProcess3.pl"), "print 2;\n");
    testutil::WriteFile(Tools() + QStringLiteral("/new.pl"), "new\n");
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), Scripts());
    EXPECT_EQ(testutil::ReadFile(Scripts() + QStringLiteral("/PostProcess3.pl")),
              QByteArray("print 1;\n"));
    EXPECT_FALSE(QFileInfo::exists(Scripts() + QStringLiteral("/new.pl")));
}

TEST_F(OatScriptsTest, ExistingEmptyFolderIsNotFilled)
{
    testutil::WriteFile(Tools() + QStringLiteral("/PostProcess3.pl"), "print 1;\n");
    env.Set("KESTIX_TESTSET", temp.path() + QStringLiteral("/kit"));
    ASSERT_TRUE(QDir().mkpath(Scripts()));
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), Scripts());
    EXPECT_TRUE(QDir(Scripts()).isEmpty());
}

TEST_F(OatScriptsTest, NoTestSetLeavesTheFolderEmptyForGood)
{
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), Scripts());
    EXPECT_TRUE(QDir(Scripts()).isEmpty());

    testutil::WriteFile(Tools() + QStringLiteral("/PostProcess3.pl"), "print 1;\n");
    env.Set("KESTIX_TESTSET", temp.path() + QStringLiteral("/kit"));
    TestDirectories::GetOatPerlScripts();
    EXPECT_TRUE(QDir(Scripts()).isEmpty());
}

TEST_F(TestDirectoriesTest, GenerateProPlatformMatchesNameThenDefault)
{
    const QString root = temp.path() + QStringLiteral("/platforms");
    for (const char *name : {"Alpha Pro", "beta pro", "Gamma"})
        ASSERT_TRUE(QDir().mkpath(root + QLatin1Char('/') + QString::fromUtf8(name)));
    env.Set("KESTIX_PLATFORMS_ALL", root);

    Platform found = TestDirectories::GenerateProPlatform(QStringLiteral("BETA"));
    EXPECT_EQ(found.name, QStringLiteral("beta"));
    EXPECT_EQ(found.path, root + QStringLiteral("/beta pro"));

    // Non-professional platforms are never chosen, and no default: empty.
    found = TestDirectories::GenerateProPlatform(QStringLiteral("gamma"));
    EXPECT_TRUE(found.name.isEmpty());
    EXPECT_TRUE(found.path.isEmpty());
    EXPECT_FALSE(found.isPro);

    env.Set("KESTIX_PLATFORM", root + QStringLiteral("/Alpha Pro/"));
    found = TestDirectories::GenerateProPlatform(QStringLiteral("gamma"));
    EXPECT_EQ(found.name, QStringLiteral("Alpha"));
    EXPECT_TRUE(found.isDefault);
    EXPECT_EQ(TestDirectories::GenerateProPlatform(QStringLiteral("beta")).name, QStringLiteral("beta"));
}

TEST_F(TestDirectoriesTest, ResolveXmlPathSearchOrder)
{
    const QString work = temp.path() + QStringLiteral("/work");
    const QString home = temp.path() + QStringLiteral("/home");
    const QString pack = temp.path() + QStringLiteral("/pack");
    testutil::WriteFile(work + QStringLiteral("/here.xml"), "<a/>");
    testutil::WriteFile(home + QStringLiteral("/athome.xml"), "<a/>");
    testutil::WriteFile(pack + QStringLiteral("/device.xml"), "<a/>");
    testutil::WriteFile(pack + QStringLiteral("/beside.xml"), "<a/>");
    testutil::WriteFile(pack + QStringLiteral("/sub/deep.xml"), "<a/>");
    testutil::WriteFile(pack + QStringLiteral("/flat.xml"), "<a/>");
    ASSERT_TRUE(QDir().mkpath(work + QStringLiteral("/folder")));
    env.Set("HOME", home);
    CurrentDirectory cd(work);
    const QString reference = pack + QStringLiteral("/device.xml");

    EXPECT_EQ(ResolveXmlPath(QStringLiteral("/no/such/file.xml"), reference),
              QStringLiteral("/no/such/file.xml"));
    EXPECT_EQ(ResolveXmlPath(QStringLiteral("here.xml"), reference), work + QStringLiteral("/here.xml"));
    EXPECT_EQ(ResolveXmlPath(QStringLiteral("athome.xml"), reference), home + QStringLiteral("/athome.xml"));
    EXPECT_EQ(ResolveXmlPath(QStringLiteral("beside.xml"), reference), pack + QStringLiteral("/beside.xml"));
    EXPECT_EQ(ResolveXmlPath(QStringLiteral("sub/deep.xml"), reference),
              pack + QStringLiteral("/sub/deep.xml"));
    EXPECT_EQ(ResolveXmlPath(QStringLiteral("elsewhere/flat.xml"), reference),
              pack + QStringLiteral("/flat.xml"));
    EXPECT_EQ(ResolveXmlPath(QStringLiteral("beside.xml"), QString()), QString());
    EXPECT_EQ(ResolveXmlPath(QStringLiteral("missing.xml"), reference), QString());
    // A folder is not a file.
    EXPECT_EQ(ResolveXmlPath(QStringLiteral("folder"), reference), QString());
    EXPECT_EQ(ResolveXmlPath(QString(), reference), QString());
}

class AssociatedExecutableTest : public TestDirectoriesTest
{
protected:
    void SetUp() override
    {
        TestDirectoriesTest::SetUp();
        bin = temp.path() + QStringLiteral("/bin");
        for (const char *program : {"perl", "python3", "sh"})
            MakeExecutable(bin + QLatin1Char('/') + QString::fromLatin1(program));
        env.Set("PATH", bin);
    }

    static void MakeExecutable(const QString &path)
    {
        testutil::WriteFile(path, "#!/bin/sh\nexit 0\n");
        QFile::setPermissions(path, QFile::ReadOwner | QFile::WriteOwner | QFile::ExeOwner);
    }

    QString Script(const QString &name, const QByteArray &content)
    {
        const QString path = temp.path() + QStringLiteral("/scripts/") + name;
        testutil::WriteFile(path, content);
        return path;
    }

    QString bin;
};

TEST_F(AssociatedExecutableTest, ShebangNamesTheInterpreter)
{
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("a"), "#!/usr/bin/env perl\nprint;\n")),
              bin + QStringLiteral("/perl"));
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("b.txt"), "#! /usr/bin/env -S python3 -u\n")),
              bin + QStringLiteral("/python3"));
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("c.pl"), "#!/bin/sh\necho\n")),
              QStringLiteral("/bin/sh"));
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("d"), "#!perl -w\r\n")),
              bin + QStringLiteral("/perl"));
    const QString own = temp.path() + QStringLiteral("/tools/interp");
    MakeExecutable(own);
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("e"), "#!" + own.toUtf8() + " --x\n")), own);
}

TEST_F(AssociatedExecutableTest, SuffixNamesTheInterpreter)
{
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("PostProcess3.pl"), "print 1;\n")),
              bin + QStringLiteral("/perl"));
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("Tool.PL"), "")), bin + QStringLiteral("/perl"));
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("x.py"), "print(1)\n")),
              bin + QStringLiteral("/python3"));
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("x.sh"), "echo\n")), bin + QStringLiteral("/sh"));
    // A "#!" naming an interpreter that is not there falls back to the suffix.
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("y.pl"), "#!/no/such/perl\n")),
              bin + QStringLiteral("/perl"));
}

TEST_F(AssociatedExecutableTest, NothingFoundIsEmpty)
{
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("notes.txt"), "hello\n")), QString());
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("noext"), "")), QString());
    EXPECT_EQ(FindAssociatedExecutable(temp.path() + QStringLiteral("/missing.pl")), QString());
    EXPECT_EQ(FindAssociatedExecutable(temp.path()), QString());
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("z"), "#!/usr/bin/env\n")), QString());
    env.Set("PATH", temp.path() + QStringLiteral("/empty"));
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("p.pl"), "print 1;\n")), QString());
    EXPECT_EQ(FindAssociatedExecutable(Script(QStringLiteral("q"), "#!/usr/bin/env perl\n")), QString());
}

} // namespace
