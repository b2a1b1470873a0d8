#pragma once

#include "device/device.h"

#include <gmock/gmock.h>

// A handset whose every operation is a mock, for tests of call sequences and of answers that the emulated handset
// cannot give (a module that runs for ever, a failing copy).
class MockDevice : public IKestoDevice
{
public:
    MockDevice() : IKestoDevice(ConnectTarget(QStringLiteral("mock"), QStringLiteral("mock handset"))) { }

    MOCK_METHOD(unsigned int, GetPlatformVersion, (QString &), (override));
    MOCK_METHOD(unsigned int, StartProgram, (const QString &, const QString &), (override));
    MOCK_METHOD(bool, IsProgramRunning, (const QString &), (override));
    MOCK_METHOD(unsigned int, StartApplet, (unsigned int, const QString &), (override));
    MOCK_METHOD(bool, IsAppletRunning, (unsigned int), (override));
    MOCK_METHOD(unsigned int, ListDirectory, (const QString &, QSharedPointer<_DirectoryInfo> &), (override));
    MOCK_METHOD(unsigned int, RemoveDirectory, (const QString &), (override));
    MOCK_METHOD(unsigned int, DeleteFile, (const QString &), (override));
    MOCK_METHOD(unsigned int, InstallPackage, (const QString &), (override));
    MOCK_METHOD(unsigned int, CopyFileToDevice, (const QString &, const QString &), (override));
    MOCK_METHOD(unsigned int, CopyFileFromDevice, (const QString &, const QString &), (override));
    MOCK_METHOD(unsigned int, FindModule, (unsigned int, QString &), (override));
    MOCK_METHOD(bool, FileExists, (const QString &), (override));
    MOCK_METHOD(bool, CopyOnDevice, (const QString &, const QString &), (override));
};

// A listing action for ListDirectory: answers 0 with the given file names.
inline auto ListingOf(const QStringList &files)
{
    return [files](const QString &directory, QSharedPointer<_DirectoryInfo> &info) -> unsigned int {
        info.reset(new _DirectoryInfo);
        info->directory = directory;
        for (const QString &file : files) {
            _FileInfo entry;
            entry.fileName = file;
            info->files.append(entry);
        }
        return 0;
    };
}
