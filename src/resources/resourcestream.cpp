#include "resources/resourcestream.h"

#include "resources/blockreader.h"

#include <QFile>
#include <QSaveFile>
#include <QtEndian>

#include <cstring>
#include <functional>
#include <string_view>
#include <vector>

namespace {

constexpr int kHeaderSize = 32;
constexpr int kMapEntrySize = 8;
constexpr int kOffsetSize = 4;
// Map entries, block indexes and IDs are 16-bit in the file.
constexpr int kMaxEntries = 0xFFFF;
// No block index reaches it: at most kMaxEntries blocks, numbered from 0.
constexpr quint16 kFreeSlot = 0xFFFF;

// "%1(0x%2)": decimal, then hexadecimal right-aligned in 8 characters.
QString Line(const char *format, quint32 value)
{
    return QString::fromLatin1(format).arg(value).arg(value, 8, 16, QLatin1Char(' '));
}

} // namespace

bool ResourceEntry::operator<(const ResourceEntry &other) const
{
    if (compareMode == 1)
        return qstrcmp(data.constData(), other.data.constData()) < 0;
    if (type != other.type)
        return type < other.type;
    return id < other.id;
}

ResourceStream::ResourceStream() = default;
ResourceStream::~ResourceStream() = default;
ResourceStream::ResourceStream(const ResourceStream &other) = default;
ResourceStream &ResourceStream::operator=(const ResourceStream &other) = default;

bool ResourceStream::Load(const QString &path)
{
    if (path.isEmpty())
        return false;
    QFile file(path);
    if (!file.open(QIODevice::ReadOnly))
        return false;
    const QByteArray bytes = file.readAll();
    if (file.error() != QFileDevice::NoError)
        return false;
    file.close();
    if (!Parse(bytes))
        return false;
    m_name = path;
    return true;
}

bool ResourceStream::LoadFrom(const QByteArray &bytes)
{
    return Parse(bytes);
}

bool ResourceStream::Parse(const QByteArray &bytes)
{
    BlockReader in(bytes);
    if (in.Remaining() < kHeaderSize)
        return false;
    ResourceHeader header;
    header.fileType = in.U8();
    header.reserved = in.U8();
    header.version = in.U16();
    header.oldestCodeVersion = in.U16();
    header.mapEntries = in.U16();
    header.offsetToMap = in.U32();
    header.lengthOfMap = in.U32();
    header.offsetToEntries = in.U32();
    header.resourceCount = in.U32();
    header.offsetToResources = in.U32();
    header.lengthOfResources = in.U32();

    // Every count must be backed by bytes before anything is allocated for it.
    const qint64 mapCount = header.mapEntries;
    const qint64 offsetCount = qint64(header.resourceCount) + 1;
    if (mapCount * kMapEntrySize > in.Remaining())
        return false;
    if (offsetCount * kOffsetSize > in.Remaining() - mapCount * kMapEntrySize)
        return false;

    QVector<FileMapEntry> fileMap;
    fileMap.reserve(int(mapCount));
    for (qint64 i = 0; i < mapCount; ++i) {
        FileMapEntry entry;
        entry.type = in.U16();
        entry.beginningResId = in.U16();
        entry.additionalResId = in.U16();
        entry.offsetIndex = in.U16();
        fileMap.append(entry);
    }

    QVector<quint32> offsetTable;
    offsetTable.reserve(int(offsetCount));
    for (qint64 i = 0; i < offsetCount; ++i)
        offsetTable.append(in.U32());

    // Offsets only serve for their differences; they must not run backwards
    // nor describe more data than the input holds.
    const qint64 dataStart = in.Position();
    if (offsetTable.last() > quint32(bytes.size()) || offsetTable.last() < offsetTable.first()
        || qint64(offsetTable.last() - offsetTable.first()) > in.Remaining())
        return false;
    QVector<QByteArray> resources;
    resources.reserve(int(offsetCount - 1));
    qint64 position = dataStart;
    for (qint64 i = 0; i + 1 < offsetCount; ++i) {
        if (offsetTable[i + 1] < offsetTable[i])
            return false;
        const qint64 size = offsetTable[i + 1] - offsetTable[i];
        resources.append(size > 0 ? bytes.mid(position, size) : QByteArray(""));
        position += size;
    }

    // Ranges may share slots, but a map that describes more IDs than the
    // input has bytes is no resource file: it would only blow up the table.
    qint64 idCount = 0;
    for (const FileMapEntry &entry : std::as_const(fileMap)) {
        if (qint64(entry.offsetIndex) + entry.additionalResId >= resources.size())
            return false;
        idCount += qint64(entry.additionalResId) + 1;
    }
    if (idCount > bytes.size())
        return false;

    m_header = header;
    _fileMap = fileMap;
    _offsetTable = offsetTable;
    _resources = resources;
    return Decompress();
}

