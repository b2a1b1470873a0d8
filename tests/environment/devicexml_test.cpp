#include "environment/devicexml.h"

#include "support/testutil.h"

#include <QDir>
#include <QDomDocument>
#include <QFileInfo>
#include <QTemporaryDir>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

namespace {

class FlattenDeviceXmlTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(temp.isValid());
        pack = temp.path() + u"/pack"_s;
        elsewhere = temp.path() + u"/elsewhere"_s;
        output = temp.path() + u"/out/device.dso"_s;
        ASSERT_TRUE(QDir().mkpath(elsewhere));
        ASSERT_TRUE(QDir().mkpath(temp.path() + u"/out"_s));
        env.Set("HOME", temp.path() + u"/home"_s);
    }

    QString Write(const QString &name, const QByteArray &bytes)
    {
        const QString path = pack + u'/' + name;
        testutil::WriteFile(path, bytes);
        return path;
    }

    // Flattens from another current directory, so that includes can only be
    // found beside the device pack.
    QByteArray Flatten(const QString &source)
    {
        testutil::CurrentDirectory cd(elsewhere);
        EXPECT_TRUE(FlattenDeviceXml(source, output));
        return testutil::ReadFile(output);
    }

    // xmllint's verdict on the flattened file, when it is installed.
    void ExpectWellFormed()
    {
        if (!testutil::HaveProgram(u"xmllint"_s))
            return;
        QByteArray messages;
        EXPECT_EQ(testutil::RunProgram(u"xmllint"_s, {u"--noout"_s, output}, &messages), 0) << messages.toStdString();
    }

    QTemporaryDir temp;
    QString pack;
    QString elsewhere;
    QString output;
    testutil::EnvGuard env;
};

struct FlattenCase
{
    const char *what;
    std::vector<std::pair<QString, QByteArray>> includes; // written beside the pack first
    QByteArray source;
    QByteArray expected;
};

TEST_F(FlattenDeviceXmlTest, ExpandsIncludesAndMergesSections)
{
    const FlattenCase rows[] = {
        {"IncludesEntityFilesBesideThePackAndDropsTheDoctype",
         {{u"keys.xml"_s, "<?xml version=\"1.0\"?>\n<include>\n  <keys><key code=\"1\"/></keys>\n</include>\n"},
          {u"sub/extra.xml"_s, "<include><extra/><more n=\"2\"/></include>"}},
         "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!DOCTYPE devicepack [\n"
         "  <!ENTITY keys SYSTEM \"keys.xml\">\n  <!ENTITY extra SYSTEM \"sub/extra.xml\">\n"
         "  <!ENTITY name \"Phone &amp; Co\">\n]>\n"
         "<devicepack>\n  <display width=\"176\"/>\n  &keys;\n  <!-- &keys; in a comment stays -->\n"
         "  <misc label=\"&name;\">&extra;<![CDATA[&keys;]]></misc>\n</devicepack>\n",
         "<?xml version='1.0' encoding='UTF-8'?>\n<devicepack>\n <display width=\"176\"/>\n"
         " <keys>\n  <key code=\"1\"/>\n </keys>\n <!-- &keys; in a comment stays -->\n"
         " <misc label=\"Phone &amp; Co\">\n  <extra/>\n  <more n=\"2\"/><![CDATA[&keys;]]></misc>\n</devicepack>\n"},
        {"MergesSectionsOfTheSameNameInDocumentOrder",
         {{u"more.xml"_s, "<x><display><mode n=\"3\"/></display></x>"}},
         "<?xml version=\"1.0\"?>\n<!DOCTYPE pack [<!ENTITY more SYSTEM \"more.xml\">]>\n<pack>\n"
         "  <display a=\"first\"><mode n=\"1\"/>text</display>\n  <keys><k/></keys>\n"
         "  <display a=\"second\"><mode n=\"2\"/><!--c--></display>\n  &more;\n  <keys/>\n</pack>\n",
         "<?xml version='1.0'?>\n<pack>\n <display a=\"first\">\n  <mode n=\"1\"/>text<mode n=\"2\"/>\n"
         "  <!--c-->\n  <mode n=\"3\"/>\n </display>\n <keys>\n  <k/>\n </keys>\n</pack>\n"},
        // Without an XML declaration the doctype stays.
        {"PackWithoutXmlDeclarationKeepsItsDoctype",
         {{u"keys.xml"_s, "<i><keys/></i>"}},
         "<!DOCTYPE pack [<!ENTITY keys SYSTEM \"keys.xml\">]>\n<pack>&keys;</pack>\n",
         "<!DOCTYPE pack [\n<!ENTITY keys SYSTEM \"keys.xml\">\n]>\n<pack>\n <keys/>\n</pack>\n"},
        // "]>" further on belongs to the body, not to the declaration.
        {"DoctypeWithoutInternalSubsetStays",
         {},
         "<?xml version=\"1.0\"?>\n<!DOCTYPE pack SYSTEM \"pack.dtd\">\n<pack><!-- ]> --><a/></pack>\n",
         "<?xml version='1.0'?>\n<!DOCTYPE pack SYSTEM \"pack.dtd\">\n<pack>\n <!-- ]> -->\n <a/>\n</pack>\n"},
        // The declarations stay with the references, so the file stays well-formed.
        {"MissingOrMalformedIncludesKeepTheirReferences",
         {{u"broken.xml"_s, "<i><unclosed></i>"}, {u"good.xml"_s, "<i><good/></i>"}},
         "<?xml version=\"1.0\"?>\n<!DOCTYPE pack [\n<!ENTITY gone SYSTEM \"gone.xml\">\n"
         "<!ENTITY broken SYSTEM \"broken.xml\">\n<!ENTITY good SYSTEM \"good.xml\">\n]>\n"
         "<pack><a>&gone;</a><b>x&broken;y</b>&good;</pack>\n",
         "<?xml version='1.0'?>\n<!DOCTYPE pack [\n<!ENTITY broken SYSTEM \"broken.xml\">\n"
         "<!ENTITY gone SYSTEM \"gone.xml\">\n<!ENTITY good SYSTEM \"good.xml\">\n]>\n"
         "<pack>\n <a>&gone;</a>\n <b>x&broken;y</b>\n <good/>\n</pack>\n"},
    };
    for (const FlattenCase &row : rows) {
        SCOPED_TRACE(row.what);
        for (const auto &[name, bytes] : row.includes)
            Write(name, bytes);
        EXPECT_EQ(Flatten(Write(u"device.xml"_s, row.source)), row.expected);
        ExpectWellFormed();
    }
}

