#include <cstdio>
#include <gtest/gtest.h>
#include <unistd.h>

// The tests write to "/etc", "/tmp" and "/mnt" as if the machine were theirs.
int main(int argc, char **argv)
{
    testing::InitGoogleTest(&argc, argv);
    if (!testing::GTEST_FLAG(list_tests) && access("/run/throwaway_appliance", F_OK) != 0) {
        std::fputs("These tests run inside a throwaway appliance only: use scripts/test or device/boot.\n",
                   stderr);
        return 1;
    }
    return RUN_ALL_TESTS();
}
