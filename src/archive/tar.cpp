#include "archive/tar.h"

#include <QDataStream>
#include <QDateTime>
#include <QHash>
#include <QSaveFile>

#include <algorithm>
#include <cstring>
#include <limits>

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
constexpr int kLinkNameOffset = 157;
constexpr int kLinkNameSize = 100;
constexpr int kMagicOffset = 257;
constexpr int kVersionOffset = 263;
constexpr int kDevMajorOffset = 329;
constexpr int kDevMinorOffset = 337;
constexpr int kPrefixOffset = 345;
constexpr int kPrefixSize = 155;

// GNU sparse headers: four (offset, size) pairs in the header, more in
// extension blocks of 21 pairs each while the "is extended" byte is set.
constexpr int kSparseNumberSize = 12;
constexpr int kSparsePairSize = 2 * kSparseNumberSize;
constexpr int kGnuSparseOffset = 386;
constexpr int kGnuSparsePairs = 4;
constexpr int kGnuIsExtendedOffset = 482;
constexpr int kGnuRealSizeOffset = 483;
constexpr int kExtensionPairs = 21;
constexpr int kExtensionIsExtendedOffset = 504;

// "ustar" and a NUL: the POSIX magic. GNU archives carry "ustar  " instead and
// use the prefix area for other fields.
constexpr char kPosixMagic[] = "ustar";
constexpr int kPosixMagicSize = 6;

constexpr char kTypeHardLink = '1';
constexpr char kTypeGnuSparse = 'S';
// Records that describe the member after them, or nothing at all; never
// members themselves.
constexpr char kTypeGnuLongName = 'L';
constexpr char kTypeGnuLongLink = 'K';
constexpr char kTypePaxHeader = 'x';
constexpr char kTypePaxGlobal = 'g';
constexpr char kTypeSolarisHeader = 'X';
constexpr char kTypeSolarisAcl = 'A';
constexpr char kTypeVolumeLabel = 'V';
constexpr char kTypeMultiVolume = 'M';
constexpr char kTypeGnuOldNames = 'N';

// Name and pax records larger than this are refused rather than read.
constexpr quint64 kMaxMetaRecord = 1 << 20;
constexpr quint64 kMaxMemberSize = 0xFFFFFFFFu;

constexpr quint64 kMaxUstarSize = (quint64(1) << 33) - 1; // 11 octal digits

using PaxRecords = QList<QPair<QByteArray, QByteArray>>;

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

bool IsZeroBlock(const char *block)
{
    for (int i = 0; i < kBlockSize; ++i) {
        if (block[i] != 0)
            return false;
    }
    return true;
}

// A decimal number of at most 63 bits, digits only.
bool ReadDecimal(const QByteArray &text, quint64 &value)
{
    value = 0;
    if (text.isEmpty() || text.size() > 19)
        return false;
    for (const char c : text) {
        if (c < '0' || c > '9')
            return false;
        value = value * 10 + quint64(c - '0');
    }
    return value <= quint64(std::numeric_limits<qint64>::max());
}

// Splits pax extended header records ("LEN key=value\n", LEN counting the
// whole record) and appends them in order; false when any is malformed.
bool ParsePax(const QByteArray &data, PaxRecords &records)
{
    int pos = 0;
    while (pos < data.size()) {
        const int space = data.indexOf(' ', pos);
        quint64 length = 0;
        if (space < 0 || !ReadDecimal(data.mid(pos, space - pos), length) || length <= quint64(space - pos + 1)
            || length > quint64(data.size() - pos))
            return false;
        const int end = pos + int(length);
        if (data.at(end - 1) != '\n')
            return false;
        const QByteArray record = data.mid(space + 1, end - 1 - (space + 1));
        const int equals = record.indexOf('=');
        if (equals <= 0)
            return false;
        records.append({record.left(equals), record.mid(equals + 1)});
        pos = end;
    }
    return true;
}

// The last value of key; null when there is none.
QByteArray PaxValue(const PaxRecords &records, const char *key)
{
    for (auto it = records.crbegin(); it != records.crend(); ++it) {
        if (it->first == key)
            return it->second.isNull() ? QByteArray("") : it->second;
    }
    return QByteArray();
}

