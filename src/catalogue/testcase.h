#pragma once

#include "../common/export.h"

#include <QDomElement>

class XmlNode;
#include <QString>

// One named case inside a test module.
class HARNESS_EXPORT TestCase
{
public:
    TestCase();
    // A case with the given name and type.
    TestCase(const QString &name, const QString &type);
    // Copies name and type.
    TestCase(const TestCase &other);
    // Copies name and type.
    TestCase &operator=(const TestCase &other);
    virtual ~TestCase();

    // Reads "name" and "type" (missing ones read as empty); always true.
    virtual bool ReadFromXML(const QDomElement &element);
    // The same, from an XmlNode.
    bool ReadFromXML(const XmlNode &element);
    // Writes the "name" and "type" attributes (even empty ones).
    virtual void WriteToXML(QDomElement &element);
    // The same, into an XmlNode.
    void WriteToXML(XmlNode &element);

    // The case's name; empty when the element had none.
    QString name;
    // The case's type word; empty when the element had none.
    QString type;
};
