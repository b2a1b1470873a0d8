#include "common/clock.h"

#include <QCoreApplication>
#include <QTemporaryDir>

#include <gtest/gtest.h>

// Every test program starts with a private data root and an instant clock, so
// that no test touches the user's folders or waits for real time to pass.
// Tests that need other values set them themselves.
int main(int argc, char **argv)
{
    QCoreApplication app(argc, argv);
    ::testing::InitGoogleTest(&argc, argv);

    QTemporaryDir root;
    if (!root.isValid())
        return 2;
    qputenv("KESTIX_DATA_ROOT", root.path().toLocal8Bit());
    qputenv("KESTIX_HANDSETS", (root.path() + QStringLiteral("/handsets")).toLocal8Bit());
    qputenv("KESTIX_TIME_SCALE", "0");
    for (const char *name : {"KESTIX_TOOLSET", "KESTIX_PLATFORMS_ALL", "KESTIX_PLATFORM",
                             "KESTIX_TESTSETS_ALL", "KESTIX_TESTSET"})
        qunsetenv(name);
    Clock::SetScale(0.0);

    return RUN_ALL_TESTS();
}
