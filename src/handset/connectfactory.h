#pragma once

#include "common/export.h"
#include "device/device.h"

#include <QList>

class Log;

// Opens connections to handsets.
class HARNESS_EXPORT ConnectFactory
{
public:
    static bool Initialize();
    static void Uninitialize();
    // Fills targets with the reachable handsets; returns their count.
    static unsigned int ListTargets(QList<ConnectTarget> &targets);
    // An open connection, or null (with the reason in the log).
    static IKestoDevice *ConnectToTarget(const ConnectTarget &target, Log *log);
    static void DisconnectTarget(IKestoDevice *device);
};
