#include "resources/kestoresources.h"

#include "encoding/qencoding.h"
#include "resources/blockreader.h"

#include <QDateTime>
#include <QRandomGenerator>

#include <cmath>
#include <cstring>

namespace {

// Module-information blocks of type 0x5000.
constexpr quint16 kMifHeaderId = 0;
constexpr quint16 kMifClassesId = 1;
constexpr quint16 kMifAppletsId = 2;
constexpr quint16 kMifExternalClassesId = 3;
constexpr quint16 kMifNotificationsId = 4;
constexpr quint16 kMifMimeTypesId = 5;

constexpr int kMifHeaderSize = 40;
constexpr int kAppletSize = 20;
constexpr int kNotifierSize = 12;
constexpr int kMimeTypeFixedSize = 8;

// Well-known strings of type 1.
constexpr quint16 kCompanyNameId = 6;
constexpr quint16 kCopyrightId = 7;
constexpr quint16 kApplicationVersionId = 8;

constexpr int kMaxMimeTypeLength = 128;

} // namespace

KestoResources::KestoResources() : m_stream(std::make_unique<ResourceStream>())
{
}

KestoResources::~KestoResources() = default;

KestoResources::KestoResources(const KestoResources &other)
    : m_stream(std::make_unique<ResourceStream>(*other.m_stream)), m_lastError(other.m_lastError)
{
}

KestoResources &KestoResources::operator=(const KestoResources &other)
{
    if (this != &other) {
        m_stream = std::make_unique<ResourceStream>(*other.m_stream);
        m_lastError = other.m_lastError;
    }
    return *this;
}

bool KestoResources::Read(const QString &path)
{
    return m_stream && m_stream->Load(path);
}

bool KestoResources::Write(const QString &path)
{
    return m_stream && m_stream->Save(path);
}

bool KestoResources::LoadFrom(const QByteArray &bytes)
{
    return m_stream && m_stream->LoadFrom(bytes);
}

bool KestoResources::SaveTo(QByteArray &bytes)
{
    return m_stream && m_stream->SaveTo(bytes);
}

QString KestoResources::LastError()
{
    QString error;
    error.swap(m_lastError);
    return error;
}

unsigned int KestoResources::GetResourceTypes(QVector<quint16> &types)
{
    types.clear();
    return m_stream ? m_stream->GetResourceTypes(types) : 0;
}

unsigned int KestoResources::GetIDs(quint16 type, QVector<quint16> &ids)
{
    ids.clear();
    return m_stream ? m_stream->GetResourceIDs(type, ids) : 0;
}

void KestoResources::Clear(quint16 type, quint16 id)
{
    if (m_stream)
        m_stream->DeleteResource(type, id);
}

void KestoResources::ClearAll()
{
    if (m_stream)
        m_stream->Clear();
}

bool KestoResources::AddString(quint16 type, quint16 id, quint16 format, const QString &text)
{
    if (!m_stream)
        return false;
    const auto encoding = static_cast<KestoEncodingFormat>(format);
    QByteArray block;
    if (encoding == ENCODING_UNICODE) {
        block = QEncoding::GetBOM(encoding);
        for (QChar unit : text) {
            block.append(char(unit.unicode() & 0xFF));
            block.append(char(unit.unicode() >> 8));
        }
    } else {
        QEncoding *encoder = nullptr;
        if (CreateEncoder(encoding, &encoder)) {
            QByteArray bytes;
            encoder->FromUnicode(text, bytes);
            block = QEncoding::GetBOM(encoding) + bytes;
        }
        FreeEncoder(encoder);
    }
    m_stream->AddResource(type, id, block);
    return true;
}

bool KestoResources::GetString(quint16 type, quint16 id, quint16 *format, QString &text)
{
    if (!m_stream)
        return false;
    const QByteArray block = m_stream->GetResource(type, id);
    if (block.isEmpty())
        return false;
    QEncoding *encoder = nullptr;
    KestoEncodingFormat detected = ENCODING_NONE;
    if (!CreateEncoder(block, &encoder, detected)) {
        FreeEncoder(encoder);
        return false;
    }
    if (encoder) {
        // The converters decode every byte they are given, so the mark is
        // left out (the ISO Latin-1 converter removes its own). The NUL added
        // ends the text where the block ends.
        QByteArray payload = detected == ENCODING_ISOLATIN1 ? block : block.mid(QEncoding::BOMSize(detected));
        payload.append('\0');
        QString decoded;
        encoder->ToUnicode(payload, decoded);
        FreeEncoder(encoder);
        if (format)
            *format = quint16(detected);
        text = decoded;
        return true;
    }
    if (detected == ENCODING_UNICODE) {
        const int markSize = int(QEncoding::BOMSize(ENCODING_UNICODE));
        const int units = (block.size() - markSize) / 2;
        QString decoded(units, Qt::Uninitialized);
        const auto *bytes = reinterpret_cast<const uchar *>(block.constData()) + markSize;
        for (int i = 0; i < units; ++i)
            decoded[i] = QChar(char16_t(bytes[2 * i] | (bytes[2 * i + 1] << 8)));
        if (format)
            *format = quint16(ENCODING_UNICODE);
        text = decoded;
        return true;
    }
    return false;
}

