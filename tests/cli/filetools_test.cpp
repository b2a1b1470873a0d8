#include "cli_test.h"

#include "support/testutil.h"

#include <QDir>
#include <QFile>
#include <QTemporaryDir>

#include <gtest/gtest.h>

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
    WriteFile(Path(QStringLiteral("src.xml")),
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
    const ToolResult compiled = RunTool({QStringLiteral("res"), QStringLiteral("compile"),
                                         Path(QStringLiteral("src.xml")), Path(QStringLiteral("out.kar"))});
    ASSERT_EQ(compiled.status, 0) << compiled.err.constData();

    const ToolResult list = RunTool({QStringLiteral("res"), QStringLiteral("list"), Path(QStringLiteral("out.kar"))});
    ASSERT_EQ(list.status, 0) << list.err.constData();
    const QString out = QString::fromUtf8(list.out);
    EXPECT_TRUE(out.contains(QStringLiteral("UTF-8  \"Gr\u00fc\u00dfe\""))) << list.out.constData();
    EXPECT_TRUE(out.contains(QStringLiteral("\"\u4e2d\u6587\""))) << list.out.constData();
    EXPECT_TRUE(out.contains(QStringLiteral("text/plain, 3 bytes")));

    // The class ID list stops at its zero value.
    const ToolResult mif = RunTool({QStringLiteral("mif"), Path(QStringLiteral("out.kar"))});
    ASSERT_EQ(mif.status, 0) << mif.err.constData();
    EXPECT_TRUE(mif.out.contains("classes: 2\n  0x12345678\n  0xdeadbeef\napplets: 0")) << mif.out.constData();

    const ToolResult dump = RunTool({QStringLiteral("res"), QStringLiteral("dump"), Path(QStringLiteral("out.kar"))});
    EXPECT_EQ(dump.status, 0);
    EXPECT_TRUE(dump.out.startsWith("=== Header ===")) << dump.out.left(200).constData();
    EXPECT_TRUE(dump.out.contains("Number of Resources:  5 (0x5)\n")) << dump.out.left(400).constData();
}

TEST_F(InspectTool, BadSourcesAndForeignFilesAreUsageErrors)
{
    WriteFile(Path(QStringLiteral("bad.xml")), "<resources><string id=\"70000\">x</string></resources>");
    WriteFile(Path(QStringLiteral("src.xml")), "<resources><string id=\"1\">x</string></resources>");
    WriteFile(Path(QStringLiteral("junk.kar")), "not a resource file at all");
    const ToolResult bad = RunTool({QStringLiteral("res"), QStringLiteral("compile"), Path(QStringLiteral("bad.xml")),
                                    Path(QStringLiteral("o.kar"))});
    EXPECT_EQ(bad.status, 2);
    EXPECT_TRUE(bad.err.contains("bad id")) << bad.err.constData();
    EXPECT_FALSE(QFile::exists(Path(QStringLiteral("o.kar"))));
    // The second of two resources with one type and ID would silently replace the first.
    WriteFile(Path(QStringLiteral("twice.xml")),
              "<resources><string id=\"3\">a</string><object id=\"4\">b</object>\n"
              "<string id=\"3\">c</string></resources>");
    const ToolResult twice = RunTool({QStringLiteral("res"), QStringLiteral("compile"),
                                      Path(QStringLiteral("twice.xml")), Path(QStringLiteral("o.kar"))});
    EXPECT_EQ(twice.status, 2);
    EXPECT_TRUE(twice.err.contains("line 2: duplicate resource ID 3 of type 0x1")) << twice.err.constData();
    const ToolResult nowhere = RunTool({QStringLiteral("res"), QStringLiteral("compile"),
                                        Path(QStringLiteral("src.xml")), Path(QStringLiteral("missing/o.kar"))});
    EXPECT_EQ(nowhere.status, 2);
    EXPECT_FALSE(nowhere.err.contains("()")) << nowhere.err.constData();
    EXPECT_FALSE(QFile::exists(Path(QStringLiteral("o.kar"))));
    EXPECT_EQ(RunTool({QStringLiteral("res"), QStringLiteral("list"), Path(QStringLiteral("junk.kar"))}).status, 2);
    EXPECT_EQ(RunTool({QStringLiteral("mif"), Path(QStringLiteral("missing.mif"))}).status, 2);
    EXPECT_EQ(RunTool({QStringLiteral("res"), QStringLiteral("frobnicate"), Path(QStringLiteral("junk.kar"))}).status,
              2);
}