// A member name as hard links name it: without leading "./" or "/" and
// without a trailing "/".
QByteArray LinkKey(QByteArray name)
{
    for (;;) {
        if (name.startsWith("./"))
            name.remove(0, 2);
        else if (name.startsWith('/'))
            name.remove(0, 1);
        else
            break;
    }
    while (name.endsWith('/'))
        name.chop(1);
    return name;
}

// The bytes as text: UTF-8 when they are, else with every byte from 0x80 up
// written as a backslash and three octal digits.
QString NameText(const QByteArray &bytes)
{
    const QString text = QString::fromUtf8(bytes);
    if (text.toUtf8() == bytes)
        return text;
    QString escaped;
    for (const char c : bytes) {
        const unsigned char byte = static_cast<unsigned char>(c);
        if (byte < 0x80)
            escaped += QLatin1Char(c);
        else
            escaped += QStringLiteral("\\%1").arg(byte, 3, 8, QLatin1Char('0'));
    }
    return escaped;
}

// Whether the runs are in order, apart from one another, inside the member
// and hold no more than the stored bytes.
bool SparseMapFits(const QVector<TarSparseRun> &runs, quint64 realSize, quint64 stored)
{
    quint64 end = 0;
    quint64 total = 0;
    for (const TarSparseRun &run : runs) {
        if (run.position < end || quint64(run.position) + run.length > realSize)
            return false;
        end = quint64(run.position) + run.length;
        total += run.length;
    }
    return total <= stored;
}

bool AppendRun(QVector<TarSparseRun> &runs, quint64 position, quint64 length)
{
    if (position > kMaxMemberSize || length > kMaxMemberSize)
        return false;
    runs.append(TarSparseRun{quint32(position), quint32(length)});
    return true;
}

// The sparse map of a pax 0.0 ("GNU.sparse.offset"/"GNU.sparse.numbytes"
// pairs) or 0.1 ("GNU.sparse.map") member.
bool PaxSparseMap(const PaxRecords &records, QVector<TarSparseRun> &runs)
{
    const QByteArray map = PaxValue(records, "GNU.sparse.map");
    QList<QByteArray> numbers;
    if (!map.isNull()) {
        if (!map.isEmpty())
            numbers = map.split(',');
    } else {
        for (const auto &record : records) {
            if (record.first == "GNU.sparse.offset" || record.first == "GNU.sparse.numbytes") {
                if ((record.first == "GNU.sparse.offset") != (numbers.size() % 2 == 0))
                    return false;
                numbers.append(record.second);
            }
        }
    }
    if (numbers.size() % 2 != 0)
        return false;
    for (int i = 0; i < numbers.size(); i += 2) {
        quint64 position = 0;
        quint64 length = 0;
        if (!ReadDecimal(numbers.at(i), position) || !ReadDecimal(numbers.at(i + 1), length)
            || !AppendRun(runs, position, length))
            return false;
    }
    return true;
}

} // namespace

bool TarFileEntry::IsFile() const
{
    if (name.isEmpty() || name.endsWith(QLatin1Char('/')))
        return false;
    if (typeflag == kTypeHardLink)
        return offset > 0;
    return typeflag == '0' || typeflag == '\0' || typeflag == '7' || typeflag == kTypeGnuSparse;
}

bool TarFileEntry::IsDirectory() const
{
    return typeflag == '5' || typeflag == 'D' || (!name.isEmpty() && name.endsWith(QLatin1Char('/')));
}

bool TarFileEntry::IsSymLink() const
{
    return typeflag == '2';
}

bool TarFileEntry::IsHardLink() const
{
    return typeflag == kTypeHardLink;
}

Tar::Tar() = default;

Tar::~Tar()
{
    Close();
}

Tar::Tar(const Tar &other)
    : m_entries(other.m_entries), m_fileName(other.m_fileName), m_members(other.m_members), m_mtime(other.m_mtime),
      m_error(other.m_error)
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
        m_error = other.m_error;
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

bool Tar::IsDamaged() const
{
    return !m_error.isEmpty();
}

QString Tar::ErrorString() const
{
    return m_error;
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
    if (entry.sparse.isEmpty()) {
        const qint64 available = std::min<qint64>(entry.size, fileSize - entry.offset);
        QByteArray data = m_file->read(available);
        if (data.isNull())
            data = QByteArray("", 0);
        return data;
    }
    // Holes read as zeros; the stored runs follow one another in the file.
    QByteArray data(qsizetype(entry.size), '\0');
    for (const TarSparseRun &run : std::as_const(entry.sparse)) {
        const qint64 got = m_file->read(data.data() + run.position, run.length);
        if (got != qint64(run.length)) {
            data.truncate(qsizetype(run.position) + std::max<qint64>(got, 0));
            break;
        }
    }
    return data;
}

