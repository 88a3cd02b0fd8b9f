/* The kernel cannot execute a program of the emulated processor. 0 where it can. */
#include <unistd.h>

int main(int argc, char **argv) {
  if (argc == 1) execl(argv[0], argv[0], "started", (char *)0);
  return argc == 1;
}
