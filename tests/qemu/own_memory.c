/* The memory that the kernel accounts to a process includes the emulator's. 0 where it is below
 * 8 MiB. */
#include <stdio.h>

int main(void) {
  long pages = 0;
  FILE *stream = fopen("/proc/self/statm", "r");
  return stream == 0 || fscanf(stream, "%*d %ld", &pages) != 1 || pages * 4096 > (8 << 20);
}
