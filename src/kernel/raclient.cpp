#include "kernel/raclient.h"

#include "platform/hostfiles.h"
#include "platform/hostprocess.h"
#include "platform/hostthread.h"

#include <chrono>
#include <thread>

namespace midebug {

namespace {

constexpr int RunPollMs = 20;
/// How often the end of a program that closed its output is looked for while
/// a time-out runs.
constexpr int ExitPollMs = 1;

using TRunClock = std::chrono::steady_clock;

/// Reads the child's output until it closes it; false when TimeoutMs passed.
bool CollectUntilEnd(THandle Output, Integer TimeoutMs, TRunClock::time_point Deadline, std::string& Collected) {
  char Buffer[4096];
  for (;;) {
    if (TimeoutMs > 0 && TRunClock::now() >= Deadline)
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

/// A program may close its output and go on running; with a time-out, waits
/// for its end only until Deadline. False when the time passed first.
bool WaitForExit(Integer Pid, Integer TimeoutMs, TRunClock::time_point Deadline) {
  if (TimeoutMs <= 0)
    return true;
  while (!ChildProcessEnded(Pid)) {
    if (TRunClock::now() >= Deadline)
      return false;
    YieldAndSleep(ExitPollMs);
  }
  return true;
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
  // The input is written by a thread of its own: a program that answers as it
  // reads would otherwise fill its output pipe while this thread still writes
  // to it, and both would wait for ever. The writer ends at the latest when
  // the program has ended and its input pipe has no reader left.
  std::jthread InputWriter;
  if (Input.empty())
    InputPipe.CloseWrite();
  else
    InputWriter = std::jthread([&InputPipe, &Input] {
      WriteHandle(InputPipe.WriteHandle(), Input.data(), Input.size());
      InputPipe.CloseWrite();
    });

  const auto Deadline = TRunClock::now() + std::chrono::milliseconds(TimeoutMs);
  std::string Collected;
  const bool Ended = CollectUntilEnd(OutputPipe.ReadHandle(), TimeoutMs, Deadline, Collected) &&
                     WaitForExit(Child.Pid, TimeoutMs, Deadline);
  if (!Ended)
    KillProcess(Child.Pid);
  ExitCode = ReapChildProcess(Child.Pid);
  if (InputWriter.joinable())
    InputWriter.join();
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
