#include <stdio.h>
static void print_lines(void) {
  for (int line = 0; line < 5000; ++line)
    printf("line %d costs \xe2\x82\xac%d\n", line, line);
}
int main(void) {
  print_lines();
  return 0;
}
