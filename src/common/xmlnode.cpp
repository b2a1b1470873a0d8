#include "common/xmlnode.h"

#include <QDomDocument>
#include <QStringDecoder>
#include <QXmlStreamReader>

#include <algorithm>
#include <array>
#include <string_view>

namespace {

// Reads the plain documents the library meets nearly always, many times
// faster than QXmlStreamReader: UTF-8 text with elements, attributes, text,
// character and predefined entity references, CDATA sections, comments and
// processing instructions, names in ASCII without colons. Anything else (a
// document type declaration, another encoding, a character that is not
// allowed, a malformed construct) is declined and left to
// QXmlStreamReader, so this reader never has to report an error: what it
// accepts is well-formed and gives the tree QXmlStreamReader would give.
class QuickReader
{
public:
    explicit QuickReader(const QString &text)
        : m_at(reinterpret_cast<const char16_t *>(text.constData())), m_end(m_at + text.size())
    {
    }

    // The root element, or null when the document is declined.
    std::unique_ptr<XmlNode> Read()
    {
        if (m_at < m_end && *m_at == 0xFEFF)
            ++m_at;
        if (Starts(u"<?xml") && !ReadDeclaration())
            return nullptr;
        if (!SkipMisc() || !Starts(u"<"))
            return nullptr;
        std::unique_ptr<XmlNode> root = ReadRoot();
        if (!root || !SkipMisc() || m_at != m_end)
            return nullptr;
        return root;
    }

private:
    static bool IsNameStart(char16_t c) { return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || c == '_'; }
    static bool IsNameChar(char16_t c) { return IsNameStart(c) || (c >= '0' && c <= '9') || c == '.' || c == '-'; }
    static bool IsSpace(char16_t c) { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }
    // Characters that may stand as they are; line ends are read as "\n".
    static bool IsPlainChar(char16_t c) { return c >= 0x20 ? c < 0xFFFE : (c == '\t' || c == '\n' || c == '\r'); }

    bool Starts(std::u16string_view text) const
    {
        return size_t(m_end - m_at) >= text.size() && std::equal(text.begin(), text.end(), m_at);
    }

    bool SkipSpaces()
    {
        const char16_t *start = m_at;
        while (m_at < m_end && IsSpace(*m_at))
            ++m_at;
        return m_at != start;
    }

    bool ReadName(QString &name)
    {
        const char16_t *start = m_at;
        if (m_at >= m_end || !IsNameStart(*m_at))
            return false;
        while (m_at < m_end && IsNameChar(*m_at))
            ++m_at;
        name = Shared(m_names, QStringView(start, m_at - start));
        return true;
    }

    // Names, and short values such as verdicts, repeat from element to
    // element: each is made once and shared while it keeps recurring (a
    // small table indexed by length and end characters; a new text takes
    // over its slot).
    using SharedTexts = std::array<QString, 64>;
    static QString Shared(SharedTexts &kept, QStringView text)
    {
        const size_t slot = text.isEmpty()
            ? 0
            : (size_t(text.size()) * 7 + text.front().unicode() * 3 + text.back().unicode()) % kept.size();
        QString &known = kept[slot];
        if (known.size() != text.size() || known != text)
            known = text.toString();
        return known;
    }

    // A quoted pseudo-attribute of the declaration: name, '=', its value.
    bool ReadPseudo(std::u16string_view name, QString &value)
    {
        if (!Starts(name))
            return false;
        m_at += name.size();
        SkipSpaces();
        if (m_at >= m_end || *m_at != '=')
            return false;
        ++m_at;
        SkipSpaces();
        if (m_at >= m_end || (*m_at != '"' && *m_at != '\''))
            return false;
        const char16_t quote = *m_at++;
        const char16_t *start = m_at;
        while (m_at < m_end && *m_at != quote)
            ++m_at;
        if (m_at >= m_end)
            return false;
        value = QString(reinterpret_cast<const QChar *>(start), m_at - start);
        ++m_at;
        return true;
    }

