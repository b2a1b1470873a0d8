#include "environment/devicexml.h"

#include "currentdirectory.h"

#include "support/testutil.h"

#include <QDir>
#include <QDomDocument>
#include <QFileInfo>
#include <QTemporaryDir>

#include <gtest/gtest.h>

namespace {

class FlattenDeviceXmlTest : public ::testing::Test
{
protected:
    void SetUp() override
    {
        ASSERT_TRUE(temp.isValid());
        pack = temp.path() + QStringLiteral("/pack");
        elsewhere = temp.path() + QStringLiteral("/elsewhere");
        output = temp.path() + QStringLiteral("/out/device.dso");
        ASSERT_TRUE(QDir().mkpath(elsewhere));
        ASSERT_TRUE(QDir().mkpath(temp.path() + QStringLiteral("/out")));
        env.Set("HOME", temp.path() + QStringLiteral("/home"));
    }

    QString Write(const QString &name, const QByteArray &bytes)
    {
        const QString path = pack + QLatin1Char('/') + name;
        testutil::WriteFile(path, bytes);
        return path;
    }

    // Flattens from another current directory, so that includes can only be
    // found beside the device pack.
    QByteArray Flatten(const QString &source)
    {
        CurrentDirectory cd(elsewhere);
        EXPECT_TRUE(FlattenDeviceXml(source, output));
        return testutil::ReadFile(output);
    }

    // xmllint's verdict on the flattened file, when it is installed.
    void ExpectWellFormed()
    {
        if (!testutil::HaveProgram(QStringLiteral("xmllint")))
            return;
        QByteArray messages;
        EXPECT_EQ(testutil::RunProgram(QStringLiteral("xmllint"), {QStringLiteral("--noout"), output},
                                       &messages),
                  0)
            << messages.toStdString();
    }

