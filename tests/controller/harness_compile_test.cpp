#include "harnesstest.h"


#include <QElapsedTimer>

namespace {

using harnesstest::CapturedLog;
using testutil::CurrentDirectory;
using harnesstest::Toolset;
using testutil::ReadFile;
using testutil::WriteFile;

class HarnessCompileTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(m_work.isValid());
        m_harness.SetLogger(m_log.log());
    }
    QString WorkPath(const QString &name) const { return m_work.filePath(name); }

    QTemporaryDir m_work;
    Toolset m_toolset;
    CapturedLog m_log;
    Harness m_harness;
};

TEST_F(HarnessCompileTest, UpperCaseKsxIsConvertedThenCompiledAndTheCarRemoved)
{
    m_toolset.InstallCompiler();
    const QString source = WorkPath(QStringLiteral("strings.KSX"));
    const QString car = WorkPath(QStringLiteral("strings.car"));
    const QString output = WorkPath(QStringLiteral("strings.kar"));
    WriteFile(source, "<resources/>\n");

    EXPECT_TRUE(m_harness.CompileResource(source, output));

    const QList<QStringList> calls = m_toolset.Calls();
    ASSERT_EQ(calls.size(), 2);
    EXPECT_EQ(calls[0], (QStringList{QStringLiteral("-convert"), QStringLiteral("-infile"), source,
                                     QStringLiteral("-outfile"), car}));
    EXPECT_EQ(calls[1], (QStringList{QStringLiteral("-compile"), QStringLiteral("-infile"), car,
                                     QStringLiteral("-outfile"), output}));
    EXPECT_FALSE(QFileInfo::exists(car));
    EXPECT_EQ(ReadFile(output), QByteArray("compiled:\n<resources/>\n"));
    // Only the success lines reach the log, each on a line of its own.
    EXPECT_EQ(m_log.Text(), QStringLiteral("Successfully converted file %1\n"
                                           "Successfully compiled %2\n")
                                .arg(source, output));
}

TEST_F(HarnessCompileTest, OtherSourcesAreCompiledDirectly)
{
    m_toolset.InstallCompiler();
    for (const QString &name : {QStringLiteral("data.kar"), QStringLiteral("data.ksx.txt"),
                                QStringLiteral("ksx")}) {
        SCOPED_TRACE(name.toStdString());
        const QString source = WorkPath(name);
        WriteFile(source, "x");
        const int before = m_toolset.Calls().size();
        EXPECT_TRUE(m_harness.CompileResource(source, WorkPath(QStringLiteral("out.kar"))));
        const QList<QStringList> calls = m_toolset.Calls();
        ASSERT_EQ(calls.size(), before + 1);
        EXPECT_EQ(calls.last().value(0), QStringLiteral("-compile"));
        EXPECT_EQ(calls.last().value(2), source);
    }
}

TEST_F(HarnessCompileTest, ConversionWithoutSuccessCompilesTheGivenSource)
{
    m_toolset.InstallCompiler();
    m_toolset.SetFlag("convert_fails", true);
    const QString source = WorkPath(QStringLiteral("strings.ksx"));
    WriteFile(source, "src");

    EXPECT_TRUE(m_harness.CompileResource(source, WorkPath(QStringLiteral("out.kar"))));
    const QList<QStringList> calls = m_toolset.Calls();
    ASSERT_EQ(calls.size(), 2);
    EXPECT_EQ(calls[1].value(0), QStringLiteral("-compile"));
    EXPECT_EQ(calls[1].value(2), source);
    EXPECT_TRUE(QFileInfo::exists(source));
    EXPECT_FALSE(m_log.Text().contains(QStringLiteral("conversion error")));
}

TEST_F(HarnessCompileTest, CompileWithoutSuccessTextFailsAndStillRemovesTheIntermediate)
{
    m_toolset.InstallCompiler();
    m_toolset.SetFlag("compile_fails", true);
    const QString source = WorkPath(QStringLiteral("strings.ksx"));
    WriteFile(source, "src");

    EXPECT_FALSE(m_harness.CompileResource(source, WorkPath(QStringLiteral("out.kar"))));
    EXPECT_FALSE(QFileInfo::exists(WorkPath(QStringLiteral("strings.car"))));
    EXPECT_TRUE(QFileInfo::exists(source));
}

