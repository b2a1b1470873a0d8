#pragma once

#include "support/testutil.h"

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

// A program record (system resource of a program type) of a module
// information file.
struct MifProgram
{
    QString name;      // the key the program is started by
    QString arguments; // stored as "Arguments" when not empty
    unsigned int type = 0x0102FAF7;
};

// One module of a package: the members are placed below `directory`, the
// module's folder on the handset ("fs:/usermods/<directory>/").
struct ModuleSpec
{
    QString directory;
    // Name of the module information file; directory + ".mif" when empty.
    QString mifName;
    QVector<unsigned int> classIds;
    QVector<unsigned int> appletIds;
    QList<MifProgram> programs;
    // OAT suite program records, keys "<vendor>:<suite>:<program name>".
    QStringList suitePrograms;
    // Text of the "behaviour" script; no script when empty.
    QByteArray behaviour;
    // Further members, names relative to directory.
    QList<QPair<QString, QByteArray>> files;
};

using Members = QList<QPair<QString, QByteArray>>;

// The bytes of a module information file listing the layout's class IDs,
// applets and program records (with a 40-byte header block).
QByteArray BuildMif(const ModuleSpec &layout);

// The members of the module's package: the .mif, the behaviour (when given)
// and the further files, all below layout.directory.
Members ModuleMembers(const ModuleSpec &layout);

// Writes a tar package of the members (names as given, written by the
// library's own Tar); false when it cannot be written.
bool WritePackage(const QString &path, const Members &members);

// A private handsets folder: sets KESTIX_HANDSETS to a temporary folder for
// the fixture's lifetime, creates handsets in it and packages beside it.
//
//   testutil::HandsetFixture fixture;
//   fixture.AddHandset("phone", "Test phone", "arm", "1.2");
//   QString package = fixture.MakePackage("ctf.kestix", layout);
//   auto device = fixture.Connect("phone");
//   device->InstallPackage(package);
class HandsetFixture
{
public:
    HandsetFixture();
    ~HandsetFixture();
    HandsetFixture(const HandsetFixture &) = delete;
    HandsetFixture &operator=(const HandsetFixture &) = delete;

    // The handsets folder (KESTIX_HANDSETS).
    QString HandsetsFolder() const;
    // A folder for packages and host files, outside the handsets folder.
    QString WorkFolder() const;

    // Creates <handsets>/<name>/handset.ini holding the keys given (empty
    // ones are left out) and an empty fs folder; returns the handset folder.
    QString AddHandset(const QString &name, const QString &description = QString(),
                       const QString &platform = QString(), const QString &version = QString());
    QString HandsetFolder(const QString &name) const;
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
    // ConnectFactory::ConnectToTarget to the handset of that name (null when
    // it refuses), reporting to log.
    Device Connect(const QString &name, Log *log = nullptr) const;

private:
    QTemporaryDir m_dir;
    EnvGuard m_env;
};

} // namespace testutil