TEST_F(FlattenDeviceXmlTest, TextOutsideAsciiSurvivesAsCharacterReferences)
{
    Write(u"names.xml"_s, "<i><name>\xe6\x97\xa5\xe6\x9c\xac</name></i>");
    const QByteArray flattened = Flatten(
        Write(u"device.xml"_s,
              "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<!DOCTYPE pack [<!ENTITY names SYSTEM \"names.xml\">]>\n"
              "<pack title=\"Caf\xc3\xa9\">&names;<c><![CDATA[\xc3\xa9<\xf0\x9f\x98\x80>]]></c></pack>\n"));
    for (const char byte : flattened)
        ASSERT_LT(static_cast<unsigned char>(byte), 0x80u) << "not ASCII";
    EXPECT_TRUE(flattened.contains("Caf&#xe9;"));
    ExpectWellFormed();

    QDomDocument document;
    ASSERT_TRUE(document.setContent(flattened));
    const QDomElement root = document.documentElement();
    EXPECT_EQ(root.attribute(u"title"_s), u"Caf\u00e9"_s);
    EXPECT_EQ(root.firstChildElement(u"name"_s).text(), u"\u65e5\u672c"_s);
    EXPECT_EQ(root.firstChildElement(u"c"_s).text(), QString::fromUtf8("\xc3\xa9<\xf0\x9f\x98\x80>"));
}

TEST_F(FlattenDeviceXmlTest, PacksInOtherEncodingsAreExpandedToo)
{
    if (!testutil::HaveProgram(u"iconv"_s))
        GTEST_SKIP() << "iconv is not installed";
    Write(u"keys.xml"_s, "<i><keys/></i>");
    const QByteArray utf8 = "<?xml version=\"1.0\" encoding=\"%1\"?>\n"
                            "<!DOCTYPE pack [<!ENTITY keys SYSTEM \"keys.xml\">]>\n"
                            "<pack name=\"T\xc3\xa9l\xc3\xa9phone\">&keys;</pack>\n";
    for (const char *encoding : {"ISO-8859-1", "UTF-16"}) {
        SCOPED_TRACE(encoding);
        const QString plain = Write(u"plain.xml"_s, QByteArray(utf8).replace("%1", encoding));
        QByteArray converted;
        ASSERT_EQ(testutil::RunProgram(u"iconv"_s, {u"-f"_s, u"UTF-8"_s, u"-t"_s, QString::fromLatin1(encoding), plain},
                                       &converted),
                  0);
        const QByteArray flattened = Flatten(Write(u"device.xml"_s, converted));
        EXPECT_TRUE(flattened.contains("<pack name=\"T&#xe9;l&#xe9;phone\">\n <keys/>\n</pack>"))
            << flattened.toStdString();
    }
}

TEST_F(FlattenDeviceXmlTest, FailsWithoutWritingOnBadSourceOrDestinationAndReadsRelativeSources)
{
    const QString good = Write(u"good.xml"_s, "<pack/>");
    const QString bad = Write(u"bad.xml"_s, "<pack><open></pack>");
    EXPECT_FALSE(FlattenDeviceXml(pack + u"/missing.xml"_s, output));
    EXPECT_FALSE(FlattenDeviceXml(u"missing-relative.xml"_s, output));
    EXPECT_FALSE(FlattenDeviceXml(bad, output));
    EXPECT_FALSE(FlattenDeviceXml(pack, output));
    EXPECT_FALSE(QFileInfo::exists(output));
    EXPECT_FALSE(FlattenDeviceXml(good, temp.path() + u"/no/such/folder/x.dso"_s));

    // A device or a pipe named by an entity is never read.
    Write(u"dev.xml"_s, "<!DOCTYPE p [<!ENTITY z SYSTEM \"/dev/zero\">]><p>&z;</p>");
    EXPECT_TRUE(FlattenDeviceXml(pack + u"/dev.xml"_s, output));
    EXPECT_TRUE(testutil::ReadFile(output).contains("<p>&z;</p>"));

    // A relative source is found from the current directory.
    Write(u"keys.xml"_s, "<i><keys/></i>");
    Write(u"device.xml"_s, "<!DOCTYPE p [<!ENTITY k SYSTEM \"keys.xml\">]><p>&k;</p>");
    testutil::CurrentDirectory cd(temp.path());
    ASSERT_TRUE(FlattenDeviceXml(u"pack/device.xml"_s, output));
    EXPECT_TRUE(testutil::ReadFile(output).contains("<p>\n <keys/>\n</p>"));
}

} // namespace
