#include "cli_test.h"

#include "support/testutil.h"

#include <QFile>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

using testutil::ReadFile;
using testutil::WriteFile;

// Each test works in a folder of its own, the current one while it runs.
class InspectTool : public ::testing::Test
{
protected:
    QTemporaryDir dir;
    testutil::CurrentDirectory current{dir.path()};
};

TEST_F(InspectTool, CompiledSourceListsDecodedStringsObjectsAndClassIds)
{
    const QString source = u"<resources>\n"
                           " <string id=\"1\" format=\"UTF-8\">Gr\u00fc\u00dfe</string>\n"
                           " <string id=\"7\" format=\"GB2312\">\u4e2d\u6587</string>\n"
                           " <object id=\"65535\" mime=\"text/plain\">abc</object>\n"
                           " <binary type=\"0x5000\" id=\"0\" hex=\"%1\"/>\n"
                           " <binary type=\"0x5000\" id=\"1\" hex=\"78563412 efbeadde 00000000 11111111\"/>\n"
                           "</resources>\n"_s;
    WriteFile(u"src.xml"_s, source.arg(QString(80, u'0')).toUtf8());
    const ToolResult compiled = Tool("res compile src.xml out.kar");
    ASSERT_EQ(compiled.status, 0) << compiled.err.constData();
    ExpectContains(OutputOf(Tool("res list out.kar")),
                   {u"UTF-8  \"Gr\u00fc\u00dfe\""_s.toUtf8(), u"\"\u4e2d\u6587\""_s.toUtf8(), "text/plain, 3 bytes"});
    // The class ID list stops at its zero value.
    ExpectContains(OutputOf(Tool("mif out.kar")), {"classes: 2\n  0x12345678\n  0xdeadbeef\napplets: 0"});
    const QByteArray dump = OutputOf(Tool("res dump out.kar"));
    EXPECT_TRUE(dump.startsWith("=== Header ===")) << dump.left(200).constData();
    ExpectContains(dump, {"Number of Resources:  5 (0x5)\n"});
}

TEST_F(InspectTool, BadSourcesAndForeignFilesAreUsageErrors)
{
    WriteFile(u"bad.xml"_s, "<resources><string id=\"70000\">x</string></resources>");
    WriteFile(u"src.xml"_s, "<resources><string id=\"1\">x</string></resources>");
    WriteFile(u"junk.kar"_s, "not a resource file at all");
    // The second of two resources with one type and ID would silently replace the first.
    WriteFile(u"twice.xml"_s,
              "<resources><string id=\"3\">a</string><object id=\"4\">b</object>\n"
              "<string id=\"3\">c</string></resources>");
    const std::pair<const char *, const char *> rows[]
        = {{"res compile bad.xml o.kar", "bad id"},
           {"res compile twice.xml o.kar", "line 2: duplicate resource ID 3 of type 0x1"},
           {"res compile src.xml missing/o.kar", "missing/o.kar"},
           {"res list junk.kar", "junk.kar"},
           {"mif missing.mif", "missing.mif"},
           {"res frobnicate junk.kar", "expected 'dump FILE'"}};
    for (const auto &[arguments, message] : rows) {
        const ToolResult r = Tool(arguments);
        ExpectRefused(r, message);
        ExpectLacks(r.err, {"()"});
    }
    EXPECT_FALSE(QFile::exists(u"o.kar"_s));
}

TEST_F(InspectTool, TarListAndCatReadAnArchiveMadeByGnuTar)
{
    if (!testutil::HaveProgram(u"tar"_s))
        GTEST_SKIP() << "tar not installed";
    WriteFile(u"pkg/mod/a.txt"_s, "alpha\n");
    WriteFile(u"pkg/mod/empty"_s, "");
    WriteFile(u"pkg/mod/red\x1b[31m\t\n"_s, "x");
    ASSERT_TRUE(QFile::link(u"a.txt"_s, u"pkg/mod/link"_s));
    WriteFile(u"pkg/late"_s, "late");
    ASSERT_EQ(testutil::RunProgram(u"tar"_s, Args("--sort=name -cf p.tar -C pkg mod")), 0);
    ASSERT_EQ(testutil::RunProgram(u"tar"_s, Args("-cf late.tar -C pkg late")), 0);
    // Whatever follows the end-of-archive blocks is not listed, as with tar -t.
    const QByteArray archive = ReadFile(u"p.tar"_s);
    WriteFile(u"both.tar"_s, archive + ReadFile(u"late.tar"_s));
    EXPECT_EQ(OutputOf(Tool("tar list both.tar")),
              QByteArray("d\t0\tmod/\n"
                         "-\t6\tmod/a.txt\n"
                         "-\t0\tmod/empty\n"
                         "l\t0\tmod/link -> a.txt\n"
                         "-\t1\tmod/red\\033[31m\\t\\n\n"));
    EXPECT_EQ(OutputOf(Tool("tar cat p.tar mod/a.txt")), QByteArray("alpha\n"));
    // A name is found as the listing shows it too.
    EXPECT_EQ(Tool("tar cat p.tar", u"mod/red\\033[31m\\t\\n"_s).out, QByteArray("x"));
    WriteFile(u"cut.tar"_s, archive.left(1300));
    const std::pair<const char *, const char *> refusals[]
        = {{"p.tar mod/none", "no member mod/none"},
           {"p.tar mod/", "mod/ is a directory"},
           {"p.tar mod/link", "mod/link is a symbolic link to a.txt"},
           {"cut.tar mod/a.txt", "cut.tar: unexpected end of archive at offset 1300"},
           {"pkg/mod/a.txt a", "a.txt: does not look like a tar archive"}};
    for (const auto &[arguments, message] : refusals) {
        const ToolResult r = Tool("tar cat", arguments);
        ExpectRefused(r, message);
        EXPECT_TRUE(r.err.startsWith("harness tar: ")) << r.err.constData();
    }
    // A damaged archive lists what comes before the damage, then says why.
    const ToolResult r = Tool("tar list cut.tar");
    EXPECT_EQ(r.status, 2);
    EXPECT_EQ(r.out, QByteArray("d\t0\tmod/\n-\t6\tmod/a.txt\n"));
    EXPECT_TRUE(r.err.endsWith("cut.tar: unexpected end of archive at offset 1300\n")) << r.err.constData();
}

