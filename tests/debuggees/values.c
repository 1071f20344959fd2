/* Values to evaluate, modify and inspect: scalars, a struct holding a
   nested struct, a union, arrays of 10 and 100,000 elements, a linked list
   a function call that faults, a frame of 200 locals and a recursion 50
   calls deep. */
#include <stdio.h>
#include <string.h>

struct point {
  int x, y;
  const char *name;
};
struct rect {
  struct point topleft, bottomright;
};
union number {
  int whole;
  float real;
  unsigned char bytes[4];
};
struct node {
  int value;
  struct node *next;
};

int counter = 7;
double ratio = 1.5;
char letter = 'a';
char buf[16] = "hello";
int small[10] = {0, 1, 2, 3, 4, 5, 6, 7, 8, 9};
int big[100000];
struct node third = {3, 0}, second = {2, &third}, first = {1, &second};

int twice(int value) { return 2 * value; }

int fault(void) {
  volatile int *nowhere = 0;
  return *nowhere;
}

int recurse(int depth) {
  int here = depth * 10;
  if (depth < 50)
    return recurse(depth + 1) + here;
  return here; /* deepest */
}

#include "manylocals.h"

int touch(int number, double scale, char mark, struct point *where) {
  struct rect area = {{1, 2, "corner"}, {3, 4, "far"}};
  union number both;
  struct point pt = {5, 6, "corner"};
  struct node *list = &first;
  both.whole = 0x41424344;
  printf("touch %d %g %c %d %d\n", number, scale, mark, where->x, area.topleft.x); /* stop here */
  pt.x = 50;
  big[99999] = -1;
  printf("after %d %g %c %d %s %d %d\n", number, scale, mark, where->x, pt.name, pt.x, list->value);
  return number + pt.x + both.bytes[0];
}

int main(void) {
  struct point origin = {10, 20, "origin"};
  for (int i = 0; i < 100000; ++i)
    big[i] = i;
  touch(3, 2.5, 'q', &origin);
  printf("counter %d letter %c ratio %g origin %d\n", counter, letter, ratio, origin.x);
  printf("many %d\n", many(1));
  return recurse(1) > 0 ? 0 : 1;
}
