/* Two worker threads that start and end while main waits; exits with 6. */
#include <pthread.h>
static void *work(void *arg) { return arg; }
int main(void) {
  pthread_t workers[2];
  for (int i = 0; i < 2; ++i) pthread_create(&workers[i], 0, work, 0);
  for (int i = 0; i < 2; ++i) pthread_join(workers[i], 0);
  return 6;
}
