#pragma once

#include "../common/export.h"
#include "../device/device.h"

#include <QList>

class Log;

// Opens connections to handsets.
class HARNESS_EXPORT ConnectFactory
{
public:
    // Prepares the device layer once per process; true when it is ready.
    static bool Initialize();
    // Ends what Initialize() started.
    static void Uninitialize();
    // Fills targets with the reachable handsets; returns their count.
    static unsigned int ListTargets(QList<ConnectTarget> &targets);
    // An open connection, or null (with the reason in the log). The
    // connection reports later refusals (a damaged package) to log as well,
    // so log must outlive it.
    static IKestoDevice *ConnectToTarget(const ConnectTarget &target, Log *log);
    // Closes and deletes a connection from ConnectToTarget; null is ignored.
    static void DisconnectTarget(IKestoDevice *device);
};