// The name would run commands if it ever reached a shell.
TEST_F(HarnessCompileTest, FileNamesWithShellCharactersArePassedUnchanged)
{
    m_toolset.InstallCompiler();
    m_toolset.InstallAltCompiler();
    CurrentDirectory cwd(m_work.path());
    const QString name =
        QStringLiteral("my data \"q\" 'x' $HOME $(touch injected) `touch injected2`; x.ksx");
    const QString source = WorkPath(name);
    WriteFile(source, "payload");
    const QString output = WorkPath(QStringLiteral("out $PATH \"1\".kar"));

    EXPECT_TRUE(m_harness.CompileResource(source, output));
    EXPECT_EQ(ReadFile(output), QByteArray("compiled:\npayload"));
    const QList<QStringList> calls = m_toolset.Calls();
    ASSERT_EQ(calls.size(), 2);
    EXPECT_EQ(calls[0].value(2), source);
    EXPECT_EQ(calls[1].value(4), output);

    const QString altOutput = WorkPath(QStringLiteral("dpk $(touch injected3).kar"));
    EXPECT_TRUE(m_harness.AltCompileResource(source, altOutput));
    EXPECT_EQ(ReadFile(altOutput), QByteArray("payload"));
    EXPECT_EQ(m_toolset.Calls().value(2), (QStringList{QStringLiteral("-nh"), QStringLiteral("-o"),
                                                       altOutput, source}));
    EXPECT_TRUE(m_log.Text().startsWith(QStringLiteral("Successfully converted file ")));
    EXPECT_FALSE(m_log.Text().contains(QStringLiteral("Compiliation")));

    for (const char *file : {"injected", "injected2", "injected3"})
        EXPECT_FALSE(QFileInfo::exists(WorkPath(QString::fromLatin1(file)))) << file;
}

TEST_F(HarnessCompileTest, AltCompileWithAnEmptyOutputFailsWithTheCommandAndTheToolOutput)
{
    m_toolset.InstallAltCompiler();
    m_toolset.SetFlag("alt_empty", true);
    const QString source = WorkPath(QStringLiteral("device.dso"));
    const QString output = WorkPath(QStringLiteral("device.kar"));
    WriteFile(source, "<device/>");

    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_TRUE(QFileInfo::exists(output));
    EXPECT_EQ(m_log.Text(),
              QStringLiteral("Device Pack Compiliation failed.\n\tCommand:\"%1\"-nh -o %2 %3\n\n"
                             "kestorc: syntax error\nstderr line\n")
                  .arg(m_toolset.AltCompilerPath(), output, source));
}

TEST_F(HarnessCompileTest, MissingOrUnstartableCompilersFailAtOnce)
{
    const QString source = WorkPath(QStringLiteral("strings.ksx"));
    const QString output = WorkPath(QStringLiteral("out.kar"));
    WriteFile(source, "src");
    // A stale output from an earlier run must not pass for a compiled one.
    WriteFile(output, "stale");

    QElapsedTimer real;
    real.start();
    EXPECT_FALSE(m_harness.CompileResource(source, output));
    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_EQ(m_log.Text(),
              QStringLiteral("Device Pack Compiliation failed.\n\tCommand:\"%1\"-nh -o %2 %3\n\n")
                  .arg(m_toolset.AltCompilerPath(), output, source));

    // Present but not executable.
    WriteFile(m_toolset.CompilerPath(), "#!/bin/sh\necho Successfully compiled\n");
    WriteFile(m_toolset.AltCompilerPath(), "#!/bin/sh\n");
    EXPECT_FALSE(m_harness.CompileResource(source, output));
    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_LT(real.elapsed(), 10000);
}

} // namespace
