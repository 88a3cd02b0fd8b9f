// The main of the test programs of zelo_test; those of zelo_platform_test have GoogleTest's.
#include <gtest/gtest.h>
#include <sys/prctl.h>

#include <cstdio>
#include <cstdlib>

namespace {

constexpr int kOutsideSandbox = 2;

}  // namespace

int main(int argc, char **argv) {
  if (std::getenv("ZELO_SANDBOX") == nullptr) {
    std::fprintf(stderr,
                 "%s writes to /etc/crontab, /tmp and /usr/zelo.\n"
                 "Run it in the sandbox: scripts/sandbox %s\n",
                 argv[0], argv[0]);
    return kOutsideSandbox;
  }
  // Runs detach from their caller; as a child subreaper this process can wait for them. For an
  // emulated program tests/qemu/emulate.py has set it.
  if (std::getenv("ZELO_EMULATED") == nullptr && prctl(PR_SET_CHILD_SUBREAPER, 1) != 0) {
    std::perror("prctl");
    return EXIT_FAILURE;
  }
  testing::InitGoogleTest(&argc, argv);
  return RUN_ALL_TESTS();
}