bool KestoResources::AddMimeObject(quint16 type, quint16 id, const QString &mimeType, const QByteArray &data)
{
    if (!m_stream)
        return false;
    const QByteArray name = mimeType.toLatin1();
    if (name.size() > kMaxMimeTypeLength)
        return false;
    QByteArray block;
    block.reserve(name.size() + 4 + data.size());
    block.append(char(name.size() + 1));
    block.append('\0');
    block.append(name);
    block.append('\0');
    block.append('\0');
    block.append(data);
    m_stream->AddResource(type, id, block);
    return true;
}

bool KestoResources::GetMimeObject(quint16 type, quint16 id, QString &mimeType, QByteArray &data)
{
    if (!m_stream)
        return false;
    const QByteArray block = m_stream->GetResource(type, id);
    if (block.size() < 2)
        return false;
    const int count = quint8(block.at(0));
    // Count byte, ignored byte, the MIME type's bytes, ignored byte.
    if (block.size() < 2 + count + 1)
        return false;
    const QByteArray name = block.mid(2, count);
    const int nul = name.indexOf('\0');
    mimeType = QString::fromLatin1(nul < 0 ? name : name.left(nul));
    data = block.mid(2 + count + 1);
    return true;
}

bool KestoResources::AddBinary(quint16 type, quint16 id, const QByteArray &data)
{
    if (!m_stream)
        return false;
    m_stream->AddResource(type, id, data);
    return true;
}

bool KestoResources::GetBinary(quint16 type, quint16 id, QByteArray &data)
{
    if (!m_stream)
        return false;
    data = m_stream->GetResource(type, id);
    return !data.isEmpty();
}

unsigned int KestoResources::GetFormats(QList<QPair<unsigned int, QString>> &formats)
{
    formats.clear();
    QList<KestoEncodingFormat> values;
    QEncoding::EncodingFormats(values);
    for (KestoEncodingFormat value : std::as_const(values))
        formats.append(qMakePair(unsigned(value), QEncoding::Format2Name(value)));
    return unsigned(formats.size());
}

QString KestoResources::GetFormatName(quint16 format)
{
    return QEncoding::Format2Name(static_cast<KestoEncodingFormat>(format));
}

QString KestoResources::GetResourceTypeName(quint16 type)
{
    switch (type) {
    case kTypeStrings:
        return QStringLiteral("Strings");
    case kTypeObjects:
        return QStringLiteral("Objects");
    case kTypeBinaries:
        return QStringLiteral("Binaries");
    case kTypeSysResource:
        return QStringLiteral("Sys Resource");
    case kTypeGrantedPrivileges:
        return QStringLiteral("Granted Priviledges");
    case kTypeRequiredPrivileges:
        return QStringLiteral("Required Priviledges");
    case kTypePrivilegeData:
        return QStringLiteral("Priviledge Data");
    default:
        return QStringLiteral("Type: %1 (0x%2)").arg(type).arg(type, 4, 16, QLatin1Char('0'));
    }
}

QString KestoResources::GetWellKnownString(quint16 id)
{
    quint16 format = 0;
    QString text;
    if (!GetString(kTypeStrings, id, &format, text))
        return QString();
    return text;
}

QString KestoResources::GetCompanyName()
{
    return GetWellKnownString(kCompanyNameId);
}

QString KestoResources::GetCopyright()
{
    return GetWellKnownString(kCopyrightId);
}

QString KestoResources::GetApplicationVersion()
{
    return GetWellKnownString(kApplicationVersionId);
}

unsigned int KestoResources::GenerateLocalClassID()
{
    QRandomGenerator generator{quint32(QDateTime::currentSecsSinceEpoch())};
    const quint32 value = generator.bounded(32768u);
    return unsigned(std::floor(value / 32767.0 * 16777216.0));
}

bool KestoResources::ResourceHeader(quint8 &fileType, quint16 &version, quint16 &oldestCodeVersion, quint16 &mapEntries,
                                    quint32 &offsetToMap, quint32 &lengthOfMap, quint32 &offsetToEntries,
                                    quint32 &resourceCount, quint32 &offsetToResources, quint32 &lengthOfResources)
{
    if (!m_stream)
        return false;
    const ::ResourceHeader *header = m_stream->GetResourceHeader();
    if (!header)
        return false;
    fileType = header->fileType;
    version = header->version;
    oldestCodeVersion = header->oldestCodeVersion;
    mapEntries = header->mapEntries;
    offsetToMap = header->offsetToMap;
    lengthOfMap = header->lengthOfMap;
    offsetToEntries = header->offsetToEntries;
    resourceCount = header->resourceCount;
    offsetToResources = header->offsetToResources;
    lengthOfResources = header->lengthOfResources;
    return true;
}

QString KestoResources::Dump()
{
    return m_stream ? m_stream->Dump() : QString();
}

