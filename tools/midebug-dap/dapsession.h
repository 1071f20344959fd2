#pragma once
/// \file
/// One debug adapter session: the requests of one client, served on the
/// main thread for one debugged program, and the library's events turned
/// into the protocol's events.

#include "dapterminal.h"
#include "midebug.h"

#include <nlohmann/json.hpp>

#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

namespace midebug::dap {

class TDapSession;

/// The library's listener: hands every event to the session on the main
/// thread (the two the library raises elsewhere are posted there first).
class TDapListener : public TInterfaced<IGDBProcessListener> {
public:
  explicit TDapListener(TDapSession* Session) : FSession(Session) {}
  /// Called by the session as it ends; events that come later are dropped.
  void Forget() { FSession = nullptr; }
  /// The session, or null once it has ended.
  TDapSession* Session() const { return FSession; }

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
  TDapSession* FSession;
};

/// The request's arguments, read with their types checked. The first
/// argument of a wrong type is remembered as the request's problem.
class TDapArguments {
public:
  explicit TDapArguments(const nlohmann::json& Arguments) : FArguments(Arguments) {}

  std::optional<std::string> String(const char* Name);
  std::optional<bool> Boolean(const char* Name);
  /// A whole number within [Min, Max].
  std::optional<long long> Number(const char* Name, long long Min, long long Max);
  /// An object, as it is.
  const nlohmann::json* Object(const char* Name);
  /// A list of strings.
  std::optional<TStringArray> Strings(const char* Name);
  /// The argument as it is; null when absent.
  const nlohmann::json* Value(const char* Name) { return Find(Name); }
  /// Makes Message the request's problem unless it already has one.
  void Refuse(const std::string& Message) {
    if (FProblem.empty())
      FProblem = Message;
  }
  /// The first argument that had a wrong type or value; empty when none.
  const std::string& Problem() const { return FProblem; }

private:
  const nlohmann::json* Find(const char* Name);
  void Complain(const char* Name, const char* Expected);

  const nlohmann::json& FArguments;
  std::string FProblem;
};

/// What a handler answers: success with a body, or a failure a person can
/// read.
struct TDapReply {
  bool Success = true;
  std::string Message;
  nlohmann::json Body;

  static TDapReply Ok(nlohmann::json Body = nullptr) { return {true, {}, std::move(Body)}; }
  static TDapReply Refuse(std::string Message) { return {false, std::move(Message), nullptr}; }
};

/// Where the debugged program is, as the session has learnt from events.
enum class TProgramState { None, Loaded, Running, Stopped, Exited, Detached, Lost };

/// The adapter's side of one client. Every member runs on the main thread:
/// requests arrive there as deliveries from the reader, events from the
/// library, and it alone writes to the client, so no state here is shared.
class TDapSession {
public:
  TDapSession();
  ~TDapSession();
  TDapSession(const TDapSession&) = delete;
  TDapSession& operator=(const TDapSession&) = delete;

  /// One message body from the client.
  void HandleMessage(const std::string& Body);
  /// Bytes that were no message were dropped.
  void HandleGarbage(const std::string& What);
  /// The client closed its end: the program and the debugger go.
  void HandleClientGone();
  /// Where the messages to the client go; standard output unless set.
  void SetWriter(std::function<void(const std::string&)> Writer) { FWriter = std::move(Writer); }
  /// True once the session is over and the adapter may exit.
  bool Finished() const { return FFinished; }
  /// Ends the program if it still runs (a launched one) or lets it go (an
  /// attached one), then the debugger.
  void End(std::optional<bool> TerminateDebuggee = std::nullopt);

  // Events, on the main thread.
  void OnSuspended(Integer ThreadId);
  void OnResumed(Integer ThreadId);
  void OnExited(Integer Code, const std::string& Signal);
  void OnThread(Integer ThreadId, bool Started);
  void OnModule(const TGDBModule& Module, bool Loaded);
  void OnSignal(Integer ThreadId, const TGDBException& Signal);
  void OnException(Integer ThreadId, const TGDBException& Exception);
  void OnLog(const TGDBLogEvent& Event);
  void OnDebuggerLost();
  /// A hit of the client's breakpoint Id: true keeps the program stopped.
  bool OnBreakpointHit(Integer Id, Integer ThreadId);
  void OnBreakpointVerified(Integer Id, bool Verified, Integer Number, const TGDBLocation& Location);
  /// True when a filter the client set catches this exception.
  bool CatchesException(const TGDBException& Exception);

private:
  using THandler = TDapReply (TDapSession::*)(TDapArguments& Arguments);
  struct TRequestEntry {
    const char* Command;
    THandler Handler;
  };
  static const std::vector<TRequestEntry>& Requests();

