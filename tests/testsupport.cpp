#include "testsupport.h"

#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>

namespace midebug::test {

std::string FakeDebuggerPath() { return MIDEBUG_FAKE_MI; }

std::string TestDataDir() { return MIDEBUG_TEST_DATA; }

std::string ReadWholeFile(const std::string& Path) {
  std::ifstream In(Path, std::ios::binary);
  std::stringstream Text;
  Text << In.rdbuf();
  return Text.str();
}

TStringArray SplitLines(const std::string& Text) {
  TStringArray Lines;
  std::istringstream In(Text);
  for (std::string Line; std::getline(In, Line);)
    Lines.push_back(Line);
  return Lines;
}

std::string ReplyContaining(TGDBKernel& Kernel, const std::string& Needle) {
  std::string Reply;
  while (Kernel.GetReply(Reply))
    if (Reply.find(Needle) != std::string::npos)
      return Reply;
  return "read failed: " + Kernel.GetLastError(true);
}

TScratchDir::TScratchDir() {
  std::string Template = (std::filesystem::temp_directory_path() / "midebug-test-XXXXXX").string();
  if (mkdtemp(Template.data()) == nullptr)
    throw std::runtime_error("cannot create a scratch directory");
  FPath = Template;
}

TScratchDir::~TScratchDir() {
  std::error_code Ignored;
  std::filesystem::remove_all(FPath, Ignored);
}

std::string TScratchDir::WriteFile(const std::string& Name, const std::string& Text) const {
  const std::string FullPath = FPath + "/" + Name;
  std::ofstream Out(FullPath, std::ios::binary);
  Out << Text;
  return FullPath;
}

TScopedEnv::TScopedEnv(const std::string& Name, const std::string& Value) : FName(Name) {
  const char* Old = std::getenv(Name.c_str());
  FHadValue = Old != nullptr;
  if (FHadValue)
    FOldValue = Old;
  setenv(Name.c_str(), Value.c_str(), 1);
}

TScopedEnv::~TScopedEnv() {
  if (FHadValue)
    setenv(FName.c_str(), FOldValue.c_str(), 1);
  else
    unsetenv(FName.c_str());
}

} // namespace midebug::test