    // <?xml version="1.0" [encoding="UTF-8"] [standalone="yes|no"]?>
    bool ReadDeclaration()
    {
        m_at += 5;
        QString value;
        if (!SkipSpaces() || !ReadPseudo(u"version", value) || value != QLatin1String("1.0"))
            return false;
        bool spaced = SkipSpaces();
        if (spaced && Starts(u"encoding")) {
            if (!ReadPseudo(u"encoding", value) || value.compare(QLatin1String("utf-8"), Qt::CaseInsensitive) != 0)
                return false;
            spaced = SkipSpaces();
        }
        if (spaced && Starts(u"standalone")) {
            if (!ReadPseudo(u"standalone", value) || (value != QLatin1String("yes") && value != QLatin1String("no")))
                return false;
            SkipSpaces();
        }
        if (!Starts(u"?>"))
            return false;
        m_at += 2;
        return true;
    }

    // Comments and processing instructions around the root element (not
    // kept) and blanks.
    bool SkipMisc()
    {
        for (;;) {
            SkipSpaces();
            if (Starts(u"<!--")) {
                QString ignored;
                if (!ReadComment(ignored))
                    return false;
            } else if (Starts(u"<?")) {
                QString target, data;
                if (!ReadInstruction(target, data))
                    return false;
            } else {
                return true;
            }
        }
    }

    // "<!--" ... "-->" without "--" inside.
    bool ReadComment(QString &text)
    {
        m_at += 4;
        const char16_t *start = m_at;
        for (;; ++m_at) {
            if (m_at + 1 >= m_end)
                return false;
            if (*m_at == '-' && m_at[1] == '-')
                break;
            if (!IsPlainChar(*m_at))
                return false;
        }
        if (m_at + 2 >= m_end || m_at[2] != '>')
            return false;
        text = Normalized(start, m_at);
        m_at += 3;
        return true;
    }

    // "<?target data?>", target not "xml" in any case.
    bool ReadInstruction(QString &target, QString &data)
    {
        m_at += 2;
        if (!ReadName(target) || target.compare(QLatin1String("xml"), Qt::CaseInsensitive) == 0)
            return false;
        if (Starts(u"?>")) {
            m_at += 2;
            return true;
        }
        if (!SkipSpaces())
            return false;
        const char16_t *start = m_at;
        for (; !Starts(u"?>"); ++m_at) {
            if (m_at >= m_end || !IsPlainChar(*m_at))
                return false;
        }
        data = Normalized(start, m_at);
        m_at += 2;
        return true;
    }

    // "<![CDATA[" ... "]]>".
    bool ReadCData(QString &text)
    {
        m_at += 9;
        const char16_t *start = m_at;
        for (; !Starts(u"]]>"); ++m_at) {
            if (m_at >= m_end || !IsPlainChar(*m_at))
                return false;
        }
        text = Normalized(start, m_at);
        m_at += 3;
        return true;
    }

    // Characters from start to end with line ends read as "\n".
    static QString Normalized(const char16_t *start, const char16_t *end)
    {
        QString text(reinterpret_cast<const QChar *>(start), end - start);
        if (text.contains(QLatin1Char('\r'))) {
            text.replace(QLatin1String("\r\n"), QLatin1String("\n"));
            text.replace(QLatin1Char('\r'), QLatin1Char('\n'));
        }
        return text;
    }