  TDapReply Initialize(TDapArguments& Arguments);
  TDapReply Launch(TDapArguments& Arguments);
  TDapReply Attach(TDapArguments& Arguments);
  TDapReply ConfigurationDone(TDapArguments& Arguments);
  TDapReply Disconnect(TDapArguments& Arguments);
  TDapReply Terminate(TDapArguments& Arguments);
  TDapReply Threads(TDapArguments& Arguments);
  TDapReply StackTrace(TDapArguments& Arguments);
  TDapReply Continue(TDapArguments& Arguments);
  TDapReply Next(TDapArguments& Arguments);
  TDapReply StepIn(TDapArguments& Arguments);
  TDapReply StepOut(TDapArguments& Arguments);
  TDapReply Pause(TDapArguments& Arguments);
  TDapReply Cancel(TDapArguments& Arguments);
  TDapReply SetBreakpoints(TDapArguments& Arguments);
  TDapReply SetFunctionBreakpoints(TDapArguments& Arguments);
  TDapReply SetExceptionBreakpoints(TDapArguments& Arguments);
  TDapReply SetInstructionBreakpoints(TDapArguments& Arguments);
  TDapReply BreakpointLocations(TDapArguments& Arguments);
  TDapReply ExceptionInfo(TDapArguments& Arguments);
  TDapReply Scopes(TDapArguments& Arguments);
  TDapReply Variables(TDapArguments& Arguments);
  TDapReply SetVariable(TDapArguments& Arguments);
  TDapReply SetExpression(TDapArguments& Arguments);
  TDapReply Evaluate(TDapArguments& Arguments);

  /// What a breakpoint of the client's stands on; each set request
  /// replaces the breakpoints of its kind.
  enum class TBreakpointKind { Source, Function, Instruction, Data };
  /// One breakpoint of the client's: a source line, a function, an
  /// instruction or data.
  struct TBreakpoint {
    Integer Id = 0;
    TBreakpointKind Kind = TBreakpointKind::Source;
    std::string Source;
    Integer Line = 0;
    std::string Function;
    /// The instruction's address, or the data's, and the data's size.
    UInt64 Address = 0;
    Integer Size = 0;
    /// A data breakpoint's access: "write", "read" or "readWrite".
    std::string Access;
    /// What a data breakpoint watches, as dataBreakpointInfo described it.
    std::string Watched;
    std::string Condition;
    std::string LogMessage;
    /// The hit condition: 0 none, '=' on the Nth hit, '>' after the Nth,
    /// 'g' from the Nth, '%' on every Nth.
    char HitOperator = 0;
    long long HitCount = 0;
    long long Hits = 0;
    /// The library's number, -1 until placed.
    Integer Number = -1;
    bool Placed = false;
    bool Verified = false;
    TGDBLocation Location;
    std::string Message;
  };
  /// Reads one breakpoint of a set request; a refusal leaves Message set.
  std::shared_ptr<TBreakpoint> ReadBreakpoint(const nlohmann::json& Entry, TBreakpointKind Kind);
  void PlaceBreakpoint(TBreakpoint& Breakpoint);
  /// Places what was set before the program was there.
  void PlaceBreakpoints();
  /// Removes the breakpoints of Kind (of a source kind, those in Source).
  void RemoveBreakpoints(TBreakpointKind Kind, const std::string& Source);
  nlohmann::json BreakpointJson(const TBreakpoint& Breakpoint) const;
  /// Places a set request's breakpoints where the program is there, and
  /// answers their verdicts (no events meanwhile).
  TDapReply PlaceAndAnswer(const std::vector<std::shared_ptr<TBreakpoint>>& Set);
  /// Replaces every breakpoint of Kind with the request's list.
  TDapReply ReplaceBreakpoints(TDapArguments& Arguments, TBreakpointKind Kind, const char* Request);
  /// The text of a log message with each {expression} evaluated.
  std::string Interpolate(IGDBThread& Thread, const std::string& Message);

