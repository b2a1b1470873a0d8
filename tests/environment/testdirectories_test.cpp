#include "environment/testdirectories.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QFileInfo>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

class TestDirectoriesTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(temp.isValid());
        base = temp.path() + u"/data"_s;
        env.Set("KESTIX_DATA_ROOT", base + u'/');
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
    const QString manifests = TestDirectories::GetManifestDirectory(u"#42"_s);
    EXPECT_EQ(manifests, base + u"/Norvane/TestManifests/#42"_s);
    EXPECT_TRUE(QFileInfo(manifests).isDir());

    EXPECT_EQ(TestDirectories::GetTestDataPath(), base + u"/Norvane/TestDataCache"_s);

    const QString kar = TestDirectories::GetTestDataCacheFilePath(u"#7"_s);
    EXPECT_EQ(kar, base + u"/Norvane/TestDataCache/#7.kar"_s);
    EXPECT_FALSE(QFileInfo::exists(kar));

    const QString dso = TestDirectories::GetDSOCacheFilePath(u"#7"_s);
    EXPECT_EQ(dso, base + u"/Norvane/TestDataCache/DSOFiles/#7.dso"_s);
    EXPECT_TRUE(QFileInfo(QFileInfo(dso).path()).isDir());
    EXPECT_FALSE(QFileInfo::exists(dso));

    // An empty data root falls back to the generic data location.
    const QString xdg = temp.path() + u"/xdg"_s;
    ASSERT_TRUE(QDir().mkpath(xdg));
    env.Set("XDG_DATA_HOME", xdg);
    env.Set("KESTIX_DATA_ROOT", QString());
    EXPECT_EQ(TestDirectories::GetTestDataPath(), xdg + u"/Norvane/TestDataCache"_s);
}

TEST_F(TestDirectoriesTest, ProcessResultsPathCreatesFoldersButNotTheFile)
{
    const QString path = TestDirectories::GetProcessResultsPath(u"phone"_s);
    const QString logs = base + u"/Norvane/Targets/phone/Logs"_s;
    EXPECT_EQ(path, logs + u"/ProcessedResults/ProcessedResults.xml"_s);
    EXPECT_TRUE(QFileInfo(logs + u"/ProcessedResults"_s).isDir());
    EXPECT_FALSE(QFileInfo::exists(path));
    EXPECT_EQ(TestDirectories::GetLogDirectory(u"phone"_s), logs);

    // Asking again leaves what is there alone.
    testutil::WriteFile(path, "<results/>");
    EXPECT_EQ(TestDirectories::GetProcessResultsPath(u"phone"_s), path);
    EXPECT_EQ(testutil::ReadFile(path), QByteArray("<results/>"));
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
    const QString targets = base + u"/Norvane/Targets"_s;
    const QString directory = TestDirectories::GetTargetDirectory(QString::fromUtf8(GetParam().target));
    EXPECT_EQ(directory, targets + u'/' + QString::fromLatin1(GetParam().folder));
    EXPECT_EQ(QFileInfo(directory).path(), targets);
    EXPECT_TRUE(QFileInfo(directory).isDir());
}

INSTANTIATE_TEST_SUITE_P(Names, TargetNameTest,
                         ::testing::Values(TargetCase{"My Phone:1", "My%20Phone%3A1"},
                                           TargetCase{"a/b\\c", "a%2Fb%5Cc"}, TargetCase{"Az09-._~", "Az09-._~"},
                                           TargetCase{"100%", "100%25"}, TargetCase{"..", "%2E%2E"},
                                           TargetCase{".", "%2E"}, TargetCase{"a..b", "a..b"},
                                           TargetCase{"T\xc3\xa9l\xc3\xa9phone", "T%E9l%E9phone"},
                                           TargetCase{"\xe9\x9b\xbb\xe8\xa9\xb1", "%E9%9B%BB%E8%A9%B1"}));

class OatScriptsTest : public TestDirectoriesTest
{
protected:
    QString Scripts() const { return base + u"/Norvane/TestDataCache/PerlScripts"_s; }
    QString Tools() const { return temp.path() + u"/kit/testframeworks/oat/tools/bin"_s; }
};

