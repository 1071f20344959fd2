/* Handles SIGUSR1 and exits with 5; with an argument it then faults. */
#include <signal.h>
static volatile int handled = 0;
static void on_usr1(int signal_number) { handled = signal_number; }
int main(int argc, char** argv) {
  (void)argv;
  signal(SIGUSR1, on_usr1);
  raise(SIGUSR1);
  if (argc > 1)
    *(volatile int*)0 = 1;
  return handled == SIGUSR1 ? 5 : 6;
}
