// Times that differ from machine to machine.
#include <gtest/gtest.h>

#include <cmath>
#include <cstdio>
#include <map>
#include <string>

#include "store/stagger.h"
#include "terminal/failure.h"

namespace support {
namespace {

constexpr char kMachine[] = "0123456789abcdef0123456789abcdef";

std::string machine(unsigned number) {
  char id[40];
  std::snprintf(id, sizeof id, "%032x", number * 2654435761U);
  return id;
}

TEST(ZeloschedStaggerTest, AWindowIsSaidInMinutesOrHours) {
  EXPECT_EQ(minutesOfWindow("1m"), 1U);
  EXPECT_EQ(minutesOfWindow("30m"), 30U);
  EXPECT_EQ(minutesOfWindow("2h"), 120U);
  EXPECT_EQ(minutesOfWindow("120s"), 2U);
  EXPECT_EQ(minutesOfWindow("1d"), 1440U);
  for (const char *text : {"", "30", "0m", "30s", "90s", "25h", "2d", "m", "-1h"}) {
    EXPECT_THROW(minutesOfWindow(text), UsageError) << text;
  }
}

// A later version must give each machine the same minutes.
TEST(ZeloschedStaggerTest, TheMinuteOfAMachineIsTheSameForEver) {
  EXPECT_EQ(placeInWindow(kMachine, "backup", "Nightly", 30), 8U);
  EXPECT_EQ(placeInWindow(kMachine, "backup", "Nightly", 1440), 1118U);
  EXPECT_EQ(placeInWindow(kMachine, "", "Nightly", 1440), 953U);
  EXPECT_EQ(placeInWindow(machine(7), "backup", "Nightly", 1440), 1278U);
}

TEST(ZeloschedStaggerTest, TenThousandMachinesAreSpreadEvenly) {
  for (const uint32_t window : {7U, 30U, 32U, 120U}) {
    std::map<uint32_t, int> counts;
    constexpr int kMachines = 10000;
    for (unsigned i = 0; i < kMachines; ++i) {
      ++counts[placeInWindow(machine(i), "backup", "Nightly", window)];
    }
    EXPECT_EQ(counts.size(), window);
    const double mean = static_cast<double>(kMachines) / window;
    for (const auto &[minute, count] : counts) {
      EXPECT_LT(minute, window);
      EXPECT_NEAR(count, mean, 6 * std::sqrt(mean)) << minute << " of " << window;
    }
  }
}

TEST(ZeloschedStaggerTest, SoAreTheTasksOfOneMachine) {
  std::map<uint32_t, int> counts;
  for (int i = 0; i < 320; ++i) {
    ++counts[placeInWindow(kMachine, "backup", "task " + std::to_string(i), 32)];
  }
  EXPECT_GT(counts.size(), 30U);
}

// "a" and "bc" are not "ab" and "c".
TEST(ZeloschedStaggerTest, ApplicationAndNameAreTwoTexts) {
  EXPECT_NE(placeInWindow(kMachine, "a", "bc", 1440), placeInWindow(kMachine, "ab", "c", 1440));
}

}  // namespace
}  // namespace support