    // A reference after '&': a predefined entity or a character.
    bool ReadReference(QString &out)
    {
        ++m_at;
        const char16_t *semicolon = m_at;
        while (semicolon < m_end && semicolon - m_at < 12 && *semicolon != ';')
            ++semicolon;
        if (semicolon >= m_end || *semicolon != ';')
            return false;
        const std::u16string_view name(m_at, size_t(semicolon - m_at));
        m_at = semicolon + 1;
        if (name == u"lt") {
            out += QLatin1Char('<');
            return true;
        }
        if (name == u"gt") {
            out += QLatin1Char('>');
            return true;
        }
        if (name == u"amp") {
            out += QLatin1Char('&');
            return true;
        }
        if (name == u"apos") {
            out += QLatin1Char('\'');
            return true;
        }
        if (name == u"quot") {
            out += QLatin1Char('"');
            return true;
        }
        if (name.size() < 2 || name[0] != '#')
            return false;
        const bool hex = name[1] == 'x';
        const size_t first = hex ? 2 : 1;
        if (first >= name.size() || name.size() - first > 8)
            return false;
        char32_t code = 0;
        for (size_t i = first; i < name.size(); ++i) {
            const char16_t c = name[i];
            int digit;
            if (c >= '0' && c <= '9')
                digit = c - '0';
            else if (hex && c >= 'a' && c <= 'f')
                digit = c - 'a' + 10;
            else if (hex && c >= 'A' && c <= 'F')
                digit = c - 'A' + 10;
            else
                return false;
            code = code * (hex ? 16 : 10) + char32_t(digit);
        }
        if (!XmlNode::IsXmlChar(code))
            return false;
        out += QString::fromUcs4(&code, 1);
        return true;
    }

    // A run of character data up to the next '<'; false when it holds
    // something not allowed.
    bool ReadText(QString &text)
    {
        while (m_at < m_end && *m_at != '<') {
            const char16_t *start = m_at;
            while (m_at < m_end && *m_at != '<' && *m_at != '&' && *m_at != '>' && *m_at != '\r' && IsPlainChar(*m_at))
                ++m_at;
            text.append(reinterpret_cast<const QChar *>(start), m_at - start);
            if (m_at >= m_end || *m_at == '<')
                break;
            switch (*m_at) {
            case '&':
                if (!ReadReference(text))
                    return false;
                break;
            case '>':
                // "]]>" cannot stand in content (written out, not as references).
                if (m_at - start >= 2 && m_at[-1] == ']' && m_at[-2] == ']')
                    return false;
                text += QLatin1Char('>');
                ++m_at;
                break;
            case '\r':
                text += QLatin1Char('\n');
                ++m_at;
                if (m_at < m_end && *m_at == '\n')
                    ++m_at;
                break;
            default:
                return false;
            }
        }
        return true;
    }

    bool ReadAttributeValue(QString &value)
    {
        if (m_at >= m_end || (*m_at != '"' && *m_at != '\''))
            return false;
        const char16_t quote = *m_at++;
        for (bool first = true;; first = false) {
            const char16_t *start = m_at;
            while (m_at < m_end && *m_at != quote && *m_at >= 0x20 && *m_at != '<' && *m_at != '&' && *m_at < 0xFFFE)
                ++m_at;
            if (first && m_at < m_end && *m_at == quote && m_at - start <= kSharedValueSize) {
                value = Shared(m_values, QStringView(start, m_at - start));
                ++m_at;
                return true;
            }
            value.append(reinterpret_cast<const QChar *>(start), m_at - start);
            if (m_at >= m_end)
                return false;
            const char16_t c = *m_at;
            if (c == quote) {
                ++m_at;
                return true;
            }
            if (c == '&') {
                if (!ReadReference(value))
                    return false;
            } else if (c == '\t' || c == '\n') {
                value += QLatin1Char(' ');
                ++m_at;
            } else if (c == '\r') {
                value += QLatin1Char(' ');
                ++m_at;
                if (m_at < m_end && *m_at == '\n')
                    ++m_at;
            } else {
                return false;
            }
        }
    }

    // A start tag after its '<': name and attributes, then ">" (true in
    // empty false) or "/>" (empty true).
    bool ReadStartTag(XmlNode &element, bool &empty)
    {
        QString name;
        m_attributes.clear();
        for (;;) {
            const bool spaced = SkipSpaces();
            if (m_at >= m_end)
                return false;
            if (*m_at == '>' || Starts(u"/>")) {
                empty = *m_at == '/';
                m_at += empty ? 2 : 1;
                if (!m_attributes.isEmpty())
                    element.SetAttributes(std::move(m_attributes));
                return true;
            }
            if (!spaced || !ReadName(name))
                return false;
            SkipSpaces();
            if (m_at >= m_end || *m_at != '=')
                return false;
            ++m_at;
            SkipSpaces();
            QString value;
            if (!ReadAttributeValue(value))
                return false;
            for (const auto &attribute : m_attributes) {
                if (attribute.first == name)
                    return false;
            }
            m_attributes.append({std::move(name), std::move(value)});
        }
    }