TEST_F(InspectTool, EncodeMatchesIconvAfterTheMarkAndDecodeReadsItBack)
{
    if (!testutil::HaveProgram(u"iconv"_s))
        GTEST_SKIP() << "iconv not installed";
    const QString text = u"\u4e2d\u6587 A"_s; // 中文 A
    WriteFile(u"text.txt"_s, text.toUtf8());
    // Format, iconv's name for it, mark.
    const std::tuple<const char *, const char *, QByteArray> rows[]
        = {{"S-JIS", "SHIFT_JIS", "\xfd\xfe"}, {"GB2312", "GB2312", "\xfc\xfe"}, {"UTF-8", "UTF-8", "\x02"}};
    for (const auto &[format, iconvName, mark] : rows) {
        SCOPED_TRACE(format);
        QByteArray expected;
        ASSERT_EQ(testutil::RunProgram(u"iconv"_s, Args("-f UTF-8 -t", iconvName, "text.txt"), &expected), 0);
        const ToolResult encoded = Tool("encode", format, text);
        ASSERT_EQ(encoded.status, 0);
        const QByteArray bytes = QByteArray::fromHex(encoded.out.trimmed().replace(' ', ""));
        EXPECT_EQ(bytes, mark + expected) << encoded.out.constData();
        EXPECT_EQ(QString::fromUtf8(OutputOf(Tool("decode", QString::fromLatin1(encoded.out.trimmed())))),
                  QString::fromLatin1(format) + u'\t' + text + u'\n');
    }
    EXPECT_EQ(Tool("encode EBCDIC x").status, 2);
    EXPECT_EQ(Tool("decode 0g").status, 2);
}

TEST_F(InspectTool, TextAnEncodingCannotHoldIsNamedAndNothingIsStored)
{
    // Format, text, and the line on standard error (empty when every character is held).
    const std::tuple<const char *, QString, QByteArray> rows[]
        = {{"1", u"H\u00e9llo \u30c6"_s, "character 7 U+30C6 '\xe3\x83\x86'"},
           {"ISOLATIN1", u"H\u00e9llo"_s, {}},
           {"S-JIS", u"\u00e9\u30c6"_s, "character 1 U+00E9 '\xc3\xa9'"},
           {"UTF-8", u"\u30c6\U0001F600"_s, {}}};
    for (const auto &[format, text, lost] : rows) {
        SCOPED_TRACE(format);
        const ToolResult r = Tool("encode", format, text);
        EXPECT_EQ(r.status, lost.isEmpty() ? 0 : 1) << r.err.constData();
        EXPECT_EQ(r.out.isEmpty(), !lost.isEmpty());
        EXPECT_EQ(r.err.count('\n'), lost.isEmpty() ? 0 : 1);
        EXPECT_TRUE(r.err.contains(lost)) << r.err.constData();
    }

    WriteFile(u"lossy.xml"_s,
              "<resources>\n<string id=\"1\" format=\"1\">\xe3\x83\x86\xe3\x82\xb9\xe3\x83\x88</string>\n</resources>");
    const ToolResult compiled = Tool("res compile lossy.xml out.kar");
    EXPECT_EQ(compiled.status, 1);
    EXPECT_EQ(compiled.err.count('\n'), 3) << compiled.err.constData();
    ExpectContains(compiled.err, {"line 2, string 1: character 3 U+30C8"});
    EXPECT_FALSE(QFile::exists(u"out.kar"_s));
}

} // namespace
