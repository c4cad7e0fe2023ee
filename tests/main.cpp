// The test program's entry. Its last line, "kral_tests: N passed, M failed", is required by the scripts: a program
// that did not really run cannot print it.
#include <gtest/gtest.h>

#include <cstdio>

int main(int argc, char** argv) {
  testing::InitGoogleTest(&argc, argv);
  const int result = RUN_ALL_TESTS();
  const auto& unit = *testing::UnitTest::GetInstance();
  std::fflush(stderr);
  std::printf("kral_tests: %d passed, %d failed\n", unit.successful_test_count(), unit.failed_test_count());
  std::fflush(stdout);
  return unit.successful_test_count() > 0 ? result : 1;
}
