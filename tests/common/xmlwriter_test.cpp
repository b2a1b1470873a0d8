#include "common/filewriter.h"
#include "common/xmlnode.h"
#include "common/xmlwriter.h"

#include "support/testutil.h"

#include <QBuffer>
#include <QFile>
#include <QTemporaryDir>

#include <gtest/gtest.h>

#include <unistd.h>

using namespace Qt::StringLiterals;

namespace {

QDomDocument Parse(const QString &text)
{
    QDomDocument doc;
    EXPECT_TRUE(doc.setContent(text));
    return doc;
}

// Documents as read and as written: attributes ordered by name (Qt's own serialiser orders them by a per-process seed),
// one blank per level, and only the nodes the document holds (a declaration, no document type).
TEST(XmlWriter, WritesParsedDocumentsInOneOrderAndIndentation)
{
    // As read, as written.
    const std::pair<QString, QString> rows[]
        = {{u"<manifest><module zeta='ZETA' name='NAME' alpha='ALPHA' type='TYPE' id='ID' b='B'>"
            "<testcase>Run &amp; &lt;check></testcase></module></manifest>"_s,
            u"<manifest>\n"
            " <module alpha=\"ALPHA\" b=\"B\" id=\"ID\" name=\"NAME\" type=\"TYPE\" zeta=\"ZETA\">\n"
            "  <testcase>Run &amp; &lt;check&gt;</testcase>\n"
            " </module>\n"
            "</manifest>\n"_s},
           {u"<a q=\"1\" w=\"2\" e=\"3\" r=\"4\" t=\"5\" y=\"6\" u=\"7\" i=\"8\"><b x=\"1\" y=\"2\"/></a>"_s,
            u"<a e=\"3\" i=\"8\" q=\"1\" r=\"4\" t=\"5\" u=\"7\" w=\"2\" y=\"6\">\n <b x=\"1\" y=\"2\"/>\n</a>\n"_s},
           {u"<r/>"_s, u"<r/>\n"_s},
           {u"<?xml version=\"1.0\" encoding=\"UTF-8\"?><r><!--c--><?pi x?></r>"_s,
            u"<?xml version='1.0' encoding='UTF-8'?>\n<r>\n <!--c-->\n <?pi x?>\n</r>\n"_s},
           {u"<?xml version=\"1.0\"?><a/>"_s, u"<?xml version='1.0'?>\n<a/>\n"_s},
           {u"<!DOCTYPE a SYSTEM \"a.dtd\"><a/>"_s, u"<a/>\n"_s}};
    for (const auto &[read, written] : rows) {
        const QDomDocument doc = Parse(read);
        EXPECT_EQ(XmlWriter::ToString(doc), written);
        EXPECT_EQ(XmlWriter::Serialize(doc), written.toUtf8());
    }
}

TEST(XmlWriter, EscapesAttributesAndReplacesCharactersXmlCannotCarry)
{
    QDomDocument doc;
    QDomElement root = doc.appendChild(doc.createElement(u"r"_s)).toElement();
    root.setAttribute(u"v"_s, u"a\"b\nc<d>&"_s);
    root.appendChild(doc.createTextNode(QString(QChar(0x01)) + u"x"_s + QChar(0xD800)));
    const QString text = XmlWriter::ToString(doc);
    EXPECT_EQ(text, u"<r v=\"a&quot;b&#xa;c&lt;d&gt;&amp;\">"_s + QChar(0xFFFD) + u"x"_s + QChar(0xFFFD) + u"</r>\n"_s);
    QDomDocument back;
    ASSERT_TRUE(back.setContent(text));
    EXPECT_EQ(back.documentElement().attribute(u"v"_s), u"a\"b\nc<d>&"_s);
}

TEST(FileWriter, AtomicWriteReplacesWholeFileOrLeavesItUntouched)
{
    QTemporaryDir dir;
    const QString path = dir.filePath(u"out.xml"_s);
    // A written document is well-formed for xmllint too.
    QDomDocument doc = Parse(u"<r a='&lt;'><s>t</s></r>"_s);
    doc.documentElement().appendChild(doc.createCDATASection(u"x]]>y"_s));
    ASSERT_TRUE(XmlWriter::WriteDocument(doc, path));
    testutil::ExpectXmllintAccepts(path);
    ASSERT_TRUE(FileWriter::Write(path, "second"));
    EXPECT_EQ(testutil::ReadFile(path), QByteArray("second"));

    QString error;
    EXPECT_FALSE(FileWriter::Write(dir.filePath(u"missing/out.xml"_s), "x", true, &error));
    EXPECT_FALSE(error.isEmpty());

    if (::geteuid() != 0) {
        QFile::setPermissions(dir.path(), QFileDevice::ReadOwner | QFileDevice::ExeOwner);
        EXPECT_FALSE(FileWriter::Write(path, "third"));
        QFile::setPermissions(dir.path(), QFileDevice::ReadOwner | QFileDevice::WriteOwner | QFileDevice::ExeOwner);
        EXPECT_EQ(testutil::ReadFile(path), QByteArray("second"));
    }
}

TEST(XmlWriterDeclarations, EntityReferencesRunInline)
{
    QDomDocument doc;
    QDomElement root = doc.appendChild(doc.createElement(u"a"_s)).toElement();
    root.appendChild(doc.createTextNode(u"x"_s));
    root.appendChild(doc.createEntityReference(u"ref"_s));
    root.appendChild(doc.createElement(u"b"_s)).appendChild(doc.createEntityReference(u"only"_s));
    EXPECT_EQ(XmlWriter::ToString(doc), u"<a>x&ref;<b>&only;</b>\n</a>\n"_s);
}

TEST(XmlWriterDeclarations, AsciiStringEscapesEverythingBeyondAscii)
{
    QDomDocument doc;
    QDomElement root = doc.appendChild(doc.createElement(u"r"_s)).toElement();
    root.setAttribute(u"v"_s, u"\u00e9\"\U0001F600"_s);
    root.appendChild(doc.createTextNode(u"caf\u00e9 & \u65e5"_s));
    root.appendChild(doc.createCDATASection(u"a\u00e9]]>b"_s));
    root.appendChild(doc.createCDATASection(QString()));

    const QString ascii = XmlWriter::ToAsciiString(doc);
    EXPECT_EQ(ascii,
              u"<r v=\"&#xe9;&quot;&#x1f600;\">caf&#xe9; &amp; &#x65e5;"
              "<![CDATA[a]]>&#xe9;<![CDATA[]]]]><![CDATA[>b]]><![CDATA[]]></r>\n"_s);
    // Read back, it holds the same text.
    const QDomDocument back = Parse(ascii);
    EXPECT_EQ(back.documentElement().attribute(u"v"_s), u"\u00e9\"\U0001F600"_s);
    EXPECT_EQ(back.documentElement().text(), u"caf\u00e9 & \u65e5a\u00e9]]>b"_s);
}

// Writing a document piece by piece gives the bytes of writing it whole, escaping and attribute order included; an
// opened element that receives nothing closes as an empty one.
TEST(XmlWriterStream, PiecesGiveTheBytesOfTheWholeDocument)
{
    const QDomDocument whole
        = Parse(u"<kit z=\"1\" a=\"x &amp; &quot;y&quot;\"><modules>"
                "<module n=\"1\" b=\"2\"><case name=\"t&lt;1&gt;\"/><case name=\"t2\">text &amp; more</case></module>"
                "<module n=\"\u00e9\"/></modules>"
                "<empty k=\"v\"/><frameworks><framework name=\"ctf\"><variant/></framework></frameworks></kit>"_s);

    XmlWriter::DocumentStream out;
    const QDomElement kit = whole.documentElement();
    out.Open(kit);
    const QDomElement modules = kit.firstChildElement();
    out.Open(modules);
    for (QDomElement module = modules.firstChildElement(); !module.isNull(); module = module.nextSiblingElement()) {
        // Each piece in a document of its own, as a caller builds it.
        QDomDocument piece;
        piece.appendChild(piece.importNode(module, true));
        out.Write(piece.documentElement());
    }
    out.Close();
    out.Open(modules.nextSiblingElement());
    out.Close();
    out.Write(kit.lastChildElement());
    EXPECT_EQ(QString::fromUtf8(out.Finish()), XmlWriter::ToString(whole));
    EXPECT_TRUE(out.Finish().isEmpty());
}

TEST(XmlWriterStream, ADeviceReceivesTheSameBytesPieceByPiece)
{
    // Enough text to be passed on in several pieces, with characters whose UTF-8 takes more than one byte.
    const auto write = [](XmlWriter::DocumentStream &out) {
        XmlNode root(u"kit"_s);
        root.SetAttribute(u"name"_s, u"caf\u00e9"_s);
        out.Open(root);
        for (int i = 0; i < 3000; ++i) {
            XmlNode module(u"module"_s);
            module.SetAttribute(u"n"_s, QString::number(i));
            module.AppendElement(u"case"_s).SetAttribute(u"name"_s, u"\u65e5%1"_s.arg(i));
            out.Write(module);
        }
    };
    XmlWriter::DocumentStream whole;
    write(whole);
    const QByteArray expected = whole.Finish();
    ASSERT_GT(expected.size(), 150000);

    QBuffer buffer;
    ASSERT_TRUE(buffer.open(QIODevice::WriteOnly));
    XmlWriter::DocumentStream streamed(1, &buffer);
    write(streamed);
    EXPECT_TRUE(streamed.Finish().isEmpty());
    EXPECT_TRUE(streamed.Ok());
    EXPECT_EQ(buffer.data(), expected);

    // A device that takes nothing is reported.
    QBuffer closed;
    ASSERT_TRUE(closed.open(QIODevice::ReadOnly));
    XmlWriter::DocumentStream refused(1, &closed);
    write(refused);
    refused.Finish();
    EXPECT_FALSE(refused.Ok());
}

} // namespace
