#include "common/xmlnode.h"
#include "common/xmlwriter.h"

#include "support/testutil.h"

#include <QDomDocument>
#include <QRandomGenerator>

#include <gtest/gtest.h>

namespace {

// What Qt's DOM makes of a document, written by our writer: the reference
// the light tree is held to.
QString ThroughDom(const QByteArray &bytes, bool *parsed = nullptr)
{
    QDomDocument document;
    const bool ok = bool(document.setContent(bytes));
    if (parsed)
        *parsed = ok;
    return ok ? XmlWriter::ToString(document.documentElement()) : QString();
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
    "\xEF\xBB\xBF<r>bom</r>",
    "<!-- before --><?pi before?>\n<r/>\n<!-- after -->",
    "<r>\n  <a/>\n  <b>text</b>\n</r>",
    "<r>  <a/>  text with blanks  <b/>  </r>",
    "<r>&lt; &gt; &amp; &apos; &quot; &#65;&#x42;&#x1F600;</r>",
    "<r>&#32;</r>",
    "<r>\xC2\xA0</r>",
    "<r>a\r\nb\rc&#13;</r>",
    "<r a='1&#10;2\n3\t4\r\n5&#13;6' b=\"'\" c='\"' d='&lt;&amp;' e='>'/>",
    "<r><![CDATA[ <not markup> & ]]]]><![CDATA[> ]]></r>",
    "<r> <![CDATA[ ]]> </r>",
    "<r>a<![CDATA[b]]>c<!--d-->e<?f g ?>h</r>",
    "<r><?pi   data  more ?><?empty?></r>",
    "<r><!-- a - b --></r>",
    "<r><a x='1' y='2' z='3'><b/><c></c ><d\n\tq = 'v' /></a></r>",
    "<r.x-y_z a.b-c='1'/>",
    "<r>\xE6\x97\xA5\xE6\x9C\xAC \xD0\xBA\xD0\xB8\xD1\x80 \xF0\x9F\x98\x80</r>",
    "<r a='\xC3\xA9t\xC3\xA9'>]]</r>",
    "<r>]&gt;</r>",
    // Taken by the full reader only.
    "<!DOCTYPE r [<!ENTITY e 'expanded'>]><r>&e;</r>",
    "<?xml version='1.0' encoding='ISO-8859-1'?><r>\xE9t\xE9</r>",
    "<a:r xmlns:a='urn:x' a:b='1'><a:c/></a:r>",
};

// Documents neither reader takes.
const char *const kMalformed[] = {
    "",
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
    "<r><!-- a -- b --></r>",
    "<r><?xml version='1.0'?></r>",
    "<?xml version='1.1'?><r/>",
    "<r/><s/>",
    "<r/>text",
    "<-r/>",
    "<r>\xC3</r>",
    "text",
};

TEST(XmlNode, ReadsEveryDocumentAsTheDomDoes)
{
    for (const char *text : kWellFormed) {
        const QByteArray bytes(text);
        bool parsed = false;
        const QString expected = ThroughDom(bytes, &parsed);
        ASSERT_TRUE(parsed) << text;
        EXPECT_EQ(ThroughTree(XmlNode::Parse(bytes)), expected) << text;
        EXPECT_EQ(ThroughTree(XmlNode::ParseFully(bytes)), expected) << text;
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
        EXPECT_FALSE(error.message.isEmpty()) << text;
        EXPECT_EQ(error.message, domError) << text;
        EXPECT_EQ(error.line, domLine) << text;
        EXPECT_EQ(error.column, domColumn) << text;
        EXPECT_EQ(fullError.message, domError) << text;
    }
}

TEST(XmlNode, ReadsTextThatIconvEncodedInUtf16)
{
    if (!testutil::HaveProgram(QStringLiteral("iconv")))
        GTEST_SKIP() << "iconv is not installed";
    QTemporaryDir dir;
    ASSERT_TRUE(dir.isValid());
    const QString source = dir.filePath(QStringLiteral("in.xml"));
    const QByteArray utf8("<?xml version=\"1.0\" encoding=\"UTF-16\"?><r n=\"\xC3\xA9\">\xE6\x97\xA5</r>");
    testutil::WriteFile(source, utf8);
    QByteArray utf16;
    ASSERT_EQ(testutil::RunProgram(QStringLiteral("iconv"),
                                   {QStringLiteral("-f"), QStringLiteral("UTF-8"), QStringLiteral("-t"),
                                    QStringLiteral("UTF-16"), source},
                                   &utf16),
              0);
    const std::unique_ptr<XmlNode> root = XmlNode::Parse(utf16);
    ASSERT_NE(root, nullptr);
    EXPECT_EQ(root->Attribute(QStringLiteral("n")), QString(QChar(0xE9)));
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
            switch (random.bounded(3)) {
            case 0: bytes[at] = c; break;
            case 1: bytes.insert(at, c); break;
            default: bytes.remove(at, 1); break;
            }
        }
        const std::unique_ptr<XmlNode> quick = XmlNode::Parse(bytes);
        const std::unique_ptr<XmlNode> full = XmlNode::ParseFully(bytes);
        ASSERT_EQ(quick == nullptr, full == nullptr) << bytes.toStdString();
        if (quick) {
            ASSERT_EQ(ThroughTree(quick), ThroughTree(full)) << bytes.toStdString();
            ++compared;
        }
    }
    EXPECT_GT(compared, 500);
}

