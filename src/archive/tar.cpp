#include "archive/tar.h"

#include <QDataStream>
#include <QDateTime>
#include <QSaveFile>

#include <algorithm>
#include <cstring>

namespace {

constexpr int kBlockSize = 512;
constexpr int kNameOffset = 0;
constexpr int kNameSize = 100;
constexpr int kModeOffset = 100;
constexpr int kUidOffset = 108;
constexpr int kGidOffset = 116;
constexpr int kIdSize = 8;
constexpr int kSizeOffset = 124;
constexpr int kSizeSize = 12;
constexpr int kMtimeOffset = 136;
constexpr int kMtimeSize = 12;
constexpr int kChecksumOffset = 148;
constexpr int kChecksumSize = 8;
constexpr int kTypeflagOffset = 156;
constexpr int kMagicOffset = 257;
constexpr int kVersionOffset = 263;
constexpr int kDevMajorOffset = 329;
constexpr int kDevMinorOffset = 337;
constexpr int kPrefixOffset = 345;
constexpr int kPrefixSize = 155;

// "ustar" and a NUL: the POSIX magic. GNU archives carry "ustar  " instead and
// use the prefix area for other fields.
constexpr char kPosixMagic[] = "ustar";
constexpr int kPosixMagicSize = 6;

// GNU long-name and long-link records, and pax extended headers.
constexpr char kTypeGnuLongName = 'L';
constexpr char kTypeGnuLongLink = 'K';
constexpr char kTypePaxHeader = 'x';
constexpr char kTypePaxGlobal = 'g';

// Meta records larger than this are not names: they are skipped unread.
constexpr qint64 kMaxMetaRecord = 1 << 20;

constexpr quint64 kMaxUstarSize = (quint64(1) << 33) - 1; // 11 octal digits

qint64 RoundUpToBlock(quint64 size)
{
    const quint64 blocks = size / kBlockSize + (size % kBlockSize ? 1 : 0);
    return qint64(blocks * kBlockSize);
}

QByteArray UpToNul(const char *bytes, int size)
{
    const void *nul = std::memchr(bytes, 0, size_t(size));
    return QByteArray(bytes, nul ? int(static_cast<const char *>(nul) - bytes) : size);
}

// The "path" value of a pax extended header ("LEN key=value\n" records);
// empty when there is none or the records are malformed.
QByteArray PaxPath(const QByteArray &records)
{
    int pos = 0;
    QByteArray path;
    while (pos < records.size()) {
        int space = records.indexOf(' ', pos);
        if (space < 0)
            break;
        bool ok = false;
        const int length = records.mid(pos, space - pos).toInt(&ok);
        if (!ok || length <= space - pos + 1 || length > records.size() - pos)
            break;
        const QByteArray record = records.mid(space + 1, length - (space - pos) - 1);
        if (record.endsWith('\n')) {
            const int equals = record.indexOf('=');
            if (equals > 0 && record.left(equals) == "path")
                path = record.mid(equals + 1, record.size() - equals - 2);
        }
        pos += length;
    }
    return path;
}

} // namespace

bool TarFileEntry::IsFile() const
{
    return !name.isEmpty() && !name.endsWith(QLatin1Char('/'))
           && (typeflag == '0' || typeflag == '\0' || typeflag == '7');
}

bool TarFileEntry::IsDirectory() const
{
    return typeflag == '5' || (!name.isEmpty() && name.endsWith(QLatin1Char('/')));
}

Tar::Tar() = default;

Tar::~Tar()
{
    Close();
}

Tar::Tar(const Tar &other)
    : m_entries(other.m_entries),
      m_fileName(other.m_fileName),
      m_members(other.m_members),
      m_mtime(other.m_mtime)
{
}

Tar &Tar::operator=(const Tar &other)
{
    if (this != &other) {
        Close();
        m_entries = other.m_entries;
        m_fileName = other.m_fileName;
        m_members = other.m_members;
        m_mtime = other.m_mtime;
    }
    return *this;
}

void Tar::SetFileName(const QString &name)
{
    m_fileName = name;
}

QString Tar::FileName() const
{
    return m_fileName;
}

bool Tar::Open(QFlags<QIODevice::OpenModeFlag> mode, const QString &path)
{
    if (!path.isEmpty())
        m_fileName = path;
    if (m_fileName.isEmpty())
        return false;
    Close();
    auto file = std::make_unique<QFile>(m_fileName);
    if (!file->open(mode))
        return false;
    m_file = std::move(file);
    QDataStream stream(m_file.get());
    Read(stream);
    return true;
}

void Tar::Close()
{
    if (m_file) {
        m_file->close();
        m_file.reset();
    }
}

bool Tar::IsOpen() const
{
    return m_file != nullptr;
}

unsigned int Tar::EntryCount() const
{
    return unsigned(m_entries.size());
}

