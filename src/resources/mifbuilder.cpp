#include "resources/mifbuilder.h"

#include "resources/kestoresources.h"
#include "resources/sysresource.h"

#include <QDataStream>
#include <QIODevice>

namespace {

constexpr quint16 kHeaderId = 0;
constexpr quint16 kClassesId = 1;
constexpr quint16 kAppletsId = 2;
constexpr int kHeaderSize = 40;
// A key of exactly SysResource::kNumericKeySize bytes reads back as a
// number, so text keys are padded to a multiple of four and never to four.
constexpr int kNumericKeySize = SysResource::kNumericKeySize;

QByteArray PaddedKey(const QString &key)
{
    QByteArray bytes = key.toUtf8();
    int size = (int(bytes.size()) + 1 + 3) / 4 * 4;
    if (size == kNumericKeySize)
        size = 2 * kNumericKeySize;
    bytes.resize(size, '\0');
    return bytes;
}

QDataStream &LittleEndian(QDataStream &stream)
{
    stream.setByteOrder(QDataStream::LittleEndian);
    return stream;
}

} // namespace

void MifBuilder::AddClass(unsigned int classId)
{
    m_classes.append(classId);
}

void MifBuilder::AddApplet(unsigned int classId, quint16 appletType, quint16 baseId)
{
    m_applets.append({classId, appletType, baseId});
}

void MifBuilder::AddProgram(const QString &name, const QString &arguments, unsigned int type)
{
    const QByteArray key = PaddedKey(name);
    QByteArray args = arguments.toUtf8();
    if (!args.isEmpty())
        args.append('\0');
    QByteArray block;
    QDataStream out(&block, QIODevice::WriteOnly);
    LittleEndian(out) << quint16(key.size()) << quint32(type);
    out.writeRawData(key.constData(), int(key.size()));
    // version, main id, flags, priority, stack size, max services, max
    // memory, privilege index
    for (int field = 0; field < 8; ++field)
        out << quint32(0);
    out << quint32(args.size());
    out.writeRawData(args.constData(), int(args.size()));
    m_programs.append(block);
}

void MifBuilder::AddSuiteProgram(const QString &key)
{
    const QByteArray bytes = PaddedKey(key);
    QByteArray block;
    QDataStream out(&block, QIODevice::WriteOnly);
    LittleEndian(out) << quint16(bytes.size()) << SysResource::kTypeKeyedProgram;
    out.writeRawData(bytes.constData(), int(bytes.size()));
    m_programs.append(block);
}

QByteArray MifBuilder::Build() const
{
    KestoResources resources;
    resources.AddBinary(KestoResources::kTypeBinaries, kHeaderId, QByteArray(kHeaderSize, '\0'));
    if (!m_classes.isEmpty()) {
        QByteArray classes;
        QDataStream out(&classes, QIODevice::WriteOnly);
        LittleEndian(out);
        for (unsigned int id : m_classes)
            out << quint32(id);
        resources.AddBinary(KestoResources::kTypeBinaries, kClassesId, classes);
    }
    if (!m_applets.isEmpty()) {
        QByteArray applets;
        QDataStream out(&applets, QIODevice::WriteOnly);
        LittleEndian(out);
        // class ID, name reference, base ID, applet type, host ID, privilege set, flags
        for (const AppletRecord &a : m_applets)
            out << quint32(a.id) << quint32(0) << a.baseId << a.type << quint32(0) << quint16(0) << quint16(0);
        resources.AddBinary(KestoResources::kTypeBinaries, kAppletsId, applets);
    }
    quint16 id = 1;
    for (const QByteArray &program : m_programs)
        resources.AddBinary(KestoResources::kTypeSysResource, id++, program);
    QByteArray bytes;
    resources.SaveTo(bytes);
    return bytes;
}