    QTemporaryDir temp;
    QString pack;
    QString elsewhere;
    QString output;
    testutil::EnvGuard env;
};

TEST_F(FlattenDeviceXmlTest, IncludesEntityFilesBesideThePackAndDropsTheDoctype)
{
    Write(QStringLiteral("keys.xml"),
          "<?xml version=\"1.0\"?>\n<include>\n  <keys><key code=\"1\"/></keys>\n</include>\n");
    Write(QStringLiteral("sub/extra.xml"), "<include><extra/><more n=\"2\"/></include>");
    const QString device = Write(QStringLiteral("device.xml"),
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
        "<!DOCTYPE devicepack [\n"
        "  <!ENTITY keys SYSTEM \"keys.xml\">\n"
        "  <!ENTITY extra SYSTEM \"sub/extra.xml\">\n"
        "  <!ENTITY name \"Phone &amp; Co\">\n"
        "]>\n"
        "<devicepack>\n"
        "  <display width=\"176\"/>\n"
        "  &keys;\n"
        "  <!-- &keys; in a comment stays -->\n"
        "  <misc label=\"&name;\">&extra;<![CDATA[&keys;]]></misc>\n"
        "</devicepack>\n");

    EXPECT_EQ(Flatten(device),
              QByteArray("<?xml version='1.0' encoding='UTF-8'?>\n"
                         "<devicepack>\n"
                         " <display width=\"176\"/>\n"
                         " <keys>\n"
                         "  <key code=\"1\"/>\n"
                         " </keys>\n"
                         " <!-- &keys; in a comment stays -->\n"
                         " <misc label=\"Phone &amp; Co\">\n"
                         "  <extra/>\n"
                         "  <more n=\"2\"/><![CDATA[&keys;]]></misc>\n"
                         "</devicepack>\n"));
    ExpectWellFormed();
}

TEST_F(FlattenDeviceXmlTest, MergesSectionsOfTheSameNameInDocumentOrder)
{
    Write(QStringLiteral("more.xml"), "<x><display><mode n=\"3\"/></display></x>");
    const QString device = Write(QStringLiteral("device.xml"),
        "<?xml version=\"1.0\"?>\n"
        "<!DOCTYPE pack [<!ENTITY more SYSTEM \"more.xml\">]>\n"
        "<pack>\n"
        "  <display a=\"first\"><mode n=\"1\"/>text</display>\n"
        "  <keys><k/></keys>\n"
        "  <display a=\"second\"><mode n=\"2\"/><!--c--></display>\n"
        "  &more;\n"
        "  <keys/>\n"
        "</pack>\n");

    EXPECT_EQ(Flatten(device),
              QByteArray("<?xml version='1.0'?>\n"
                         "<pack>\n"
                         " <display a=\"first\">\n"
                         "  <mode n=\"1\"/>text<mode n=\"2\"/>\n"
                         "  <!--c-->\n"
                         "  <mode n=\"3\"/>\n"
                         " </display>\n"
                         " <keys>\n"
                         "  <k/>\n"
                         " </keys>\n"
                         "</pack>\n"));
    ExpectWellFormed();
}

TEST_F(FlattenDeviceXmlTest, PackWithoutXmlDeclarationKeepsItsDoctype)
{
    Write(QStringLiteral("keys.xml"), "<i><keys/></i>");
    const QString device = Write(QStringLiteral("device.xml"),
        "<!DOCTYPE pack [<!ENTITY keys SYSTEM \"keys.xml\">]>\n<pack>&keys;</pack>\n");

    EXPECT_EQ(Flatten(device), QByteArray("<!DOCTYPE pack [\n"
                                          "<!ENTITY keys SYSTEM \"keys.xml\">\n"
                                          "]>\n"
                                          "<pack>\n"
                                          " <keys/>\n"
                                          "</pack>\n"));
}

TEST_F(FlattenDeviceXmlTest, DoctypeWithoutInternalSubsetStays)
{
    // "]>" further on belongs to the body, not to the declaration.
    const QString device = Write(QStringLiteral("device.xml"),
        "<?xml version=\"1.0\"?>\n<!DOCTYPE pack SYSTEM \"pack.dtd\">\n<pack><!-- ]> --><a/></pack>\n");
    EXPECT_EQ(Flatten(device), QByteArray("<?xml version='1.0'?>\n"
                                          "<!DOCTYPE pack SYSTEM \"pack.dtd\">\n"
                                          "<pack>\n"
                                          " <!-- ]> -->\n"
                                          " <a/>\n"
                                          "</pack>\n"));
}

TEST_F(FlattenDeviceXmlTest, MissingOrMalformedIncludesKeepTheirReferences)
{
    Write(QStringLiteral("broken.xml"), "<i><unclosed></i>");
    Write(QStringLiteral("good.xml"), "<i><good/></i>");
    const QString device = Write(QStringLiteral("device.xml"),
        "<?xml version=\"1.0\"?>\n"
        "<!DOCTYPE pack [\n"
        "<!ENTITY gone SYSTEM \"gone.xml\">\n"
        "<!ENTITY broken SYSTEM \"broken.xml\">\n"
        "<!ENTITY good SYSTEM \"good.xml\">\n"
        "]>\n"
        "<pack><a>&gone;</a><b>x&broken;y</b>&good;</pack>\n");

    // The declarations stay with the references, so the file stays well-formed.
    EXPECT_EQ(Flatten(device), QByteArray("<?xml version='1.0'?>\n"
                                          "<!DOCTYPE pack [\n"
                                          "<!ENTITY broken SYSTEM \"broken.xml\">\n"
                                          "<!ENTITY gone SYSTEM \"gone.xml\">\n"
                                          "<!ENTITY good SYSTEM \"good.xml\">\n"
                                          "]>\n"
                                          "<pack>\n"
                                          " <a>&gone;</a>\n"
                                          " <b>x&broken;y</b>\n"
                                          " <good/>\n"
                                          "</pack>\n"));
    ExpectWellFormed();
}

TEST_F(FlattenDeviceXmlTest, TextOutsideAsciiSurvivesAsCharacterReferences)
{
    Write(QStringLiteral("names.xml"), "<i><name>\xe6\x97\xa5\xe6\x9c\xac</name></i>");
    const QString device = Write(QStringLiteral("device.xml"),
        "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
        "<!DOCTYPE pack [<!ENTITY names SYSTEM \"names.xml\">]>\n"
        "<pack title=\"Caf\xc3\xa9\">&names;<c><![CDATA[\xc3\xa9<\xf0\x9f\x98\x80>]]></c></pack>\n");

    const QByteArray flattened = Flatten(device);
    for (const char byte : flattened)
        ASSERT_GE(static_cast<unsigned char>(byte), 0) << "not ASCII";
    EXPECT_TRUE(flattened.contains("Caf&#xe9;"));
    ExpectWellFormed();

    QDomDocument document;
    ASSERT_TRUE(document.setContent(flattened));
    const QDomElement root = document.documentElement();
    EXPECT_EQ(root.attribute(QStringLiteral("title")), QStringLiteral("Caf\u00e9"));
    EXPECT_EQ(root.firstChildElement(QStringLiteral("name")).text(), QStringLiteral("\u65e5\u672c"));
    EXPECT_EQ(root.firstChildElement(QStringLiteral("c")).text(),
              QString::fromUtf8("\xc3\xa9<\xf0\x9f\x98\x80>"));
}

TEST_F(FlattenDeviceXmlTest, PacksInOtherEncodingsAreExpandedToo)
{
    if (!testutil::HaveProgram(QStringLiteral("iconv")))
        GTEST_SKIP() << "iconv is not installed";
    Write(QStringLiteral("keys.xml"), "<i><keys/></i>");
    const QByteArray utf8 = "<?xml version=\"1.0\" encoding=\"%1\"?>\n"
                            "<!DOCTYPE pack [<!ENTITY keys SYSTEM \"keys.xml\">]>\n"
                            "<pack name=\"T\xc3\xa9l\xc3\xa9phone\">&keys;</pack>\n";
    for (const char *encoding : {"ISO-8859-1", "UTF-16"}) {
        SCOPED_TRACE(encoding);
        const QString plain = Write(QStringLiteral("plain.xml"), QByteArray(utf8).replace("%1", encoding));
        QByteArray converted;
        ASSERT_EQ(testutil::RunProgram(QStringLiteral("iconv"),
                                       {QStringLiteral("-f"), QStringLiteral("UTF-8"), QStringLiteral("-t"),
                                        QString::fromLatin1(encoding), plain},
                                       &converted),
                  0);
        const QString device = Write(QStringLiteral("device.xml"), converted);
        const QByteArray flattened = Flatten(device);
        EXPECT_TRUE(flattened.contains("<pack name=\"T&#xe9;l&#xe9;phone\">\n <keys/>\n</pack>"))
            << flattened.toStdString();
    }
}

TEST_F(FlattenDeviceXmlTest, RelativeSourceIsFoundFromTheCurrentDirectory)
{
    Write(QStringLiteral("keys.xml"), "<i><keys/></i>");
    Write(QStringLiteral("device.xml"), "<!DOCTYPE p [<!ENTITY k SYSTEM \"keys.xml\">]><p>&k;</p>");
    CurrentDirectory cd(temp.path());
    ASSERT_TRUE(FlattenDeviceXml(QStringLiteral("pack/device.xml"), output));
    EXPECT_TRUE(testutil::ReadFile(output).contains("<p>\n <keys/>\n</p>"));
}

TEST_F(FlattenDeviceXmlTest, FailsWithoutWritingOnBadSourceOrDestination)
{
    const QString good = Write(QStringLiteral("good.xml"), "<pack/>");
    const QString bad = Write(QStringLiteral("bad.xml"), "<pack><open></pack>");
    EXPECT_FALSE(FlattenDeviceXml(pack + QStringLiteral("/missing.xml"), output));
    EXPECT_FALSE(FlattenDeviceXml(QStringLiteral("missing-relative.xml"), output));
    EXPECT_FALSE(FlattenDeviceXml(bad, output));
    EXPECT_FALSE(FlattenDeviceXml(pack, output));
    EXPECT_FALSE(QFileInfo::exists(output));
    EXPECT_FALSE(FlattenDeviceXml(good, temp.path() + QStringLiteral("/no/such/folder/x.dso")));

    // A device or a pipe named by an entity is never read.
    Write(QStringLiteral("dev.xml"), "<!DOCTYPE p [<!ENTITY z SYSTEM \"/dev/zero\">]><p>&z;</p>");
    EXPECT_TRUE(FlattenDeviceXml(pack + QStringLiteral("/dev.xml"), output));
    EXPECT_TRUE(testutil::ReadFile(output).contains("<p>&z;</p>"));
}

} // namespace
