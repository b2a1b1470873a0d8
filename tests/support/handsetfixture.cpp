#include "support/handsetfixture.h"

#include "common/handsetpath.h"
#include "device/device.h"
#include "handset/connectfactory.h"

#include <QDir>
#include <QSettings>

#include <gtest/gtest.h>

namespace testutil {

HandsetFixture::HandsetFixture()
{
    EXPECT_TRUE(m_dir.isValid());
    QDir().mkpath(HandsetsFolder());
    QDir().mkpath(WorkFolder());
    m_env.Set("KESTIX_HANDSETS", HandsetsFolder());
}

QString HandsetFixture::AddHandset(const QString &name, const QString &description, const QString &platform,
                                   const QString &version)
{
    const QString folder = HandsetFolder(name);
    EXPECT_TRUE(QDir().mkpath(folder + u"/fs"_s));
    // QSettings writes no file for no keys, but the file marks the handset.
    WriteFile(folder + u"/handset.ini"_s, QByteArray());
    QSettings settings(folder + u"/handset.ini"_s, QSettings::IniFormat);
    if (!description.isEmpty())
        settings.setValue(u"description"_s, description);
    if (!platform.isEmpty())
        settings.setValue(u"platform"_s, platform);
    if (!version.isEmpty())
        settings.setValue(u"version"_s, version);
    settings.sync();
    EXPECT_EQ(settings.status(), QSettings::NoError);
    return folder;
}

QString HandsetFixture::HostPath(const QString &name, const QString &handsetPath) const
{
    return HandsetPath::ToHost(HandsetFolder(name), handsetPath);
}

QString HandsetFixture::MakePackage(const QString &fileName, const ModuleSpec &layout) const
{
    return MakePackage(fileName, ModuleMembers(layout));
}

QString HandsetFixture::MakePackage(const QString &fileName, const Members &members) const
{
    const QString path = WorkFolder() + u'/' + fileName;
    if (!KitWriter::WritePackage(path, members)) {
        ADD_FAILURE() << "cannot write package " << path.toStdString();
        return QString();
    }
    return path;
}

void HandsetFixture::Disconnect::operator()(IKestoDevice *device) const
{
    ConnectFactory::DisconnectTarget(device);
}

HandsetFixture::Device HandsetFixture::Connect(const QString &name, Log *log) const
{
    return Device(ConnectFactory::ConnectToTarget(ConnectTarget(name, name), log));
}

} // namespace testutil
