#include "cli_test.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using testutil::ReadFile;
using testutil::WriteFile;

class InspectTool : public ::testing::Test
{
protected:
    void SetUp() override { ASSERT_TRUE(dir.isValid()); }
    QString Path(const QString &name) const { return dir.filePath(name); }
    QTemporaryDir dir;
};

TEST_F(InspectTool, CompiledSourceListsDecodedStringsObjectsAndClassIds)
{
    WriteFile(Path(u"src.xml"_s),
              "<resources>\n"
              " <string id=\"1\" format=\"UTF-8\">Gr\xc3\xbc\xc3\x9f"
              "e</string>\n"
              " <string id=\"7\" format=\"GB2312\">\xe4\xb8\xad\xe6\x96\x87</string>\n"
              " <object id=\"2\" mime=\"text/plain\">abc</object>\n"
              " <binary type=\"0x5000\" id=\"0\" hex=\""
                  + QByteArray(80, '0')
                  + "\"/>\n"
                    " <binary type=\"0x5000\" id=\"1\" hex=\"78563412 efbeadde 00000000 11111111\"/>\n"
                    "</resources>\n");
    const ToolResult compiled = RunTool({u"res"_s, u"compile"_s, Path(u"src.xml"_s), Path(u"out.kar"_s)});
    ASSERT_EQ(compiled.status, 0) << compiled.err.constData();

    const ToolResult list = RunTool({u"res"_s, u"list"_s, Path(u"out.kar"_s)});
    ASSERT_EQ(list.status, 0) << list.err.constData();
    const QString out = QString::fromUtf8(list.out);
    EXPECT_TRUE(out.contains(u"UTF-8  \"Gr\u00fc\u00dfe\""_s)) << list.out.constData();
    EXPECT_TRUE(out.contains(u"\"\u4e2d\u6587\""_s)) << list.out.constData();
    EXPECT_TRUE(out.contains(u"text/plain, 3 bytes"_s));

    // The class ID list stops at its zero value.
    const ToolResult mif = RunTool({u"mif"_s, Path(u"out.kar"_s)});
    ASSERT_EQ(mif.status, 0) << mif.err.constData();
    EXPECT_TRUE(mif.out.contains("classes: 2\n  0x12345678\n  0xdeadbeef\napplets: 0")) << mif.out.constData();

    const ToolResult dump = RunTool({u"res"_s, u"dump"_s, Path(u"out.kar"_s)});
    EXPECT_EQ(dump.status, 0);
    EXPECT_TRUE(dump.out.startsWith("=== Header ===")) << dump.out.left(200).constData();
    EXPECT_TRUE(dump.out.contains("Number of Resources:  5 (0x5)\n")) << dump.out.left(400).constData();
}

TEST_F(InspectTool, BadSourcesAndForeignFilesAreUsageErrors)
{
    WriteFile(Path(u"bad.xml"_s), "<resources><string id=\"70000\">x</string></resources>");
    WriteFile(Path(u"src.xml"_s), "<resources><string id=\"1\">x</string></resources>");
    WriteFile(Path(u"junk.kar"_s), "not a resource file at all");
    const ToolResult bad = RunTool({u"res"_s, u"compile"_s, Path(u"bad.xml"_s), Path(u"o.kar"_s)});
    EXPECT_EQ(bad.status, 2);
    EXPECT_TRUE(bad.err.contains("bad id")) << bad.err.constData();
    EXPECT_FALSE(QFile::exists(Path(u"o.kar"_s)));
    // The second of two resources with one type and ID would silently replace the first.
    WriteFile(Path(u"twice.xml"_s),
              "<resources><string id=\"3\">a</string><object id=\"4\">b</object>\n"
              "<string id=\"3\">c</string></resources>");
    const ToolResult twice = RunTool({u"res"_s, u"compile"_s, Path(u"twice.xml"_s), Path(u"o.kar"_s)});
    EXPECT_EQ(twice.status, 2);
    EXPECT_TRUE(twice.err.contains("line 2: duplicate resource ID 3 of type 0x1")) << twice.err.constData();
    const ToolResult nowhere = RunTool({u"res"_s, u"compile"_s, Path(u"src.xml"_s), Path(u"missing/o.kar"_s)});
    EXPECT_EQ(nowhere.status, 2);
    EXPECT_FALSE(nowhere.err.contains("()")) << nowhere.err.constData();
    EXPECT_FALSE(QFile::exists(Path(u"o.kar"_s)));
    EXPECT_EQ(RunTool({u"res"_s, u"list"_s, Path(u"junk.kar"_s)}).status, 2);
    EXPECT_EQ(RunTool({u"mif"_s, Path(u"missing.mif"_s)}).status, 2);
    EXPECT_EQ(RunTool({u"res"_s, u"frobnicate"_s, Path(u"junk.kar"_s)}).status, 2);
}

