#pragma once

#include "../common/export.h"

#include <QByteArray>
#include <QDomElement>
#include <QList>
#include <QObject>
#include <QVariant>

#include <memory>

class XmlNode;

// One system resource (resource type 0x6000): a key and the fields of its
// type, decoded into named properties. The block is little-endian: keysize
// (16 bits), type (32 bits), the key, then the fields of the type. Property
// names are the ones stored in manifests and are kept as they stand
// ("Privildedge Index" included).
//
// Copies carry type, keysize, data and every property; each record owns its
// own properties object.
struct HARNESS_EXPORT SysResource
{
    // Program records.
    static constexpr quint32 kTypeProgram = 0x0102C305;
    // Program records of the second kind, decoded as kTypeProgram.
    static constexpr quint32 kTypeProgramAlt = 0x0102FAF7;
    // Records whose key names a program ("a:b:<program name>").
    static constexpr quint32 kTypeKeyedProgram = 0x01010100;
    // A key of exactly this many bytes is a number, any other is text.
    static constexpr int kNumericKeySize = 4;

    SysResource();
    virtual ~SysResource();
    // Copies type, keysize, data and every property into a properties object of its own.
    SysResource(const SysResource &other);
    // Replaces type, keysize, data and the properties by copies of other's.
    SysResource &operator=(const SysResource &other);

    // Reads the record from an element written by WriteToXML: attributes
    // "type" and "keysize" (decimal), children "data" and "properties" with
    // "property" elements ("name", "value"). Property values come back as
    // byte arrays; data comes back empty.
    virtual void ReadFromXML(const QDomElement &element);
    // The same, from an XmlNode.
    void ReadFromXML(const XmlNode &element);
    // Writes "type", "keysize", an empty "data" child when data is not empty
    // and a "properties" child when there is at least one property (holding
    // the properties whose text is not empty).
    virtual void WriteToXML(QDomElement &element);
    // The same, into an XmlNode.
    void WriteToXML(XmlNode &element);

    // Type and keysize 0, no properties (data is kept).
    void Reset();
    // Decodes data (keysize, type, key, fields) into the record. Values past
    // the end of the block read as 0; byte fields take only the bytes there.
    void Decode();

    // The property called name; an invalid QVariant when there is none.
    QVariant Property(const char *name) const;
    // Sets the property called name, adding it when new; an invalid value removes it.
    void SetProperty(const char *name, const QVariant &value);
    // Names of the properties, in the order they were set.
    QList<QByteArray> PropertyNames() const;
    // True for a program record (kTypeProgram or kTypeProgramAlt).
    bool IsProgram() const { return type == kTypeProgram || type == kTypeProgramAlt; }

    // Length of the key in bytes: kNumericKeySize for a numeric key, 0 for none.
    quint16 keysize = 0;
    // The record's type (kTypeProgram, kTypeKeyedProgram, ...); 0 when unknown.
    quint32 type = 0;
    // The record's block as stored, which Decode reads; a manifest does not keep it.
    QByteArray data;
    // Holds the properties as dynamic properties of a QObject; never null.
    std::unique_ptr<QObject> properties;
};
