#pragma once

#include "support/testutil.h"

#include "modules/kitwriter.h"

#include <QByteArray>
#include <QList>
#include <QPair>
#include <QString>
#include <QTemporaryDir>
#include <QVector>

#include <memory>

class IKestoDevice;
class Log;

namespace testutil {

// Packages of modules for the emulated handset, as the library's kit writer
// makes them: the layout's module information file and package members.
using ModuleSpec = KitPackage;
using Members = KitMembers;
inline QByteArray BuildMif(const ModuleSpec &layout)
{
    return layout.Mif();
}
inline Members ModuleMembers(const ModuleSpec &layout)
{
    return layout.Members();
}

// A private handsets folder: sets KESTIX_HANDSETS to a temporary folder for
// the fixture's lifetime, creates handsets in it and packages beside it.
class HandsetFixture
{
public:
    HandsetFixture();
    HandsetFixture(const HandsetFixture &) = delete;
    HandsetFixture &operator=(const HandsetFixture &) = delete;

    // The handsets folder (KESTIX_HANDSETS).
    QString HandsetsFolder() const { return m_dir.filePath(u"handsets"_s); }
    // A folder for packages and host files, outside the handsets folder.
    QString WorkFolder() const { return m_dir.filePath(u"work"_s); }

    // Creates <handsets>/<name>/handset.ini holding the keys given (empty
    // ones are left out) and an empty fs folder; returns the handset folder.
    QString AddHandset(const QString &name, const QString &description = QString(), const QString &platform = QString(),
                       const QString &version = QString());
    QString HandsetFolder(const QString &name) const { return HandsetsFolder() + u'/' + name; }
    // The host path of a handset path ("fs:/a/b") of handset name.
    QString HostPath(const QString &name, const QString &handsetPath) const;

    // Writes the module's package into the work folder; returns its path
    // (empty, with a test failure, when it cannot be written).
    QString MakePackage(const QString &fileName, const ModuleSpec &layout) const;
    QString MakePackage(const QString &fileName, const Members &members) const;

    struct Disconnect
    {
        void operator()(IKestoDevice *device) const;
    };
    using Device = std::unique_ptr<IKestoDevice, Disconnect>;
    // ConnectFactory::ConnectToTarget to the handset of that name (null when it refuses), reporting to log.
    Device Connect(const QString &name, Log *log = nullptr) const;

private:
    QTemporaryDir m_dir;
    EnvGuard m_env;
};

} // namespace testutil
