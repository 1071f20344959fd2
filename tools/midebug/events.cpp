// The library's events as the console debugger reports them.

#include "session.h"

#include <regex>
#include <utility>

namespace midebug::cli {

// --- The listener --------------------------------------------------------------

void TCliListener::ProcessSuspended(Integer ThreadId) {
  if (FSession)
    FSession->OnSuspended(ThreadId);
}
void TCliListener::ProcessResumed(Integer ThreadId) {
  if (FSession)
    FSession->OnResumed(ThreadId);
}
void TCliListener::ProcessExited(Integer Code, const std::string& Signal) {
  if (FSession)
    FSession->OnExited(Code, Signal);
}
void TCliListener::ThreadCreated(Integer ThreadId) {
  if (FSession)
    FSession->OnThreadCreated(ThreadId);
}
void TCliListener::ThreadExited(Integer ThreadId) {
  if (FSession)
    FSession->OnThreadExited(ThreadId);
}
void TCliListener::ModuleLoaded(const TGDBModule& Module) {
  if (FSession)
    FSession->OnModule(Module, true);
}
void TCliListener::ModuleUnLoaded(const TGDBModule& Module) {
  if (FSession)
    FSession->OnModule(Module, false);
}
void TCliListener::SignalReceived(bool& ShouldStop, Integer ThreadId, const TGDBException& SignalException) {
  // A console debugger stops at every signal, as GDB does by default.
  ShouldStop = true;
  if (FSession)
    FSession->OnSignal(ThreadId, SignalException);
}
void TCliListener::ExceptionRaised(bool& ShouldStop, Integer ThreadId, const TGDBException& LanguageException) {
  ShouldStop = FSession ? FSession->OnException(ThreadId, LanguageException) : true;
}
void TCliListener::LogEvent(const TGDBLogEvent& Event) {
  if (FSession)
    FSession->OnLog(Event);
}
void TCliListener::InternalError(const std::string& Message) {
  // Raised on the thread that found the error: report it from the main one.
  TIntfPtr<TCliListener> Self(this);
  Post([Self, Message] {
    if (Self->FSession)
      Self->FSession->OnInternalError(Message);
  });
}
bool TCliListener::FatalError() {
  // Nobody is there to wait for a debugger that stopped answering.
  if (FSession)
    FSession->OnDebuggerLost();
  return true;
}
void TCliListener::ProcessRestart() {
  TIntfPtr<TCliListener> Self(this);
  Post([Self] {
    if (Self->FSession)
      Self->FSession->OnRestart();
  });
}

// --- The session's side ------------------------------------------------------

namespace {

std::string StopReasonWord(TThreadStopReason Reason) {
  switch (Reason) {
  case tsrNotStopped:
    return "not-stopped";
  case tsrAtBreakpoint:
    return "breakpoint";
  case tsrStepDone:
    return "step";
  case tsrFCallDone:
    return "function-finished";
  case tsrSignal:
    return "signal";
  case tsrError:
    return "error";
  case tsrExceptRaised:
    return "exception";
  case tsrUnknown:
  default:
    return "unknown";
  }
}

std::string LogKindWord(TGDBEvent Event) {
  switch (Event) {
  case etError:
    return "error";
  case etConsole:
    return "console";
  case etOds:
    return "debug-string";
  case etInternal:
    return "internal";
  case etUnknown:
  default:
    return "output";
  }
}

/// GDB's own notes on threads, stops and the program's end, which the
/// session reports in its own words: its banner-free console, as a person
/// reads it.
bool IsDebuggerChatter(const std::string& Line) {
  static const char* const Prefixes[] = {
      "[New Thread ", "[Thread ", "[New LWP ", "[LWP ", "[Inferior ", "[Switching to ", "[Thread debugging using ",
      "Using host libthread_db", "Program received signal ", "Program terminated with signal ",
      "The program no longer exists.", "Run till exit from ", "Continuing.", "Starting program: ", "Breakpoint ",
      "Temporary breakpoint ", "Thread "};
  for (const char* Prefix : Prefixes)
    if (Line.starts_with(Prefix))
      return true;
  // The frame and source line GDB shows at a stop: "0x... in f () at f.c:8",
  // "f (a=1) at f.c:8", "8       text".
  static const std::regex StopEcho(R"(^((0x[0-9a-f]+ in )?\S+ \(.*\)( at \S+:[0-9]+| from \S+)?|[0-9]+(\t|   ).*)$)");
  return Line.empty() || std::regex_match(Line, StopEcho);
}

std::string SignalWords(const std::string& Name, const std::string& Description) {
  const std::string Words = Description.empty() ? SignalDescription(Name) : Description;
  return Words.empty() ? Name : Name + " (" + Words + ")";
}

/// The code the library gives the end of a launch the debugger refused;
/// the loss of the debugger comes with another.
constexpr Integer LaunchRefusedCode = -1;

/// A signal's name is a single word in capitals; the library reports other
/// texts (the debugger's loss, a refused launch) in the same place.
bool IsSignalName(const std::string& Text) {
  return Text.size() > 3 && Text.starts_with("SIG") &&
         Text.find_first_not_of("ABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789") == std::string::npos;
}

} // namespace

void TCliSession::OnSuspended(Integer ThreadId) {
  FState = TRunState::Stopped;
  FQuietConsole = false;
  ++FStopCount;
  FCurrentThread = ThreadId;
  FCurrentFrame = 0;
  FThreads.insert(ThreadId);
  TThreadStopReason Reason = tsrUnknown;
  TGDBLocation Location;
  std::string Header;
  if (FProcess) {
    if (TIntfPtr<IGDBThread> Thread = FProcess->GetThread(ThreadId)) {
      Reason = Thread->GetStopReason();
      Location = Thread->GetCurrentLocation();
      // The frame's call is read only for the text a person reads.
      if (!FOutput.Json() && Thread->GetCallCount() > 0)
        Header = Thread->GetCallHeader(1);
    }
    if (Location.Source.empty() && Location.Address == 0)
      Location = FProcess->GetSuspendedLocation();
  }
  std::string ReasonWord = StopReasonWord(Reason);
  std::string Why = "Stopped (" + ReasonWord + ")";
  nlohmann::json Event = {{"event", "stopped"}, {"thread", ThreadId}};
  if (FPausing) {
    ReasonWord = "paused";
    Why = "Paused";
  } else if (Reason == tsrSignal && !FLastSignal.Name.empty()) {
    Event["signal"] = FLastSignal.Name;
    Why = "Stopped by signal " + SignalWords(FLastSignal.Name, FLastSignal.Desc);
  }
  FPausing = false;
  FAwaitingMain = false;
  FPauseWhenResumed = false;
  FResumeConfirmed = true;
  FLastSignal = {};
  Event["reason"] = ReasonWord;
  Event.update(LocationJson(Location));
  std::string Text = Why + " in thread " + std::to_string(ThreadId) + ": " +
                     (Header.empty() ? LocationText(Location) : FrameText(-1, Header, Location));
  DescribeHit(Event, Text);
  if (FProcess) {
    if (const std::string Returned = FProcess->GetReturnValue(); !Returned.empty()) {
      Event["returned"] = Returned;
      Text += "\nValue returned: " + Returned;
    }
  }
  const std::string Source = SourceText(Location);
  if (!Source.empty()) {
    Event["text"] = FSources.Line(Location.Source, Location.Line);
    Text += "\n" + Source;
  }
  FOutput.Emit(Event, Text);
  ShowDisplays();
}

void TCliSession::OnResumed(Integer ThreadId) {
  FState = TRunState::Running;
  FResumeConfirmed = true;
  if (std::exchange(FPauseWhenResumed, false))
    RequestPause();
  FOutput.Emit({{"event", "running"}, {"thread", ThreadId}}, "");
}

void TCliSession::OnExited(Integer Code, const std::string& Signal) {
  const TRunState Before = FState;
  const TEnding Ending = FEnding;
  FEnding = TEnding::None;
  FPausing = false;
  ++FStopCount;
  nlohmann::json Event = {{"event", "exited"}};
  std::string Text;
  if (Ending == TEnding::Detach) {
    FState = TRunState::Detached;
    Event["reason"] = "detached";
    Text = "Detached; the program goes on.";
  } else if (Ending == TEnding::Kill) {
    FState = TRunState::Exited;
    Event["reason"] = "killed";
    Text = "Program killed.";
  } else if (IsSignalName(Signal)) {
    FState = TRunState::Exited;
    Event["reason"] = "signal";
    Event["signal"] = Signal;
    Text = "Program ended by signal " + SignalWords(Signal, "") + ".";
  } else if (!Signal.empty() && Before == TRunState::Loaded && Code == LaunchRefusedCode) {
    FState = TRunState::Exited;
    Event["reason"] = "start-failed";
    Event["message"] = Signal;
    Text = "The program could not be started: " + Signal;
  } else if (!Signal.empty()) {
    FState = TRunState::Lost;
    Event["reason"] = "debugger-lost";
    Event["message"] = Signal;
    Text = "Debugger lost: " + Signal;
  } else {
    FState = TRunState::Exited;
    Event["reason"] = "exited";
    Event["code"] = Code;
    Text = "Program exited with code " + std::to_string(Code) + ".";
  }
  if (std::exchange(FAwaitingMain, false) && Ending == TEnding::None) {
    Event["note"] = "no main function";
    Text += " It never reached main: the program has no main function.";
  }
  FOutput.Emit(Event, Text);
}

void TCliSession::OnThreadCreated(Integer ThreadId) {
  FThreads.insert(ThreadId);
  if (FOptions.ThreadEvents)
    FOutput.Emit({{"event", "thread-created"}, {"thread", ThreadId}},
                 "[thread " + std::to_string(ThreadId) + " created]");
}

void TCliSession::OnThreadExited(Integer ThreadId) {
  FThreads.erase(ThreadId);
  if (FOptions.ThreadEvents)
    FOutput.Emit({{"event", "thread-exited"}, {"thread", ThreadId}},
                 "[thread " + std::to_string(ThreadId) + " exited]");
}

void TCliSession::OnModule(const TGDBModule& Module, bool Loaded) {
  // Every shared library would be a line: kept for tools, left out of the
  // text a person reads.
  FOutput.Emit({{"event", Loaded ? "module-loaded" : "module-unloaded"},
                {"name", Module.Name},
                {"path", Module.Path},
                {"base", HexAddress(Module.BaseAddress)}},
               "");
}

void TCliSession::OnSignal(Integer ThreadId, const TGDBException& Signal) {
  // The stop that follows names the signal in the text form.
  FLastSignal = Signal;
  nlohmann::json Event = {{"event", "signal"}, {"thread", ThreadId}, {"name", Signal.Name}, {"description", Signal.Desc}};
  Event.update(LocationJson(Signal.Location));
  FOutput.Emit(Event, "");
}

void TCliSession::OnLog(const TGDBLogEvent& Event) {
  if (Event.Event == etConsole) {
    // GDB writes a console line in pieces: whole lines are reported.
    FConsoleText += Event.Data;
    for (size_t End = FConsoleText.find('\n'); End != std::string::npos; End = FConsoleText.find('\n')) {
      const std::string Line = FConsoleText.substr(0, End);
      FConsoleText.erase(0, End + 1);
      OnConsoleLine(Line);
    }
    return;
  }
  nlohmann::json Object = {{"event", "output"}, {"kind", LogKindWord(Event.Event)}, {"text", Event.Data}};
  if (Event.ThreadId >= 0)
    Object["thread"] = Event.ThreadId;
  std::string Text = Event.Data;
  if (Event.Event == etError)
    Text = "[debugger error] " + Text;
  else if (Event.Event == etInternal)
    Text = "[debugger] " + Text;
  FOutput.Emit(Object, Text);
}

void TCliSession::OnConsoleLine(const std::string& Line) {
  if (IsDebuggerChatter(Line))
    return;
  // The debugger's banner and start-up chatter: kept for tools, left out of
  // the text a person reads.
  FOutput.Emit({{"event", "output"}, {"kind", LogKindWord(etConsole)}, {"text", Line}},
               FQuietConsole ? "" : Line);
}

void TCliSession::OnInternalError(const std::string& Message) {
  FOutput.Emit({{"event", "internal-error"}, {"message", Message}}, "[internal error] " + Message);
}

void TCliSession::OnDebuggerLost() {
  FState = TRunState::Lost;
  ++FStopCount;
  FOutput.Emit({{"event", "debugger-lost"}}, "Debugger lost: it stopped answering; the session is over.");
}

void TCliSession::OnRestart() { FOutput.Emit({{"event", "restart"}}, "[the program restarts]"); }

} // namespace midebug::cli
