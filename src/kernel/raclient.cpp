#include "kernel/raclient.h"

#include "platform/hostfiles.h"
#include "platform/hostprocess.h"

#include <chrono>

namespace midebug {

namespace {

constexpr int RunPollMs = 20;

/// Reads the child's output until it closes it; false when TimeoutMs passed.
bool CollectUntilEnd(THandle Output, Integer TimeoutMs, std::string& Collected) {
  const auto Deadline = std::chrono::steady_clock::now() + std::chrono::milliseconds(TimeoutMs);
  char Buffer[4096];
  for (;;) {
    if (TimeoutMs > 0 && std::chrono::steady_clock::now() >= Deadline)
      return false;
    switch (WaitForPipeData(Output, RunPollMs)) {
    case TPipeState::Empty:
      continue;
    case TPipeState::Closed:
    case TPipeState::Failed:
      return true;
    case TPipeState::Data: {
      const Int64 Read = ReadHandle(Output, Buffer, sizeof Buffer);
      if (Read <= 0)
        return true;
      Collected.append(Buffer, static_cast<size_t>(Read));
    }
    }
  }
}

} // namespace

bool TLocalMethodsClient::DoRun(const std::string& Program, const std::string& Arguments, const std::string& Input,
                                bool CollectOutput, bool /*Hidden*/, Integer& ExitCode, Integer& ProcessId,
                                Integer TimeoutMs, void* /*Callback*/) {
  FResultText.clear();
  ExitCode = -1;
  ProcessId = -1;
  TStringArray CommandLine = SplitCommandLine(Arguments);
  CommandLine.insert(CommandLine.begin(), Program);

  TPipe InputPipe;
  TPipe OutputPipe;
  if (!InputPipe.Created() || !OutputPipe.Created()) {
    FResultText = "cannot create pipes";
    return false;
  }
  TChildProcess Child;
  std::string Error;
  if (!StartChildProcess(CommandLine, {}, InputPipe.ReadHandle(), OutputPipe.WriteHandle(), Child, Error)) {
    FResultText = "Unable to run '" + Program + "': " + Error;
    return false;
  }
  ProcessId = Child.Pid;
  InputPipe.CloseRead();
  OutputPipe.CloseWrite();
  if (!Input.empty())
    WriteHandle(InputPipe.WriteHandle(), Input.data(), Input.size());
  InputPipe.CloseWrite();

  std::string Collected;
  const bool Ended = CollectUntilEnd(OutputPipe.ReadHandle(), TimeoutMs, Collected);
  if (!Ended)
    KillProcess(Child.Pid);
  ExitCode = ReapChildProcess(Child.Pid);
  if (!Ended) {
    FResultText = "'" + Program + "' did not end in time";
    return false;
  }
  if (CollectOutput)
    FResultText = std::move(Collected);
  return true;
}

std::string TLocalMethodsClient::GetLine(std::string& Text) {
  const size_t LineEnd = Text.find('\n');
  std::string Line = Text.substr(0, LineEnd);
  Text.erase(0, LineEnd == std::string::npos ? Text.size() : LineEnd + 1);
  if (!Line.empty() && Line.back() == '\r')
    Line.pop_back();
  return Line;
}

std::string TLocalMethodsClient::GetToken(std::string& Text) {
  const size_t Start = Text.find_first_not_of(" \t");
  if (Start == std::string::npos) {
    Text.clear();
    return {};
  }
  const size_t End = Text.find_first_of(" \t", Start);
  std::string Token = Text.substr(Start, End == std::string::npos ? std::string::npos : End - Start);
  Text.erase(0, End == std::string::npos ? Text.size() : End);
  return Token;
}

TAndroidLLDBInfo AndroidLLDBInfo() {
  auto Setting = [](const char* Name, const char* Default) {
    const std::string Value = GetEnvironmentVariable(Name);
    return Value.empty() ? std::string(Default) : Value;
  };
  return TAndroidLLDBInfo{
      Setting("MIDEBUG_ADB", "adb"),
      Setting("MIDEBUG_ADB_LLDB_SERVER_ARGS", "shell /data/local/tmp/lldb-server platform --server --listen *:5039"),
      Setting("MIDEBUG_ADB_PS_ARGS", "shell ps"),
      Setting("MIDEBUG_ADB_KILL_ARGS", "shell kill -9"),
  };
}

} // namespace midebug