  /// What a variables reference stands for: members of an inspector, a
  /// slice of them (the locals view holds arguments, then locals).
  struct TVariablesRef {
    TIntfPtr<IGDBInspect> Inspect;
    TIntfPtr<IGDBThread> Thread;
    Integer Frame = 1;
    Integer From = 0;
    Integer Total = 0;
    /// A scope: a slice of the locals view, listed whole.
    bool Scope = false;
    /// The thread's general registers.
    bool Registers = false;
    /// Each member listed so far, by name: its full expression.
    std::map<std::string, std::string> Expressions;
  };
  Integer VariablesHandle(TVariablesRef Ref);
  /// The thread and 1-based frame of a frame id; null with Refusal set.
  TIntfPtr<IGDBThread> FrameThread(TDapArguments& Arguments, Integer& Frame, TDapReply& Refusal, bool Optional);
  /// A variables reference (and its count) for a value with members.
  void DescribeChildren(const TIntfPtr<IGDBInspect>& Inspect, const TIntfPtr<IGDBThread>& Thread, Integer Frame,
                        const std::string& Type, nlohmann::json& Entry);
  TDapReply Assign(const TIntfPtr<IGDBThread>& Thread, Integer Frame, const std::string& Expr,
                   const std::string& Value, bool Hex);

  // Sources (dapsources.cpp).
  TDapReply LoadedSources(TDapArguments& Arguments);
  TDapReply Source(TDapArguments& Arguments);

  // Data breakpoints (dapdata.cpp).
  TDapReply DataBreakpointInfo(TDapArguments& Arguments);
  TDapReply SetDataBreakpoints(TDapArguments& Arguments);
  /// Reads a data breakpoint's dataId and access; a refusal, or a watch
  /// the hardware cannot hold beside the others, leaves Message set.
  void ReadDataBreakpoint(const nlohmann::json& Entry, TBreakpoint& Breakpoint);
  /// Why the debugger could not place a watch it had accepted.
  static std::string UnplacedWatchText();
  /// The address and size of Expr in Frame; nullopt, with Why set, when it
  /// lies in no memory (a register, a bit-field, a computed value).
  std::optional<std::pair<UInt64, Integer>> FindStorage(IGDBThread& Thread, Integer Frame, const std::string& Expr,
                                                        std::string& Why);

  // Memory (dapmemory.cpp).
  TDapReply ReadMemory(TDapArguments& Arguments);
  TDapReply WriteMemory(TDapArguments& Arguments);
  TDapReply Modules(TDapArguments& Arguments);
  // Machine code (dapcode.cpp).
  TDapReply Disassemble(TDapArguments& Arguments);
  TDapReply GotoTargets(TDapArguments& Arguments);
  TDapReply Goto(TDapArguments& Arguments);
  /// memoryReference plus offset; nullopt with the problem set.
  std::optional<UInt64> MemoryAddress(TDapArguments& Arguments);

  /// A response to the adapter's own request.
  void HandleResponse(const nlohmann::json& Response);
  /// Runs the request's handler and answers it.
  void Dispatch(const nlohmann::json& Request);
  void Respond(const nlohmann::json& Request, const TDapReply& Reply);
  void SendEvent(const std::string& Event, nlohmann::json Body = nullptr);
  /// Sends Message with the next seq, which it returns.
  Integer Send(nlohmann::json Message);
  void Output(const std::string& Category, const std::string& Text);

