#include "catalogue/testcase.h"

TestCase::TestCase() = default;
TestCase::TestCase(const QString &name, const QString &type) : name(name), type(type) {}
TestCase::TestCase(const TestCase &other) = default;
TestCase &TestCase::operator=(const TestCase &other) = default;
TestCase::~TestCase() = default;

bool TestCase::ReadFromXML(const QDomElement &element)
{
    name = element.attribute(QStringLiteral("name"));
    type = element.attribute(QStringLiteral("type"));
    return true;
}

void TestCase::WriteToXML(QDomElement &element)
{
    element.setAttribute(QStringLiteral("name"), name);
    element.setAttribute(QStringLiteral("type"), type);
}
