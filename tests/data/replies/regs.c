#include <emmintrin.h>
#include <pthread.h>
#include <stdio.h>
struct point { int x; int y; };
static volatile int stop_here;
static void *spin(void *arg) { while (!stop_here) ; return arg; }
int scale(int value, int factor) {
  int product = value * factor;
  return product;
}
int main(void) {
  struct point p = {3, 4};
  unsigned char bytes[4] = {10, 11, 12, 255};
  pthread_t t;
  pthread_create(&t, NULL, spin, NULL);
  long double ld = 5.0L;
  __m128i v = _mm_set_epi32(0x44556677, 0x00112233, 0x8899aabb, 0x11223344);
  __m128i w = _mm_add_epi32(v, _mm_set1_epi32(0));
  __asm__ volatile ("movdqa %0, %%xmm1" : : "x"(w) : "xmm1");
  __asm__ volatile ("fldt %0" : : "m"(ld));
  int r = scale(p.x, p.y);
  stop_here = 1;
  pthread_join(t, NULL);
  printf("%d %d\n", r, bytes[0]);
  return 8;
}
