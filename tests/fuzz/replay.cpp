// Runs a fuzz target's entry point once on every file in the folders named
// on the command line: the inputs the fuzzer once broke stay a test.

#include <cstdint>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* Data, size_t Size);

int main(int ArgCount, char** Args) {
  int Count = 0;
  for (int I = 1; I < ArgCount; ++I) {
    if (!std::filesystem::is_directory(Args[I]))
      continue;
    for (const auto& Entry : std::filesystem::directory_iterator(Args[I])) {
      std::ifstream In(Entry.path(), std::ios::binary);
      const std::string Input((std::istreambuf_iterator<char>(In)), std::istreambuf_iterator<char>());
      LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t*>(Input.data()), Input.size());
      ++Count;
    }
  }
  std::printf("%d inputs ran without fault\n", Count);
  return Count > 0 ? 0 : 1;
}
