/* The example program the README's main command debugs: a loop that calls
   a small function, so that there is something to step over and into. */
#include <stdio.h>

static int square(int value) {
  int result = value * value;
  return result;
}

int main(int argc, char **argv) {
  int total = 0;
  for (int i = 1; i <= 3; ++i)
    total += square(i);
  printf("hello from %s: total %d\n", argv[0], total);
  return argc == 1 ? 0 : 2;
}
