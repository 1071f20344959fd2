/* Source lines: a loop whose line has code in two places, lines to skip or
   repeat (their sums tell from the exit code), a function below main. */
int below(int value);
int main(void) {
  int total = 0;
  for (int i = 0; i < 3; i++)
    total += below(i);
  total += 1;
  total += 10;
  total += 100;
  return total;
}
int below(int value) {
  return value;
}
