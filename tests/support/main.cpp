#include <cstdio>
#include <cstdlib>
#include <gtest/gtest.h>

int main(int argc, char **argv) {
    if (getenv("KOVA_BOX") == nullptr) {
        fprintf(stderr, "These tests write to /etc and /run: run them inside the box, as ./test does.\n");
        return 2;
    }
    ::testing::InitGoogleTest(&argc, argv);
    return RUN_ALL_TESTS();
}
