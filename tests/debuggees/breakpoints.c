/* The breakpoint tests' program: a loop that calls one function (as many
   rounds as the first argument says, 3 without one), a comment line inside
   it, and a global that is written and read in both of its halves. */
#include <stdlib.h>

long counter;
int sink;

int bump(int step) {
  /* no code here */ // line:comment
  counter += step;   // line:bump-add
  return (int)counter;
}

int main(int argc, char** argv) {
  int rounds = argc > 1 ? atoi(argv[1]) : 3; // line:main-first
  for (int round = 0; round < rounds; ++round)
    sink = bump(1); // line:main-call
  counter += 0x100000000L; // line:upper-write
  sink = (int)(counter >> 32); // line:upper-read
  return sink;
}
