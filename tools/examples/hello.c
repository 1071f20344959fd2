/* The example program the demonstration debugs. */
#include <stdio.h>

static int square(int value) { return value * value; }

int main(int argc, char **argv) {
  int total = 0;
  for (int i = 1; i <= 3; ++i)
    total += square(i);
  printf("hello from %s: total %d\n", argv[0], total);
  return argc == 1 ? 0 : 2;
}
