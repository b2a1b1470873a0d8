#include "support/testutil.h"

#include <QCoreApplication>
#include <QTemporaryDir>

#include <gtest/gtest.h>

// Every test program starts with a private data root and an instant clock, so that no test touches the user's folders
// or waits for real time to pass. Tests that need other values set them themselves.
int main(int argc, char **argv)
{
    QCoreApplication app(argc, argv);
    ::testing::InitGoogleTest(&argc, argv);

    QTemporaryDir root;
    if (!root.isValid())
        return 2;
    testutil::IsolateEnvironment(root);

    return RUN_ALL_TESTS();
}
