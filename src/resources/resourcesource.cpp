#include "resources/resourcesource.h"

#include "common/filewriter.h"
#include "encoding/qencoding.h"
#include "resources/kestoresources.h"

#include <QDir>
#include <QDomDocument>
#include <QFile>
#include <QFileInfo>
#include <QSet>

namespace {

constexpr quint16 kWholeDocumentType = 0x7000;

bool ReadNumber(const QDomElement &element, const char *attribute, quint16 fallback, bool required, quint16 &value,
                QString *error)
{
    const QString text = element.attribute(QLatin1String(attribute)).trimmed();
    if (text.isEmpty()) {
        if (required) {
            *error = QStringLiteral("line %1: <%2> needs %3")
                         .arg(element.lineNumber())
                         .arg(element.tagName(), QLatin1String(attribute));
            return false;
        }
        value = fallback;
        return true;
    }
    bool ok = false;
    const uint number = text.startsWith(QLatin1String("0x"), Qt::CaseInsensitive) ? text.mid(2).toUInt(&ok, 16)
                                                                                  : text.toUInt(&ok, 10);
    if (!ok || number > 0xFFFF) {
        *error = QStringLiteral("line %1: bad %2 \"%3\"").arg(element.lineNumber()).arg(QLatin1String(attribute), text);
        return false;
    }
    value = quint16(number);
    return true;
}

bool ReadFormat(const QDomElement &element, quint16 &format, QString *error)
{
    const QString text = element.attribute(QStringLiteral("format"), QStringLiteral("0")).trimmed();
    bool number = false;
    const uint value = text.toUInt(&number);
    if (number && value <= 6) {
        format = quint16(value);
        return true;
    }
    const KestoEncodingFormat named = QEncoding::Name2Format(text);
    if (!number && named != ENCODING_NONE) {
        format = quint16(named);
        return true;
    }
    *error = QStringLiteral("line %1: unknown format \"%2\"").arg(element.lineNumber()).arg(text);
    return false;
}

// Each type and ID names one resource; a second one would silently replace
// the first.
bool Claim(QSet<quint32> &seen, quint16 type, quint16 id, const QDomElement &element, QString *error)
{
    if (!seen.contains(quint32(type) << 16 | id)) {
        seen.insert(quint32(type) << 16 | id);
        return true;
    }
    *error = QStringLiteral("line %1: duplicate resource ID %2 of type 0x%3")
                 .arg(QString::number(element.lineNumber()), QString::number(id), QString::number(type, 16));
    return false;
}

bool CompileElement(KestoResources &resources, const QDomElement &element, const QDir &base, QString *error,
                    QStringList *lost, QSet<quint32> &seen)
{
    const QString kind = element.tagName().toLower();
    quint16 id = 0;
    quint16 type = 0;
    if (kind == QLatin1String("string")) {
        quint16 format = 0;
        if (!ReadNumber(element, "type", KestoResources::kTypeStrings, false, type, error)
            || !ReadNumber(element, "id", 0, true, id, error) || !ReadFormat(element, format, error)
            || !Claim(seen, type, id, element, error))
            return false;
        if (lost) {
            for (const LostCharacter &character : LostCharacters(element.text(), KestoEncodingFormat(format)))
                lost->append(
                    QStringLiteral("line %1, string %2: %3")
                        .arg(QString::number(element.lineNumber()), QString::number(id), character.Describe()));
        }
        return resources.AddString(type, id, format, element.text());
    }
    if (kind == QLatin1String("object")) {
        if (!ReadNumber(element, "type", KestoResources::kTypeObjects, false, type, error)
            || !ReadNumber(element, "id", 0, true, id, error) || !Claim(seen, type, id, element, error))
            return false;
        if (!resources.AddMimeObject(type, id, element.attribute(QStringLiteral("mime")), element.text().toUtf8())) {
            *error = QStringLiteral("line %1: MIME type too long").arg(element.lineNumber());
            return false;
        }
        return true;
    }
    if (kind == QLatin1String("binary")) {
        if (!ReadNumber(element, "type", 0, true, type, error) || !ReadNumber(element, "id", 0, true, id, error)
            || !Claim(seen, type, id, element, error))
            return false;
        QByteArray data;
        if (element.hasAttribute(QStringLiteral("file"))) {
            QFile file(base.filePath(element.attribute(QStringLiteral("file"))));
            if (!file.open(QIODevice::ReadOnly)) {
                *error = QStringLiteral("line %1: cannot read %2").arg(element.lineNumber()).arg(file.fileName());
                return false;
            }
            data = file.readAll();
        } else {
            const QByteArray hex = element.attribute(QStringLiteral("hex")).toLatin1().replace(' ', "");
            if (hex.size() % 2 != 0 || QByteArray::fromHex(hex).size() * 2 != hex.size()) {
                *error = QStringLiteral("line %1: bad hex bytes").arg(element.lineNumber());
                return false;
            }
            data = QByteArray::fromHex(hex);
        }
        return resources.AddBinary(type, id, data);
    }
    *error = QStringLiteral("line %1: unknown element <%2>").arg(element.lineNumber()).arg(element.tagName());
    return false;
}

} // namespace

bool CompileResourceSource(const QString &source, const QString &output, QString *error)
{
    return CompileResourceSource(source, output, error, nullptr);
}

bool CompileResourceSource(const QString &source, const QString &output, QString *error, QStringList *lost)
{
    QFile file(source);
    if (!file.open(QIODevice::ReadOnly)) {
        *error = QStringLiteral("cannot read %1").arg(source);
        return false;
    }
    const QByteArray bytes = file.readAll();
    QDomDocument document;
    QString message;
    int line = 0;
    if (!document.setContent(bytes, &message, &line)) {
        *error = QStringLiteral("%1 is not XML: %2 (line %3)").arg(source, message).arg(line);
        return false;
    }
    KestoResources resources;
    const QDomElement root = document.documentElement();
    if (root.tagName().toLower() == QLatin1String("resources")) {
        const QDir base = QFileInfo(source).absoluteDir();
        QSet<quint32> seen;
        for (QDomElement element = root.firstChildElement(); !element.isNull();
             element = element.nextSiblingElement()) {
            if (!CompileElement(resources, element, base, error, lost, seen)) {
                *error = source + QStringLiteral(": ") + *error;
                return false;
            }
        }
    } else {
        resources.AddBinary(kWholeDocumentType, 1, bytes);
    }
    if (lost && !lost->isEmpty()) {
        *error = QStringLiteral("%1: text the string formats cannot hold").arg(source);
        return false;
    }
    QByteArray compiled;
    QString reason;
    if (!resources.SaveTo(compiled) || !FileWriter::Write(output, compiled, true, &reason)) {
        *error = QStringLiteral("cannot write %1 (%2)")
                     .arg(output, reason.isEmpty() ? QStringLiteral("the resources could not be serialised") : reason);
        return false;
    }
    return true;
}