TEST_F(InspectTool, TarListAndCatReadAnArchiveMadeByGnuTar)
{
    if (!testutil::HaveProgram(QStringLiteral("tar")))
        GTEST_SKIP() << "tar not installed";
    WriteFile(Path(QStringLiteral("pkg/mod/a.txt")), "alpha\n");
    WriteFile(Path(QStringLiteral("pkg/mod/empty")), "");
    WriteFile(Path(QStringLiteral("pkg/mod/red\x1b[31m\n")), "x");
    ASSERT_TRUE(QFile::link(QStringLiteral("a.txt"), Path(QStringLiteral("pkg/mod/link"))));
    WriteFile(Path(QStringLiteral("pkg/late")), "late");
    const auto makeTar = [this](const QString &name, const QStringList &members) {
        return testutil::RunProgram(QStringLiteral("tar"),
                                    QStringList{QStringLiteral("--sort=name"), QStringLiteral("-cf"), Path(name),
                                                QStringLiteral("-C"), Path(QStringLiteral("pkg"))}
                                        + members);
    };
    ASSERT_EQ(makeTar(QStringLiteral("p.tar"), {QStringLiteral("mod")}), 0);
    ASSERT_EQ(makeTar(QStringLiteral("late.tar"), {QStringLiteral("late")}), 0);
    // Whatever follows the end-of-archive blocks is not listed, as with tar -t.
    const QByteArray archive = ReadFile(Path(QStringLiteral("p.tar")));
    WriteFile(Path(QStringLiteral("both.tar")), archive + ReadFile(Path(QStringLiteral("late.tar"))));
    const ToolResult list = RunTool({QStringLiteral("tar"), QStringLiteral("list"), Path(QStringLiteral("both.tar"))});
    ASSERT_EQ(list.status, 0) << list.err.constData();
    EXPECT_EQ(list.out,
              QByteArray("d\t0\tmod/\n"
                         "-\t6\tmod/a.txt\n"
                         "-\t0\tmod/empty\n"
                         "l\t0\tmod/link -> a.txt\n"
                         "-\t1\tmod/red\\033[31m\\n\n"));

    const auto cat = [this](const QString &file, const QString &member) {
        return RunTool({QStringLiteral("tar"), QStringLiteral("cat"), Path(file), member});
    };
    ToolResult r = cat(QStringLiteral("p.tar"), QStringLiteral("mod/a.txt"));
    EXPECT_EQ(r.status, 0);
    EXPECT_EQ(r.out, QByteArray("alpha\n"));
    // A name is found as the listing shows it too.
    EXPECT_EQ(cat(QStringLiteral("p.tar"), QStringLiteral("mod/red\\033[31m\\n")).out, QByteArray("x"));
    const struct
    {
        QString file;
        QString member;
        QByteArray message;
    } refusals[] = {
        {QStringLiteral("p.tar"), QStringLiteral("mod/none"), "no member mod/none"},
        {QStringLiteral("p.tar"), QStringLiteral("mod/"), "mod/ is a directory"},
        {QStringLiteral("p.tar"), QStringLiteral("mod/link"), "mod/link is a symbolic link to a.txt"},
        {QStringLiteral("cut.tar"), QStringLiteral("mod/a.txt"), "cut.tar: unexpected end of archive at offset 1300"},
        {QStringLiteral("pkg/mod/a.txt"), QStringLiteral("a"), "a.txt: does not look like a tar archive"},
    };
    WriteFile(Path(QStringLiteral("cut.tar")), archive.left(1300));
    for (const auto &refusal : refusals) {
        r = cat(refusal.file, refusal.member);
        EXPECT_EQ(r.status, 2) << refusal.message.constData();
        EXPECT_TRUE(r.out.isEmpty());
        EXPECT_TRUE(r.err.startsWith("harness tar: ")) << r.err.constData();
        EXPECT_TRUE(r.err.contains(refusal.message)) << r.err.constData();
    }
    // A damaged archive lists what comes before the damage, then says why.
    r = RunTool({QStringLiteral("tar"), QStringLiteral("list"), Path(QStringLiteral("cut.tar"))});
    EXPECT_EQ(r.status, 2);
    EXPECT_EQ(r.out, QByteArray("d\t0\tmod/\n-\t6\tmod/a.txt\n"));
    EXPECT_TRUE(r.err.endsWith("cut.tar: unexpected end of archive at offset 1300\n")) << r.err.constData();
}

