/* A program that receives SIGUSR1 and then faults with SIGSEGV. */
#include <signal.h>
#include <stdio.h>

static volatile int *nowhere;

int main(void)
{
  printf("raising");
  fflush(stdout);
  raise(SIGUSR1); /* line:raise */
  printf(" faulting\n");
  fflush(stdout);
  *nowhere = 42; /* line:fault */
  return 0;
}
