#include "common/stringhash.h"

unsigned int StringHash(const QString &text)
{
    unsigned int h = 0;
    for (const QChar c : text) {
        h = (h << 4) + c.unicode();
        h ^= (h & 0xF0000000u) >> 23;
        h &= 0x0FFFFFFFu;
    }
    return h;
}

QString StringHashName(const QString &text)
{
    return QLatin1Char('#') + QString::number(StringHash(text));
}