TEST_F(InspectTool, EncodeMatchesIconvAfterTheMarkAndDecodeReadsItBack)
{
    if (!testutil::HaveProgram(QStringLiteral("iconv")))
        GTEST_SKIP() << "iconv not installed";
    struct Case
    {
        const char *format;
        const char *iconvName;
        QByteArray mark;
    };
    const QString text = QStringLiteral("\u4e2d\u6587 A"); // 中文 A
    WriteFile(Path(QStringLiteral("text.txt")), text.toUtf8());
    for (const Case &c :
         {Case{"S-JIS", "SHIFT_JIS", QByteArray("\xfd\xfe")}, Case{"GB2312", "GB2312", QByteArray("\xfc\xfe")},
          Case{"UTF-8", "UTF-8", QByteArray("\x02")}}) {
        QByteArray expected;
        ASSERT_EQ(testutil::RunProgram(QStringLiteral("sh"),
                                       {QStringLiteral("-c"),
                                        QStringLiteral("iconv -f UTF-8 -t %1 '%2'")
                                            .arg(QLatin1String(c.iconvName), Path(QStringLiteral("text.txt")))},
                                       &expected),
                  0);
        const ToolResult encoded = RunTool({QStringLiteral("encode"), QLatin1String(c.format), text});
        ASSERT_EQ(encoded.status, 0) << c.format;
        const QByteArray bytes = QByteArray::fromHex(encoded.out.trimmed().replace(' ', ""));
        EXPECT_TRUE(bytes.startsWith(c.mark)) << c.format << " " << encoded.out.constData();
        EXPECT_EQ(bytes.mid(c.mark.size()), expected) << c.format;

        const ToolResult decoded = RunTool({QStringLiteral("decode"), QString::fromLatin1(encoded.out.trimmed())});
        ASSERT_EQ(decoded.status, 0) << c.format;
        EXPECT_EQ(QString::fromUtf8(decoded.out),
                  QLatin1String(c.format) + QLatin1Char('\t') + text + QLatin1Char('\n'));
    }
    EXPECT_EQ(RunTool({QStringLiteral("encode"), QStringLiteral("EBCDIC"), QStringLiteral("x")}).status, 2);
    EXPECT_EQ(RunTool({QStringLiteral("decode"), QStringLiteral("0g")}).status, 2);
}

TEST_F(InspectTool, TextAnEncodingCannotHoldIsNamedAndNothingIsStored)
{
    const struct
    {
        const char *format;
        QString text;
        QByteArray lost; // the lines on standard error, empty when every character is held
    } rows[] = {
        {"1", QStringLiteral("H\u00e9llo \u30c6"), "character 7 U+30C6 '\xe3\x83\x86'"},
        {"ISOLATIN1", QStringLiteral("H\u00e9llo"), {}},
        {"S-JIS", QStringLiteral("\u00e9\u30c6"), "character 1 U+00E9 '\xc3\xa9'"},
        {"UTF-8", QStringLiteral("\u30c6\U0001F600"), {}},
    };
    for (const auto &row : rows) {
        SCOPED_TRACE(row.format);
        const ToolResult r = RunTool({QStringLiteral("encode"), QLatin1String(row.format), row.text});
        EXPECT_EQ(r.status, row.lost.isEmpty() ? 0 : 1) << r.err.constData();
        EXPECT_EQ(r.out.isEmpty(), !row.lost.isEmpty());
        EXPECT_EQ(r.err.count('\n'), row.lost.isEmpty() ? 0 : 1);
        EXPECT_TRUE(r.err.contains(row.lost)) << r.err.constData();
    }

    WriteFile(Path(QStringLiteral("lossy.xml")),
              "<resources>\n<string id=\"1\" format=\"1\">\xe3\x83\x86\xe3\x82\xb9\xe3\x83\x88</string>\n</resources>");
    const ToolResult compiled = RunTool({QStringLiteral("res"), QStringLiteral("compile"),
                                         Path(QStringLiteral("lossy.xml")), Path(QStringLiteral("out.kar"))});
    EXPECT_EQ(compiled.status, 1);
    EXPECT_EQ(compiled.err.count('\n'), 3) << compiled.err.constData();
    EXPECT_TRUE(compiled.err.contains("line 2, string 1: character 3 U+30C8")) << compiled.err.constData();
    EXPECT_FALSE(QFile::exists(Path(QStringLiteral("out.kar"))));
}

} // namespace
