// A platform that is stricter than ours: it does not accept null to be freed, and before the first
// failure its error record has no file name.
#include <dlfcn.h>
#include <gtest/gtest.h>

#include "captured_log.h"
#include "failing_calls.h"
#include "sandbox_fixture.h"
#include "tasks.h"
#include "zelocore.h"
#include "zelosched.h"

namespace {

using support::failCall;
using support::logged;
using Lines = std::vector<std::string>;

int freedNulls = 0;
bool hasFileName = true;

template <class Function>
Function *real(const char *name) {
  return reinterpret_cast<Function *>(dlsym(RTLD_NEXT, name));
}

}  // namespace

#pragma GCC visibility push(default)
extern "C" {

void QLIBCSzHashFree(PSZHASH hash) {
  freedNulls += hash == nullptr ? 1 : 0;
  real<void(PSZHASH)>("QLIBCSzHashFree")(hash);
}

void QLIBCSzListFree(PSZLIST list) {
  freedNulls += list == nullptr ? 1 : 0;
  real<void(PSZLIST)>("QLIBCSzListFree")(list);
}

const char *QLIBCErrorGetFile(void) {
  return hasFileName ? real<const char *()>("QLIBCErrorGetFile")() : nullptr;
}
}
#pragma GCC visibility pop

namespace {

class StrictPlatformTest : public support::SandboxTest {
 protected:
  void SetUp() override {
    SandboxTest::SetUp();
    freedNulls = 0;
  }
  void TearDown() override {
    hasFileName = true;
    SandboxTest::TearDown();
  }
};

TEST_F(StrictPlatformTest, AHashOrAListThatWasNotHadIsNotFreed) {
  ZELO_SCHED_TASK *tasks = nullptr;
  ZELO_SCHED_TASK task = {};
  EXPECT_EQ(ZELOSchedTaskListGet(&tasks, nullptr), 0);
  for (const char *call : {"QLIBCSzHashAlloc", "QLIBCSzListAlloc"}) {
    failCall(call, {.times = support::kAlways});
    ZELOSchedTaskListGet(&tasks, nullptr);
    EXPECT_EQ(ZELOSchedTaskGetByID(7, &task), -1);
    EXPECT_EQ(ZELOSchedTaskSaveFromJson("{}", 0), -1);
    support::resetFailingCalls();
  }
  EXPECT_EQ(freedNulls, 0);
}

TEST_F(StrictPlatformTest, AnErrorRecordWithoutAFileNameIsKept) {
  hasFileName = false;
  const char json[] =
      R"({"id":"\"-1\"","run hour":"\"1\"","run min":"\"2\"","name":"\"n\"","app":"\"a\"",)"
      R"("app name":"\"b\"","action":"\"c\"","cmd":"\"bHM=\"","state":"\"enabled\"",)"
      R"("type":"\"daily\""})";
  EXPECT_EQ(ZELOSchedTaskSaveFromJson(json, 1), 1);
}

TEST_F(StrictPlatformTest, AFailureWithoutAFileNameIsLogged) {
  failCall("QLIBCSzHashAlloc", {.times = support::kAlways});
  hasFileName = false;
  EXPECT_EQ(ZELOSchedTaskAlloc(), nullptr);
  ASSERT_FALSE(logged().empty());
  EXPECT_EQ(logged()[0].find("(null)"), std::string::npos) << logged()[0];
}

}  // namespace
