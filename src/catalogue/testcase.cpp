#include "catalogue/testcase.h"

#include "common/xmlnode.h"

TestCase::TestCase() = default;
TestCase::TestCase(const QString &name, const QString &type) : name(name), type(type)
{
}
TestCase::TestCase(const TestCase &other) = default;
TestCase &TestCase::operator=(const TestCase &other) = default;
TestCase::~TestCase() = default;

bool TestCase::ReadFromXML(const QDomElement &element)
{
    return ReadFromXML(*XmlNode::FromDom(element));
}

bool TestCase::ReadFromXML(const XmlNode &element)
{
    name = element.Attribute(QStringLiteral("name"));
    type = element.Attribute(QStringLiteral("type"));
    return true;
}

void TestCase::WriteToXML(QDomElement &element)
{
    XmlNode node(element.tagName());
    WriteToXML(node);
    node.CopyTo(element);
}

void TestCase::WriteToXML(XmlNode &element)
{
    element.SetAttribute(QStringLiteral("name"), name);
    element.SetAttribute(QStringLiteral("type"), type);
}
