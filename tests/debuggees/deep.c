/* A stack as deep as its argument asks (10,000 calls by default): bottom,
   then recurse(left=0), recurse(left=1), ... and main outermost. */
#include <stdlib.h>

int bottom(int calls) { return calls * 2; }
int recurse(int left) {
  if (left == 0)
    return bottom(0);
  return recurse(left - 1) + 1;
}
int main(int argc, char** argv) { return recurse(argc > 1 ? atoi(argv[1]) : 10000) & 1; }
