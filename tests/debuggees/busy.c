/* Creates the file "started.flag" in its working directory once it runs,
   then spins until stopped from outside. */
#include <stdio.h>
int main(void) {
  volatile unsigned long counter = 0;
  fclose(fopen("started.flag", "w"));
  for (;;)
    ++counter;
  return 0;
}
