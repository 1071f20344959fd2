#include "kernel/gdbkernel.h"

#include "platform/hostthread.h"

#include <charconv>

namespace midebug {

namespace {

constexpr int ServerPollMs = 2;

Integer StrToIntDef(const std::string& Text, Integer Default) {
  Integer Value = Default;
  const auto [End, Error] = std::from_chars(Text.data(), Text.data() + Text.size(), Value);
  return Error == std::errc() && End == Text.data() + Text.size() ? Value : Default;
}

} // namespace

TAndroidDevice::TAndroidDevice(const std::string& AdbPath, const std::string& LLDBServerCmd, const std::string& PsCmd,
                               const std::string& KillCmd)
    : FAdbPath(AdbPath), FLLDBServerCmd(LLDBServerCmd), FPsCmd(PsCmd), FKillCmd(KillCmd) {}

TAndroidDevice::~TAndroidDevice() {
  if (!FLLDBServerThread.joinable())
    return;
  while (!FServerFinished) {
    ShutdownLLDBServer();
    YieldAndSleep(ServerPollMs);
  }
  FLLDBServerThread.join();
}

void TAndroidDevice::RunLLDBServer() {
  SetCurrentThreadName("lldb-server");
  FServerStarted = true;
  try {
    TLocalMethodsClient Client;
    Integer ExitCode = 0;
    Integer ProcessId = 0;
    if (!Client.DoRun(FAdbPath, FLLDBServerCmd, {}, false, true, ExitCode, ProcessId, 0, nullptr))
      FServerError = Client.ResultText();
  } catch (...) {
    // The run's failure shows as the server's end; nothing more to report.
  }
  FServerFinished = true;
}

bool TAndroidDevice::StartLLDBServer() {
  FLLDBServerThread = std::thread([this] { RunLLDBServer(); });
  while (!FServerStarted && !FServerFinished)
    YieldAndSleep(ServerPollMs);
  if (FServerFinished) {
    FLastError = FServerError;
    return false;
  }
  try {
    TLocalMethodsClient Client;
    for (;;) {
      Integer ExitCode = 0;
      Integer ProcessId = 0;
      if (!Client.DoRun(FAdbPath, FPsCmd, {}, true, true, ExitCode, ProcessId, 0, nullptr)) {
        FLastError = Client.ResultText();
        return false;
      }
      std::string Output = Client.ResultText();
      while (!Output.empty() && FLLDBServerPid == -1) {
        std::string Line = TLocalMethodsClient::GetLine(Output);
        if (Line.find(" lldb-server") == std::string::npos && Line.find(" ./lldb-server") == std::string::npos)
          continue;
        TLocalMethodsClient::GetToken(Line);
        FLLDBServerPid = StrToIntDef(TLocalMethodsClient::GetToken(Line), -1);
      }
      if (FLLDBServerPid != -1)
        return true;
      if (FServerFinished) {
        FLastError = FServerError;
        return false;
      }
    }
  } catch (...) {
    return false;
  }
}

void TAndroidDevice::RunBridge(const std::string& Arguments) {
  TLocalMethodsClient Client;
  Integer ExitCode = 0;
  Integer ProcessId = 0;
  Client.DoRun(FAdbPath, Arguments, {}, true, true, ExitCode, ProcessId, 0, nullptr);
}

void TAndroidDevice::Terminate(Integer Pid) { RunBridge(FKillCmd + " " + std::to_string(Pid)); }

void TAndroidDevice::ShutdownLLDBServer() {
  if (FLLDBServerPid != -1)
    RunBridge(FKillCmd + " " + std::to_string(FLLDBServerPid));
}

} // namespace midebug