    std::unique_ptr<XmlNode> ReadRoot()
    {
        ++m_at;
        QString name;
        if (!ReadName(name))
            return nullptr;
        auto root = std::make_unique<XmlNode>(name);
        bool empty = false;
        if (!ReadStartTag(*root, empty))
            return nullptr;
        if (empty)
            return root;
        std::vector<XmlNode *> open{root.get()};
        QString text;
        while (!open.empty()) {
            // As the DOM reads it: a run of blanks is no content. Most runs
            // between elements are blanks, and are passed over at once.
            const char16_t *run = m_at;
            SkipSpaces();
            if (m_at >= m_end)
                return nullptr;
            XmlNode &parent = *open.back();
            if (*m_at != '<') {
                m_at = run;
                text.clear();
                if (!ReadText(text) || m_at >= m_end)
                    return nullptr;
                if (!text.trimmed().isEmpty())
                    parent.AppendText(text);
            }
            if (Starts(u"</")) {
                m_at += 2;
                if (!ReadName(name) || name != parent.Name())
                    return nullptr;
                SkipSpaces();
                if (m_at >= m_end || *m_at != '>')
                    return nullptr;
                ++m_at;
                open.pop_back();
            } else if (Starts(u"<!--")) {
                auto comment = std::make_unique<XmlNode>(QString(), XmlNode::Comment);
                QString value;
                if (!ReadComment(value))
                    return nullptr;
                comment->SetValue(value);
                parent.AppendChild(std::move(comment));
            } else if (Starts(u"<![CDATA[")) {
                QString value;
                if (!ReadCData(value))
                    return nullptr;
                auto section = std::make_unique<XmlNode>(QString(), XmlNode::CData);
                section->SetValue(value);
                parent.AppendChild(std::move(section));
            } else if (Starts(u"<?")) {
                QString target, data;
                if (!ReadInstruction(target, data))
                    return nullptr;
                auto instruction = std::make_unique<XmlNode>(target, XmlNode::ProcessingInstruction);
                instruction->SetValue(data);
                parent.AppendChild(std::move(instruction));
            } else {
                ++m_at;
                if (!ReadName(name))
                    return nullptr;
                XmlNode &child = parent.AppendElement(name);
                if (!ReadStartTag(child, empty))
                    return nullptr;
                if (!empty)
                    open.push_back(&child);
            }
        }
        return root;
    }

    static constexpr qsizetype kSharedValueSize = 12;

    const char16_t *m_at;
    const char16_t *m_end;
    SharedTexts m_names;
    SharedTexts m_values;
    // The attributes of the start tag being read.
    XmlNode::AttributeList m_attributes;
};

} // namespace

XmlNode::XmlNode(const QString &name, Kind kind) : m_kind(kind), m_name(name)
{
}

XmlNode::~XmlNode()
{
    // Deep trees are taken apart level by level, so no document can exhaust
    // the stack on the way out.
    std::vector<std::unique_ptr<XmlNode>> pending;
    pending.swap(m_children);
    while (!pending.empty()) {
        std::unique_ptr<XmlNode> node = std::move(pending.back());
        pending.pop_back();
        for (auto &child : node->m_children)
            pending.push_back(std::move(child));
        node->m_children.clear();
    }
}

std::unique_ptr<XmlNode> XmlNode::ParseQuickly(const QByteArray &bytes)
{
    QStringDecoder decoder(QStringDecoder::Utf8, QStringDecoder::Flag::Stateless);
    const QString text = decoder(bytes);
    return decoder.hasError() ? nullptr : QuickReader(text).Read();
}

std::unique_ptr<XmlNode> XmlNode::Parse(const QByteArray &bytes, XmlParseError *error)
{
    if (std::unique_ptr<XmlNode> root = ParseQuickly(bytes))
        return root;
    return ParseFully(bytes, error);
}