TarFileEntry Tar::Entry(unsigned int index) const
{
    if (index >= EntryCount())
        return TarFileEntry();
    return m_entries.at(int(index));
}

QByteArray Tar::EntryData(TarFileEntry &entry)
{
    if (!m_file)
        return QByteArray();
    const qint64 fileSize = m_file->size();
    if (entry.offset < 0 || entry.offset > fileSize || !m_file->seek(entry.offset))
        return QByteArray("", 0);
    const qint64 available = std::min<qint64>(entry.size, fileSize - entry.offset);
    QByteArray data = m_file->read(available);
    if (data.isNull())
        data = QByteArray("", 0);
    return data;
}

bool Tar::Read(QDataStream &stream)
{
    m_entries.clear();
    QIODevice *device = stream.device();
    if (!device)
        return false;

    QByteArray longName;
    bool haveLongName = false;
    char header[kBlockSize];
    while (!device->atEnd()) {
        if (device->read(header, kBlockSize) != kBlockSize)
            break;
        const signed char *raw = reinterpret_cast<const signed char *>(header);
        const quint64 size = ReadOctal64(raw + kSizeOffset, kSizeSize);
        const qint64 offset = device->pos();
        const char typeflag = header[kTypeflagOffset];

        if (typeflag == kTypeGnuLongName || typeflag == kTypeGnuLongLink
            || typeflag == kTypePaxHeader || typeflag == kTypePaxGlobal) {
            if (qint64(size) <= kMaxMetaRecord && typeflag != kTypePaxGlobal) {
                const QByteArray record = device->read(qint64(size));
                if (typeflag == kTypeGnuLongName) {
                    longName = UpToNul(record.constData(), record.size());
                    haveLongName = !longName.isEmpty();
                } else if (typeflag == kTypePaxHeader) {
                    const QByteArray path = PaxPath(record);
                    if (!path.isEmpty()) {
                        longName = path;
                        haveLongName = true;
                    }
                }
            }
        } else {
            TarFileEntry entry;
            QByteArray name = UpToNul(header + kNameOffset, kNameSize);
            // A long name belongs to the member header that follows it, never
            // to the zero blocks that end the archive.
            if (haveLongName && !name.isEmpty()) {
                name = longName;
            } else if (std::memcmp(header + kMagicOffset, kPosixMagic, kPosixMagicSize) == 0) {
                const QByteArray prefix = UpToNul(header + kPrefixOffset, kPrefixSize);
                if (!prefix.isEmpty())
                    name = prefix + '/' + name;
            }
            haveLongName = false;
            longName.clear();
            entry.name = QString::fromUtf8(name);
            entry.size = quint32(std::min<quint64>(size, 0xFFFFFFFFu));
            entry.offset = offset;
            entry.typeflag = typeflag;
            m_entries.append(entry);
        }

        // Every header is followed by its data padded to whole blocks.
        const qint64 next = offset + RoundUpToBlock(size);
        if (next < offset || !device->seek(next))
            break;
    }
    return true;
}

unsigned int Tar::CalcChecksum(signed char *header)
{
    unsigned int sum = 0;
    for (int i = 0; i < kBlockSize; ++i)
        sum += unsigned(int(header[i]));
    return sum;
}

unsigned int Tar::ReadOctal(const signed char *field)
{
    return unsigned(std::min<quint64>(ReadOctal64(field, kSizeSize), 0xFFFFFFFFu));
}

quint64 Tar::ReadOctal64(const signed char *field, unsigned int width)
{
    quint64 value = 0;
    for (unsigned int i = 0; i < width && field[i] >= '0' && field[i] <= '9'; ++i) {
        if (value > (~quint64(0) >> 3))
            return ~quint64(0);
        value = (value << 3) | quint64(field[i] - '0');
    }
    return value;
}

void Tar::PutOctalNumber(signed char *field, unsigned int width, int value, bool checksumStyle)
{
    if (width == 0 || value < 0 || (checksumStyle && width < 2))
        return;
    const unsigned int digits = checksumStyle ? width - 2 : width - 1;
    if (digits < 11 && quint64(value) >= (quint64(1) << (3 * digits)))
        return;
    if (checksumStyle) {
        field[width - 2] = 0;
        field[width - 1] = ' ';
    } else {
        field[width - 1] = 0;
    }
    unsigned int rest = unsigned(value);
    for (unsigned int i = digits; i > 0; --i) {
        field[i - 1] = static_cast<signed char>('0' + (rest & 7));
        rest >>= 3;
    }
}

bool Tar::PutOctal64(signed char *field, unsigned int width, quint64 value)
{
    const unsigned int digits = width - 1;
    if (digits < 21 && value >= (quint64(1) << (3 * digits)))
        return false;
    field[width - 1] = 0;
    for (unsigned int i = digits; i > 0; --i) {
        field[i - 1] = static_cast<signed char>('0' + (value & 7));
        value >>= 3;
    }
    return true;
}

