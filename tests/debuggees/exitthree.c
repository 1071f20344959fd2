#include <stdio.h>
int main(void) { puts("marker-7781"); return 3; }
