#include "catalogue/testcase.h"

#include "common/xmlnode.h"

TestCase::TestCase() = default;
TestCase::TestCase(const QString &name, const QString &type) : name(name), type(type) {}
TestCase::TestCase(const TestCase &other) = default;
TestCase &TestCase::operator=(const TestCase &other) = default;
TestCase::~TestCase() = default;

namespace {

template <class Element>
void ReadCase(TestCase &testCase, const Element &element)
{
    testCase.name = XmlRead::Attribute(element, QStringLiteral("name"));
    testCase.type = XmlRead::Attribute(element, QStringLiteral("type"));
}

} // namespace

bool TestCase::ReadFromXML(const QDomElement &element)
{
    ReadCase(*this, element);
    return true;
}

bool TestCase::ReadFromXML(const XmlNode &element)
{
    ReadCase(*this, element);
    return true;
}

namespace {

template <class Element>
void WriteCase(const TestCase &testCase, Element &element)
{
    XmlBuild::SetAttribute(element, QStringLiteral("name"), testCase.name);
    XmlBuild::SetAttribute(element, QStringLiteral("type"), testCase.type);
}

} // namespace

void TestCase::WriteToXML(QDomElement &element)
{
    WriteCase(*this, element);
}

void TestCase::WriteToXML(XmlNode &element)
{
    WriteCase(*this, element);
}