TEST(XmlNode, CopiesToAndFromTheDomAndWritesTheSameBytes)
{
    // Records are written as light trees and handed to DOM callers by CopyTo;
    // DOM elements given to them are read through FromDom.
    XmlNode root(QStringLiteral("root"));
    root.SetAttribute(QStringLiteral("zeta"), QStringLiteral("last"));
    root.SetAttribute(QStringLiteral("alpha"), QStringLiteral("a\"b<c>\n\t&"));
    root.SetAttribute(QStringLiteral("alpha"), QStringLiteral("replaced \xE9"));
    XmlNode &list = root.AppendElement(QStringLiteral("list"));
    for (int i = 0; i < 3; ++i)
        list.AppendElement(QStringLiteral("item")).SetAttribute(QStringLiteral("n"), QString::number(i));
    root.AppendElement(QStringLiteral("empty"));
    XmlNode &lightText = root.AppendElement(QStringLiteral("text"));
    lightText.AppendText(QStringLiteral("a < b"));
    auto comment = std::make_unique<XmlNode>(QString(), XmlNode::Comment);
    comment->SetValue(QStringLiteral("c"));
    lightText.AppendChild(std::move(comment));
    auto section = std::make_unique<XmlNode>(QString(), XmlNode::CData);
    section->SetValue(QStringLiteral("]]>"));
    lightText.AppendChild(std::move(section));
    auto instruction = std::make_unique<XmlNode>(QStringLiteral("pi"), XmlNode::ProcessingInstruction);
    instruction->SetValue(QStringLiteral("data"));
    lightText.AppendChild(std::move(instruction));

    QDomDocument document;
    QDomElement domRoot = document.createElement(QStringLiteral("root"));
    document.appendChild(domRoot);
    root.CopyTo(domRoot);
    EXPECT_EQ(domRoot.attribute(QStringLiteral("alpha")), QStringLiteral("replaced \xE9"));
    EXPECT_EQ(domRoot.elementsByTagName(QStringLiteral("item")).count(), 3);
    EXPECT_EQ(XmlWriter::Serialize(root), XmlWriter::Serialize(domRoot));
    EXPECT_EQ(XmlWriter::Serialize(*XmlNode::FromDom(domRoot)), XmlWriter::Serialize(root));

    XmlWriter::DocumentStream stream;
    stream.Open(XmlNode(QStringLiteral("outer")));
    stream.Write(root);
    XmlWriter::DocumentStream domStream;
    domStream.Open(document.createElement(QStringLiteral("outer")));
    domStream.Write(domRoot);
    EXPECT_EQ(stream.Finish(), domStream.Finish());
}

TEST(XmlNode, KeepsHundredsOfThousandsOfLevelsOffTheStack)
{
    constexpr int kDepth = 300000;
    QByteArray bytes;
    bytes.reserve(kDepth * 7 + 16);
    for (int i = 0; i < kDepth; ++i)
        bytes += "<a>";
    bytes += "deep";
    for (int i = 0; i < kDepth; ++i)
        bytes += "</a>";
    std::unique_ptr<XmlNode> root = XmlNode::Parse(bytes);
    ASSERT_NE(root, nullptr);
    EXPECT_EQ(root->InnerText(), QStringLiteral("deep"));
    EXPECT_EQ(root->Depth(), kDepth);
    // Without indentation: indented, the text grows with the square of the
    // depth.
    const QByteArray written = XmlWriter::Serialize(*root, 0);
    EXPECT_EQ(written.count("</a>"), kDepth);
    EXPECT_TRUE(written.contains(">deep</a>"));
    EXPECT_LT(written.size(), bytes.size() * 2);
    root.reset();
}

TEST(XmlNode, EditsKeepDocumentOrder)
{
    XmlNode root(QStringLiteral("r"));
    XmlNode &first = root.AppendElement(QStringLiteral("a"));
    root.AppendText(QStringLiteral("x"));
    root.AppendText(QStringLiteral("y"));
    root.AppendElement(QStringLiteral("b"));
    root.MoveToEnd(&first);
    EXPECT_EQ(XmlWriter::ToString(root), QStringLiteral("<r>xy<b/>\n <a/>\n</r>\n"));
    EXPECT_EQ(root.ChildElements().size(), 2u);
    EXPECT_EQ(root.FirstChildElement()->Name(), QStringLiteral("b"));
    EXPECT_EQ(root.Attribute(QStringLiteral("none"), QStringLiteral("fallback")), QStringLiteral("fallback"));
    EXPECT_FALSE(root.HasAttribute(QStringLiteral("none")));
}

} // namespace
