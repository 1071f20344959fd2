// A template instantiated twice, so that one source line has two code
// locations, and a class for the variable-object views.
#include <cstdio>

template <typename T> T twice(T value)
{
  T doubled = value + value; // line:twice-body
  return doubled;
}

class Account {
public:
  Account(int id, double balance) : id(id), balance(balance) {}
  int id;
  double Deposit(double amount) { balance += amount; return balance; }

private:
  double balance;
  int history[3] = {1, 2, 3};
};

int main()
{
  Account savings(42, 100.5);
  int whole = twice(21);
  double half = twice(1.25);
  savings.Deposit(half); // line:deposit
  std::printf("%d %.2f\n", whole, half);
  std::fflush(stdout);
  return 0;
}