bool Tar::Damaged(const QString &reason)
{
    if (m_error.isEmpty())
        m_error = reason;
    return false;
}

bool Tar::Read(QDataStream &stream)
{
    m_entries.clear();
    m_error.clear();
    QIODevice *device = stream.device();
    if (!device)
        return false;
    if (!device->isReadable())
        return true;

    const qint64 fileSize = device->size();
    const auto unexpectedEnd = [&]() {
        return Damaged(QStringLiteral("unexpected end of archive at offset %1").arg(fileSize));
    };
    // Reads size bytes at offset, all of them or fail as an unexpected end.
    const auto readAt = [&](qint64 offset, quint64 size, QByteArray &bytes) {
        if (quint64(fileSize) < size || offset > fileSize - qint64(size) || !device->seek(offset))
            return unexpectedEnd();
        bytes = device->read(qint64(size));
        return bytes.size() == qsizetype(size) || unexpectedEnd();
    };

    // What the records before a member say about it.
    QByteArray longName;
    QByteArray longLink;
    PaxRecords pax;
    PaxRecords global;
    bool sawHeader = false;
    bool ended = false;
    // The latest member of each name, for the hard links after it.
    QHash<QByteArray, int> latest;

    qint64 pos = 0;
    char header[kBlockSize];
    for (;;) {
        // A member's padding is part of the archive too.
        if (pos > fileSize && !ended)
            return unexpectedEnd();
        if (pos >= fileSize || !device->seek(pos))
            break;
        const qint64 got = device->read(header, kBlockSize);
        if (got < kBlockSize) {
            if (ended)
                break;
            return sawHeader ? unexpectedEnd() : Damaged(QStringLiteral("does not look like a tar archive"));
        }
        if (IsZeroBlock(header)) {
            // The end of the archive; its blocks are listed, but nothing
            // after them is read.
            ended = true;
            TarFileEntry end;
            end.offset = pos + kBlockSize;
            m_entries.append(end);
            pos += kBlockSize;
            continue;
        }
        if (ended)
            break;

        // GNU tar accepts the sum of the bytes taken as unsigned or as signed.
        quint64 recorded = 0;
        unsigned int sum = 0;
        int signedSum = 0;
        for (int i = 0; i < kBlockSize; ++i) {
            const bool inField = i >= kChecksumOffset && i < kChecksumOffset + kChecksumSize;
            sum += inField ? unsigned(' ') : unsigned(static_cast<unsigned char>(header[i]));
            signedSum += inField ? int(' ') : int(static_cast<signed char>(header[i]));
        }
        if (!ReadNumber(header + kChecksumOffset, kChecksumSize, recorded)
            || (recorded != sum && qint64(recorded) != qint64(signedSum))) {
            if (!sawHeader)
                return Damaged(QStringLiteral("does not look like a tar archive"));
            return Damaged(QStringLiteral("checksum error at offset %1").arg(pos));
        }
        sawHeader = true;
        quint64 stored = 0;
        if (!ReadNumber(header + kSizeOffset, kSizeSize, stored))
            return Damaged(QStringLiteral("invalid size field at offset %1").arg(pos));
        qint64 dataOffset = pos + kBlockSize;
        const char typeflag = header[kTypeflagOffset];

        if (typeflag == kTypeGnuLongName || typeflag == kTypeGnuLongLink || typeflag == kTypePaxHeader
            || typeflag == kTypePaxGlobal || typeflag == kTypeSolarisHeader) {
            if (stored > kMaxMetaRecord)
                return Damaged(QStringLiteral("extended header too large at offset %1").arg(pos));
            QByteArray record;
            if (!readAt(dataOffset, stored, record))
                return false;
            if (typeflag == kTypeGnuLongName) {
                longName = UpToNul(record.constData(), int(record.size()));
            } else if (typeflag == kTypeGnuLongLink) {
                longLink = UpToNul(record.constData(), int(record.size()));
            } else {
                PaxRecords records;
                if (!ParsePax(record, records))
                    return Damaged(QStringLiteral("malformed extended header at offset %1").arg(pos));
                (typeflag == kTypePaxGlobal ? global : pax) += records;
            }
            pos = dataOffset + RoundUpToBlock(stored);
            continue;
        }
        if (typeflag == kTypeSolarisAcl || typeflag == kTypeVolumeLabel || typeflag == kTypeMultiVolume
            || typeflag == kTypeGnuOldNames) {
            if (qint64(stored) > fileSize - dataOffset)
                return unexpectedEnd();
            pos = dataOffset + RoundUpToBlock(stored);
            continue;
        }

        QByteArray name = UpToNul(header + kNameOffset, kNameSize);
        if (std::memcmp(header + kMagicOffset, kPosixMagic, kPosixMagicSize) == 0) {
            const QByteArray prefix = UpToNul(header + kPrefixOffset, kPrefixSize);
            if (!prefix.isEmpty())
                name = prefix + '/' + name;
        }
        QByteArray link = UpToNul(header + kLinkNameOffset, kLinkNameSize);
        PaxRecords records = global + pax;
        if (const QByteArray path = PaxValue(records, "path"); !path.isEmpty())
            name = path;
        if (const QByteArray path = PaxValue(records, "linkpath"); !path.isEmpty())
            link = path;
        if (const QByteArray size = PaxValue(records, "size"); !size.isNull() && !ReadDecimal(size, stored))
            return Damaged(QStringLiteral("malformed extended header at offset %1").arg(pos));
        if (!longName.isEmpty())
            name = longName;
        if (!longLink.isEmpty())
            link = longLink;
        longName.clear();
        longLink.clear();
        pax.clear();

        // Sparse members: where their stored runs belong and their full size.
        QVector<TarSparseRun> runs;
        quint64 realSize = stored;
        bool sparse = false;
        const auto badMap = [&]() {
            return Damaged(QStringLiteral("invalid sparse map at offset %1").arg(pos));
        };
        if (typeflag == kTypeGnuSparse) {
            sparse = true;
            if (!ReadNumber(header + kGnuRealSizeOffset, kSparseNumberSize, realSize))
                return badMap();
            const char *pairs = header + kGnuSparseOffset;
            int count = kGnuSparsePairs;
            bool extended = header[kGnuIsExtendedOffset] != 0;
            QByteArray extension;
            for (;;) {
                for (int i = 0; i < count && pairs[i * kSparsePairSize] != 0; ++i) {
                    quint64 position = 0;
                    quint64 length = 0;
                    if (!ReadNumber(pairs + i * kSparsePairSize, kSparseNumberSize, position)
                        || !ReadNumber(pairs + i * kSparsePairSize + kSparseNumberSize, kSparseNumberSize, length)
                        || !AppendRun(runs, position, length))
                        return badMap();
                }
                if (!extended)
                    break;
                if (!readAt(dataOffset, kBlockSize, extension))
                    return false;
                dataOffset += kBlockSize;
                pairs = extension.constData();
                count = kExtensionPairs;
                extended = extension.at(kExtensionIsExtendedOffset) != 0;
            }
        } else if (PaxValue(records, "GNU.sparse.major") == "1") {
            // Format 1.0: the map leads the data as decimal lines, padded to
            // whole blocks.
            sparse = true;
            if (PaxValue(records, "GNU.sparse.minor") != "0"
                || !ReadDecimal(PaxValue(records, "GNU.sparse.realsize"), realSize))
                return badMap();
            QByteArray text;
            int cursor = 0;
            const auto nextNumber = [&](quint64 &value) {
                int newline;
                while ((newline = text.indexOf('\n', cursor)) < 0) {
                    QByteArray block;
                    if (quint64(text.size()) >= stored)
                        return false;
                    if (!readAt(dataOffset + text.size(), kBlockSize, block))
                        return false;
                    text += block;
                }
                const bool ok = ReadDecimal(text.mid(cursor, newline - cursor), value);
                cursor = newline + 1;
                return ok;
            };
            quint64 count = 0;
            if (!nextNumber(count))
                return IsDamaged() ? false : badMap();
            for (quint64 i = 0; i < count; ++i) {
                quint64 position = 0;
                quint64 length = 0;
                if (!nextNumber(position) || !nextNumber(length) || !AppendRun(runs, position, length))
                    return IsDamaged() ? false : badMap();
            }
            const qint64 mapSize = RoundUpToBlock(quint64(cursor));
            if (quint64(mapSize) > stored)
                return badMap();
            dataOffset += mapSize;
            stored -= quint64(mapSize);
        } else if (!PaxValue(records, "GNU.sparse.map").isNull() || !PaxValue(records, "GNU.sparse.offset").isNull()) {
            sparse = true;
            if (!ReadDecimal(PaxValue(records, "GNU.sparse.size"), realSize) || !PaxSparseMap(records, runs))
                return badMap();
        }
        if (sparse) {
            if (const QByteArray realName = PaxValue(records, "GNU.sparse.name"); !realName.isEmpty())
                name = realName;
            if (realSize <= kMaxMemberSize && !SparseMapFits(runs, realSize, stored))
                return badMap();
            // A member that is all hole still reads as zeros, not as what
            // follows it in the archive.
            if (runs.isEmpty() && realSize <= kMaxMemberSize)
                runs.append(TarSparseRun{quint32(realSize), 0});
        }
        if (realSize > kMaxMemberSize)
            return Damaged(QStringLiteral("member %1 at offset %2 is larger than 4 GiB - 1 bytes: not supported")
                               .arg(NameText(name))
                               .arg(pos));
        if (qint64(stored) > fileSize - dataOffset)
            return unexpectedEnd();

        TarFileEntry entry;
        entry.rawName = name;
        entry.name = NameText(name);
        entry.linkName = NameText(link);
        entry.size = quint32(realSize);
        entry.offset = dataOffset;
        entry.typeflag = typeflag;
        entry.sparse = runs;
        if (typeflag == kTypeHardLink) {
            // The data of the latest member of that name before the link.
            entry.size = 0;
            entry.offset = 0;
            const auto target = latest.constFind(LinkKey(link));
            if (target != latest.constEnd() && m_entries.at(target.value()).IsFile()) {
                const TarFileEntry &linked = m_entries.at(target.value());
                entry.size = linked.size;
                entry.offset = linked.offset;
                entry.sparse = linked.sparse;
            }
        }
        latest.insert(LinkKey(name), int(m_entries.size()));
        m_entries.append(entry);
        pos = dataOffset + RoundUpToBlock(stored);
    }
    return !IsDamaged();
}

