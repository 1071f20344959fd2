// The library's events as the adapter reports them to the client.

#include "dapsession.h"

#include <cxxabi.h>

#include <cstdlib>
#include <memory>

namespace midebug::dap {

// --- The listener --------------------------------------------------------------

void TDapListener::ProcessSuspended(Integer ThreadId) {
  if (FSession)
    FSession->OnSuspended(ThreadId);
}
void TDapListener::ProcessResumed(Integer ThreadId) {
  if (FSession)
    FSession->OnResumed(ThreadId);
}
void TDapListener::ProcessExited(Integer Code, const std::string& Signal) {
  if (FSession)
    FSession->OnExited(Code, Signal);
}
void TDapListener::ThreadCreated(Integer ThreadId) {
  if (FSession)
    FSession->OnThread(ThreadId, true);
}
void TDapListener::ThreadExited(Integer ThreadId) {
  if (FSession)
    FSession->OnThread(ThreadId, false);
}
void TDapListener::ModuleLoaded(const TGDBModule& Module) {
  if (FSession)
    FSession->OnModule(Module, true);
}
void TDapListener::ModuleUnLoaded(const TGDBModule& Module) {
  if (FSession)
    FSession->OnModule(Module, false);
}
void TDapListener::SignalReceived(bool& ShouldStop, Integer ThreadId, const TGDBException& SignalException) {
  // Every signal stops the program, as GDB does by default: the client shows
  // where it struck.
  ShouldStop = true;
  if (FSession)
    FSession->OnSignal(ThreadId, SignalException);
}
void TDapListener::ExceptionRaised(bool& ShouldStop, Integer ThreadId, const TGDBException& LanguageException) {
  // Only the kinds the client's filters name stop the program.
  ShouldStop = FSession && FSession->CatchesException(LanguageException);
  if (ShouldStop)
    FSession->OnException(ThreadId, LanguageException);
}
void TDapListener::LogEvent(const TGDBLogEvent& Event) {
  if (FSession)
    FSession->OnLog(Event);
}
void TDapListener::InternalError(const std::string& Message) {
  // Raised on the thread that found the error: reported from the main one,
  // the only one that writes to the client.
  TIntfPtr<TDapListener> Self(this);
  Post([Self, Message] {
    if (Self->FSession)
      Self->FSession->OnLog(CreateInternalLogEvent("internal error: " + Message));
  });
}
bool TDapListener::FatalError() {
  // Nobody is there to wait for a debugger that stopped answering.
  if (FSession)
    FSession->OnDebuggerLost();
  return true;
}
void TDapListener::ProcessRestart() {
  TIntfPtr<TDapListener> Self(this);
  Post([Self] {
    if (Self->FSession)
      Self->FSession->OnLog(CreateInternalLogEvent("the program restarts"));
  });
}

// --- The session's side ------------------------------------------------------

namespace {

const char* StopReasonWord(TThreadStopReason Reason) {
  switch (Reason) {
  case tsrAtBreakpoint:
    return "breakpoint";
  case tsrStepDone:
  case tsrFCallDone:
    return "step";
  case tsrSignal:
    return "signal";
  case tsrExceptRaised:
    return "exception";
  case tsrError:
  case tsrNotStopped:
  case tsrUnknown:
  default:
    return "pause";
  }
}

/// A type of the standard library's exception family, which all have
/// what(); others (a thrown std::string, say) have no virtual table to call.
bool IsStandardException(const std::string& Type) {
  if (!Type.starts_with("std::"))
    return false;
  for (const char* Word : {"error", "exception", "::bad_", "failure"})
    if (Type.find(Word) != std::string::npos)
      return true;
  return false;
}

/// The C++ type a mangled name stands for; the name itself otherwise.
std::string Demangled(const std::string& Name) {
  int Status = 0;
  std::unique_ptr<char, decltype(&std::free)> Readable(abi::__cxa_demangle(Name.c_str(), nullptr, nullptr, &Status),
                                                       &std::free);
  return Status == 0 && Readable ? std::string(Readable.get()) : Name;
}

/// "NAME (what it means)", or the part that is known.
std::string Described(const std::string& Name, const std::string& Desc) {
  if (Desc.empty())
    return Name;
  return Name.empty() ? Desc : Name + " (" + Desc + ")";
}

} // namespace

bool TDapSession::ProgramGone() const {
  return FState == TProgramState::Exited || FState == TProgramState::Detached || FState == TProgramState::Lost;
}

void TDapSession::OnSuspended(Integer ThreadId) {
  // A report queued before the program's end arrives after it.
  if (ProgramGone())
    return;
  FState = TProgramState::Stopped;
  FThreads.insert(ThreadId);
  if (FHoldAttachStop) {
    // The stop that attaching caused: the client sees the program go on.
    FAttachStopSeen = true;
    StartWhenReady();
    return;
  }
  nlohmann::json Body = {{"threadId", ThreadId}, {"allThreadsStopped", true}};
  if (FEntryPending) {
    Body["reason"] = "entry";
  } else if (FPausePending) {
    Body["reason"] = "pause";
  } else if (FPendingStop) {
    Body["reason"] = FPendingStop->first;
    Body.update(FPendingStop->second);
  } else {
    TIntfPtr<IGDBThread> Thread = FProcess ? FProcess->GetThread(ThreadId) : nullptr;
    Body["reason"] = StopReasonWord(Thread ? Thread->GetStopReason() : tsrUnknown);
    if (Body["reason"] == "breakpoint" && !FHitBreakpoints.empty()) {
      Body["hitBreakpointIds"] = FHitBreakpoints;
      // The first breakpoint that kept the program stopped names the stop.
      const auto First = FBreakpoints.find(FHitBreakpoints.front());
      const TBreakpoint* Hit = First != FBreakpoints.end() ? First->second.get() : nullptr;
      if (Hit && Hit->Kind == TBreakpointKind::Instruction) {
        Body["reason"] = "instruction breakpoint";
      } else if (Hit && Hit->Kind == TBreakpointKind::Data) {
        Body["reason"] = "data breakpoint";
        Body["description"] = "Data breakpoint: " + Hit->Watched +
                              (Hit->Access == "write"  ? " changed"
                               : Hit->Access == "read" ? " was read"
                                                       : " was accessed");
      }
    }
  }
  FEntryPending = false;
  FPausePending = false;
  FPendingStop.reset();
  SendEvent("stopped", std::move(Body));
}

void TDapSession::OnResumed(Integer ThreadId) {
  if (ProgramGone())
    return;
  FState = TProgramState::Running;
  FFrames.clear();
  FVariables.clear();
  FHitBreakpoints.clear();
  FGotoTargets.clear();
  SendEvent("continued", {{"threadId", ThreadId}, {"allThreadsContinued", true}});
}

void TDapSession::OnExited(Integer Code, const std::string& Signal) {
  FState = TProgramState::Exited;
  if (!Signal.empty())
    Output("console", "The program ended: " + Signal + "\n");
  SendEvent("exited", {{"exitCode", Code}});
  if (!FTerminatedSent) {
    FTerminatedSent = true;
    SendEvent("terminated");
  }
}

void TDapSession::OnThread(Integer ThreadId, bool Started) {
  if (Started)
    FThreads.insert(ThreadId);
  else
    FThreads.erase(ThreadId);
  SendEvent("thread", {{"reason", Started ? "started" : "exited"}, {"threadId", ThreadId}});
}

void TDapSession::OnModule(const TGDBModule& Module, bool Loaded) {
  nlohmann::json Entry = {{"id", Module.Id}, {"name", Module.Name.empty() ? Module.Path : Module.Name}};
  if (!Module.Path.empty())
    Entry["path"] = Module.Path;
  if (Module.BaseAddress != 0)
    Entry["addressRange"] = "0x" + [&] {
      static const char* const Digits = "0123456789abcdef";
      std::string Hex;
      for (UInt64 Value = Module.BaseAddress; Value != 0; Value >>= 4)
        Hex.insert(Hex.begin(), Digits[Value & 0xF]);
      return Hex;
    }();
  if (Loaded)
    FModules[Module.Id] = Entry;
  else
    FModules.erase(Module.Id);
  SendEvent("module", {{"reason", Loaded ? "new" : "removed"}, {"module", Entry}});
}

void TDapSession::OnSignal(Integer /*ThreadId*/, const TGDBException& Signal) {
  FPendingStop.emplace("signal", nlohmann::json{{"description", "Signal " + Described(Signal.Name, Signal.Desc)},
                                                {"text", Signal.Name}});
}

void TDapSession::OnException(Integer ThreadId, const TGDBException& Raised) {
  TGDBException Exception = Raised;
  Exception.Name = Demangled(Raised.Name);
  // The library names a C++ exception's type only; the standard ones say
  // what went wrong when asked: what() is the third entry of their virtual
  // table. Written in C, the language the debugger speaks inside the
  // runtime that throws.
  if (Exception.Desc.empty() && Exception.EObject != 0 && IsStandardException(Exception.Name) && FProcess)
    if (TIntfPtr<IGDBThread> Thread = FProcess->GetThread(ThreadId)) {
      std::string Value, TypeName;
      bool CanModify = false;
      const std::string Object = "(void*)" + std::to_string(Exception.EObject);
      const std::string Expr = "((const char*(*)(void*))(*(void***)" + Object + ")[2])(" + Object + ")";
      if (Thread->Evaluate(Expr, "", 1, Value, CanModify, TypeName) == ercOk)
        if (const size_t Quote = Value.find('"'); Quote != std::string::npos && Value.back() == '"')
          Exception.Desc = Value.substr(Quote + 1, Value.size() - Quote - 2);
    }
  FExceptions[ThreadId] = Exception;
  std::string Description = Exception.Name;
  if (!Exception.Desc.empty())
    Description += (Description.empty() ? "" : ": ") + Exception.Desc;
  FPendingStop.emplace("exception", nlohmann::json{{"description", "Exception " + Description},
                                                   {"text", Exception.Name}});
}

void TDapSession::OnLog(const TGDBLogEvent& Event) {
  if (Event.Data.empty())
    return;
  if (Event.Event == etUnknown) {
    Output("stdout", Event.Data);
    return;
  }
  // One console line per record, whatever blank or line break ends it.
  std::string Text = Event.Data;
  while (!Text.empty() && (Text.back() == ' ' || Text.back() == '\n'))
    Text.pop_back();
  Text += '\n';
  Output("console", Text);
}

void TDapSession::OnDebuggerLost() {
  FState = TProgramState::Lost;
  Output("console", "midebug-dap: the debugger stopped answering; the session is over\n");
  if (!FTerminatedSent) {
    FTerminatedSent = true;
    SendEvent("terminated");
  }
}

} // namespace midebug::dap
