#pragma once

#include "export.h"
#include "filewriter.h"

#include <QByteArray>
#include <QDomDocument>
#include <QString>

#include <memory>
#include <vector>

class QIODevice;
class XmlNode;

// Serialises DOM documents the same way in every process. Qt keeps
// attributes in a seeded hash, so QDomDocument::toString orders them
// differently from run to run; this writer orders attributes by name, indents
// each level by `indent` blanks and writes exactly the nodes the document
// holds (no XML declaration unless the document has one), except a document
// type declaration: only a flattened device pack keeps one, and the
// device-pack code writes it.
namespace XmlWriter {

HARNESS_EXPORT QString ToString(const QDomNode &node, int indent = 1);

// ToString for 8-bit files: every character outside ASCII in text, CDATA,
// attribute and entity values is written as a character reference, so the
// text reads the same under any encoding its declaration names. Names,
// comments and processing instructions are written as they are.
HARNESS_EXPORT QString ToAsciiString(const QDomNode &node, int indent = 1);

// Text as ToString writes it in character data (attribute false) or in a
// double-quoted attribute or entity value (attribute true).
HARNESS_EXPORT QString Escape(const QString &text, bool attribute, bool ascii);

// The nodes of a map ordered by name: Qt keeps attributes and declarations
// in a seeded hash, so their own order changes from run to run.
HARNESS_EXPORT std::vector<QDomNode> SortedByName(const QDomNamedNodeMap &map);

// UTF-8 bytes of ToString.
HARNESS_EXPORT QByteArray Serialize(const QDomNode &node, int indent = 1);

// A light tree, written exactly as the same tree held in a DOM document
// (the root element on its own, as a document holding just that element).
HARNESS_EXPORT QString ToString(const XmlNode &node, int indent = 1);
HARNESS_EXPORT QByteArray Serialize(const XmlNode &node, int indent = 1);

// Serialize(document) written with FileWriter::Write.
HARNESS_EXPORT bool WriteDocument(const QDomDocument &document, const QString &path, int indent = 1, bool atomic = true,
                                  QString *error = nullptr);
HARNESS_EXPORT bool WriteDocument(const XmlNode &root, const QString &path, int indent = 1, bool atomic = true,
                                  QString *error = nullptr);

// Writes one large document element by element, exactly as ToString would
// write the whole tree, so that it never has to be held as one DOM: each
// piece can be built in a small document of its own and dropped once
// written. Every element given is taken as followed by an element sibling
// (a line end after it); text between the pieces cannot be written.
//
//   XmlWriter::DocumentStream out;
//   out.Open(root);              // "<testkit a=...>" (its children are not written)
//   out.Write(module);           // a whole element, one level deeper
//   out.Close();                 // "</testkit>", or "/>" when nothing was written inside
//   FileWriter::Write(path, out.Finish());
//
// Given a device, the stream passes its text on to it as it goes (UTF-8, in
// pieces of some tens of kilobytes), so the document is never held whole;
// Finish then writes the rest and returns nothing, and Ok tells whether
// every write succeeded.
class HARNESS_EXPORT DocumentStream
{
public:
    explicit DocumentStream(int indent = 1, QIODevice *device = nullptr);
    ~DocumentStream();
    DocumentStream(const DocumentStream &) = delete;
    DocumentStream &operator=(const DocumentStream &) = delete;

    // Starts element (its name and attributes) inside the innermost open one.
    void Open(const QDomElement &element);
    void Open(const XmlNode &element);
    // Writes element with everything below it inside the innermost open one.
    void Write(const QDomElement &element);
    void Write(const XmlNode &element);
    // Ends the innermost open element.
    void Close();
    // Ends every open element and returns the UTF-8 text (what is left of
    // it with a device); the stream is empty afterwards.
    QByteArray Finish();
    // False once writing to the device failed.
    bool Ok() const;

private:
    struct Private;
    std::unique_ptr<Private> d;
};

} // namespace XmlWriter
