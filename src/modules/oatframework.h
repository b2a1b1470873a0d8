#pragma once

#include "../catalogue/framework.h"
#include "../common/export.h"

// The OAT framework applet (class ID 0x01010001) with the run's compiled
// test data and device pack pushed into its handset directory.
class HARNESS_EXPORT _OatFramework : public _Framework
{
public:
    // The class ID of the OAT framework applet.
    static constexpr unsigned int kClassId = 0x01010001;

    _OatFramework();
    ~_OatFramework() override;

    // Whether the framework applet is installed (its own class ID, whatever
    // the record says).
    bool IsLoaded(IKestoDevice *device) override;
    // Installs the variant for the handset's platform and pushes whatever
    // test data and device pack the environment names. False when there is
    // no variant or the package is refused.
    bool Load(IKestoDevice *device, QMap<QString, QString> &env) override;
    // Pushes the test data and device pack caches whose flag keys hold
    // "true"; always true.
    bool PostLoad(IKestoDevice *device, QMap<QString, QString> &env) override;
    // Removes every OAT directory from the handset.
    void Unload(IKestoDevice *device, QMap<QString, QString> &env) override;
    // Post-processes every raw OAT log of the run's log folder.
    void PostProcess(QMap<QString, QString> &env) override;
};
