#include "common/xmlnode.h"
#include "common/xmlwriter.h"

#include "support/testutil.h"

#include <QDomDocument>
#include <QRandomGenerator>

#include <gtest/gtest.h>

using namespace Qt::StringLiterals;

class XmlNodeTestAccess
{
public:
    static std::unique_ptr<XmlNode> ParseQuickly(const QByteArray &bytes) { return XmlNode::ParseQuickly(bytes); }
};

namespace {

// What Qt's DOM makes of a document, written by our writer: the reference
// the light tree is held to; null when the DOM refuses it.
QString ThroughDom(const QByteArray &bytes)
{
    QDomDocument document;
    return document.setContent(bytes) ? XmlWriter::ToString(document.documentElement()) : QString();
}

QString ThroughTree(const std::unique_ptr<XmlNode> &root)
{
    return root ? XmlWriter::ToString(*root) : QString();
}

// Documents both readers take, each meant to trip one rule of reading.
const char *const kWellFormed[] = {
    "<r/>",
    "<?xml version=\"1.0\"?>\n<r a='1'/>",
    "<?xml version='1.0' encoding='utf-8' standalone='yes'?><r/>",
    "<?xml version = '1.0' encoding =\n'utf-8'?><r/>",
    "\xEF\xBB\xBF<r>bom</r>",
    "<!-- before --><?pi before?>\n<r/>\n<!-- after -->",
    "<r>\n  <a/>\n  <b>text</b>\n</r>",
    "<r>  <a/>  text with blanks  <b/>  </r>",
    "<r>&lt; &gt; &amp; &apos; &quot; &#65;&#x42;&#x1F600;&#x4A;&#x4a;</r>",
    "<r>&#32;</r>",
    "<r>\xC2\xA0</r>",
    "<r>a\r\nb\rc&#13;</r>",
    "<r a='1&#10;2\n3\t4\r\n5&#13;6' b=\"'\" c='\"' d='&lt;&amp;' e='>'/>",
    "<r><![CDATA[ <not markup> & ]]]]><![CDATA[> ]]></r>",
    "<r> <![CDATA[ ]]> </r>",
    "<r>a<![CDATA[b]]>c<!--d-->e<?f g ?>h</r>",
    "<r><?pi   data  more ?><?empty?></r>",
    "<r a = '1' b\n=\n\"2\"/>",
    "<r><!-- a - b --></r>",
    "<r><a x='1' y='2' z='3'><b/><c></c ><d\n\tq = 'v' /></a></r>",
    "<r.x-y_z a.b-c='1'/>",
    "<r>\xE6\x97\xA5\xE6\x9C\xAC \xD0\xBA\xD0\xB8\xD1\x80 \xF0\x9F\x98\x80</r>",
    "<r a='\xC3\xA9t\xC3\xA9 \xEF\xBF\xBD'>]]</r>",
    "<r>]&gt;</r>",
    // Taken by the full reader only (kFullOnly rows).
    "<!DOCTYPE r [<!ENTITY e 'expanded'>]><r>&e;</r>",
    "<?xml version='1.0' encoding='ISO-8859-1'?><r>\xE9t\xE9</r>",
    "<a:r xmlns:a='urn:x' a:b='1'><a:c/></a:r>",
};

constexpr size_t kFullOnly = 3;

// Documents neither reader takes.
const char *const kMalformed[] = {"",
                                  "   ",
                                  "<r>",
                                  "<r></s>",
                                  "<r a='1' a='2'/>",
                                  "<r a='1'b='2'/>",
                                  "<r a='<'/>",
                                  "<r>]]></r>",
                                  "<r>&unknown;</r>",
                                  "<r>&#0;</r>",
                                  "<r>&#xD800;</r>",
                                  "<r>&#65</r>",
                                  "<r>\x01</r>",
                                  "<r>\xEF\xBF\xBE</r>",
                                  "<r a='\xEF\xBF\xBE'/>",
                                  "<r><!-- a -- b --></r>",
                                  "<r><?xml version='1.0'?></r>",
                                  "<?xml version='1.1'?><r/>",
                                  "<r/><s/>",
                                  "<r/>text",
                                  "<-r/>",
                                  "<r>\xC3</r>",
                                  "text"};

TEST(XmlNode, ReadsEveryDocumentAsTheDomDoes)
{
    for (size_t i = 0; i < std::size(kWellFormed); ++i) {
        const QByteArray bytes(kWellFormed[i]);
        const QString expected = ThroughDom(bytes);
        ASSERT_FALSE(expected.isNull()) << bytes.constData();
        EXPECT_EQ(ThroughTree(XmlNode::Parse(bytes)), expected) << bytes.constData();
        EXPECT_EQ(ThroughTree(XmlNode::ParseFully(bytes)), expected) << bytes.constData();
        // Plain documents never need the slower reader.
        if (i + kFullOnly < std::size(kWellFormed)) {
            EXPECT_EQ(ThroughTree(XmlNodeTestAccess::ParseQuickly(bytes)), expected) << bytes.constData();
        }
    }
}

TEST(XmlNode, RejectsMalformedDocumentsWithTheDomsMessageAndPlace)
{
    for (const char *text : kMalformed) {
        const QByteArray bytes(text);
        QDomDocument document;
        QString domError;
        int domLine = 0, domColumn = 0;
        EXPECT_FALSE(document.setContent(bytes, &domError, &domLine, &domColumn)) << text;
        XmlParseError error, fullError;
        EXPECT_EQ(XmlNode::Parse(bytes, &error), nullptr) << text;
        EXPECT_EQ(XmlNode::ParseFully(bytes, &fullError), nullptr) << text;
        EXPECT_EQ(error.message, domError) << text;
        EXPECT_EQ(error.line, domLine) << text;
        EXPECT_EQ(error.column, domColumn) << text;
        EXPECT_EQ(fullError.message, domError) << text;
    }
}

TEST(XmlNode, ReadsTextThatIconvEncodedInUtf16)
{
    if (!testutil::HaveProgram(u"iconv"_s))
        GTEST_SKIP() << "iconv is not installed";
    QTemporaryDir dir;
    const QString source = dir.filePath(u"in.xml"_s);
    testutil::WriteFile(source, "<?xml version=\"1.0\" encoding=\"UTF-16\"?><r n=\"\xC3\xA9\">\xE6\x97\xA5</r>");
    QByteArray utf16;
    ASSERT_EQ(testutil::RunProgram(u"iconv"_s, {u"-f"_s, u"UTF-8"_s, u"-t"_s, u"UTF-16"_s, source}, &utf16), 0);
    const std::unique_ptr<XmlNode> root = XmlNode::Parse(utf16);
    ASSERT_NE(root, nullptr);
    EXPECT_EQ(root->Attribute(u"n"_s), QString(QChar(0xE9)));
    EXPECT_EQ(root->InnerText(), QString(QChar(0x65E5)));
}

TEST(XmlNode, AgreesWithTheFullReaderOnMutatedDocuments)
{
    // Bytes changed at random in the documents above: whatever the quick
    // reader takes, it must take as the full reader does.
    QRandomGenerator random(20261206);
    const QByteArray alphabet("<>/='\"&;#x!-?[] \n\r\tabrACDT0\xC3\xA9");
    int compared = 0;
    for (int round = 0; round < 4000; ++round) {
        QByteArray bytes(kWellFormed[random.bounded(int(std::size(kWellFormed)))]);
        const int edits = 1 + random.bounded(3);
        for (int e = 0; e < edits && !bytes.isEmpty(); ++e) {
            const int at = random.bounded(int(bytes.size()));
            const char c = alphabet.at(random.bounded(int(alphabet.size())));
            const int kind = random.bounded(3); // replace, insert or remove
            bytes.replace(at, kind == 1 ? 0 : 1, kind == 2 ? QByteArray() : QByteArray(1, c));
        }
        const std::unique_ptr<XmlNode> quick = XmlNodeTestAccess::ParseQuickly(bytes);
        if (quick) {
            ASSERT_EQ(ThroughTree(quick), ThroughTree(XmlNode::ParseFully(bytes))) << bytes.toStdString();
            ++compared;
        }
    }
    EXPECT_GT(compared, 500);
}

TEST(XmlNode, CopiesToAndFromTheDomAndWritesTheSameBytes)
{
    // Records are written as light trees and handed to DOM callers by CopyTo;
    // DOM elements given to them are read through FromDom.
    const std::unique_ptr<XmlNode> parsed
        = XmlNode::Parse("<root zeta='last' alpha='first'><list><item n='0'/><item n='1'/><item n='2'/></list><empty/>"
                         "<text>a &lt; b<!--c--><?pi data?></text></root>");
    ASSERT_NE(parsed, nullptr);
    XmlNode &root = *parsed;
    root.SetAttribute(u"alpha"_s, u"replaced \xE9 a\"b<c>\n\t&"_s);
    auto section = std::make_unique<XmlNode>(QString(), XmlNode::CData);
    section->SetValue(u"]]>"_s);
    root.ChildElements().back()->AppendChild(std::move(section));

    QDomDocument document;
    QDomElement domRoot = document.appendChild(document.createElement(u"root"_s)).toElement();
    root.CopyTo(domRoot);
    EXPECT_EQ(domRoot.attribute(u"alpha"_s), u"replaced \xE9 a\"b<c>\n\t&"_s);
    EXPECT_EQ(XmlWriter::Serialize(root), XmlWriter::Serialize(domRoot));
    EXPECT_EQ(XmlWriter::Serialize(*XmlNode::FromDom(domRoot)), XmlWriter::Serialize(root));

    XmlWriter::DocumentStream stream;
    stream.Open(XmlNode(u"outer"_s));
    stream.Write(root);
    XmlWriter::DocumentStream domStream;
    domStream.Open(document.createElement(u"outer"_s));
    domStream.Write(domRoot);
    EXPECT_EQ(stream.Finish(), domStream.Finish());
}

TEST(XmlNode, KeepsHundredsOfThousandsOfLevelsOffTheStack)
{
    constexpr int kDepth = 300000;
    const QByteArray bytes = QByteArray("<a>").repeated(kDepth) + "deep" + QByteArray("</a>").repeated(kDepth);
    const std::unique_ptr<XmlNode> root = XmlNode::Parse(bytes);
    ASSERT_NE(root, nullptr);
    EXPECT_EQ(root->InnerText(), u"deep"_s);
    EXPECT_EQ(root->Depth(), kDepth);
    // Without indentation: indented, the text grows with the square of the depth.
    const QByteArray written = XmlWriter::Serialize(*root, 0);
    EXPECT_EQ(written.count("</a>"), kDepth);
    EXPECT_TRUE(written.contains(">deep</a>"));
    EXPECT_LT(written.size(), bytes.size() * 2);
}

TEST(XmlNode, EditsKeepDocumentOrder)
{
    XmlNode root(u"r"_s);
    XmlNode &first = root.AppendElement(u"a"_s);
    root.AppendText(u"x"_s);
    root.AppendText(u"y"_s);
    root.AppendElement(u"b"_s);
    root.MoveToEnd(&first);
    EXPECT_EQ(XmlWriter::ToString(root), u"<r>xy<b/>\n <a/>\n</r>\n"_s);
    EXPECT_EQ(root.ChildElements().size(), 2u);
    EXPECT_EQ(root.FirstChildElement()->Name(), u"b"_s);
    EXPECT_EQ(root.Attribute(u"none"_s, u"fallback"_s), u"fallback"_s);
    EXPECT_FALSE(root.HasAttribute(u"none"_s));
}

} // namespace
