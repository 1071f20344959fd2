/* Two worker threads that sleep for ever beside a main thread that sleeps
   too; "started.flag" appears in the working directory once all three
   exist, so that a pause finds three threads none of which stopped itself. */
#include <pthread.h>
#include <stdio.h>
#include <unistd.h>
static void *idle(void *arg) { for (;;) sleep(1); return arg; }
int main(void) {
  pthread_t workers[2];
  for (int i = 0; i < 2; ++i) pthread_create(&workers[i], 0, idle, 0);
  fclose(fopen("started.flag", "w"));
  for (;;) sleep(1);
  return 0;
}
