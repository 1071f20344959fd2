// Throws as many times as the first argument says (3 without one), each
// exception caught by the loop; then one of its own type, in a namespace.
#include <cstdlib>
#include <stdexcept>

namespace shapes {
struct BadShape {
  int sides;
};
} // namespace shapes

static void fail(int round) {
  throw std::runtime_error("round " + std::to_string(round)); // line:throw
}

int main(int argc, char** argv) {
  const int rounds = argc > 1 ? std::atoi(argv[1]) : 3;
  int caught = 0;
  for (int round = 0; round < rounds; ++round) {
    try {
      fail(round);
    } catch (const std::exception&) { // line:catch
      ++caught;
    }
  }
  try {
    throw shapes::BadShape{5}; // line:own-throw
  } catch (const shapes::BadShape& Bad) {
    caught += Bad.sides;
  }
  return caught == rounds + 5 ? 0 : 1;
}
