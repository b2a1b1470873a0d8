#include "common/xmlwriter.h"

#include "common/filewriter.h"
#include "common/xmlnode.h"

#include <QDomNamedNodeMap>
#include <QIODevice>
#include <QVarLengthArray>

#include <algorithm>
#include <utility>
#include <vector>

namespace XmlWriter {
namespace {

void AppendCharacterReference(QString &out, char32_t c)
{
    out += QLatin1String("&#x") + QString::number(static_cast<uint>(c), 16) + QLatin1Char(';');
}

// Whether c can be copied as it is: no markup, no line or tab characters
// (attributes escape them), nothing XML cannot carry and, for ASCII output,
// nothing above 0x7F.
bool IsPlain(char16_t c, bool ascii)
{
    if (c < 0x20)
        return false;
    switch (c) {
    case '&':
    case '<':
    case '>':
    case '"':
        return false;
    default:
        break;
    }
    return ascii ? c <= 0x7F : (c <= 0xD7FF || (c >= 0xE000 && c <= 0xFFFD));
}

void AppendEscaped(QString &out, const QString &text, bool attribute, bool ascii)
{
    const qsizetype n = text.size();
    const QChar *chars = text.constData();
    for (qsizetype i = 0; i < n; ++i) {
        // Runs of plain characters, usually the whole text, are copied at once.
        qsizetype run = i;
        while (run < n && IsPlain(chars[run].unicode(), ascii))
            ++run;
        if (run > i) {
            out.append(chars + i, run - i);
            i = run;
            if (i == n)
                break;
        }
        const QChar c = chars[i];
        if (c.isHighSurrogate() && i + 1 < n && text.at(i + 1).isLowSurrogate()) {
            if (ascii) {
                AppendCharacterReference(out, QChar::surrogateToUcs4(c, text.at(i + 1)));
                ++i;
                continue;
            }
            out += c;
            out += text.at(++i);
            continue;
        }
        switch (c.unicode()) {
        case '&':
            out += QLatin1String("&amp;");
            continue;
        case '<':
            out += QLatin1String("&lt;");
            continue;
        case '>':
            out += QLatin1String("&gt;");
            continue;
        case '"':
            if (attribute) {
                out += QLatin1String("&quot;");
                continue;
            }
            break;
        case '\n':
            if (attribute) {
                out += QLatin1String("&#xa;");
                continue;
            }
            break;
        case '\r':
            out += QLatin1String("&#xd;");
            continue;
        case '\t':
            if (attribute) {
                out += QLatin1String("&#x9;");
                continue;
            }
            break;
        default:
            break;
        }
        // What XML cannot carry at all (most C0 controls, lone surrogates)
        // becomes U+FFFD, so that whatever a log held, the file stays
        // well-formed.
        const QChar kept = XmlNode::IsXmlChar(c.unicode()) && !c.isSurrogate() ? c : QChar(0xFFFD);
        if (ascii && kept.unicode() > 0x7F)
            AppendCharacterReference(out, kept.unicode());
        else
            out += kept;
    }
}

} // namespace

QString Escape(const QString &text, bool attribute, bool ascii)
{
    QString out;
    AppendEscaped(out, text, attribute, ascii);
    return out;
}

std::vector<QDomNode> SortedByName(const QDomNamedNodeMap &map)
{
    const int count = map.count();
    std::vector<QDomNode> sorted;
    sorted.reserve(static_cast<size_t>(count));
    if (count == 1) {
        sorted.push_back(map.item(0));
        return sorted;
    }
    // Each name is taken once, not at every comparison.
    std::vector<std::pair<QString, QDomNode>> named;
    named.reserve(static_cast<size_t>(count));
    for (int i = 0; i < count; ++i) {
        const QDomNode node = map.item(i);
        named.emplace_back(node.nodeName(), node);
    }
    std::sort(named.begin(), named.end(), [](const auto &a, const auto &b) { return a.first < b.first; });
    for (auto &entry : named)
        sorted.push_back(std::move(entry.second));
    return sorted;
}

namespace {

// Character data and entity references run inline: no indent or line end is
// added around them.
bool IsTextLike(const QDomNode &node)
{
    return !node.isNull() && (node.isText() || node.isCDATASection() || node.isEntityReference());
}

class Writer
{
public:
    Writer(int indent, bool ascii) : m_indent(indent < 0 ? 0 : indent), m_ascii(ascii) { }

