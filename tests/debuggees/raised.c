/* Raises SIGTRAP and then SIGINT itself, as a program with its own
   breakpoint or interrupt would, and exits with 4. */
#include <signal.h>
int main(void) {
  raise(SIGTRAP);
  raise(SIGINT);
  return 4;
}