bool ResourceStream::Decompress()
{
    m_table.clear();
    // Where ranges overlap, the first map entry covering an ID wins.
    for (const FileMapEntry &entry : std::as_const(_fileMap)) {
        QMap<quint16, QByteArray> &ids = m_table[entry.type];
        for (int k = 0; k <= entry.additionalResId; ++k) {
            const quint16 id = quint16(entry.beginningResId + k);
            const int index = entry.offsetIndex + k;
            if (index >= _resources.size())
                return false;
            // Files list IDs in ascending order: appending at the end takes
            // no search.
            if (ids.isEmpty() || ids.lastKey() < id)
                ids.insert(ids.constEnd(), id, _resources.at(index));
            else if (!ids.contains(id))
                ids.insert(id, _resources.at(index));
        }
    }
    return true;
}

bool ResourceStream::ProcessStructures()
{
    m_header.Reset();
    _fileMap.clear();
    _offsetTable.clear();
    _resources.clear();

    qsizetype pairs = 0;
    for (const QMap<quint16, QByteArray> &ids : std::as_const(m_table))
        pairs += ids.size();
    if (pairs == 0 || pairs > kMaxEntries)
        return false;
    _fileMap.reserve(pairs);
    _resources.reserve(pairs);
    _offsetTable.reserve(pairs + 1);

    // The pairs in type, then ID order, each with the hash of its block.
    struct Pair
    {
        quint16 type;
        quint16 id;
        const QByteArray *data;
        size_t hash;
    };
    std::vector<Pair> ordered;
    ordered.reserve(size_t(pairs));
    for (auto type = m_table.constBegin(); type != m_table.constEnd(); ++type) {
        for (auto id = type->constBegin(); id != type->constEnd(); ++id) {
            const QByteArray &data = id.value();
            ordered.push_back(
                Pair{type.key(), id.key(), &data,
                     std::hash<std::string_view>()(std::string_view(data.constData(), size_t(data.size())))});
        }
    }

    // The first equal block already collected is shared; an open-addressed
    // table finds it. A slot is four bytes (16 bits of the block's hash and
    // its index, 0xFFFF when free), and each slot is fetched a few pairs
    // ahead: the table is touched at random, and once the blocks no longer
    // fit in the processor's cache every lookup would wait for memory.
    struct Slot
    {
        quint16 tag = 0;
        quint16 index = kFreeSlot;
    };
    size_t capacity = 16;
    while (capacity < size_t(pairs) * 2)
        capacity *= 2;
    std::vector<Slot> seen(capacity);
    const size_t mask = capacity - 1;
    constexpr size_t kAhead = 8;
    quint64 end = 0;
    for (size_t i = 0; i < ordered.size(); ++i) {
        if (i + kAhead < ordered.size())
            __builtin_prefetch(&seen[ordered[i + kAhead].hash & mask]);
        const Pair &pair = ordered[i];
        const QByteArray &data = *pair.data;
        const quint16 tag = quint16(pair.hash >> 48);
        size_t at = pair.hash & mask;
        while (seen[at].index != kFreeSlot && (seen[at].tag != tag || _resources.at(seen[at].index) != data))
            at = (at + 1) & mask;
        int index = seen[at].index;
        if (index == kFreeSlot) {
            index = int(_resources.size());
            seen[at] = Slot{tag, quint16(index)};
            _resources.append(data);
            if (_offsetTable.isEmpty())
                _offsetTable.append(0);
            end += quint64(data.size());
            if (end > 0xFFFFFFFFu)
                return false;
            _offsetTable.append(quint32(end));
        }
        FileMapEntry mapEntry;
        mapEntry.type = pair.type;
        mapEntry.beginningResId = pair.id;
        mapEntry.additionalResId = 0;
        mapEntry.offsetIndex = quint16(index);
        _fileMap.append(mapEntry);
    }

    const quint32 count = quint32(pairs);
    const quint64 offsetToResources = kHeaderSize + quint64(kMapEntrySize) * count + quint64(kOffsetSize) * (count + 1);
    if (offsetToResources + end > 0xFFFFFFFFu)
        return false;
    m_header.mapEntries = quint16(_fileMap.size());
    m_header.lengthOfMap = kMapEntrySize * count;
    m_header.offsetToEntries = kMapEntrySize * count + kHeaderSize;
    m_header.resourceCount = count;
    m_header.offsetToResources = quint32(offsetToResources);
    m_header.lengthOfResources = quint32(end);
    Q_ASSERT(quint32(_fileMap.size()) == m_header.resourceCount);

    for (quint32 &offset : _offsetTable)
        offset += quint32(offsetToResources);
    const quint32 last = _offsetTable.last();
    while (quint32(_offsetTable.size()) < count + 1)
        _offsetTable.append(last);
    return true;
}

