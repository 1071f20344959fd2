int twice(int value) {
  int doubled = value * 2;
  return doubled;
}
int main(void) {
  int first = 1;
  int second = twice(first);
  return second;
}