  /// The debugger's settings shared by launch and attach.
  struct TDebuggerChoice {
    std::string Debugger = "gdb";
    TGDBLanguage Language = glC;
  };
  std::optional<TDapReply> ReadDebuggerChoice(TDapArguments& Arguments, const std::string& Program,
                                              TDebuggerChoice& Choice);
  /// Has the client start the program in its terminal through the stand-in,
  /// and attaches to it there.
  TDapReply LaunchInTerminal(const std::string& Program, const TStringArray& Arguments,
                             const std::string& WorkingDir, const nlohmann::json& Environment,
                             const TDebuggerChoice& Choice);
  /// Starts the program once it is loaded and the client's configuration is
  /// done, whichever comes last.
  void StartWhenReady();
  /// Null with Refusal set unless the program is stopped.
  TIntfPtr<IGDBThread> StoppedThread(TDapArguments& Arguments, TDapReply& Refusal);
  /// Why a request that needs a stopped program cannot be served now.
  std::string NotStoppedReason() const;
  /// Steps the thread the request names.
  TDapReply Step(TDapArguments& Arguments, void (IGDBThread::*Line)(), void (IGDBThread::*Instruction)());
  /// Pumps the main-thread queue while the program stays in State, at most
  /// Limit.
  void PumpWhile(TProgramState State, std::chrono::milliseconds Limit);
  /// True once the program has exited, was let go or the debugger is lost.
  bool ProgramGone() const;
  Integer ClientLine(Integer Line) const { return FLinesStartAt1 ? Line : Line - 1; }
  Integer FrameHandle(Integer ThreadId, Integer Level);

  std::function<void(const std::string&)> FWriter;
  TIntfPtr<TDapListener> FListener;
  TIntfPtr<IGDBProcess> FProcess;
  TProgramState FState = TProgramState::None;
  bool FAttached = false;
  /// The client offers to start programs in its terminal.
  bool FClientHasTerminal = false;
  /// The client opens memory where a value's memoryReference points.
  bool FClientHasMemoryViews = false;
  /// The program runs in the client's terminal (launched, though attached to).
  bool FInTerminal = false;
  TStandInMeeting FMeeting;
  /// The seq of the adapter's runInTerminal request, and the client's answer.
  Integer FTerminalRequest = -1;
  std::optional<TDapReply> FTerminalAnswer;
  /// The stop that attaching caused is kept from the client until the
  /// configuration is done; set until then, and once it has been seen.
  bool FHoldAttachStop = false;
  bool FAttachStopSeen = false;
  bool FInitialized = false;
  bool FConfigured = false;
  bool FStarted = false;
  bool FStopAtEntry = false;
  /// Set while the stop at the program's entry is awaited.
  bool FEntryPending = false;
  /// Set by a pause request until the stop it caused.
  bool FPausePending = false;
  /// What the last signal or exception said, for the stop that follows it.
  std::optional<std::pair<std::string, nlohmann::json>> FPendingStop;
  /// What dataBreakpointInfo answered, by dataId.
  std::map<std::string, std::string> FDataDescriptions;
  /// The bytes a request changed, announced once it is answered.
  std::optional<std::pair<UInt64, Integer>> FPendingMemoryEvent;
  /// The addresses gotoTargets offered since the last stop, by id less one.
  std::vector<UInt64> FGotoTargets;
  /// The thread a goto moved, told as a stop once it is answered.
  std::optional<Integer> FPendingGotoStop;
  /// The modules loaded now, as module events described them, by id.
  std::map<Integer, nlohmann::json> FModules;
  bool FLinesStartAt1 = true;
  bool FColumnsStartAt1 = true;
  bool FEnding = false;
  bool FFinished = false;
  bool FTerminatedSent = false;
  /// Set by a garbage report until the next good message, so that a flood
  /// of garbage is reported once.
  bool FInGarbage = false;
  Integer FSequence = 0;
  std::set<Integer> FThreads;
  /// Frame ids handed out since the last stop: thread and 0-based level.
  std::vector<std::pair<Integer, Integer>> FFrames;
  /// The client's breakpoints by id.
  std::map<Integer, std::shared_ptr<TBreakpoint>> FBreakpoints;
  Integer FNextBreakpointId = 0;
  /// Set while breakpoints are placed for a response that tells their
  /// verdict: no event then.
  bool FPlacingForResponse = false;
  /// The breakpoints that kept the program stopped at its last stop.
  std::vector<Integer> FHitBreakpoints;
  /// The exception filters the client set, and the library told.
  std::set<std::string> FExceptionFilters;
  bool FExceptionsPlaced = false;
  /// The last exception that stopped each thread.
  std::map<Integer, TGDBException> FExceptions;
  /// Variables references handed out since the last stop.
  std::vector<TVariablesRef> FVariables;
};

} // namespace midebug::dap
