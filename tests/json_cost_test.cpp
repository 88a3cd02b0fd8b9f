// The processor time that a text made to exhaust the processor takes, compared with one of ordinary
// members of the same size.
#include <gtest/gtest.h>

#include <algorithm>
#include <cstdint>
#include <cstring>
#include <ctime>
#include <functional>
#include <string>
#include <vector>

#include "captured_log.h"
#include "sandbox_fixture.h"
#include "zelosched.h"

namespace {

constexpr size_t kSize = size_t{1} << 20;  // where the cost grows with the square, it is seconds

// A task with `rest` behind its members.
std::string taskWith(const std::string &rest) {
  constexpr char kTask[] =
      R"({"id":"\"-1\"","run hour":"\"1\"","run min":"\"2\"","name":"\"n\"","app":"\"a\"",)"
      R"("app name":"\"b\"","action":"\"c\"","cmd":"\"bHM=\"","state":"\"enabled\"",)"
      R"("type":"\"daily\"")";
  return kTask + rest + "}";
}

std::string repeated(const std::string &piece) {
  std::string text;
  while (text.size() < kSize) text += piece;
  return text;
}

std::string withMembers(const std::function<std::string(size_t)> &member) {
  std::string text;
  for (size_t i = 0; text.size() < kSize; ++i) text += "," + member(i);
  return taskWith(text);
}

std::string withValue(const std::string &value) {
  return taskWith(",\"x\":\"" + value + "\"");
}

std::string named(const std::string &name) {
  return "\"" + name + R"(":"\"\"")";
}

std::string harmless() {
  return withMembers([](size_t i) {
    const std::string number = std::to_string(100000 + i);
    return "\"member " + number + R"(":"\"value )" + number + R"(\"")";
  });
}

bool canStandInAString(char c) {
  const auto byte = static_cast<unsigned char>(c);
  return byte >= ' ' && c != '"' && c != '\\';
}

// Texts of 16 bytes that collide in a hash that mixes them with known constants.
std::string colliding() {
  uint64_t next = 0;
  return withMembers([&](size_t) {
    for (;; ++next) {
      constexpr uint64_t kMultiplier = 0x9E3779B97F4A7C15U;
      const uint64_t first = 0x4141414141414141U + (next & 0x1F) + ((next & 0xFFFFE0) << 3);
      const uint64_t state = (sizeof(uint64_t[2]) ^ first) * kMultiplier;
      const uint64_t words[] = {first, (state ^ (state >> 32)) ^ 0x6161616161616161U};
      std::string name(sizeof(words), '\0');
      std::memcpy(name.data(), words, sizeof(words));
      if (std::all_of(name.begin(), name.end(), canStandInAString)) {
        ++next;
        return named(name);
      }
    }
  });
}

double processorSeconds() {
  timespec used{};
  clock_gettime(CLOCK_PROCESS_CPUTIME_ID, &used);
  return static_cast<double>(used.tv_sec) + 1e-9 * static_cast<double>(used.tv_nsec);
}

class JsonCostTest : public support::SandboxTest {
 protected:
  // The least of three: the first also pays for memory that the others find.
  static double cost(const std::string &text, bool isAccepted) {
    double least = 1000;
    for (int round = 0; round < 3; ++round) {
      const double before = processorSeconds();
      const int id = ZELOSchedTaskSaveFromJson(text.c_str(), 1);
      least = std::min(least, processorSeconds() - before);
      EXPECT_EQ(id >= 0, isAccepted);
      support::clearLog();
    }
    return least;
  }
};

struct Text {
  const char *what;
  std::string text;
};

TEST_F(JsonCostTest, NoAcceptedTextCostsMoreThanFourTimesAHarmlessOneOfItsSize) {
  const double usual = cost(harmless(), true);
  const Text texts[] = {
      {"names that were made to collide", colliding()},
      {"small members", withMembers([](size_t i) { return named(std::to_string(i)); })},
      {"one name", withMembers([](size_t) { return named("k"); })},
      {"long names that differ at the end",
       withMembers([](size_t i) { return named(std::string(2000, 'k') + std::to_string(i)); })},
      {"a bad member before each good one",
       withMembers([](size_t) { return R"("k":1e5,)" + named("k"); })},
      {"escapes", withValue("\\\"" + repeated("\\u0041") + "\\\"")},
      {"escapes of escapes", withValue("\\\"" + repeated("\\\\u0041") + "\\\"")},
      {"surrogate pairs", withValue("\\\"" + repeated("\\\\ud83d\\\\ude00") + "\\\"")},
      {"backslashes", withValue("\\\"" + repeated("\\\\\\\\") + "\\\"")},
      {"comments", taskWith(repeated("/**/"))},
      {"comments to the end of the line", taskWith(repeated("//\n"))},
      {"comments behind the end", taskWith("") + repeated("/**/")},
      {"comments in a value", withValue(repeated("/**/") + "\\\"\\\"")},
      {"comments behind a value", withValue("\\\"\\\"" + repeated("/**/"))},
      {"blanks", taskWith(repeated(" \n"))},
  };
  for (const auto &[what, text] : texts) {
    SCOPED_TRACE(what);
    const double perByte = cost(text, true) / static_cast<double>(text.size());
    EXPECT_LT(perByte, 4 * usual / static_cast<double>(kSize));
  }
}

// Parsing such a value takes many times the memory of its text, and no task has one.
TEST_F(JsonCostTest, AWideOrDeepValueIsNotReadWhereItCannotBeTaken) {
  const double usual = cost(harmless(), true);
  const Text texts[] = {
      {"an array for a task", "[" + repeated("0,") + "0]"},
      {"arrays for a task", repeated("[")},
      {"an array in a string", withValue("[" + repeated("0,") + "0]")},
      {"objects in a string", withValue(repeated("{"))},
      {"a broken array in a string", withValue("/**/[" + repeated("1e1,"))},
  };
  for (const auto &[what, text] : texts) {
    SCOPED_TRACE(what);
    EXPECT_LT(cost(text, false), usual);
  }
}

// The value must be parsed to tell whether the text is JSON: in time linear in its size.
TEST_F(JsonCostTest, ARefusedTextCostsNoMoreThanAFewTimesAHarmlessOne) {
  const double usual = cost(harmless(), true);
  const Text texts[] = {
      {"an array", taskWith(",\"x\":[" + repeated("0,") + "0]")},
      {"numbers", taskWith(",\"x\":[" + repeated("1e1,") + "0]")},
      {"objects", taskWith(",\"x\":[" + repeated("{},") + "0]")},
      {"nested arrays",
       taskWith(",\"x\":[" + repeated(std::string(400, '[') + std::string(400, ']') + ",") + "0]")},
      {"an array that is given again", taskWith(",\"x\":[" + repeated("0,") + "0]," + named("x"))},
  };
  constexpr double kFew = 16;
  for (const auto &[what, text] : texts) {
    SCOPED_TRACE(what);
    EXPECT_LT(cost(text, false), kFew * usual);
  }
}

}  // namespace