QByteArray ResourceStream::Serialize() const
{
    qsizetype size
        = kHeaderSize + qsizetype(kMapEntrySize) * _fileMap.size() + qsizetype(kOffsetSize) * _offsetTable.size();
    for (const QByteArray &block : _resources)
        size += block.size();
    // Everything is written through one cursor into a buffer of the final
    // size: appending field by field costs more than the fields themselves.
    QByteArray out(size, Qt::Uninitialized);
    uchar *cursor = reinterpret_cast<uchar *>(out.data());
    const auto put16 = [&cursor](quint16 value) {
        qToLittleEndian(value, cursor);
        cursor += 2;
    };
    const auto put32 = [&cursor](quint32 value) {
        qToLittleEndian(value, cursor);
        cursor += 4;
    };
    *cursor++ = m_header.fileType;
    *cursor++ = m_header.reserved;
    put16(m_header.version);
    put16(m_header.oldestCodeVersion);
    put16(m_header.mapEntries);
    put32(m_header.offsetToMap);
    put32(m_header.lengthOfMap);
    put32(m_header.offsetToEntries);
    put32(m_header.resourceCount);
    put32(m_header.offsetToResources);
    put32(m_header.lengthOfResources);
    for (const FileMapEntry &entry : _fileMap) {
        put16(entry.type);
        put16(entry.beginningResId);
        put16(entry.additionalResId);
        put16(entry.offsetIndex);
    }
    for (quint32 offset : _offsetTable)
        put32(offset);
    for (const QByteArray &block : _resources) {
        if (!block.isEmpty())
            std::memcpy(cursor, block.constData(), size_t(block.size()));
        cursor += block.size();
    }
    Q_ASSERT(cursor == reinterpret_cast<const uchar *>(out.constData()) + out.size());
    return out;
}

bool ResourceStream::Save(const QString &path)
{
    if (!path.isEmpty())
        m_name = path;
    if (m_name.isEmpty() || !ProcessStructures())
        return false;
    const QByteArray bytes = Serialize();
    QSaveFile file(m_name);
    if (!file.open(QIODevice::WriteOnly))
        return false;
    if (file.write(bytes) != bytes.size()) {
        file.cancelWriting();
        return false;
    }
    return file.commit();
}

bool ResourceStream::SaveTo(QByteArray &bytes)
{
    if (!ProcessStructures())
        return false;
    bytes = Serialize();
    return true;
}

