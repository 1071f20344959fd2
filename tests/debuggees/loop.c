static int square(int value) {
  int result = value * value; /* square-body */
  return result;
}

int main(void) {
  int total = 0; /* main-first */
  for (int i = 1; i <= 2; ++i) /* main-loop */
    total += square(i); /* main-call */
  return total == 5 ? 4 : 1;
}
