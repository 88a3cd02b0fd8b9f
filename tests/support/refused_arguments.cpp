#include "refused_arguments.h"

#include <gtest/gtest.h>

#include "captured_log.h"
#include "sandbox_fixture.h"
#include "zelocore.h"

namespace support {

void expectRefused(const std::string &unit, const std::vector<RefusedCall> &calls) {
  for (const RefusedCall &refused : calls) {
    SCOPED_TRACE("call " + std::to_string(&refused - calls.data()) + ": " + refused.condition);
    clearLog();
    QLIBCErrSetEx(0, "", 0);
    EXPECT_EQ(refused.call(), -1);
    EXPECT_EQ(logged(), std::vector<std::string>{unit + ":N Invaild Argument (" +
                                                 refused.condition + ")=[0]\n"});
    EXPECT_EQ(loggedPriorities(), std::vector<int>{3});
    EXPECT_EQ(errorRecord(), (ErrorRecord{0x0D00, unit}));
  }
}

}  // namespace support
