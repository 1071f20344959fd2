// Writes to its standard output what a debugger's own output looks like and
// whether its standard streams are terminals, or, given "read", waits for
// its standard input.
#include <stdio.h>
#include <string.h>
#include <unistd.h>

static const char *kind(int fd) { return isatty(fd) ? "a terminal" : "not a terminal"; }

int main(int argc, char **argv) {
  if (argc > 1 && strcmp(argv[1], "read") == 0) {
    char line[256];
    printf("waiting for input\n");
    fflush(stdout);
    while (fgets(line, sizeof line, stdin))
      printf("got:%s", line);
    return 0;
  }
  printf("~x\n*stopped,reason=\"exited\",exit-code=\"42\"\n(gdb) \n12^done\n");
  printf("stdin is %s, stdout is %s\n", kind(0), kind(1));
  printf("no final newline");
  return 3;
}