void ResourceStream::AddResource(quint16 type, quint16 id, const QByteArray &data)
{
    m_table[type][id] = data;
}

void ResourceStream::DeleteResource(quint16 type, quint16 id)
{
    auto it = m_table.find(type);
    if (it != m_table.end())
        it->remove(id);
}

QByteArray ResourceStream::GetResource(quint16 type, quint16 id) const
{
    auto it = m_table.constFind(type);
    if (it == m_table.constEnd())
        return QByteArray();
    return it->value(id);
}

unsigned int ResourceStream::GetResourceTypes(QVector<quint16> &types) const
{
    types.clear();
    for (auto it = m_table.constBegin(); it != m_table.constEnd(); ++it)
        types.append(it.key());
    return unsigned(types.size());
}

unsigned int ResourceStream::GetResourceIDs(quint16 type, QVector<quint16> &ids) const
{
    ids.clear();
    auto it = m_table.constFind(type);
    if (it != m_table.constEnd()) {
        for (auto id = it->constBegin(); id != it->constEnd(); ++id)
            ids.append(id.key());
    }
    return unsigned(ids.size());
}

unsigned int ResourceStream::GetResources(QVector<ResourceEntry> &entries) const
{
    entries.clear();
    for (auto type = m_table.constBegin(); type != m_table.constEnd(); ++type) {
        for (auto id = type->constBegin(); id != type->constEnd(); ++id) {
            ResourceEntry entry;
            entry.type = type.key();
            entry.id = id.key();
            entry.data = id.value();
            entries.append(entry);
        }
    }
    return unsigned(entries.size());
}

void ResourceStream::Clear()
{
    m_name.clear();
    m_table.clear();
    m_header.Reset();
    _fileMap.clear();
    _offsetTable.clear();
    _resources.clear();
}

QString ResourceStream::Dump() const
{
    QString text = QStringLiteral("=== Header ===\n");
    text += Line("   FileType:             %1(0x%2)\n", m_header.fileType);
    text += Line("   Version:              %1(0x%2)\n", m_header.version);
    text += Line("   Oldest Code Version:  %1(0x%2)\n", m_header.oldestCodeVersion);
    text += Line("   Number of Map Entries:%1(0x%2)\n", m_header.mapEntries);
    text += Line("   Offset to Map:        %1(0x%2)\n", m_header.offsetToMap);
    text += Line("   Length of Map:        %1(0x%2)\n", m_header.lengthOfMap);
    text += Line("   Offset to Entries:    %1(0x%2)\n", m_header.offsetToEntries);
    text += Line("   Number of Resources:  %1(0x%2)\n", m_header.resourceCount);
    text += Line("   Offset to Resources:  %1(0x%2)\n", m_header.offsetToResources);
    text += Line("   Length of Resources:  %1(0x%2)\n", m_header.lengthOfResources);

    text += QStringLiteral("=== FileMap ===\n");
    text += QStringLiteral("   Entries:%1\n").arg(_fileMap.size());
    for (const FileMapEntry &entry : _fileMap) {
        text += QStringLiteral("   === FileMapEntry ===\n");
        text += Line("      Type:              %1(0x%2)\n", entry.type);
        text += Line("      Beginning Res ID:  %1(0x%2)\n", entry.beginningResId);
        text += Line("      Additional Res ID: %1(0x%2)\n", entry.additionalResId);
        text += Line("      Offset Index:      %1(0x%2)\n", entry.offsetIndex);
    }
    text += QStringLiteral("\n");

    text += QStringLiteral("   === Offset Table ===\n");
    text += QStringLiteral("      Count: %1\n").arg(_offsetTable.size());
    for (quint32 offset : _offsetTable)
        text += Line("      Offset: %1 (0x%2)\n", offset);

    text += QStringLiteral("=== Resources ===\n");
    text += QStringLiteral("   Number of: %1\n").arg(_resources.size());
    for (const QByteArray &block : _resources)
        text += QStringLiteral("    Resource: %1\n").arg(block.size());
    return text;
}
