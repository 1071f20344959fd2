// C++ values to inspect: a class with base classes and members of every
// access, and standard containers read through GDB's pretty printers.
#include <cstdio>
#include <map>
#include <string>
#include <vector>

struct Named {
  std::string label = "shape";
};
class Counted {
protected:
  int count = 2;
};
class Square : public Named, public Counted {
public:
  int side = 4;

protected:
  int area = 16;

private:
  double ratio = 0.5;
};

int show(const std::vector<int>& numbers) {
  std::vector<int> fresh; // its storage is garbage until constructed: line:fresh
  std::string text = "hello";
  std::map<std::string, int> ages = {{"ann", 31}, {"bob", 42}};
  std::vector<int> copy = numbers;
  Square square;
  std::printf("%zu %s %zu %d\n", copy.size(), text.c_str(), ages.size(), square.side); // line:show
  return static_cast<int>(copy.size() + fresh.size());
}

int main() {
  std::vector<int> numbers;
  for (int value = 0; value < 250; ++value)
    numbers.push_back(value * 2);
  return show(numbers) == 250 ? 0 : 1;
}