TEST_F(InspectTool, TarListAndCatReadAnArchiveMadeByGnuTar)
{
    if (!testutil::HaveProgram(u"tar"_s))
        GTEST_SKIP() << "tar not installed";
    WriteFile(Path(u"pkg/mod/a.txt"_s), "alpha\n");
    WriteFile(Path(u"pkg/mod/empty"_s), "");
    WriteFile(Path(u"pkg/mod/red\x1b[31m\n"_s), "x");
    ASSERT_TRUE(QFile::link(u"a.txt"_s, Path(u"pkg/mod/link"_s)));
    WriteFile(Path(u"pkg/late"_s), "late");
    const auto makeTar = [this](const QString &name, const QStringList &members) {
        return testutil::RunProgram(
            u"tar"_s, QStringList{u"--sort=name"_s, u"-cf"_s, Path(name), u"-C"_s, Path(u"pkg"_s)} + members);
    };
    ASSERT_EQ(makeTar(u"p.tar"_s, {u"mod"_s}), 0);
    ASSERT_EQ(makeTar(u"late.tar"_s, {u"late"_s}), 0);
    // Whatever follows the end-of-archive blocks is not listed, as with tar -t.
    const QByteArray archive = ReadFile(Path(u"p.tar"_s));
    WriteFile(Path(u"both.tar"_s), archive + ReadFile(Path(u"late.tar"_s)));
    const ToolResult list = RunTool({u"tar"_s, u"list"_s, Path(u"both.tar"_s)});
    ASSERT_EQ(list.status, 0) << list.err.constData();
    EXPECT_EQ(list.out,
              QByteArray("d\t0\tmod/\n"
                         "-\t6\tmod/a.txt\n"
                         "-\t0\tmod/empty\n"
                         "l\t0\tmod/link -> a.txt\n"
                         "-\t1\tmod/red\\033[31m\\n\n"));

    const auto cat = [this](const QString &file, const QString &member) {
        return RunTool({u"tar"_s, u"cat"_s, Path(file), member});
    };
    ToolResult r = cat(u"p.tar"_s, u"mod/a.txt"_s);
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, QByteArray("alpha\n"));
    // A name is found as the listing shows it too.
    EXPECT_EQ(cat(u"p.tar"_s, u"mod/red\\033[31m\\n"_s).out, QByteArray("x"));
    const struct
    {
        QString file;
        QString member;
        QByteArray message;
    } refusals[] = {
        {u"p.tar"_s, u"mod/none"_s, "no member mod/none"},
        {u"p.tar"_s, u"mod/"_s, "mod/ is a directory"},
        {u"p.tar"_s, u"mod/link"_s, "mod/link is a symbolic link to a.txt"},
        {u"cut.tar"_s, u"mod/a.txt"_s, "cut.tar: unexpected end of archive at offset 1300"},
        {u"pkg/mod/a.txt"_s, u"a"_s, "a.txt: does not look like a tar archive"},
    };
    WriteFile(Path(u"cut.tar"_s), archive.left(1300));
    for (const auto &refusal : refusals) {
        r = cat(refusal.file, refusal.member);
        EXPECT_EQ(r.status, 2) << refusal.message.constData();
        EXPECT_TRUE(r.out.isEmpty());
        EXPECT_TRUE(r.err.startsWith("harness tar: ")) << r.err.constData();
        EXPECT_TRUE(r.err.contains(refusal.message)) << r.err.constData();
    }
    // A damaged archive lists what comes before the damage, then says why.
    r = RunTool({u"tar"_s, u"list"_s, Path(u"cut.tar"_s)});
    EXPECT_EQ(r.status, 2);
    EXPECT_EQ(r.out, QByteArray("d\t0\tmod/\n-\t6\tmod/a.txt\n"));
    EXPECT_TRUE(r.err.endsWith("cut.tar: unexpected end of archive at offset 1300\n")) << r.err.constData();
}