std::unique_ptr<XmlNode> XmlNode::ParseFully(const QByteArray &bytes, XmlParseError *error)
{
    QXmlStreamReader reader(bytes);
    reader.setNamespaceProcessing(false);
    std::unique_ptr<XmlNode> root;
    std::vector<XmlNode *> open;
    while (!reader.atEnd()) {
        switch (reader.readNext()) {
        case QXmlStreamReader::StartElement: {
            auto element = std::make_unique<XmlNode>(reader.qualifiedName().toString());
            const QXmlStreamAttributes attributes = reader.attributes();
            for (const QXmlStreamAttribute &attribute : attributes)
                element->m_attributes.append({attribute.qualifiedName().toString(), attribute.value().toString()});
            XmlNode *raw = element.get();
            if (open.empty())
                root = std::move(element);
            else
                open.back()->m_children.push_back(std::move(element));
            open.push_back(raw);
            break;
        }
        case QXmlStreamReader::EndElement:
            if (!open.empty())
                open.pop_back();
            break;
        case QXmlStreamReader::Characters:
            // As the DOM reads it: runs of blanks between elements are no
            // content, a CDATA section always is.
            if (open.empty() || reader.isWhitespace())
                break;
            if (reader.isCDATA()) {
                auto section = std::make_unique<XmlNode>(QString(), CData);
                section->m_value = reader.text().toString();
                open.back()->m_children.push_back(std::move(section));
            } else if (!reader.text().trimmed().isEmpty()) {
                open.back()->AppendText(reader.text().toString());
            }
            break;
        case QXmlStreamReader::Comment:
            if (!open.empty()) {
                auto comment = std::make_unique<XmlNode>(QString(), Comment);
                comment->m_value = reader.text().toString();
                open.back()->m_children.push_back(std::move(comment));
            }
            break;
        case QXmlStreamReader::ProcessingInstruction:
            if (!open.empty()) {
                auto instruction
                    = std::make_unique<XmlNode>(reader.processingInstructionTarget().toString(), ProcessingInstruction);
                instruction->m_value = reader.processingInstructionData().toString();
                open.back()->m_children.push_back(std::move(instruction));
            }
            break;
        case QXmlStreamReader::EntityReference:
            if (!open.empty())
                open.back()->m_children.push_back(std::make_unique<XmlNode>(reader.name().toString(), EntityReference));
            break;
        default:
            break;
        }
    }
    if (reader.hasError() || !root) {
        if (error) {
            error->message = reader.hasError() ? reader.errorString() : QStringLiteral("no root element");
            error->line = int(reader.lineNumber());
            error->column = int(reader.columnNumber());
        }
        return nullptr;
    }
    return root;
}

QString XmlNode::Attribute(const QString &name, const QString &fallback) const
{
    for (const auto &attribute : m_attributes) {
        if (attribute.first == name)
            return attribute.second;
    }
    return fallback;
}

bool XmlNode::HasAttribute(const QString &name) const
{
    return std::any_of(m_attributes.cbegin(), m_attributes.cend(),
                       [&name](const auto &attribute) { return attribute.first == name; });
}

void XmlNode::SetAttribute(const QString &name, const QString &value)
{
    for (auto &attribute : m_attributes) {
        if (attribute.first == name) {
            attribute.second = value;
            return;
        }
    }
    m_attributes.append({name, value});
}

std::vector<XmlNode *> XmlNode::ChildElements() const
{
    std::vector<XmlNode *> elements;
    elements.reserve(m_children.size());
    for (const auto &child : m_children) {
        if (child->IsElement())
            elements.push_back(child.get());
    }
    return elements;
}

XmlNode *XmlNode::FirstChildElement() const
{
    for (const auto &child : m_children) {
        if (child->IsElement())
            return child.get();
    }
    return nullptr;
}

