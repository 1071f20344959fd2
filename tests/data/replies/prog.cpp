#include <pthread.h>
#include <cstdio>
template <typename T> T twice(T v) {
  T r = v + v;
  return r;
}
struct S { int a; double b; char name[8]; };
static void *worker(void *arg) {
  int *n = static_cast<int *>(arg);
  for (int i = 0; i < 3; ++i)
    *n += i;
  return nullptr;
}
int add(int x, int y) {
  int sum = x + y;
  return sum;
}
int main(int argc, char **argv) {
  S s = {1, 2.5, "abc"};
  int n = 0;
  pthread_t t;
  pthread_create(&t, nullptr, worker, &n);
  int a = twice(3);
  double d = twice(1.25);
  int r = add(a, n);
  pthread_join(t, nullptr);
  double e = d * 5.0;
  std::printf("%d %f %d %f\n", r, d, s.a, e);
  return r > 100 ? 8 : 0;
}
