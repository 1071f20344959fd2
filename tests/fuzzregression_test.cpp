// Every input the parser's fuzzer once broke, and its seeds, parse cleanly.

#include <gtest/gtest.h>

#include <cstdint>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* Data, size_t Size);

namespace {

void ParseEveryFileIn(const std::filesystem::path& Dir) {
  if (!std::filesystem::is_directory(Dir))
    return;
  for (const auto& Entry : std::filesystem::directory_iterator(Dir)) {
    std::ifstream In(Entry.path(), std::ios::binary);
    const std::string Input((std::istreambuf_iterator<char>(In)), std::istreambuf_iterator<char>());
    SCOPED_TRACE(Entry.path().string());
    LLVMFuzzerTestOneInput(reinterpret_cast<const uint8_t*>(Input.data()), Input.size());
  }
}

TEST(ParserFuzzInputs, RegressionsAndSeedsParseWithoutFault) {
  ParseEveryFileIn(std::filesystem::path(MIDEBUG_FUZZ_DATA) / "regressions");
  ParseEveryFileIn(std::filesystem::path(MIDEBUG_FUZZ_DATA) / "seeds");
  SUCCEED();
}

} // namespace
