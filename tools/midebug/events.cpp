// The library's events as the console debugger reports them.

#include "session.h"

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
  ShouldStop = true;
  if (FSession)
    FSession->OnException(ThreadId, LanguageException);
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

} // namespace

void TCliSession::OnSuspended(Integer ThreadId) {
  FState = TRunState::Stopped;
  ++FStopCount;
  FCurrentThread = ThreadId;
  FCurrentFrame = 0;
  FThreads.insert(ThreadId);
  TThreadStopReason Reason = tsrUnknown;
  TGDBLocation Location;
  if (FProcess) {
    if (TIntfPtr<IGDBThread> Thread = FProcess->GetThread(ThreadId)) {
      Reason = Thread->GetStopReason();
      Location = Thread->GetCurrentLocation();
    }
    if (Location.Source.empty() && Location.Address == 0)
      Location = FProcess->GetSuspendedLocation();
  }
  nlohmann::json Event = {{"event", "stopped"}, {"thread", ThreadId}, {"reason", StopReasonWord(Reason)}};
  Event.update(LocationJson(Location));
  std::string Text = "Stopped (" + StopReasonWord(Reason) + ") in thread " + std::to_string(ThreadId) + " at " +
                     LocationText(Location);
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
  FOutput.Emit({{"event", "running"}, {"thread", ThreadId}}, "");
}

void TCliSession::OnExited(Integer Code, const std::string& Signal) {
  FState = TRunState::Exited;
  ++FStopCount;
  nlohmann::json Event = {{"event", "exited"}, {"code", Code}};
  std::string Text = "Program exited with code " + std::to_string(Code);
  if (!Signal.empty()) {
    Event["signal"] = Signal;
    Text = "Program ended: " + Signal + " (code " + std::to_string(Code) + ")";
  }
  FOutput.Emit(Event, Text);
}

void TCliSession::OnThreadCreated(Integer ThreadId) {
  FThreads.insert(ThreadId);
  FOutput.Emit({{"event", "thread-created"}, {"thread", ThreadId}}, "[thread " + std::to_string(ThreadId) + " created]");
}

void TCliSession::OnThreadExited(Integer ThreadId) {
  FThreads.erase(ThreadId);
  FOutput.Emit({{"event", "thread-exited"}, {"thread", ThreadId}}, "[thread " + std::to_string(ThreadId) + " exited]");
}

void TCliSession::OnModule(const TGDBModule& Module, bool Loaded) {
  // Every shared library would be a line: kept for tools, left out of the
  // text a person reads.
  FOutput.Emit({{"event", Loaded ? "module-loaded" : "module-unloaded"},
                {"name", Module.Name},
                {"path", Module.Path},
                {"base", Module.BaseAddress}},
               "");
}

void TCliSession::OnSignal(Integer ThreadId, const TGDBException& Signal) {
  nlohmann::json Event = {{"event", "signal"}, {"thread", ThreadId}, {"name", Signal.Name}, {"description", Signal.Desc}};
  Event.update(LocationJson(Signal.Location));
  FOutput.Emit(Event, "Signal " + Signal.Name + (Signal.Desc.empty() ? "" : " (" + Signal.Desc + ")") +
                          " in thread " + std::to_string(ThreadId));
}

void TCliSession::OnException(Integer ThreadId, const TGDBException& Exception) {
  nlohmann::json Event = {
      {"event", "exception"}, {"thread", ThreadId}, {"name", Exception.Name}, {"description", Exception.Desc}};
  Event.update(LocationJson(Exception.Location));
  FOutput.Emit(Event, "Exception " + Exception.Name + (Exception.Desc.empty() ? "" : ": " + Exception.Desc) +
                          " in thread " + std::to_string(ThreadId));
}

void TCliSession::OnLog(const TGDBLogEvent& Event) {
  nlohmann::json Object = {{"event", "output"}, {"kind", LogKindWord(Event.Event)}, {"text", Event.Data}};
  if (Event.ThreadId >= 0)
    Object["thread"] = Event.ThreadId;
  std::string Text = Event.Data;
  // The debugger's banner and start-up chatter: kept for tools, left out of
  // the text a person reads.
  if (FState == TRunState::Loaded && Event.Event == etConsole)
    Text.clear();
  else if (Event.Event == etError)
    Text = "[debugger error] " + Text;
  else if (Event.Event == etInternal)
    Text = "[debugger] " + Text;
  FOutput.Emit(Object, Text);
}

void TCliSession::OnInternalError(const std::string& Message) {
  FOutput.Emit({{"event", "internal-error"}, {"message", Message}}, "[internal error] " + Message);
}

void TCliSession::OnDebuggerLost() {
  FState = TRunState::Lost;
  ++FStopCount;
  FOutput.Emit({{"event", "debugger-lost"}}, "The debugger stopped answering; the session is over.");
}

void TCliSession::OnRestart() { FOutput.Emit({{"event", "restart"}}, "[the program restarts]"); }

} // namespace midebug::cli
