#include "support/handsetfixture.h"

#include "archive/tar.h"
#include "common/handsetpath.h"
#include "device/device.h"
#include "resources/kestoresources.h"

#include <QDataStream>
#include <QDir>
#include <QSettings>

#include <gtest/gtest.h>

namespace testutil {

namespace {

constexpr quint16 kMifHeaderId = 0;
constexpr quint16 kMifClassesId = 1;
constexpr quint16 kMifAppletsId = 2;
constexpr int kMifHeaderSize = 40;
constexpr quint16 kAppletType = 1;

QDataStream &LittleEndian(QDataStream &stream)
{
    stream.setByteOrder(QDataStream::LittleEndian);
    return stream;
}

// A program record: keysize, type, the name padded with NULs (never to
// exactly 4 bytes, which would read as a number), nine fields, arguments.
QByteArray ProgramRecord(const MifProgram &program)
{
    QByteArray key = program.name.toUtf8();
    int keySize = (key.size() + 1 + 3) / 4 * 4;
    if (keySize == 4)
        keySize = 8;
    key.resize(keySize, '\0');
    QByteArray arguments = program.arguments.toUtf8();
    if (!arguments.isEmpty())
        arguments.append('\0');

    QByteArray block;
    QDataStream out(&block, QIODevice::WriteOnly);
    LittleEndian(out) << quint16(keySize) << quint32(program.type);
    out.writeRawData(key.constData(), key.size());
    // version, main id, flags, priority, stack size, max services, max
    // memory, privilege index
    for (int field = 0; field < 8; ++field)
        out << quint32(0);
    out << quint32(arguments.size());
    out.writeRawData(arguments.constData(), arguments.size());
    return block;
}

} // namespace

QByteArray BuildMif(const ModuleSpec &spec)
{
    KestoResources resources;
    resources.AddBinary(KestoResources::kTypeBinaries, kMifHeaderId, QByteArray(kMifHeaderSize, '\0'));

    if (!spec.classIds.isEmpty()) {
        QByteArray classes;
        QDataStream out(&classes, QIODevice::WriteOnly);
        LittleEndian(out);
        for (unsigned int id : spec.classIds)
            out << quint32(id);
        resources.AddBinary(KestoResources::kTypeBinaries, kMifClassesId, classes);
    }
    if (!spec.appletIds.isEmpty()) {
        QByteArray applets;
        QDataStream out(&applets, QIODevice::WriteOnly);
        LittleEndian(out);
        for (unsigned int id : spec.appletIds) // id, name reference, baseid, apptype, hostid, privset, flags
            out << quint32(id) << quint32(0) << quint16(0) << kAppletType << quint32(0) << quint16(0)
                << quint16(0);
        resources.AddBinary(KestoResources::kTypeBinaries, kMifAppletsId, applets);
    }
    quint16 id = 1;
    for (const MifProgram &program : spec.programs)
        resources.AddBinary(KestoResources::kTypeSysResource, id++, ProgramRecord(program));

    QByteArray bytes;
    EXPECT_TRUE(resources.SaveTo(bytes));
    return bytes;
}

Members ModuleMembers(const ModuleSpec &spec)
{
    const QString prefix = spec.directory.isEmpty() ? QString() : spec.directory + QLatin1Char('/');
    const QString mifName = spec.mifName.isEmpty() ? spec.directory + QStringLiteral(".mif") : spec.mifName;
    Members members;
    members.append({prefix + mifName, BuildMif(spec)});
    if (!spec.behaviour.isEmpty())
        members.append({prefix + QStringLiteral("behaviour"), spec.behaviour});
    for (const auto &file : spec.files)
        members.append({prefix + file.first, file.second});
    return members;
}

bool WritePackage(const QString &path, const Members &members)
{
    Tar tar;
    for (const auto &member : members)
        tar.AddFile(member.first, member.second);
    return tar.Write(path);
}

HandsetFixture::HandsetFixture()
{
    EXPECT_TRUE(m_dir.isValid());
    QDir().mkpath(HandsetsFolder());
    QDir().mkpath(WorkFolder());
    m_env.Set("KESTIX_HANDSETS", HandsetsFolder());
}

HandsetFixture::~HandsetFixture() = default;

QString HandsetFixture::HandsetsFolder() const
{
    return m_dir.filePath(QStringLiteral("handsets"));
}

QString HandsetFixture::WorkFolder() const
{
    return m_dir.filePath(QStringLiteral("work"));
}

QString HandsetFixture::AddHandset(const QString &name, const QString &description,
                                   const QString &platform, const QString &version)
{
    const QString folder = HandsetFolder(name);
    EXPECT_TRUE(QDir().mkpath(folder + QStringLiteral("/fs")));
    // QSettings writes no file for no keys, but the file marks the handset.
    WriteFile(folder + QStringLiteral("/handset.ini"), QByteArray());
    QSettings settings(folder + QStringLiteral("/handset.ini"), QSettings::IniFormat);
    if (!description.isEmpty())
        settings.setValue(QStringLiteral("description"), description);
    if (!platform.isEmpty())
        settings.setValue(QStringLiteral("platform"), platform);
    if (!version.isEmpty())
        settings.setValue(QStringLiteral("version"), version);
    settings.sync();
    EXPECT_EQ(settings.status(), QSettings::NoError);
    return folder;
}

QString HandsetFixture::HandsetFolder(const QString &name) const
{
    return HandsetsFolder() + QLatin1Char('/') + name;
}

QString HandsetFixture::HostPath(const QString &name, const QString &handsetPath) const
{
    return HandsetPath::ToHost(HandsetFolder(name), handsetPath);
}

QString HandsetFixture::MakePackage(const QString &fileName, const ModuleSpec &spec) const
{
    return MakePackage(fileName, ModuleMembers(spec));
}

QString HandsetFixture::MakePackage(const QString &fileName, const Members &members) const
{
    const QString path = WorkFolder() + QLatin1Char('/') + fileName;
    if (!WritePackage(path, members)) {
        ADD_FAILURE() << "cannot write package " << path.toStdString();
        return QString();
    }
    return path;
}

void HandsetFixture::Disconnect::operator()(IKestoDevice *device) const
{
    ConnectFactory::DisconnectTarget(device);
}

HandsetFixture::Device HandsetFixture::Connect(const QString &name) const
{
    return Device(ConnectFactory::ConnectToTarget(ConnectTarget(name, name), nullptr));
}

} // namespace testutil
