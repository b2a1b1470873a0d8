#include "environment/testdirectories.h"

bool FlattenDeviceXml(const QString &source, const QString &destination)
{
    Q_UNUSED(source);
    Q_UNUSED(destination);
    return false;
}