void Tar::AddFile(const QString &name, const QByteArray &data, unsigned int mode)
{
    Member member;
    member.name = name;
    member.data = data;
    member.mode = mode;
    member.typeflag = '0';
    m_members.append(member);
}

void Tar::AddDirectory(const QString &name, unsigned int mode)
{
    Member member;
    member.name = name.endsWith(QLatin1Char('/')) ? name : name + QLatin1Char('/');
    member.mode = mode;
    member.typeflag = '5';
    m_members.append(member);
}

void Tar::ClearMembers()
{
    m_members.clear();
}

void Tar::SetModificationTime(qint64 secondsSinceEpoch)
{
    m_mtime = secondsSinceEpoch;
}

bool Tar::SplitUstarName(const QByteArray &name, QByteArray &prefix, QByteArray &base)
{
    if (name.size() <= kNameSize) {
        prefix.clear();
        base = name;
        return true;
    }
    // The last "/" that leaves at most 100 bytes after it and 155 before it.
    // A directory's own trailing "/" stays in the name part.
    const int searchFrom = name.endsWith('/') ? name.size() - 2 : name.size() - 1;
    for (int slash = name.lastIndexOf('/', searchFrom); slash > 0;
         slash = name.lastIndexOf('/', slash - 1)) {
        if (name.size() - slash - 1 > kNameSize)
            return false;
        if (slash <= kPrefixSize) {
            prefix = name.left(slash);
            base = name.mid(slash + 1);
            return !base.isEmpty();
        }
    }
    return false;
}

bool Tar::MakeHeader(const Member &member, qint64 mtime, signed char *header)
{
    std::memset(header, 0, kBlockSize);
    const QByteArray name = member.name.toUtf8();
    if (name.isEmpty() || name.contains('\0'))
        return false;
    if (member.typeflag == '0' && name.endsWith('/'))
        return false;
    QByteArray prefix;
    QByteArray base;
    if (!SplitUstarName(name, prefix, base))
        return false;
    std::memcpy(header + kNameOffset, base.constData(), size_t(base.size()));
    std::memcpy(header + kPrefixOffset, prefix.constData(), size_t(prefix.size()));

    const quint64 size = quint64(member.data.size());
    if (size > kMaxUstarSize || mtime < 0)
        return false;
    if (!PutOctal64(header + kModeOffset, kIdSize, member.mode & 07777)
        || !PutOctal64(header + kUidOffset, kIdSize, 0)
        || !PutOctal64(header + kGidOffset, kIdSize, 0)
        || !PutOctal64(header + kSizeOffset, kSizeSize, size)
        || !PutOctal64(header + kMtimeOffset, kMtimeSize, quint64(mtime))
        || !PutOctal64(header + kDevMajorOffset, kIdSize, 0)
        || !PutOctal64(header + kDevMinorOffset, kIdSize, 0))
        return false;
    header[kTypeflagOffset] = member.typeflag;
    std::memcpy(header + kMagicOffset, kPosixMagic, kPosixMagicSize);
    header[kVersionOffset] = '0';
    header[kVersionOffset + 1] = '0';

    std::memset(header + kChecksumOffset, ' ', kChecksumSize);
    PutOctalNumber(header + kChecksumOffset, kChecksumSize, int(CalcChecksum(header)), true);
    return true;
}

bool Tar::Write(QDataStream &stream)
{
    QIODevice *device = stream.device();
    if (!device)
        return false;
    const qint64 mtime = m_mtime >= 0 ? m_mtime : QDateTime::currentSecsSinceEpoch();
    static const char zeros[kBlockSize] = {};
    signed char header[kBlockSize];
    for (const Member &member : std::as_const(m_members)) {
        if (!MakeHeader(member, mtime, header))
            return false;
        if (device->write(reinterpret_cast<const char *>(header), kBlockSize) != kBlockSize)
            return false;
        const qint64 size = member.data.size();
        if (size > 0 && device->write(member.data.constData(), size) != size)
            return false;
        const qint64 padding = RoundUpToBlock(quint64(size)) - size;
        if (padding > 0 && device->write(zeros, padding) != padding)
            return false;
    }
    for (int i = 0; i < 2; ++i) {
        if (device->write(zeros, kBlockSize) != kBlockSize)
            return false;
    }
    return true;
}

bool Tar::Write(const QString &path)
{
    if (path.isEmpty())
        return false;
    QSaveFile file(path);
    if (!file.open(QIODevice::WriteOnly))
        return false;
    QDataStream stream(&file);
    if (!Write(stream)) {
        file.cancelWriting();
        return false;
    }
    return file.commit();
}
