#include <unistd.h>
int main(void) { for (;;) sleep(1); }
