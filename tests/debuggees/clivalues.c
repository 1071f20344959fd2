/* Values for the console debugger's value commands. */
#include <string.h>

struct pair {
  int left, right;
};

int total = 0;

int add(int first, int second) {
  int sum = first + second;
  return sum;
}

int main(int argc, char **argv) {
  int count = 5;
  struct pair pt = {1, 2};
  int many[300];
  memset(many, 0, sizeof many);
  many[101] = 7;
  count = count + 1;
  total = add(count, pt.left);
  return total == 7 && argv != 0 ? 0 : argc;
}