    void Save(const QDomNode &node, int depth)
    {
        switch (node.nodeType()) {
        case QDomNode::DocumentNode:
            SaveDocument(node.toDocument(), depth);
            break;
        case QDomNode::DocumentFragmentNode:
            SaveChildren(node, depth);
            break;
        case QDomNode::ElementNode:
            SaveElement(node.toElement(), depth);
            break;
        case QDomNode::TextNode:
            AppendEscaped(m_out, node.nodeValue(), false, m_ascii);
            break;
        case QDomNode::CDATASectionNode:
            SaveCData(node.nodeValue());
            break;
        case QDomNode::CommentNode:
            Indent(node, depth);
            SaveComment(node.nodeValue());
            LineEnd(node);
            break;
        case QDomNode::ProcessingInstructionNode: {
            const QDomProcessingInstruction pi = node.toProcessingInstruction();
            Indent(node, depth);
            SaveProcessingInstruction(pi.target(), pi.data());
            LineEnd(node);
            break;
        }
        case QDomNode::EntityReferenceNode:
            SaveEntityReference(node.nodeName());
            break;
        case QDomNode::DocumentTypeNode:
            break;
        default:
            break;
        }
    }

    // The light tree, written as the same tree held in a DOM document.
    // previous and next are the node's siblings (null at either end). The
    // walk keeps its own stack: no nesting depth can exhaust the thread's.
    void Save(const XmlNode &node, int depth, const XmlNode *previous, const XmlNode *next)
    {
        struct Open
        {
            const XmlNode *element;
            size_t child;
            int depth;
            const XmlNode *next;
        };
        std::vector<Open> open;
        auto begin = [&](const XmlNode &item, int level, const XmlNode *before, const XmlNode *after) {
            if (!item.IsElement()) {
                SaveLeaf(item, level, before, after);
                return;
            }
            const auto &children = item.Children();
            const bool empty = children.empty();
            const int spaces = IsTextNode(before) ? 0 : level * m_indent;
            const bool lineEnd = empty ? !IsTextNode(after) : !children.front()->IsTextLike();
            if (!AppendPlainStartTag(item, spaces, empty, lineEnd)) {
                AppendSpaces(spaces);
                m_out += QLatin1Char('<');
                m_out += item.Name();
                AppendAttributes(item);
                m_out += empty ? QLatin1String("/>") : QLatin1String(">");
                if (lineEnd)
                    m_out += QLatin1Char('\n');
            }
            if (!empty)
                open.push_back({&item, 0, level, after});
        };
        begin(node, depth, previous, next);
        while (!open.empty()) {
            const Open top = open.back();
            const auto &children = top.element->Children();
            if (top.child < children.size()) {
                const size_t i = open.back().child++;
                begin(*children[i], top.depth + 1, i > 0 ? children[i - 1].get() : nullptr,
                      i + 1 < children.size() ? children[i + 1].get() : nullptr);
                continue;
            }
            // "</name>", indented and followed by a line end as its
            // neighbours ask, written in one piece.
            const int spaces = children.back()->IsTextLike() ? 0 : top.depth * m_indent;
            const bool lineEnd = !IsTextNode(top.next);
            const QString &name = top.element->Name();
            QChar *at = Extend(spaces + 3 + name.size() + (lineEnd ? 1 : 0));
            at = std::fill_n(at, spaces, QChar(u' '));
            *at++ = QChar(u'<');
            *at++ = QChar(u'/');
            at = std::copy_n(name.constData(), name.size(), at);
            *at++ = QChar(u'>');
            if (lineEnd)
                *at = QChar(u'\n');
            open.pop_back();
        }
    }

    void StartTag(const XmlNode &element, int depth)
    {
        AppendSpaces(depth * m_indent);
        m_out += QLatin1Char('<');
        m_out += element.Name();
        AppendAttributes(element);
    }

