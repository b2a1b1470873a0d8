#include "harnesstest.h"

#include <QElapsedTimer>

namespace {

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

// The name would run commands if it ever reached a shell.
TEST_F(HarnessCompileTest, UpperCaseKsxIsConvertedThenCompiledWithItsNamePassedUnchangedAndTheCarRemoved)
{
    m_toolset.InstallCompiler();
    m_toolset.InstallAltCompiler();
    CurrentDirectory cwd(m_work.path());
    const QString name = u"my data \"q\" 'x' $HOME $(touch injected) `touch injected2`; x"_s;
    const QString source = WorkPath(name + u".KSX"_s);
    const QString car = WorkPath(name + u".car"_s);
    const QString output = WorkPath(u"out $PATH \"1\".kar"_s);
    WriteFile(source, "<resources/>\n");

    EXPECT_TRUE(m_harness.CompileResource(source, output));
    const QList<QStringList> calls = m_toolset.Calls();
    ASSERT_EQ(calls.size(), 2);
    EXPECT_EQ(calls[0], (QStringList{u"-convert"_s, u"-infile"_s, source, u"-outfile"_s, car}));
    EXPECT_EQ(calls[1], (QStringList{u"-compile"_s, u"-infile"_s, car, u"-outfile"_s, output}));
    EXPECT_FALSE(QFileInfo::exists(car));
    EXPECT_EQ(ReadFile(output), QByteArray("compiled:\n<resources/>\n"));
    // Only the success lines reach the log, each on a line of its own.
    EXPECT_EQ(m_log.Text(), u"Successfully converted file %1\nSuccessfully compiled %2\n"_s.arg(source, output));

    const QString altOutput = WorkPath(u"dpk $(touch injected3).kar"_s);
    EXPECT_TRUE(m_harness.AltCompileResource(source, altOutput));
    EXPECT_EQ(ReadFile(altOutput), QByteArray("<resources/>\n"));
    EXPECT_EQ(m_toolset.Calls().value(2), (QStringList{u"-nh"_s, u"-o"_s, altOutput, source}));
    EXPECT_FALSE(m_log.Text().contains(u"Compiliation"_s));
    for (const char *file : {"injected", "injected2", "injected3"})
        EXPECT_FALSE(QFileInfo::exists(WorkPath(QString::fromLatin1(file)))) << file;
}

TEST_F(HarnessCompileTest, OnlyKsxIsConvertedAndAFailedStepKeepsTheSourceAndNoIntermediate)
{
    m_toolset.InstallCompiler();
    // The source, the toolset flag that fails a step (or null), what the compiler reads ("car": the converted
    // intermediate) and whether the compile succeeds.
    const struct
    {
        const char *source, *failing, *compileInput;
        bool compiled;
    } rows[] = {
        {"data.kar", nullptr, "data.kar", true},
        {"data.ksx.txt", nullptr, "data.ksx.txt", true},
        {"ksx", nullptr, "ksx", true},
        {"strings.ksx", "convert_fails", "strings.ksx", true},
        {"strings.ksx", "compile_fails", "car", false},
    };
    for (const auto &row : rows) {
        SCOPED_TRACE(row.source + std::string(" ") + (row.failing ? row.failing : ""));
        const QString source = WorkPath(QString::fromLatin1(row.source));
        const QString car = WorkPath(u"strings.car"_s);
        WriteFile(source, "src");
        if (row.failing)
            m_toolset.SetFlag(row.failing, true);
        const qsizetype before = m_toolset.Calls().size();
        EXPECT_EQ(m_harness.CompileResource(source, WorkPath(u"out.kar"_s)), row.compiled);
        if (row.failing)
            m_toolset.SetFlag(row.failing, false);

        const QList<QStringList> calls = m_toolset.Calls().mid(before);
        ASSERT_EQ(calls.size(), source.endsWith(u".ksx"_s) ? 2 : 1);
        EXPECT_EQ(calls.last().value(0), u"-compile"_s);
        EXPECT_EQ(calls.last().value(2), qstrcmp(row.compileInput, "car") ? source : car);
        EXPECT_TRUE(QFileInfo::exists(source));
        EXPECT_FALSE(QFileInfo::exists(car));
    }
    EXPECT_FALSE(m_log.Text().contains(u"conversion error"_s));
}

TEST_F(HarnessCompileTest, MissingUnstartableOrFailingCompilersFailAtOnceWithTheCommandAndTheToolOutput)
{
    const QString source = WorkPath(u"strings.ksx"_s);
    const QString output = WorkPath(u"out.kar"_s);
    WriteFile(source, "src");
    // A stale output from an earlier run must not pass for a compiled one.
    WriteFile(output, "stale");
    const QString failed = u"Device Pack Compiliation failed.\n\tCommand:\"%1\"-nh -o %2 %3\n\n"_s.arg(
        m_toolset.AltCompilerPath(), output, source);

    QElapsedTimer real;
    real.start();
    EXPECT_FALSE(m_harness.CompileResource(source, output));
    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_EQ(m_log.Text(), failed);

    // Present but not executable.
    WriteFile(m_toolset.CompilerPath(), "#!/bin/sh\necho Successfully compiled\n");
    WriteFile(m_toolset.AltCompilerPath(), "#!/bin/sh\n");
    EXPECT_FALSE(m_harness.CompileResource(source, output));
    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_LT(real.elapsed(), 10000);

    // Running but leaving an empty output.
    m_toolset.InstallAltCompiler();
    m_toolset.SetFlag("alt_empty", true);
    const qsizetype logged = m_log.Text().size();
    EXPECT_FALSE(m_harness.AltCompileResource(source, output));
    EXPECT_TRUE(QFileInfo::exists(output));
    EXPECT_EQ(m_log.Text().mid(logged), failed + u"kestorc: syntax error\nstderr line\n"_s);
}

} // namespace
