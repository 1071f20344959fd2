#pragma once
/// \file
/// What the breakpoint and exception tests share: a breakpoint listener that
/// records what it hears, and a fixture that debugs a program through the
/// "local" profile.

#include "stoppedprogram.h"

#include <mutex>
#include <string>
#include <vector>

namespace midebug::test {

/// The IDE's side of one breakpoint: what it heard, and Stop as its answer.
class TBreakpointRecorder : public TInterfaced<IGDBBreakpointListener> {
public:
  struct TVerdict {
    bool Verified = false;
    Integer Breakpoint = -1;
    TGDBLocation Location;
  };
  std::atomic<bool> Stop{true};
  std::atomic<Integer> Hits{0}, LastThread{-1};

  void BreakpointHits(bool& ShouldStop, Integer ThreadId, TGDBLocation& /*Location*/) override {
    ShouldStop = Stop;
    LastThread = ThreadId;
    ++Hits;
  }
  void BreakpointVerified(bool Verified, Integer Breakpoint, const TGDBLocation& Location) override {
    std::lock_guard Guard(FLock);
    FVerdicts.push_back({Verified, Breakpoint, Location});
  }
  std::vector<TVerdict> Verdicts() const {
    std::lock_guard Guard(FLock);
    return FVerdicts;
  }
  TVerdict Last() const {
    std::lock_guard Guard(FLock);
    return FVerdicts.empty() ? TVerdict{} : FVerdicts.back();
  }

private:
  mutable std::mutex FLock;
  std::vector<TVerdict> FVerdicts;
};

/// The line of a debuggee's source marked "// line:Marker"; 0 without one.
inline Integer MarkedLine(const std::string& FileName, const std::string& Marker) {
  return LineOf(FileName, "line:" + Marker);
}

/// A program debugged in a scratch working directory, started as the IDE
/// starts it.
class TDebugFixture : public StoppedProgram {
protected:
  void TearDown() override {
    Process = nullptr;
    ProcessPending();
  }
  void Launch(const std::string& Program, TGDBLanguage Language = glC, const std::string& Arguments = "") {
    ASSERT_FALSE(Program.empty());
    Process = TGDBProcessManager::CreateProcess(Listener, Program, Arguments, Scratch.Path(), "local", "Linux64",
                                                Language, gcAMD64, "gdb");
    ASSERT_TRUE(Process);
  }
  void LaunchToMain(const std::string& Program, const std::string& Arguments = "") {
    Launch(Program, glC, Arguments);
    ASSERT_TRUE(Process->SetRunToMainBreakpoint());
    Process->Run();
    ASSERT_TRUE(NextStop());
  }
  /// Pumps until the IDE has heard one more stop than before.
  bool NextStop() {
    const size_t Before = StopsSeen;
    const bool Stopped = Listener->PumpUntil([&] { return Listener->CountOf("Suspended(") > Before; });
    StopsSeen = Listener->CountOf("Suspended(");
    return Stopped;
  }
  bool ResumeToStop() { return Process->Resume(), NextStop(); }
  TIntfPtr<IGDBThread> Stopped() { return Process->GetThread(Process->GetSuspendedThreadId()); }
  TGDBLocation StopLocation() { return Stopped()->GetCurrentLocation(); }
  TThreadStopReason StopReason() { return Stopped()->GetStopReason(); }
  static TIntfPtr<TBreakpointRecorder> Recorder() { return TIntfPtr<TBreakpointRecorder>(new TBreakpointRecorder); }

  TScratchDir Scratch;
  size_t StopsSeen = 0;
};

} // namespace midebug::test