TEST_F(OatScriptsTest, CopiesOnceAndNeverRefreshes)
{
    testutil::WriteFile(Tools() + u"/PostProcess3.pl"_s, "print 1;\n");
    testutil::WriteFile(Tools() + u"/helper.pm"_s, "1;\n");
    ASSERT_TRUE(QDir().mkpath(Tools() + u"/subdir"_s));
    env.Set("KESTIX_TESTSET", temp.path() + u"/kit"_s);

    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), Scripts());
    EXPECT_EQ(QDir(Scripts()).entryList(QDir::AllEntries | QDir::NoDotAndDotDot, QDir::Name | QDir::IgnoreCase),
              QStringList({"helper.pm", "PostProcess3.pl"}));

    testutil::WriteFile(Tools() + u"/PostProcess3.pl"_s, "print 2;\n");
    testutil::WriteFile(Tools() + u"/new.pl"_s, "new\n");
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), Scripts());
    EXPECT_EQ(testutil::ReadFile(Scripts() + u"/PostProcess3.pl"_s), QByteArray("print 1;\n"));
    EXPECT_FALSE(QFileInfo::exists(Scripts() + u"/new.pl"_s));
}

// The folder is filled once, from the default test set; an empty one,
// made before the test set was named or by hand, stays empty.
TEST_F(OatScriptsTest, ExistingFolderIsNeverFilled)
{
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), Scripts());
    EXPECT_TRUE(QDir(Scripts()).isEmpty());

    testutil::WriteFile(Tools() + u"/PostProcess3.pl"_s, "print 1;\n");
    env.Set("KESTIX_TESTSET", temp.path() + u"/kit"_s);
    EXPECT_EQ(TestDirectories::GetOatPerlScripts(), Scripts());
    EXPECT_TRUE(QDir(Scripts()).isEmpty());
}

TEST_F(TestDirectoriesTest, GenerateProPlatformMatchesNameThenDefault)
{
    const QString root = temp.path() + u"/platforms"_s;
    for (const char *name : {"Alpha Pro", "beta pro", "Gamma"})
        ASSERT_TRUE(QDir().mkpath(root + u'/' + QString::fromUtf8(name)));
    env.Set("KESTIX_PLATFORMS_ALL", root);

    Platform found = TestDirectories::GenerateProPlatform(u"BETA"_s);
    EXPECT_EQ(found.name, u"beta"_s);
    EXPECT_EQ(found.path, root + u"/beta pro"_s);

    // Non-professional platforms are never chosen, and no default: empty.
    found = TestDirectories::GenerateProPlatform(u"gamma"_s);
    EXPECT_TRUE(found.name.isEmpty());
    EXPECT_TRUE(found.path.isEmpty());
    EXPECT_FALSE(found.isPro);

    env.Set("KESTIX_PLATFORM", root + u"/Alpha Pro/"_s);
    found = TestDirectories::GenerateProPlatform(u"gamma"_s);
    EXPECT_EQ(found.name, u"Alpha"_s);
    EXPECT_TRUE(found.isDefault);
    EXPECT_EQ(TestDirectories::GenerateProPlatform(u"beta"_s).name, u"beta"_s);
}