    QString Result() const { return m_out; }
    QString &Out() { return m_out; }
    int IndentWidth() const { return m_indent; }

    // The start tag of element with its attributes, left open ("<name a=..."):
    // the caller finishes it with ">" or "/>".
    void StartTag(const QDomElement &element, int depth)
    {
        AppendSpaces(depth * m_indent);
        m_out += QLatin1Char('<');
        m_out += element.tagName();
        AppendAttributes(element);
    }

    void AppendSpaces(int count)
    {
        if (m_spaces.size() < count)
            m_spaces = QString(count * 2, QLatin1Char(' '));
        m_out.append(m_spaces.constData(), count);
    }

private:
    void SaveCData(QString value)
    {
        // "]]>" cannot stand inside a section: split it across two.
        value.replace(QLatin1String("]]>"), QLatin1String("]]]]><![CDATA[>"));
        if (m_ascii)
            SaveAsciiCData(value);
        else
            m_out += QLatin1String("<![CDATA[") + value + QLatin1String("]]>");
    }

    void SaveComment(const QString &value) { m_out += QLatin1String("<!--") + value + QLatin1String("-->"); }

    void SaveProcessingInstruction(const QString &target, const QString &data)
    {
        m_out += QLatin1String("<?") + target;
        if (!data.isEmpty())
            m_out += QLatin1Char(' ') + data;
        m_out += QLatin1String("?>");
    }

    void SaveEntityReference(const QString &name) { m_out += QLatin1Char('&') + name + QLatin1Char(';'); }

    static bool IsTextNode(const XmlNode *node) { return node && node->IsTextLike(); }

    void Indent(const XmlNode *previous, int depth)
    {
        if (!IsTextNode(previous))
            AppendSpaces(depth * m_indent);
    }

    void LineEnd(const XmlNode *next)
    {
        if (!IsTextNode(next))
            m_out += QLatin1Char('\n');
    }

    using SortedAttributes = QVarLengthArray<const QPair<QString, QString> *, 16>;

    static SortedAttributes AttributesByName(const XmlNode &element)
    {
        const auto byName = [](const auto *a, const auto *b) {
            return a->first < b->first;
        };
        SortedAttributes sorted;
        for (const auto &attribute : element.Attributes())
            sorted.append(&attribute);
        // A tree read from a file this writer wrote is in order already.
        if (!std::is_sorted(sorted.begin(), sorted.end(), byName))
            std::sort(sorted.begin(), sorted.end(), byName);
        return sorted;
    }

    // Grows the text by size characters and returns where they go.
    QChar *Extend(qsizetype size)
    {
        const qsizetype at = m_out.size();
        m_out.resize(at + size);
        return m_out.data() + at;
    }

    // The start tag of element ("<name a=\"v\">" or "/>"), after spaces blanks
    // and before an optional line end, in one piece: its length is worked
    // out first. False, with nothing written, when an attribute value has a
    // character to escape.
    bool AppendPlainStartTag(const XmlNode &element, int spaces, bool empty, bool lineEnd)
    {
        const SortedAttributes sorted = AttributesByName(element);
        qsizetype size = spaces + 1 + element.Name().size() + (empty ? 2 : 1) + (lineEnd ? 1 : 0);
        for (const auto *attribute : sorted) {
            const QString &value = attribute->second;
            const char16_t *chars = reinterpret_cast<const char16_t *>(value.constData());
            if (!std::all_of(chars, chars + value.size(), [this](char16_t c) { return IsPlain(c, m_ascii); }))
                return false;
            size += attribute->first.size() + value.size() + 4;
        }
        QChar *at = Extend(size);
        at = std::fill_n(at, spaces, QChar(u' '));
        *at++ = QChar(u'<');
        at = std::copy_n(element.Name().constData(), element.Name().size(), at);
        for (const auto *attribute : sorted) {
            *at++ = QChar(u' ');
            at = std::copy_n(attribute->first.constData(), attribute->first.size(), at);
            *at++ = QChar(u'=');
            *at++ = QChar(u'"');
            at = std::copy_n(attribute->second.constData(), attribute->second.size(), at);
            *at++ = QChar(u'"');
        }
        if (empty)
            *at++ = QChar(u'/');
        *at++ = QChar(u'>');
        if (lineEnd)
            *at = QChar(u'\n');
        return true;
    }

