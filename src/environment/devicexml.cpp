#include "environment/devicexml.h"

#include "environment/testdirectories.h"

#include "common/filewriter.h"
#include "common/xmlwriter.h"

#include <QDomDocument>
#include <QFile>
#include <QFileInfo>
#include <QMap>
#include <QRegularExpression>
#include <QSet>
#include <QStringDecoder>
#include <QUuid>

#include <optional>

// Flattening a device pack. Qt's XML readers drop every reference to an
// external entity without leaving a node behind, so before the document is
// parsed each such reference in element content is replaced by a processing
// instruction of a target unique to this call; the expansion then treats that
// instruction as the reference.

namespace {

// How many bytes of the start of a file may hold its XML declaration.
constexpr qsizetype kDeclarationWindow = 1024;

struct Expansion
{
    QDomDocument document;
    QString sourcePath; // the resolved device pack, for relative includes
    QString placeholderTarget; // processing-instruction target standing for a reference
    bool unresolved = false; // some reference could not be replaced by its file
};

bool IsRegularFile(const QString &path)
{
    const QFileInfo info(path);
    return info.exists() && info.isFile();
}

// Reads a whole regular file (never a device or a pipe, which could be endless).
std::optional<QByteArray> ReadRegularFile(const QString &path)
{
    if (!IsRegularFile(path))
        return std::nullopt;
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return std::nullopt;
    QByteArray bytes = file.readAll();
    if (file.error() != QFileDevice::NoError)
        return std::nullopt;
    return bytes;
}

// The text of an XML file, decoded as the XML reader would: a byte order mark
// or the UTF-16/32 shape of a leading '<' first, then the encoding its
// declaration names, else UTF-8.
std::optional<QString> DecodeXml(const QByteArray &bytes)
{
    std::optional<QStringConverter::Encoding> known = QStringConverter::encodingForData(bytes, u'<');
    QStringDecoder decoder;
    if (known) {
        decoder = QStringDecoder(*known);
    } else {
        QByteArray name = "UTF-8";
        const QByteArray head = bytes.left(kDeclarationWindow);
        if (head.startsWith("<?xml")) {
            const qsizetype end = head.indexOf("?>");
            static const QRegularExpression encoding(QStringLiteral("encoding\\s*=\\s*[\"']([A-Za-z0-9._:-]+)[\"']"));
            const QRegularExpressionMatch match
                = encoding.match(QString::fromLatin1(head.left(end < 0 ? head.size() : end)));
            if (match.hasMatch())
                name = match.captured(1).toLatin1();
        }
        decoder = QStringDecoder(name.constData());
    }
    if (!decoder.isValid())
        return std::nullopt;
    QString text = decoder.decode(bytes);
    if (decoder.hasError())
        return std::nullopt;
    return text;
}

// Whether text holds marker at index i.
bool At(const QString &text, qsizetype i, QLatin1String marker)
{
    return QStringView(text).mid(i).startsWith(marker);
}

// Index of the first occurrence of marker at or after from, or n when none.
qsizetype Find(const QString &text, QLatin1String marker, qsizetype from)
{
    const qsizetype at = text.indexOf(marker, from);
    return at < 0 ? text.size() : at;
}

// Index past the closing quote when a quoted literal starts at i, else i.
qsizetype SkipLiteral(const QString &text, qsizetype i)
{
    const QChar c = text.at(i);
    if (c != QLatin1Char('"') && c != QLatin1Char('\''))
        return i;
    const qsizetype close = text.indexOf(c, i + 1);
    return close < 0 ? text.size() : close + 1;
}

// Index just past the document type declaration, or -1 when the prolog has
// none (or is not one we can follow).
qsizetype EndOfDocumentType(const QString &text)
{
    const qsizetype n = text.size();
    qsizetype i = 0;
    if (i < n && text.at(i) == QChar(0xFEFF))
        ++i;
    while (i < n) {
        if (text.at(i).isSpace()) {
            ++i;
        } else if (At(text, i, QLatin1String("<?"))) {
            i = Find(text, QLatin1String("?>"), i + 2) + 2;
        } else if (At(text, i, QLatin1String("<!--"))) {
            i = Find(text, QLatin1String("-->"), i + 4) + 3;
        } else if (At(text, i, QLatin1String("<!DOCTYPE"))) {
            bool subset = false;
            qsizetype j = i + 9;
            while (j < n) {
                const qsizetype past = SkipLiteral(text, j);
                if (past != j) {
                    j = past;
                } else if (subset && At(text, j, QLatin1String("<!--"))) {
                    j = Find(text, QLatin1String("-->"), j + 4) + 3;
                } else if (subset && At(text, j, QLatin1String("<?"))) {
                    j = Find(text, QLatin1String("?>"), j + 2) + 2;
                } else {
                    const QChar c = text.at(j++);
                    if (c == QLatin1Char('['))
                        subset = true;
                    else if (c == QLatin1Char(']'))
                        subset = false;
                    else if (c == QLatin1Char('>') && !subset)
                        return j;
                }
            }
            return -1;
        } else {
            return -1;
        }
    }
    return -1;
}

bool EndsReferenceName(QChar c)
{
    return c.isSpace() || c == QLatin1Char('<') || c == QLatin1Char('&') || c == QLatin1Char(';');
}

// Copies text from the end of the document type declaration on, replacing
// each reference "&name;" to one of the given entities in character data by
// "<?target name?>". Markup, comments, sections and instructions are copied
// untouched (references cannot stand in attribute values anyway).
QString MarkReferences(const QString &text, qsizetype from, const QSet<QString> &entities, const QString &target)
{
    const qsizetype n = text.size();
    QString out;
    out.reserve(n + n / 8);
    out += QStringView(text).left(from);
    qsizetype i = from;
    auto copyThrough = [&](QLatin1String end, qsizetype searchFrom) {
        const qsizetype stop = std::min(n, Find(text, end, searchFrom) + end.size());
        out += QStringView(text).mid(i, stop - i);
        i = stop;
    };
    while (i < n) {
        const QChar c = text.at(i);
        if (c == QLatin1Char('<')) {
            if (At(text, i, QLatin1String("<!--"))) {
                copyThrough(QLatin1String("-->"), i + 4);
            } else if (At(text, i, QLatin1String("<![CDATA["))) {
                copyThrough(QLatin1String("]]>"), i + 9);
            } else if (At(text, i, QLatin1String("<?"))) {
                copyThrough(QLatin1String("?>"), i + 2);
            } else {
                // A tag: up to its '>' outside quoted attribute values.
                qsizetype j = i + 1;
                while (j < n && text.at(j) != QLatin1Char('>')) {
                    const qsizetype past = SkipLiteral(text, j);
                    j = past != j ? past : j + 1;
                }
                const qsizetype stop = std::min(n, j + 1);
                out += QStringView(text).mid(i, stop - i);
                i = stop;
            }
        } else if (c == QLatin1Char('&')) {
            qsizetype j = i + 1;
            while (j < n && !EndsReferenceName(text.at(j)))
                ++j;
            const QString name = text.mid(i + 1, j - i - 1);
            if (j < n && text.at(j) == QLatin1Char(';') && entities.contains(name)) {
                out += QLatin1String("<?") + target + QLatin1Char(' ') + name + QLatin1String("?>");
                i = j + 1;
            } else {
                out += c;
                ++i;
            }
        } else {
            const qsizetype stop = std::min(Find(text, QLatin1String("<"), i), Find(text, QLatin1String("&"), i));
            out += QStringView(text).mid(i, stop - i);
            i = stop;
        }
    }
    return out;
}

// The declared entities that stand for other files (parsed external
// entities: a system or public identifier and no notation).
QSet<QString> ExternalEntities(const QDomDocument &document)
{
    QSet<QString> names;
    const QDomNamedNodeMap entities = document.doctype().entities();
    for (int i = 0; i < entities.count(); ++i) {
        const QDomEntity entity = entities.item(i).toEntity();
        if ((!entity.systemId().isEmpty() || !entity.publicId().isEmpty()) && entity.notationName().isEmpty())
            names.insert(entity.nodeName());
    }
    return names;
}

// Parses the device pack, keeping a placeholder for every reference to an
// external entity. The document must parse as it is; when the placeholders
// cannot be set (an encoding we cannot decode), the references are lost as
// the reader drops them.
bool ParseDevicePack(const QByteArray &bytes, Expansion &expansion)
{
    QDomDocument plain;
    if (!plain.setContent(bytes, false))
        return false;
    expansion.document = plain;

    const QSet<QString> entities = ExternalEntities(plain);
    if (entities.isEmpty())
        return true;
    const std::optional<QString> text = DecodeXml(bytes);
    if (!text)
        return true;
    const qsizetype body = EndOfDocumentType(*text);
    if (body < 0)
        return true;

    expansion.placeholderTarget = QStringLiteral("harness-entity-") + QUuid::createUuid().toString(QUuid::Id128);
    QDomDocument marked;
    if (marked.setContent(MarkReferences(*text, body, entities, expansion.placeholderTarget), false))
        expansion.document = marked;
    return true;
}

// The name of the entity a node refers to, or empty when it is no reference.
QString ReferenceName(const QDomNode &node, const Expansion &expansion)
{
    if (node.isEntityReference())
        return node.nodeName();
    if (node.isProcessingInstruction() && !expansion.placeholderTarget.isEmpty()) {
        const QDomProcessingInstruction pi = node.toProcessingInstruction();
        if (pi.target() == expansion.placeholderTarget)
            return pi.data().trimmed();
    }
    return QString();
}

// Inserts the content of the file behind the named entity before node.
// False when no declared entity of that name leads to a readable XML file.
bool InsertEntityContent(const QString &name, QDomNode &node, Expansion &expansion)
{
    bool inserted = false;
    const QDomNamedNodeMap entities = expansion.document.doctype().entities();
    for (int i = 0; i < entities.count(); ++i) {
        const QDomEntity entity = entities.item(i).toEntity();
        if (entity.nodeName() != name)
            continue;
        const QString identifier = entity.systemId().isEmpty() ? entity.publicId() : entity.systemId();
        if (identifier.isEmpty())
            continue;
        const QString path = ResolveXmlPath(identifier, expansion.sourcePath);
        if (path.isEmpty())
            continue;
        const std::optional<QByteArray> bytes = ReadRegularFile(path);
        QDomDocument include;
        if (!bytes || !include.setContent(*bytes, false))
            continue;
        const QDomElement root = include.documentElement();
        if (root.isNull())
            continue;
        // The included file's root wraps the content: all of its children
        // are taken, in order.
        QDomNode parent = node.parentNode();
        for (QDomNode child = root.firstChild(); !child.isNull(); child = child.nextSibling())
            parent.insertBefore(expansion.document.importNode(child, true), node);
        inserted = true;
    }
    return inserted;
}

// Expands the references below node; true when node itself is a reference
// that was replaced and is to be removed.
bool ExpandNode(QDomNode node, Expansion &expansion)
{
    if (node.isElement()) {
        QDomNode child = node.firstChild();
        while (!child.isNull()) {
            const QDomNode next = child.nextSibling();
            if (ExpandNode(child, expansion))
                node.removeChild(child);
            child = next;
        }
        return false;
    }

    const QString name = ReferenceName(node, expansion);
    if (name.isEmpty())
        return false;
    if (InsertEntityContent(name, node, expansion))
        return true;

    // Kept: a placeholder goes back to being the reference it stood for.
    expansion.unresolved = true;
    if (node.isProcessingInstruction())
        node.parentNode().replaceChild(expansion.document.createEntityReference(name), node);
    return false;
}

void ExpandDocument(Expansion &expansion)
{
    QDomNode node = expansion.document.firstChild();
    while (!node.isNull()) {
        const QDomNode next = node.nextSibling();
        if (ExpandNode(node, expansion))
            expansion.document.removeChild(node);
        node = next;
    }
}

// Sections of the same name under the root are merged into the first one:
// the later ones' children follow its own, in document order.
void MergeDuplicateSections(QDomDocument &document)
{
    QDomElement root = document.documentElement();
    QMap<QString, QDomElement> firstByName;
    QDomNode node = root.firstChild();
    while (!node.isNull()) {
        const QDomNode next = node.nextSibling();
        if (node.isElement()) {
            const QDomElement section = node.toElement();
            const auto found = firstByName.constFind(section.tagName());
            if (found == firstByName.constEnd()) {
                firstByName.insert(section.tagName(), section);
            } else {
                QDomElement first = found.value();
                QDomNode anchor;
                QDomNode child = section.lastChild();
                while (!child.isNull()) {
                    const QDomNode previous = child.previousSibling();
                    anchor = anchor.isNull() ? first.appendChild(child) : first.insertBefore(child, anchor);
                    child = previous;
                }
                root.removeChild(node);
            }
        }
        node = next;
    }
}

QString Quoted(const QString &value)
{
    const QChar quote = value.contains(QLatin1Char('"')) ? QLatin1Char('\'') : QLatin1Char('"');
    return quote + value + quote;
}

QString ExternalId(const QString &publicId, const QString &systemId)
{
    if (!publicId.isEmpty())
        return QLatin1String("PUBLIC ") + Quoted(publicId)
            + (systemId.isEmpty() ? QString() : QLatin1Char(' ') + Quoted(systemId));
    return QLatin1String("SYSTEM ") + Quoted(systemId);
}

// A document type declaration on lines of its own, its entities and
// notations in name order, every character beyond ASCII as a reference.
QString DocumentTypeText(const QDomDocumentType &type)
{
    QString text = QLatin1String("<!DOCTYPE ") + type.name();
    if (!type.publicId().isEmpty() || !type.systemId().isEmpty())
        text += QLatin1Char(' ') + ExternalId(type.publicId(), type.systemId());
    const QDomNamedNodeMap entities = type.entities();
    const QDomNamedNodeMap notations = type.notations();
    if (entities.count() > 0 || notations.count() > 0) {
        text += QLatin1String(" [\n");
        for (const QDomNode &node : XmlWriter::SortedByName(entities)) {
            const QDomEntity entity = node.toEntity();
            QString name = entity.nodeName();
            if (name.startsWith(QLatin1Char('%')))
                name = QLatin1String("% ") + name.mid(1);
            text += QLatin1String("<!ENTITY ") + name + QLatin1Char(' ');
            if (entity.systemId().isEmpty() && entity.publicId().isEmpty()) {
                text += QLatin1Char('"') + XmlWriter::Escape(entity.nodeValue(), true, true) + QLatin1Char('"');
            } else {
                text += ExternalId(entity.publicId(), entity.systemId());
                if (!entity.notationName().isEmpty())
                    text += QLatin1String(" NDATA ") + entity.notationName();
            }
            text += QLatin1String(">\n");
        }
        for (const QDomNode &notation : XmlWriter::SortedByName(notations))
            text += QLatin1String("<!NOTATION ") + notation.nodeName() + QLatin1Char(' ')
                + ExternalId(notation.toNotation().publicId(), notation.toNotation().systemId()) + QLatin1String(">\n");
        text += QLatin1Char(']');
    }
    return text + QLatin1String(">\n");
}

// The document as 8-bit-safe text, its document type declaration after the
// XML declaration and before everything else. A declaration with an internal
// subset that follows other markup (the XML declaration) is dropped, unless a
// reference it declares is still in the document.
QString SerializeFlattened(const Expansion &expansion)
{
    QString text = XmlWriter::ToAsciiString(expansion.document, 1);
    const QDomDocumentType type = expansion.document.doctype();
    if (type.isNull() || type.name().isEmpty())
        return text;
    const QDomNode first = expansion.document.firstChild();
    const bool afterDeclaration
        = first.isProcessingInstruction() && first.toProcessingInstruction().target() == QLatin1String("xml");
    const qsizetype at = afterDeclaration ? text.indexOf(QLatin1Char('\n')) + 1 : 0;
    const QString declaration = DocumentTypeText(type);
    if (!expansion.unresolved && at >= 1 && declaration.contains(QLatin1String("]>")))
        return text;
    text.insert(at, declaration);
    return text;
}

} // namespace

bool FlattenDeviceXml(const QString &source, const QString &destination)
{
    Expansion expansion;
    expansion.sourcePath = ResolveXmlPath(source, QString());
    if (expansion.sourcePath.isEmpty())
        return false;
    const std::optional<QByteArray> bytes = ReadRegularFile(expansion.sourcePath);
    if (!bytes || !ParseDevicePack(*bytes, expansion))
        return false;

    ExpandDocument(expansion);
    MergeDuplicateSections(expansion.document);
    return FileWriter::Write(destination, SerializeFlattened(expansion).toLatin1(), true);
}
