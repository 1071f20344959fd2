#pragma once
/// \file
/// A program stopped under the real GDB through the "local" profile, for the
/// memory, register, thread and value tests: launch to a breakpoint, continue,
/// evaluate an address, and count the requests sent.

#include "midebug.h"
#include "process/gdbprocess.h"
#include "testlistener.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <string>
#include <vector>

namespace midebug::test {

class StoppedProgram : public ::testing::Test {
public:
  void SetUp() override {
    SetMainThread();
  }
  void TearDown() override {
    Process.reset();
  }

  /// Loads Program under Debugger, breaks at each of Locations and runs to
  /// the first stop.
  void Launch(const std::string& Program, TGDBLanguage Language, const std::vector<std::string>& Locations,
              const std::string& Debugger = "gdb", const std::string& Arguments = "") {
    Process = TGDBProcessManager::CreateProcess(Listener, Program, Arguments, "", "local", "Linux64", Language,
                                                gcAMD64, Debugger);
    ASSERT_TRUE(Process);
    for (const std::string& Location : Locations)
      ASSERT_TRUE(Core().ProcessAsyncRequest("-break-insert " + Location));
    ASSERT_TRUE(Core().ProcessAsyncRequest("-exec-run"));
    WaitForStop();
  }

  void Continue() {
    ASSERT_TRUE(Core().ProcessAsyncRequest("-exec-continue"));
    WaitForStop();
  }

  void WaitForStop() {
    const size_t Before = FStops;
    ASSERT_TRUE(Listener->PumpUntil([&] { return Stops() > Before; })) << "the program did not stop";
    FStops = Stops();
  }
  size_t Stops() const { return Listener->CountOf("Suspended("); }

  /// The address an expression evaluates to ("&pattern", "buffer").
  UInt64 AddressOf(const std::string& Expression) {
    TDataEvaluateExpressionResult Value;
    if (!Core().Requests().Ask(Value, &TGDBCommand::CreateDataEvaluateExpressionCommand, Expression))
      return 0;
    const size_t Hex = Value.FValue.find("0x");
    return Hex == std::string::npos ? 0 : std::stoull(Value.FValue.substr(Hex), nullptr, 16);
  }

  /// The bytes GetMemory reads, or an empty array.
  std::vector<Byte> Read(UInt64 Address, Integer Size) {
    std::vector<Byte> Bytes(static_cast<size_t>(Size));
    const Integer Count = Process->GetMemory(Address, Bytes.data(), Size);
    Bytes.resize(Count < 0 ? 0 : static_cast<size_t>(Count));
    return Bytes;
  }

  /// Requests built since the process was made: read off the counter that
  /// every token carries, less the probes that read it.
  Integer Requests() {
    std::string Token;
    Core().Requests().Build(Token, &TGDBCommand::CreateStackInfoFrameCommand);
    return static_cast<Integer>(std::stoul(Token.substr(3)) - ++FProbes);
  }

  TGDBProcess& Core() { return *static_cast<TGDBProcess*>(Process.get()); }

  /// Finds LLDB's MI front end; false, with the reason to skip in WhyNot,
  /// where it does not run here.
  bool FindLLDB() { return !(LLDB = LLDBMIPath(WhyNot)).empty(); }
  std::string LLDB, WhyNot;

  TIntfPtr<TTestListener> Listener{new TTestListener};
  TIntfPtr<IGDBProcess> Process;

private:
  unsigned long FProbes = 0;
  size_t FStops = 0;
};

} // namespace midebug::test