    void AppendAttributes(const XmlNode &element)
    {
        for (const auto *attribute : AttributesByName(element)) {
            m_out += QChar(u' ');
            m_out += attribute->first;
            m_out.append(reinterpret_cast<const QChar *>(u"=\""), 2);
            AppendEscaped(m_out, attribute->second, true, m_ascii);
            m_out += QChar(u'"');
        }
    }

    void SaveLeaf(const XmlNode &node, int depth, const XmlNode *previous, const XmlNode *next)
    {
        switch (node.NodeKind()) {
        case XmlNode::Text:
            AppendEscaped(m_out, node.Value(), false, m_ascii);
            break;
        case XmlNode::CData:
            SaveCData(node.Value());
            break;
        case XmlNode::Comment:
            Indent(previous, depth);
            SaveComment(node.Value());
            LineEnd(next);
            break;
        case XmlNode::ProcessingInstruction:
            Indent(previous, depth);
            SaveProcessingInstruction(node.Name(), node.Value());
            LineEnd(next);
            break;
        case XmlNode::EntityReference:
            SaveEntityReference(node.Name());
            break;
        case XmlNode::Element:
            break;
        }
    }

    // A section cannot hold character references: non-ASCII runs are
    // written between sections, escaped as text.
    void SaveAsciiCData(const QString &value)
    {
        qsizetype start = 0;
        const qsizetype n = value.size();
        while (start < n) {
            qsizetype end = start;
            while (end < n && value.at(end).unicode() <= 0x7F)
                ++end;
            if (end > start)
                m_out += QLatin1String("<![CDATA[") + value.mid(start, end - start) + QLatin1String("]]>");
            qsizetype other = end;
            while (other < n && value.at(other).unicode() > 0x7F)
                ++other;
            AppendEscaped(m_out, value.mid(end, other - end), false, true);
            start = other;
        }
        if (n == 0)
            m_out += QLatin1String("<![CDATA[]]>");
    }

    void SaveChildren(const QDomNode &node, int depth)
    {
        for (QDomNode child = node.firstChild(); !child.isNull(); child = child.nextSibling())
            Save(child, depth);
    }

    // A document type declaration is left to the one kind of document that
    // keeps one, the flattened device pack (FlattenDeviceXml).
    void SaveDocument(const QDomDocument &document, int depth)
    {
        for (QDomNode child = document.firstChild(); !child.isNull(); child = child.nextSibling()) {
            if (!child.isDocumentType())
                Save(child, depth);
        }
    }

    void Indent(const QDomNode &node, int depth)
    {
        if (!IsTextLike(node.previousSibling()))
            AppendSpaces(depth * m_indent);
    }

    void AppendAttributes(const QDomElement &element)
    {
        for (const QDomNode &node : SortedByName(element.attributes())) {
            const QDomAttr attr = node.toAttr();
            m_out += QLatin1Char(' ');
            m_out += attr.name();
            m_out += QLatin1String("=\"");
            AppendEscaped(m_out, attr.value(), true, m_ascii);
            m_out += QLatin1Char('"');
        }
    }

    void LineEnd(const QDomNode &node)
    {
        if (!IsTextLike(node.nextSibling()))
            m_out += QLatin1Char('\n');
    }

    void SaveElement(const QDomElement &element, int depth)
    {
        Indent(element, depth);
        const QString name = element.tagName();
        m_out += QLatin1Char('<');
        m_out += name;
        AppendAttributes(element);

        if (element.hasChildNodes()) {
            m_out += QLatin1Char('>');
            if (!IsTextLike(element.firstChild()))
                m_out += QLatin1Char('\n');
            SaveChildren(element, depth + 1);
            if (!IsTextLike(element.lastChild()))
                AppendSpaces(depth * m_indent);
            m_out += QLatin1String("</");
            m_out += name;
            m_out += QLatin1Char('>');
        } else {
            m_out += QLatin1String("/>");
        }
        LineEnd(element);
    }

