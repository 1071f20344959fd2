/* Two worker threads created and joined. A barrier holds both workers
   until both exist, so that the breakpoint in the worker always sees three
   threads. */
#include <pthread.h>
#include <stdio.h>

static int results[2];
static pthread_barrier_t bothStarted;

static void *worker(void *argument)
{
  int index = *(int *)argument;
  pthread_barrier_wait(&bothStarted);
  results[index] = (index + 1) * 10; /* line:worker-body */
  return NULL;
}

int main(void)
{
  pthread_t threads[2];
  int indexes[2] = {0, 1};
  pthread_barrier_init(&bothStarted, NULL, 2);
  for (int i = 0; i < 2; ++i)
    pthread_create(&threads[i], NULL, worker, &indexes[i]);
  for (int i = 0; i < 2; ++i)
    pthread_join(threads[i], NULL);
  printf("results %d %d\n", results[0], results[1]); /* line:after-join */
  fflush(stdout);
  return 0;
}
