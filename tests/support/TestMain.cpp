#include "TestHost.h"

#include <gtest/gtest.h>

int main(int argc, char** argv)
{
    testing::InitGoogleTest(&argc, argv);
    TestSupport::StartTestHost(argc, argv);
    const int result = RUN_ALL_TESTS();
    TestSupport::StopTestHost();
    return result;
}
