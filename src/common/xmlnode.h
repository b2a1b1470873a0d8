#pragma once

#include "export.h"

#include <QByteArray>
#include <QDomElement>
#include <QList>
#include <QPair>
#include <QString>
#include <QVarLengthArray>

#include <memory>
#include <vector>

// Why and where a document could not be parsed: the parser's message and the
// 1-based line and column it stopped at.
struct XmlParseError
{
    QString message;
    int line = 0;
    int column = 0;
};

// A light XML tree for the big documents the library handles by the
// thousand: module descriptions, catalogue caches and processed-results
// files. It holds what those documents are made of (elements, attributes,
// character data, comments, processing instructions) without the DOM's
// per-node cost, reads documents the way QDomDocument::setContent does
// (whitespace-only text is dropped) and is written by XmlWriter exactly as
// the same tree held in a QDomDocument would be.
//
//   XmlParseError error;
//   std::unique_ptr<XmlNode> root = XmlNode::Parse(bytes, &error);
//   for (const XmlNode *child : root->ChildElements())
//       child->Attribute(QStringLiteral("name"));
class HARNESS_EXPORT XmlNode
{
public:
    enum Kind : quint8 { Element, Text, CData, Comment, ProcessingInstruction, EntityReference };

    // An element named name, or a node of another kind whose name is the
    // processing instruction's target or the entity's name.
    explicit XmlNode(const QString &name, Kind kind = Element);
    ~XmlNode();
    XmlNode(const XmlNode &) = delete;
    XmlNode &operator=(const XmlNode &) = delete;

    // Parses a whole document and returns its root element. Everything
    // outside the root element (declaration, document type, comments) is not
    // kept. On malformed input returns null and fills error (when given)
    // with the parser's message and position.
    static std::unique_ptr<XmlNode> Parse(const QByteArray &bytes, XmlParseError *error = nullptr);

    // Parse through QXmlStreamReader alone. Parse gives the same tree faster
    // for plain documents; this is the reference it is held to.
    static std::unique_ptr<XmlNode> ParseFully(const QByteArray &bytes, XmlParseError *error = nullptr);

    // Whether XML 1.0 can carry the character at all.
    static bool IsXmlChar(char32_t c)
    {
        return c == 0x9 || c == 0xA || c == 0xD || (c >= 0x20 && c <= 0xD7FF) || (c >= 0xE000 && c <= 0xFFFD)
            || (c >= 0x10000 && c <= 0x10FFFF);
    }

    Kind NodeKind() const { return m_kind; }
    bool IsElement() const { return m_kind == Element; }
    bool IsTextLike() const { return m_kind == Text || m_kind == CData || m_kind == EntityReference; }
    const QString &Name() const { return m_name; }
    // The characters of text, CDATA and comments, the data of a processing
    // instruction.
    const QString &Value() const { return m_value; }
    void SetValue(const QString &value) { m_value = value; }

    // Attributes by exact name, in the order they were first set. A missing
    // attribute reads as fallback.
    QString Attribute(const QString &name, const QString &fallback = QString()) const;
    bool HasAttribute(const QString &name) const;
    void SetAttribute(const QString &name, const QString &value);
    // Most elements of these documents carry one or two attributes: they are
    // held in the node itself.
    using AttributeList = QVarLengthArray<QPair<QString, QString>, 2>;
    const AttributeList &Attributes() const { return m_attributes; }
    // Replaces every attribute; the names must differ from each other.
    void SetAttributes(const AttributeList &attributes) { m_attributes = attributes; }
    void SetAttributes(AttributeList &&attributes) { m_attributes = std::move(attributes); }

    const std::vector<std::unique_ptr<XmlNode>> &Children() const { return m_children; }
    // The child elements, in document order.
    std::vector<XmlNode *> ChildElements() const;
    // The first child element, or null.
    XmlNode *FirstChildElement() const;
    // Calls visit with every child element, in document order, without
    // building a list.
    template <class Visit> void ForEachChildElement(Visit &&visit) const
    {
        for (const auto &child : m_children) {
            if (child->IsElement())
                visit(*child);
        }
    }

    // Appends a new element and returns it.
    XmlNode &AppendElement(const QString &name);
    // Appends character data; text following text joins it.
    void AppendText(const QString &text);
    XmlNode &AppendChild(std::unique_ptr<XmlNode> child);
    // Moves child (one of this node's children) to the end of the list.
    void MoveToEnd(const XmlNode *child);

    // The text of every text and CDATA node below this one, in document
    // order (QDomElement::text).
    QString InnerText() const;

    // Levels of elements from this one down to its deepest descendant (1
    // for an element without child elements).
    int Depth() const;

    // The DOM element with everything below it as a light tree (entity
    // references and document type nodes are left out).
    static std::unique_ptr<XmlNode> FromDom(const QDomElement &element);
    // Adds this element's attributes and children to element, so that a
    // record written as a light tree can be handed out as DOM.
    void CopyTo(QDomElement &element) const;

private:
    friend class XmlNodeTestAccess;

    // The tree of a plain UTF-8 document read without QXmlStreamReader, or
    // null when the document holds anything the quick reader leaves to it.
    static std::unique_ptr<XmlNode> ParseQuickly(const QByteArray &bytes);
    void CollectText(QString &out) const;

    Kind m_kind;
    QString m_name;
    QString m_value;
    AttributeList m_attributes;
    std::vector<std::unique_ptr<XmlNode>> m_children;
};
