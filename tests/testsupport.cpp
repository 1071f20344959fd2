#include "testsupport.h"

#include <gtest/gtest.h>

#include <cstdio>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <sstream>
#include <stdexcept>
#include <sys/wait.h>
#include <unistd.h>

namespace midebug::test {

std::string FakeDebuggerPath() { return MIDEBUG_FAKE_MI; }

std::string TestDataDir() { return MIDEBUG_TEST_DATA; }

std::string Debuggee(const std::string& Name) { return std::string(MIDEBUG_DEBUGGEES) + "/" + Name; }

std::string LLDBMIPath(std::string& WhyNot) {
  const char* FromEnvironment = std::getenv("MIDEBUG_LLDB_MI");
  const std::string LLDB = FromEnvironment ? FromEnvironment : MIDEBUG_LLDB_MI_DEFAULT;
  if (access(LLDB.c_str(), X_OK) == 0 && system((LLDB + " --version >/dev/null 2>&1").c_str()) == 0)
    return LLDB;
  WhyNot = "LLDB's MI front end is not at " + LLDB + " (or lacks liblldb-14); set MIDEBUG_LLDB_MI";
  return {};
}

std::string DebuggeeSource(const std::string& FileName) {
  return std::string(MIDEBUG_DEBUGGEE_SOURCES) + "/" + FileName;
}

Integer LineOf(const std::string& FileName, const std::string& Marker) {
  std::ifstream Source(DebuggeeSource(FileName));
  std::string Line;
  for (Integer Number = 1; std::getline(Source, Line); ++Number)
    if (Line.find(Marker) != std::string::npos)
      return Number;
  return 0;
}

int StartDebuggee(const std::string& Name) {
  FILE* Shell = popen(("exec " + Quote(Debuggee(Name)) + " >/dev/null 2>&1 & echo $!").c_str(), "r");
  int Pid = 0;
  if (Shell && std::fscanf(Shell, "%d", &Pid) != 1)
    Pid = 0;
  if (Shell)
    pclose(Shell);
  return Pid;
}

std::string FakeScript(const std::string& Name) { return TestDataDir() + "/fakemi/" + Name; }

namespace {

/// The state letter and parent of a process, from /proc/<pid>/stat.
bool ReadStat(int Pid, std::string& Name, char& State, int& Parent) {
  std::ifstream Stat("/proc/" + std::to_string(Pid) + "/stat");
  std::string Line;
  std::getline(Stat, Line);
  const size_t Open = Line.find('(');
  const size_t Close = Line.rfind(')');
  if (Open == std::string::npos || Close == std::string::npos)
    return false;
  Name = Line.substr(Open + 1, Close - Open - 1);
  return std::sscanf(Line.c_str() + Close + 1, " %c %d", &State, &Parent) == 2;
}

} // namespace

std::vector<int> ChildrenNamed(const std::string& Name, int Parent) {
  const int Wanted = Parent == 0 ? getpid() : Parent;
  std::vector<int> Found;
  for (const auto& Entry : std::filesystem::directory_iterator("/proc")) {
    const int Pid = std::atoi(Entry.path().filename().c_str());
    std::string Command;
    char State = 0;
    int Owner = 0;
    if (Pid > 0 && ReadStat(Pid, Command, State, Owner) && Owner == Wanted && Command == Name && State != 'Z')
      Found.push_back(Pid);
  }
  return Found;
}

bool ProcessRuns(int Pid) {
  std::string Command;
  char State = 0;
  int Parent = 0;
  return ReadStat(Pid, Command, State, Parent) && State != 'Z' && State != 'X';
}

TFakeOnPath::TFakeOnPath(const std::string& Name, const std::string& Script)
    : FPath("PATH", FBin.Path() + ":" + std::string(std::getenv("PATH") ? std::getenv("PATH") : "")),
      FScript("FAKEMI_SCRIPT", FakeScript(Script)) {
  std::filesystem::copy_file(FakeDebuggerPath(), FBin.Path() + "/" + Name);
}

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

const nlohmann::json* TCliRun::Find(const std::function<bool(const nlohmann::json&)>& Match) const {
  for (const nlohmann::json& Line : Lines)
    if (Match(Line))
      return &Line;
  return nullptr;
}

const nlohmann::json* TCliRun::Answer(const std::string& Name) const {
  return Find([&](const nlohmann::json& Line) { return Line.value("answer", "") == Name; });
}

const nlohmann::json* TCliRun::Event(const std::string& Name) const {
  return Find([&](const nlohmann::json& Line) { return Line.value("event", "") == Name; });
}

std::vector<nlohmann::json> TCliRun::All(const std::string& Key, const std::string& Value) const {
  std::vector<nlohmann::json> Found;
  for (const nlohmann::json& Line : Lines)
    if (Line.value(Key, "") == Value)
      Found.push_back(Line);
  return Found;
}

std::string TCliRun::Output() const {
  std::string Text;
  for (const nlohmann::json& Line : All("event", "output"))
    if (Line.value("kind", "") == "output")
      Text += Line.value("text", "");
  return Text;
}

std::string Quote(const std::string& Text) { return "'" + Text + "'"; }

UInt64 SymbolAddress(const std::string& Program, const std::string& Symbol) {
  constexpr UInt64 LoadBase = 0x555555554000;
  FILE* Listing = popen(("nm " + Quote(Program)).c_str(), "r");
  if (!Listing)
    return 0;
  char Line[512];
  UInt64 Address = 0;
  while (std::fgets(Line, sizeof Line, Listing)) {
    std::istringstream Fields(Line);
    std::string Offset, Kind, Name;
    if (Fields >> Offset >> Kind >> Name && Name == Symbol)
      Address = LoadBase + std::stoull(Offset, nullptr, 16);
  }
  pclose(Listing);
  return Address;
}

std::string Hex(UInt64 Address) {
  char Text[24];
  std::snprintf(Text, sizeof Text, "0x%016llx", static_cast<unsigned long long>(Address));
  return Text;
}

TCliRun RunCli(const TScratchDir& Dir, const std::string& Arguments, const std::string& Commands, bool Json) {
  const std::string Input = Dir.WriteFile("commands.txt", Commands);
  const std::string Output = Dir.Path() + "/stdout.txt";
  const std::string Errors = Dir.Path() + "/stderr.txt";
  const std::string Command = "cd " + Quote(Dir.Path()) + " && " + Quote(MIDEBUG_CLI) + " --batch " +
                              (Json ? "--json " : "") + "--wait 20 " + Arguments + " < " + Quote(Input) + " > " +
                              Quote(Output) + " 2> " + Quote(Errors);
  TCliRun Run;
  const int Status = std::system(Command.c_str());
  Run.ExitCode = WIFEXITED(Status) ? WEXITSTATUS(Status) : -1;
  Run.Stdout = ReadWholeFile(Output);
  Run.Stderr = ReadWholeFile(Errors);
  std::istringstream Lines(Run.Stdout);
  for (std::string Line; Json && std::getline(Lines, Line);) {
    nlohmann::json Object = nlohmann::json::parse(Line, nullptr, false);
    EXPECT_FALSE(Object.is_discarded()) << "not JSON: " << Line;
    if (!Object.is_discarded())
      Run.Lines.push_back(std::move(Object));
  }
  return Run;
}

} // namespace midebug::test