    int m_indent;
    bool m_ascii;
    QString m_out;
    // Blanks to indent with, grown as deeper levels need them.
    QString m_spaces;
};

} // namespace

struct DocumentStream::Private
{
    Private(int indent, QIODevice *output) : writer(indent, false), device(output) { }
    Writer writer;
    QIODevice *device;
    bool failed = false;
    // The elements opened and not yet closed, and whether each has received
    // a child (until then its start tag is left open for "/>").
    QList<QString> open;
    bool startTagOpen = false;

    // Finishes the start tag of the innermost open element: its content
    // begins.
    void BeginContent()
    {
        if (startTagOpen) {
            writer.Out() += QLatin1String(">\n");
            startTagOpen = false;
        }
    }

    // Passes the text written so far on to the device once there is enough
    // of it (all of it with force). The start tag left open for "/>" stays.
    void Drain(bool force)
    {
        QString &out = writer.Out();
        if (!device || (!force && out.size() < kDrainSize))
            return;
        const QByteArray bytes = out.toUtf8();
        out.resize(0);
        if (!failed && device->write(bytes) != bytes.size())
            failed = true;
    }

    static constexpr qsizetype kDrainSize = 32 * 1024;
};

DocumentStream::DocumentStream(int indent, QIODevice *device) : d(new Private(indent < 0 ? 0 : indent, device))
{
}

DocumentStream::~DocumentStream() = default;

void DocumentStream::Open(const QDomElement &element)
{
    d->BeginContent();
    d->writer.StartTag(element, int(d->open.size()));
    d->open.append(element.tagName());
    d->startTagOpen = true;
}

void DocumentStream::Open(const XmlNode &element)
{
    d->BeginContent();
    d->writer.StartTag(element, int(d->open.size()));
    d->open.append(element.Name());
    d->startTagOpen = true;
}

void DocumentStream::Write(const QDomElement &element)
{
    d->BeginContent();
    d->writer.Save(element, int(d->open.size()));
    d->Drain(false);
}

void DocumentStream::Write(const XmlNode &element)
{
    d->BeginContent();
    d->writer.Save(element, int(d->open.size()), nullptr, nullptr);
    d->Drain(false);
}

void DocumentStream::Close()
{
    if (d->open.isEmpty())
        return;
    const QString name = d->open.takeLast();
    QString &out = d->writer.Out();
    if (d->startTagOpen) {
        out += QLatin1String("/>\n");
        d->startTagOpen = false;
        return;
    }
    d->writer.AppendSpaces(int(d->open.size()) * d->writer.IndentWidth());
    out += QLatin1String("</");
    out += name;
    out += QLatin1String(">\n");
}

QByteArray DocumentStream::Finish()
{
    while (!d->open.isEmpty())
        Close();
    if (d->device) {
        d->Drain(true);
        return QByteArray();
    }
    const QByteArray bytes = d->writer.Out().toUtf8();
    d->writer.Out().clear();
    return bytes;
}

bool DocumentStream::Ok() const
{
    return !d->failed;
}

QString ToString(const QDomNode &node, int indent)
{
    Writer writer(indent, false);
    writer.Save(node, 0);
    return writer.Result();
}

QString ToAsciiString(const QDomNode &node, int indent)
{
    Writer writer(indent, true);
    writer.Save(node, 0);
    return writer.Result();
}

QByteArray Serialize(const QDomNode &node, int indent)
{
    return ToString(node, indent).toUtf8();
}

QString ToString(const XmlNode &node, int indent)
{
    Writer writer(indent, false);
    writer.Save(node, 0, nullptr, nullptr);
    return writer.Result();
}

QByteArray Serialize(const XmlNode &node, int indent)
{
    return ToString(node, indent).toUtf8();
}

bool WriteDocument(const QDomDocument &document, const QString &path, int indent, bool atomic, QString *error)
{
    return FileWriter::Write(path, Serialize(document, indent), atomic, error);
}

bool WriteDocument(const XmlNode &root, const QString &path, int indent, bool atomic, QString *error)
{
    return FileWriter::Write(path, Serialize(root, indent), atomic, error);
}

} // namespace XmlWriter