bool KestoResources::GetMifHeader(MifHeader &header)
{
    if (!m_stream)
        return false;
    const QByteArray block = m_stream->GetResource(kTypeBinaries, kMifHeaderId);
    if (block.size() < kMifHeaderSize)
        return false;
    BlockReader in(block);
    MifHeader read;
    read.value1 = in.U32();
    read.value2 = in.U32();
    const QByteArray raw = in.Bytes(sizeof read.raw);
    std::memcpy(read.raw, raw.constData(), sizeof read.raw);
    read.count1 = in.U16();
    read.count2 = in.U16();
    read.count3 = in.U16();
    read.count4 = in.U16();
    read.notificationCount = in.U16();
    read.mimeTypeCount = in.U16();
    read.count7 = in.U16();
    header = read;
    return true;
}

bool KestoResources::GetClassList(quint16 id, QVector<unsigned int> &classes)
{
    classes.clear();
    if (!m_stream)
        return false;
    const QByteArray block = m_stream->GetResource(kTypeBinaries, id);
    BlockReader in(block);
    while (in.Remaining() >= 4) {
        const quint32 value = in.U32();
        if (value == 0 || value == 0xFFFFFFFFu)
            break;
        classes.append(value);
    }
    return !block.isEmpty();
}

bool KestoResources::GetMifClasses(QVector<unsigned int> &classes)
{
    return GetClassList(kMifClassesId, classes);
}

bool KestoResources::GetMifExternalClasses(QVector<unsigned int> &classes)
{
    return GetClassList(kMifExternalClassesId, classes);
}

bool KestoResources::GetMifApplets(QVector<Applet> &applets)
{
    applets.clear();
    if (!m_stream)
        return false;
    const QByteArray block = m_stream->GetResource(kTypeBinaries, kMifAppletsId);
    BlockReader in(block);
    // A final record shorter than 20 bytes is dropped.
    while (in.Remaining() >= kAppletSize) {
        Applet applet;
        applet.appletid = in.U32();
        applet.nameRef = in.U32();
        applet.baseid = in.U16();
        applet.apptype = in.U16();
        applet.hostid = in.U32();
        applet.privset = in.U16();
        applet.flags = in.U16();
        applets.append(applet);
    }
    return !block.isEmpty();
}

bool KestoResources::GetMifNotifications(QVector<Notifier> &notifications)
{
    notifications.clear();
    if (!m_stream)
        return false;
    MifHeader header;
    const int announced = GetMifHeader(header) ? header.notificationCount : 0;
    const QByteArray block = m_stream->GetResource(kTypeBinaries, kMifNotificationsId);
    BlockReader in(block);
    for (int i = 0; i < announced && in.Remaining() >= kNotifierSize; ++i) {
        Notifier notifier;
        notifier.value1 = in.U32();
        notifier.value2 = in.U32();
        notifier.value3 = in.U32();
        notifications.append(notifier);
    }
    return !block.isEmpty();
}

bool KestoResources::GetMifMimeTypes(QVector<MimeType> &mimeTypes)
{
    mimeTypes.clear();
    if (!m_stream)
        return false;
    MifHeader header;
    const int announced = GetMifHeader(header) ? header.mimeTypeCount : 0;
    const QByteArray block = m_stream->GetResource(kTypeBinaries, kMifMimeTypesId);
    BlockReader in(block);
    for (int i = 0; i < announced && in.Remaining() > kMimeTypeFixedSize; ++i) {
        MimeType mimeType;
        mimeType.value1 = in.U32();
        mimeType.value2 = in.U32();
        const qint64 nul = block.indexOf('\0', in.Position());
        if (nul < 0)
            break; // the text runs past the block
        mimeType.mimeType = QString::fromLatin1(in.Bytes(nul - in.Position()));
        in.Skip(1);
        mimeTypes.append(mimeType);
    }
    return !block.isEmpty();
}

bool KestoResources::GetMifEntry(MifEntry &entry)
{
    MifHeader header;
    if (!GetMifHeader(header))
        return false;
    entry.header = header;
    QVector<unsigned int> classes;
    if (GetMifClasses(classes))
        entry.classes = classes;
    QVector<Applet> applets;
    if (GetMifApplets(applets))
        entry.applets = applets;
    QVector<unsigned int> externalClasses;
    if (GetMifExternalClasses(externalClasses))
        entry.externalClasses = externalClasses;
    QVector<Notifier> notifications;
    if (GetMifNotifications(notifications))
        entry.notifications = notifications;
    QVector<MimeType> mimeTypes;
    if (GetMifMimeTypes(mimeTypes))
        entry.mimeTypes = mimeTypes;
    return true;
}

bool KestoResources::GetSysResource(unsigned int id, SysResource &record)
{
    record.Reset();
    if (!m_stream || id > 0xFFFF)
        return false;
    record.data = m_stream->GetResource(kTypeSysResource, quint16(id));
    if (record.data.isEmpty())
        return false;
    record.Decode();
    return true;
}
