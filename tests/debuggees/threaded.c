#include <pthread.h>
static volatile int Sink, Waiting;
static void ready(void) { Sink = 0; }
static int inner(int x) { Sink = x; return x * 2; }
static int outer(int a, int b) { return inner(a + b); }
static void *worker(void *arg) { (void)arg; while (!Waiting) {} outer(1, 2); return 0; }
static void finish(pthread_t t) { Waiting = 1; pthread_join(t, 0); }
int main(int argc, char **argv) {
  pthread_t t;
  ready();
  pthread_create(&t, 0, worker, 0);
  finish(t);
  return argc - 1;
}
