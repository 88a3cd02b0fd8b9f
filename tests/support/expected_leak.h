// What is allocated while one of these lives may never be given back: a handle that a failed call
// leaves open on purpose, say. Tells the leak check of a sanitized build so.
#pragma once

#if defined(__SANITIZE_ADDRESS__)
#include <sanitizer/lsan_interface.h>
#endif

namespace support {

class ExpectedLeak {
 public:
  ExpectedLeak() {
#if defined(__SANITIZE_ADDRESS__)
    __lsan_disable();
#endif
  }
  ~ExpectedLeak() {
#if defined(__SANITIZE_ADDRESS__)
    __lsan_enable();
#endif
  }
  ExpectedLeak(const ExpectedLeak &) = delete;
  ExpectedLeak &operator=(const ExpectedLeak &) = delete;
};

}  // namespace support
