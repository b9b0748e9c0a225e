// main() of every test program: enters the sandbox once, and gives each test fresh, empty roots.
#include <gtest/gtest.h>

#include "tests/harness/Sandbox.h"

namespace {

class FreshSandboxPerTest : public ::testing::EmptyTestEventListener {
    void OnTestStart(const ::testing::TestInfo&) override { harmona::test::ResetSandbox(); }
};

class SandboxEnvironment : public ::testing::Environment {
    void SetUp() override { harmona::test::EnterSandbox(); }
};

}  // namespace

int main(int argc, char** argv) {
    ::testing::InitGoogleTest(&argc, argv);
    ::testing::AddGlobalTestEnvironment(new SandboxEnvironment);
    ::testing::UnitTest::GetInstance()->listeners().Append(new FreshSandboxPerTest);
    return RUN_ALL_TESTS();
}
