/* Recurses as deep as its argument asks (300 calls by default), then raises
   SIGUSR1 at the bottom: a stop under a deep stack without a breakpoint. */
#include <signal.h>
#include <stdlib.h>

static int descend(int left)
{
  if (left == 0)
    return raise(SIGUSR1); /* line:bottom */
  return descend(left - 1) + 1;
}

int main(int argc, char **argv)
{
  return descend(argc > 1 ? atoi(argv[1]) : 300) & 1;
}
