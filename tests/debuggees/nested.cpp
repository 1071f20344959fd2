struct Calc {
  int base;
  int twice(int n) { return base + n * 2; }
};
static int apply(Calc &c, int n) { return c.twice(n); }
int main() {
  Calc c{1};
  return apply(c, 21) == 43 ? 0 : 1;
}
