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
    TestCase(const QString &name, const QString &type);
    TestCase(const TestCase &other);
    TestCase &operator=(const TestCase &other);
    virtual ~TestCase();

    // Reads "name" and "type" (missing ones read as empty); always true.
    virtual bool ReadFromXML(const QDomElement &element);
    bool ReadFromXML(const XmlNode &element);
    virtual void WriteToXML(QDomElement &element);
    void WriteToXML(XmlNode &element);

    QString name;
    QString type;
};
