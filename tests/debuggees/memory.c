/* Memory, code and registers for the memory, disassembly and register
   views: a global pattern, a stack buffer, a function below main, and a
   stop where the registers the tests write are read back by the program. */
#include <stdio.h>

unsigned char pattern[64];
volatile int shown = 7;
volatile unsigned long long seenRbx;
volatile unsigned char seenXmm[16];
volatile long double seenSt0;
volatile int pcNotMoved;

/* Lies below main in the program. */
int below_main(int value) { return value * 3 + 1; }

void inspect_stack(unsigned char *buffer) { buffer[0] ^= 0; }

static void stack_buffer(void)
{
  unsigned char local[32];
  for (int i = 0; i < 32; ++i)
    local[i] = (unsigned char)(0xa0 + i);
  inspect_stack(local);
}

/* Stops at registers_stop with rbx (0x1111), xmm2 (pattern's first 16
   bytes) and st0 (1.5) loaded; what the program
   then holds is stored where the tests read it. Moving the pc to
   registers_resume skips the store into pcNotMoved. */
static void registers(void)
{
  static const long double start = 1.5L;
  __asm__ volatile("fldt %[start]\n\t"
                   "movq $0x1111, %%rbx\n\t"
                   "movdqu %[pattern], %%xmm2\n\t"
                   ".globl registers_stop\n"
                   "registers_stop:\n\t"
                   "movl $1, %[notMoved]\n\t"
                   ".globl registers_resume\n"
                   "registers_resume:\n\t"
                   "movq %%rbx, %[rbx]\n\t"
                   "movdqu %%xmm2, %[xmm]\n\t"
                   "fstpt %[st0]\n\t"
                   : [rbx] "=m"(seenRbx), [xmm] "=m"(seenXmm), [st0] "=m"(seenSt0), [notMoved] "=m"(pcNotMoved)
                   : [start] "m"(start), [pattern] "m"(pattern)
                   : "rbx", "xmm2");
}

void report(void) { printf("shown=%d rbx=%llx\n", shown, seenRbx); }

int main(void)
{
  for (int i = 0; i < 64; ++i)
    pattern[i] = (unsigned char)i;
  stack_buffer();
  registers();
  report();
  fflush(stdout);
  return below_main(0) - 1;
}