unsigned int Tar::CalcChecksum(signed char *header)
{
    unsigned int sum = 0;
    for (int i = 0; i < kBlockSize; ++i)
        sum += unsigned(int(header[i]));
    return sum;
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
    for (int slash = name.lastIndexOf('/', searchFrom); slash > 0; slash = name.lastIndexOf('/', slash - 1)) {
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
    if (!PutOctal64(header + kModeOffset, kIdSize, member.mode & 07777) || !PutOctal64(header + kUidOffset, kIdSize, 0)
        || !PutOctal64(header + kGidOffset, kIdSize, 0) || !PutOctal64(header + kSizeOffset, kSizeSize, size)
        || !PutOctal64(header + kMtimeOffset, kMtimeSize, quint64(mtime))
        || !PutOctal64(header + kDevMajorOffset, kIdSize, 0) || !PutOctal64(header + kDevMinorOffset, kIdSize, 0))
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

unsigned int Tar::ReadOctal(const signed char *field)
{
    quint64 value = 0;
    if (!ReadNumber(reinterpret_cast<const char *>(field), kSizeSize, value))
        return 0;
    return unsigned(std::min<quint64>(value, 0xFFFFFFFFu));
}

bool Tar::ReadNumber(const char *field, int width, quint64 &value)
{
    value = 0;
    const auto byte = [field](int i) {
        return static_cast<unsigned char>(field[i]);
    };
    if (byte(0) & 0x80) {
        // GNU base-256: big-endian two's complement after the marker bit.
        if (byte(0) & 0x40)
            return false;
        quint64 number = byte(0) & 0x3F;
        for (int i = 1; i < width; ++i) {
            if (number >> 55)
                return false;
            number = (number << 8) | byte(i);
        }
        value = number;
        return true;
    }
    int i = 0;
    while (i < width && (byte(i) == ' ' || byte(i) == 0))
        ++i;
    quint64 number = 0;
    for (; i < width && byte(i) >= '0' && byte(i) <= '7'; ++i) {
        if (number >> 60)
            return false;
        number = (number << 3) | (byte(i) - '0');
    }
    if (i < width && byte(i) != ' ' && byte(i) != 0)
        return false;
    value = number;
    return true;
}