TEST_F(InspectTool, EncodeMatchesIconvAfterTheMarkAndDecodeReadsItBack)
{
    if (!testutil::HaveProgram(u"iconv"_s))
        GTEST_SKIP() << "iconv not installed";
    struct Case
    {
        const char *format;
        const char *iconvName;
        QByteArray mark;
    };
    const QString text = u"\u4e2d\u6587 A"_s; // 中文 A
    WriteFile(Path(u"text.txt"_s), text.toUtf8());
    for (const Case &c :
         {Case{"S-JIS", "SHIFT_JIS", QByteArray("\xfd\xfe")}, Case{"GB2312", "GB2312", QByteArray("\xfc\xfe")},
          Case{"UTF-8", "UTF-8", QByteArray("\x02")}}) {
        QByteArray expected;
        ASSERT_EQ(testutil::RunProgram(
                      u"sh"_s,
                      {u"-c"_s, u"iconv -f UTF-8 -t %1 '%2'"_s.arg(QLatin1String(c.iconvName), Path(u"text.txt"_s))},
                      &expected),
                  0);
        const ToolResult encoded = RunTool({u"encode"_s, QLatin1String(c.format), text});
        ASSERT_EQ(encoded.status, 0) << c.format;
        const QByteArray bytes = QByteArray::fromHex(encoded.out.trimmed().replace(' ', ""));
        EXPECT_TRUE(bytes.startsWith(c.mark)) << c.format << " " << encoded.out.constData();
        EXPECT_EQ(bytes.mid(c.mark.size()), expected) << c.format;

        const ToolResult decoded = RunTool({u"decode"_s, QString::fromLatin1(encoded.out.trimmed())});
        ASSERT_EQ(decoded.status, 0) << c.format;
        EXPECT_EQ(QString::fromUtf8(decoded.out), QLatin1String(c.format) + u'\t' + text + u'\n');
    }
    EXPECT_EQ(RunTool({u"encode"_s, u"EBCDIC"_s, u"x"_s}).status, 2);
    EXPECT_EQ(RunTool({u"decode"_s, u"0g"_s}).status, 2);
}

TEST_F(InspectTool, TextAnEncodingCannotHoldIsNamedAndNothingIsStored)
{
    const struct
    {
        const char *format;
        QString text;
        QByteArray lost; // the lines on standard error, empty when every character is held
    } rows[] = {
        {"1", u"H\u00e9llo \u30c6"_s, "character 7 U+30C6 '\xe3\x83\x86'"},
        {"ISOLATIN1", u"H\u00e9llo"_s, {}},
        {"S-JIS", u"\u00e9\u30c6"_s, "character 1 U+00E9 '\xc3\xa9'"},
        {"UTF-8", u"\u30c6\U0001F600"_s, {}},
    };
    for (const auto &row : rows) {
        SCOPED_TRACE(row.format);
        const ToolResult r = RunTool({u"encode"_s, QLatin1String(row.format), row.text});
        EXPECT_EQ(r.status, row.lost.isEmpty() ? 0 : 1) << r.err.constData();
        EXPECT_EQ(r.out.isEmpty(), !row.lost.isEmpty());
        EXPECT_EQ(r.err.count('\n'), row.lost.isEmpty() ? 0 : 1);
        EXPECT_TRUE(r.err.contains(row.lost)) << r.err.constData();
    }

    WriteFile(Path(u"lossy.xml"_s),
              "<resources>\n<string id=\"1\" format=\"1\">\xe3\x83\x86\xe3\x82\xb9\xe3\x83\x88</string>\n</resources>");
    const ToolResult compiled = RunTool({u"res"_s, u"compile"_s, Path(u"lossy.xml"_s), Path(u"out.kar"_s)});
    EXPECT_EQ(compiled.status, 1);
    EXPECT_EQ(compiled.err.count('\n'), 3) << compiled.err.constData();
    EXPECT_TRUE(compiled.err.contains("line 2, string 1: character 3 U+30C8")) << compiled.err.constData();
    EXPECT_FALSE(QFile::exists(Path(u"out.kar"_s)));
}

} // namespace
