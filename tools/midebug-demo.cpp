// A short demonstration of the transport: start GDB, build command lines,
// write them and read the reply blocks, while debugging a program from its
// first breakpoint to its exit.

#include "midebug.h"

#include <cstdio>
#include <string>

namespace {

using namespace midebug;

/// Writes one command line and prints the reply blocks until one holds its
/// result record (and, for a command that resumes the program, the stop).
class TDemo {
public:
  explicit TDemo(TGDBKernel& Kernel) : FKernel(Kernel) {}

  bool Exchange(const std::string& Line, const std::string& Token, bool AwaitStop = false) {
    std::printf("> %s\n", Line.c_str());
    if (!FKernel.SendRequest(Line)) {
      std::printf("! write failed: %s\n", FKernel.GetLastError(false).c_str());
      return false;
    }
    bool HaveResult = false;
    bool HaveStop = !AwaitStop;
    while (!HaveResult || !HaveStop) {
      std::string Reply;
      if (!FKernel.GetReply(Reply)) {
        std::printf("! read failed: %s\n", FKernel.GetLastError(true).c_str());
        return false;
      }
      PrintBlock(Reply);
      HaveResult = HaveResult || Reply.find(Token + "^") != std::string::npos;
      HaveStop = HaveStop || Reply.find("*stopped") != std::string::npos;
    }
    return true;
  }

  static void PrintBlock(const std::string& Reply) {
    size_t Start = 0;
    while (Start < Reply.size()) {
      size_t End = Reply.find('\n', Start);
      if (End == std::string::npos)
        End = Reply.size();
      std::printf("< %s\n", Reply.substr(Start, End - Start).c_str());
      Start = End + 1;
    }
  }

private:
  TGDBKernel& FKernel;
};

} // namespace

int main(int argc, char** argv) {
  if (argc != 2) {
    std::fprintf(stderr, "usage: %s PROGRAM\n", argv[0]);
    return 2;
  }
  const std::string Program = ExpandFileName(argv[1]);

  TGDBKernel Kernel("", "");
  if (!Kernel.Start()) {
    std::fprintf(stderr, "cannot start the debugger: %s\n", Kernel.GetLastError(false).c_str());
    return 1;
  }
  std::printf("started: %s (pid %d)\n", Kernel.GetCommandLine().c_str(), Kernel.GetProcessHandle());
  std::string Greeting;
  if (!Kernel.GetReply(Greeting))
    return 1;
  TDemo::PrintBlock(Greeting);

  TGDBCommand Builder(gcAMD64);
  TDemo Demo(Kernel);
  std::string Token;
  bool Ok = Demo.Exchange(Builder.CreateFileExecAndSymbolsCommand(Token, Program), Token);
  Ok = Ok && Demo.Exchange(Builder.CreateBreakInsertCommand(Token, "square", false, true), Token);
  Ok = Ok && Demo.Exchange(Builder.CreateExecRunCommand(Token, false), Token, true);
  Ok = Ok && Demo.Exchange(Builder.CreateStackListFramesCommand(Token, -1, -1), Token);
  Ok = Ok && Demo.Exchange(Builder.CreateStackListArgumentsCommand(Token, false, -1, -1), Token);
  Ok = Ok && Demo.Exchange(Builder.CreateDataEvaluateExpressionCommand(Token, "value * value"), Token);
  Ok = Ok && Demo.Exchange(Builder.CreateExecFinishCommand(Token), Token, true);
  Ok = Ok && Demo.Exchange(Builder.CreateBreakDeleteCommand(Token, {1}), Token);
  Ok = Ok && Demo.Exchange(Builder.CreateExecContinueCommand(Token), Token, true);
  Ok = Ok && Demo.Exchange(Builder.CreateGDBExitCommand(Token), Token);
  std::printf(Ok ? "demonstration complete\n" : "demonstration failed\n");
  return Ok ? 0 : 1;
}