std::unique_ptr<XmlNode> XmlNode::FromDom(const QDomElement &element)
{
    auto node = std::make_unique<XmlNode>(element.tagName());
    const QDomNamedNodeMap attributes = element.attributes();
    for (int i = 0; i < attributes.count(); ++i) {
        const QDomAttr attribute = attributes.item(i).toAttr();
        node->SetAttribute(attribute.name(), attribute.value());
    }
    for (QDomNode child = element.firstChild(); !child.isNull(); child = child.nextSibling()) {
        if (child.isElement()) {
            node->AppendChild(FromDom(child.toElement()));
        } else if (child.isCDATASection()) {
            auto section = std::make_unique<XmlNode>(QString(), CData);
            section->SetValue(child.nodeValue());
            node->AppendChild(std::move(section));
        } else if (child.isText()) {
            node->AppendText(child.nodeValue());
        } else if (child.isComment()) {
            auto comment = std::make_unique<XmlNode>(QString(), Comment);
            comment->SetValue(child.nodeValue());
            node->AppendChild(std::move(comment));
        } else if (child.isProcessingInstruction()) {
            auto instruction = std::make_unique<XmlNode>(child.nodeName(), ProcessingInstruction);
            instruction->SetValue(child.nodeValue());
            node->AppendChild(std::move(instruction));
        }
    }
    return node;
}

void XmlNode::CopyTo(QDomElement &element) const
{
    QDomDocument document = element.ownerDocument();
    for (const auto &attribute : m_attributes)
        element.setAttribute(attribute.first, attribute.second);
    for (const std::unique_ptr<XmlNode> &child : m_children) {
        switch (child->m_kind) {
        case Element: {
            QDomElement copy = document.createElement(child->m_name);
            child->CopyTo(copy);
            element.appendChild(copy);
            break;
        }
        case Text:
            element.appendChild(document.createTextNode(child->m_value));
            break;
        case CData:
            element.appendChild(document.createCDATASection(child->m_value));
            break;
        case Comment:
            element.appendChild(document.createComment(child->m_value));
            break;
        case ProcessingInstruction:
            element.appendChild(document.createProcessingInstruction(child->m_name, child->m_value));
            break;
        case EntityReference:
            element.appendChild(document.createEntityReference(child->m_name));
            break;
        }
    }
}

XmlNode &XmlNode::AppendElement(const QString &name)
{
    return AppendChild(std::make_unique<XmlNode>(name));
}

void XmlNode::AppendText(const QString &text)
{
    if (!m_children.empty() && m_children.back()->m_kind == Text) {
        m_children.back()->m_value += text;
        return;
    }
    auto node = std::make_unique<XmlNode>(QString(), Text);
    node->m_value = text;
    m_children.push_back(std::move(node));
}

XmlNode &XmlNode::AppendChild(std::unique_ptr<XmlNode> child)
{
    m_children.push_back(std::move(child));
    return *m_children.back();
}

void XmlNode::MoveToEnd(const XmlNode *child)
{
    const auto found
        = std::find_if(m_children.begin(), m_children.end(), [child](const auto &node) { return node.get() == child; });
    if (found != m_children.end())
        std::rotate(found, found + 1, m_children.end());
}

QString XmlNode::InnerText() const
{
    QString out;
    CollectText(out);
    return out;
}

int XmlNode::Depth() const
{
    int deepest = 0;
    std::vector<std::pair<const XmlNode *, int>> pending{{this, 1}};
    while (!pending.empty()) {
        const auto [node, level] = pending.back();
        pending.pop_back();
        deepest = std::max(deepest, level);
        for (const auto &child : node->m_children) {
            if (child->IsElement())
                pending.emplace_back(child.get(), level + 1);
        }
    }
    return deepest;
}

void XmlNode::CollectText(QString &out) const
{
    // Iterative, for the same reason as the destructor.
    std::vector<const XmlNode *> pending{this};
    while (!pending.empty()) {
        const XmlNode *node = pending.back();
        pending.pop_back();
        if (node->m_kind == Text || node->m_kind == CData)
            out += node->m_value;
        for (auto it = node->m_children.rbegin(); it != node->m_children.rend(); ++it)
            pending.push_back(it->get());
    }
}