TEST_F(TestDirectoriesTest, ResolveXmlPathSearchOrder)
{
    const QString work = temp.path() + u"/work"_s;
    const QString home = temp.path() + u"/home"_s;
    const QString pack = temp.path() + u"/pack"_s;
    testutil::WriteFile(work + u"/here.xml"_s, "<a/>");
    testutil::WriteFile(home + u"/athome.xml"_s, "<a/>");
    testutil::WriteFile(pack + u"/device.xml"_s, "<a/>");
    testutil::WriteFile(pack + u"/beside.xml"_s, "<a/>");
    testutil::WriteFile(pack + u"/sub/deep.xml"_s, "<a/>");
    testutil::WriteFile(pack + u"/flat.xml"_s, "<a/>");
    ASSERT_TRUE(QDir().mkpath(work + u"/folder"_s));
    env.Set("HOME", home);
    testutil::CurrentDirectory cd(work);
    const QString reference = pack + u"/device.xml"_s;

    EXPECT_EQ(ResolveXmlPath(u"/no/such/file.xml"_s, reference), u"/no/such/file.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"here.xml"_s, reference), work + u"/here.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"athome.xml"_s, reference), home + u"/athome.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"beside.xml"_s, reference), pack + u"/beside.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"sub/deep.xml"_s, reference), pack + u"/sub/deep.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"elsewhere/flat.xml"_s, reference), pack + u"/flat.xml"_s);
    EXPECT_EQ(ResolveXmlPath(u"beside.xml"_s, QString()), QString());
    EXPECT_EQ(ResolveXmlPath(u"missing.xml"_s, reference), QString());
    // A folder is not a file.
    EXPECT_EQ(ResolveXmlPath(u"folder"_s, reference), QString());
    EXPECT_EQ(ResolveXmlPath(QString(), reference), QString());
}

class AssociatedExecutableTest : public TestDirectoriesTest
{
protected:
    void SetUp() override
    {
        TestDirectoriesTest::SetUp();
        bin = temp.path() + u"/bin"_s;
        for (const char *program : {"perl", "python3", "sh"})
            MakeExecutable(bin + u'/' + QString::fromLatin1(program));
        env.Set("PATH", bin);
    }

    static void MakeExecutable(const QString &path)
    {
        testutil::WriteFile(path, "#!/bin/sh\nexit 0\n");
        QFile::setPermissions(path, QFile::ReadOwner | QFile::WriteOwner | QFile::ExeOwner);
    }

    QString Script(const QString &name, const QByteArray &content)
    {
        const QString path = temp.path() + u"/scripts/"_s + name;
        testutil::WriteFile(path, content);
        return path;
    }

    QString bin;
};

TEST_F(AssociatedExecutableTest, ShebangThenSuffixNamesTheInterpreter)
{
    const QString own = temp.path() + u"/tools/interp"_s;
    MakeExecutable(own);
    const struct
    {
        const char *name;
        QByteArray content;
        QString found;
    } rows[] = {
        {"a", "#!/usr/bin/env perl\nprint;\n", bin + u"/perl"_s},
        {"b.txt", "#! /usr/bin/env -S python3 -u\n", bin + u"/python3"_s},
        {"c.pl", "#!/bin/sh\necho\n", u"/bin/sh"_s},
        {"d", "#!perl -w\r\n", bin + u"/perl"_s},
        {"e", "#!" + own.toUtf8() + " --x\n", own},
        {"PostProcess3.pl", "print 1;\n", bin + u"/perl"_s},
        {"Tool.PL", "", bin + u"/perl"_s},
        {"x.py", "print(1)\n", bin + u"/python3"_s},
        {"x.sh", "echo\n", bin + u"/sh"_s},
        // A "#!" naming an interpreter that is not there falls back to the suffix.
        {"y.pl", "#!/no/such/perl\n", bin + u"/perl"_s},
        {"notes.txt", "hello\n", QString()},
        {"noext", "", QString()},
        {"z", "#!/usr/bin/env\n", QString()},
    };
    for (const auto &row : rows)
        EXPECT_EQ(FindAssociatedExecutable(Script(QString::fromLatin1(row.name), row.content)), row.found) << row.name;
    EXPECT_EQ(FindAssociatedExecutable(temp.path() + u"/missing.pl"_s), QString());
    EXPECT_EQ(FindAssociatedExecutable(temp.path()), QString());
    env.Set("PATH", temp.path() + u"/empty"_s);
    EXPECT_EQ(FindAssociatedExecutable(Script(u"p.pl"_s, "print 1;\n")), QString());
    EXPECT_EQ(FindAssociatedExecutable(Script(u"q"_s, "#!/usr/bin/env perl\n")), QString());
}

} // namespace
