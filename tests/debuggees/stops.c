/* Stops for breakpoints, steps, finish, watchpoints and an exit code;
   frames, locals, variable objects, memory and disassembly. The markers
   "line:NAME" give the recorder the lines its commands name. */
#include <stdio.h>

struct point {
  int x;
  int y;
  const char *name;
};

int counter;
int sensor = 5;
unsigned char pattern[8] = {0xde, 0xad, 0xbe, 0xef, 0x01, 0x02, 0x03, 0x04};

static int add(int left, int right)
{
  int sum = left + right; /* line:add-body */
  return sum;
}

static void bump(void)
{
  counter += 1; /* line:bump-body */
}

static int probe(void)
{
  return sensor * 2; /* line:probe-read */
}

int main(void)
{
  struct point origin = {3, 4, "origin"};
  int squares[5] = {0, 1, 4, 9, 16};
  int total;

  printf("partial "); /* line:main-first */
  fflush(stdout);
  total = add(origin.x, origin.y); /* line:main-add */
  printf("total=%d", total);
  fflush(stdout);
  bump(); /* line:main-bump */
  total += probe();
  squares[0] = total;
  printf(" done\n");
  fflush(stdout);
  return 8;
}
