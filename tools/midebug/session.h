#pragma once
/// \file
/// One debugging session of the console debugger: the process it debugs,
/// the commands a person types and the events the library reports.

#include "midebug.h"
#include "options.h"
#include "output.h"

#include <chrono>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <set>
#include <string>
#include <vector>

namespace midebug::cli {

class TCliSession;

/// The library's listener: hands every event to the session on the main
/// thread (the two the library raises elsewhere are posted there first).
class TCliListener : public TInterfaced<IGDBProcessListener> {
public:
  explicit TCliListener(TCliSession* Session) : FSession(Session) {}
  /// Called by the session as it ends; events that come later are dropped.
  void Forget() { FSession = nullptr; }

  void ProcessSuspended(Integer ThreadId) override;
  void ProcessResumed(Integer ThreadId) override;
  void ProcessExited(Integer Code, const std::string& Signal) override;
  void ThreadCreated(Integer ThreadId) override;
  void ThreadExited(Integer ThreadId) override;
  void ModuleLoaded(const TGDBModule& Module) override;
  void ModuleUnLoaded(const TGDBModule& Module) override;
  void SignalReceived(bool& ShouldStop, Integer ThreadId, const TGDBException& SignalException) override;
  void ExceptionRaised(bool& ShouldStop, Integer ThreadId, const TGDBException& LanguageException) override;
  void LogEvent(const TGDBLogEvent& Event) override;
  void InternalError(const std::string& Message) override;
  bool FatalError() override;
  void ProcessRestart() override;

private:
  TCliSession* FSession;
};

/// Where the debugged program is, as the session has learnt from events.
enum class TRunState : uint8_t { Loaded, Running, Stopped, Exited, Detached, Lost };

class TCliSession {
public:
  TCliSession(const TCliOptions& Options, TCliOutput& Output);
  ~TCliSession();
  TCliSession(const TCliSession&) = delete;
  TCliSession& operator=(const TCliSession&) = delete;

  /// Launches or attaches; false, with the reason printed, when that fails.
  bool Start();
  /// Runs one command line; false when the session is to end.
  bool Execute(const std::string& Line);
  /// Whether a command that resumes the program waits for its stop (a
  /// script, batch mode) or hands the prompt back at once (a person at the
  /// prompt, who sees the stop when it comes).
  void SetWaitForStops(bool Wait) { FWaitForStops = Wait; }
  /// Acts on a caught signal: Ctrl-C pauses a running program; SIGTERM and
  /// SIGHUP end the session. False when the session is to end.
  bool HandleSignals();
  /// True when a terminating signal ended the session.
  bool Terminated() const { return FTerminated; }
  /// Ends the program if it still runs, lets the debugger go and keeps its
  /// log when asked to.
  void End();

  // Events, on the main thread.
  void OnSuspended(Integer ThreadId);
  void OnResumed(Integer ThreadId);
  void OnExited(Integer Code, const std::string& Signal);
  void OnThreadCreated(Integer ThreadId);
  void OnThreadExited(Integer ThreadId);
  void OnModule(const TGDBModule& Module, bool Loaded);
  void OnSignal(Integer ThreadId, const TGDBException& Signal);
  /// True when the session stops at it (see 'catch').
  bool OnException(Integer ThreadId, const TGDBException& Exception);
  void OnLog(const TGDBLogEvent& Event);
  void OnInternalError(const std::string& Message);
  void OnDebuggerLost();
  void OnRestart();

private:
  using TCommand = void (TCliSession::*)(const std::string& Name, const std::vector<std::string>& Arguments);
  /// One command: its handler, how many words may follow its name, and
  /// the lines 'help' shows.
  struct TCommandEntry {
    const char* Name;
    TCommand Handler;
    size_t MaxArguments;
    const char* Usage;
    const char* Help;
  };
  static const std::vector<TCommandEntry>& Commands();

