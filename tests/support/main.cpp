// The main of every test program.
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
  // Runs detach from their caller; this makes them our children all the same, to be waited for.
  // An emulator of another processor was asked to do it (tests/qemu/emulate.py).
  if (std::getenv("ZELO_EMULATED") == nullptr && prctl(PR_SET_CHILD_SUBREAPER, 1) != 0) {
    std::perror("prctl");
    return EXIT_FAILURE;
  }
  testing::InitGoogleTest(&argc, argv);
  return RUN_ALL_TESTS();
}
