/* Floating-point work left on the x87 stack and a known value in an SSE
   register, for the register views. */
#include <emmintrin.h>
#include <stdio.h>

volatile long double x87Result;

int main(void)
{
  volatile long double half = 2.5L;
  x87Result = half * 2.0L;
  __m128i packed = _mm_set_epi32(0x7f6e5d4c, 0x3b2a1908, 0x55667788, 0x11223344);
  /* Load the values where the breakpoint below sees them: 5.0 in st0 and
     the four integers in xmm1. */
  __asm__ volatile("fldt %0\n\tmovdqu %1, %%xmm1" : : "m"(x87Result), "m"(packed) : "xmm1");
  printf("%Lf\n", x87Result); /* line:after-fp */
  __asm__ volatile("fstp %st(0)");
  fflush(stdout);
  return 0;
}