  void CmdRun(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdStart(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdContinue(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdStep(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdPause(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdBacktrace(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdThreads(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdThread(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdFrame(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdKill(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdDetach(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdQuit(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdHelp(const std::string& Name, const std::vector<std::string>& Arguments);

  // --- Memory, disassembly and registers (memorycommands.cpp) -------------
  void CmdExamine(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdWrite(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdDisassemble(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdInfoRegisters(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdSetRegister(const std::string& Name, const std::vector<std::string>& Arguments);
  /// A number, or the value of an expression (no blanks) of the stopped
  /// program: "0x4010", "&counter", "buf+8"; false when neither.
  bool ResolveAddress(const std::string& Text, UInt64& Address);
  // --- End of memory, disassembly and registers ----------------------------
  // --- Source lines (sourcecommands.cpp) ---------------------------------
  void CmdList(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdInfoLine(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdJump(const std::string& Name, const std::vector<std::string>& Arguments);
  /// Where the program stands in the current thread and frame, or the empty
  /// location.
  TGDBLocation CurrentLocation();
  /// The readable path of a file the debugger knows by Name, which holds
  /// Line; empty when none is found.
  std::string SourcePath(const std::string& Name, Integer Line);
  // -------------------------------------------------------------------------
  // --- Values (evaluatecommands.cpp) -------------------------------------
  /// An expression takes any number of words.
  static constexpr size_t AnyArguments = SIZE_MAX;
  void CmdPrint(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdSetVar(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdInfoValues(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdInspect(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdDisplay(const std::string& Name, const std::vector<std::string>& Arguments);
  /// Prints the displayed expressions at a stop, marking those that changed.
  void ShowDisplays();
  struct TDisplay {
    std::string Expr;
    std::string Value;
  };
  std::vector<TDisplay> FDisplays;
  // --- end of values ------------------------------------------------------

  /// Has the debugger load the program (again); raises when it cannot.
  void Load(TGDBLanguage Language, TGDBCPU CPU);
  // --- Breakpoints (breakpointcommands.cpp) ----------------------------------
public:
  struct TCliBreakpoint;
  /// A hit of the session's breakpoint Id; the answer is whether to stop.
  bool OnBreakpointHit(Integer Id, Integer ThreadId);
  /// True when the breakpoint has no condition, or it holds (or cannot be
  /// tested) in the stopped thread's innermost frame.
  bool ConditionHolds(const TCliBreakpoint& Breakpoint, Integer ThreadId);
  void OnBreakpointVerified(Integer Id, bool Verified, Integer Number, const TGDBLocation& Location);

private:
  void CmdBreak(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdWatch(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdDelete(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdEnable(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdInfo(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdIgnore(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdCondition(const std::string& Name, const std::vector<std::string>& Arguments);
  void CmdCatch(const std::string& Name, const std::vector<std::string>& Arguments);
  using TPlace = std::function<void(IGDBProcess& Process, const TIntfPtr<IGDBBreakpointListener>& Listener)>;
  /// Registers a new breakpoint of the session and has Place set it.
  void NewBreakpoint(const std::string& Kind, const std::string& Where, bool Temporary, TPlace Place);
  /// Sets every breakpoint and catch again in a program loaded anew.
  void RestoreBreakpoints();
  /// The breakpoint named by Text, or null with the reason printed.
  TCliBreakpoint* FindBreakpoint(const std::string& Name, const std::string& Text);
  /// "Breakpoint N, " for the stop that the hit of breakpoint N caused.
  void DescribeHit(nlohmann::json& Event, std::string& Text);

  std::map<Integer, std::shared_ptr<TCliBreakpoint>> FBreakpoints;
  Integer FNextBreakpoint = 1;
  /// The breakpoint whose hit stopped the program, until the stop is told.
  Integer FStoppedBy = -1;
  /// The kinds of language exception the session stops at: "throw", "catch", "raise".
  std::set<std::string> FCatches;
  // --- End of breakpoints ------------------------------------------------------

  /// True when the program can be resumed or stepped; otherwise prints why.
  bool RequireStopped(const std::string& Name);
  /// True when 'run' or 'start' may start the program; otherwise prints why.
  bool RequireStartable(const std::string& Name);
  /// The thread commands act on while the program is stopped, or null with
  /// the reason printed.
  TIntfPtr<IGDBThread> StoppedThread(const std::string& Name);
  /// Calls Resume (which starts or resumes the program), then pumps the
  /// main-thread queue until the program stops, exits or the debugger is
  /// lost, or the wait limit passes; then answers Name.
  void ResumeAndWait(const std::string& Name, const std::function<void()>& Resume);
  /// Pumps until the stop count moves past Before or Limit passes, pausing
  /// the program on Ctrl-C; false when the time passed or the session is to
  /// end.
  bool PumpUntilStopAfter(uint64_t Before, std::chrono::milliseconds Limit);
  /// How long a resuming command waits: --wait in batch mode, else until
  /// the stop.
  std::chrono::milliseconds WaitLimit() const;
  /// Kills or detaches the program; false when it is still there.
  enum class TEnding : uint8_t { None, Kill, Detach };
  bool EndProgram(TEnding How);
  /// Asks a running program to pause; its stop is then reported as paused.
  void RequestPause();
  /// A frame as GDB users read it: "#1  0x... in f (a=1) at f.c:7".
  std::string FrameText(Integer Level, const std::string& Header, const TGDBLocation& Location) const;
  /// A location as JSON fields and as "file:line" text.
  nlohmann::json LocationJson(const TGDBLocation& Location) const;
  std::string LocationText(const TGDBLocation& Location) const;
  /// The source text line under Location, indented, or empty.
  std::string SourceText(const TGDBLocation& Location);
  void KeepLog();
  /// One whole line of debugger console text.
  void OnConsoleLine(const std::string& Line);

  const TCliOptions& FOptions;
  TCliOutput& FOutput;
  TSourceLines FSources;
  TIntfPtr<TCliListener> FListener;
  TIntfPtr<IGDBProcess> FProcess;
  TRunState FState = TRunState::Loaded;
  TGDBLanguage FLanguage = glC;
  TGDBCPU FCPU = gcAMD64;
  /// Counts stops, exits and the loss of the debugger: the events a command
  /// that resumes the program waits for.
  uint64_t FStopCount = 0;
  Integer FCurrentThread = -1;
  /// The frame "frame N" selected, 0 being the innermost.
  Integer FCurrentFrame = 0;
  std::set<Integer> FThreads;
  bool FQuit = false;
  bool FTerminated = false;
  bool FWaitForStops = true;
  /// Set by a pause the session asked for, until the stop it brings.
  bool FPausing = false;
  /// Set by 'start' until the program first stops.
  bool FAwaitingMain = false;
  /// Whether the library has reported the program running since the last
  /// resume, and a pause waits for that.
  bool FResumeConfirmed = true;
  bool FPauseWhenResumed = false;
  /// The end the session itself asked for, so that it is reported as such.
  TEnding FEnding = TEnding::None;
  /// The last signal reported, for the stop it brings.
  TGDBException FLastSignal;
  /// Debugger console text is left out of the text form until the program
  /// starts or the attach stop: the debugger's banner and start-up chatter.
  bool FQuietConsole = true;
  /// Console text received after its last line break.
  std::string FConsoleText;
  /// The debugger logs present before start-up, so that the new one is found.
  std::set<std::string> FLogsBefore;
  std::string FLogDir;
};

} // namespace midebug::cli
