// The adapter's requests: start-up, run control, threads and stacks, and the
// end of the session.

#include "dapsession.h"

#include "dapaddress.h"
#include "dapframing.h"

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <sstream>

namespace midebug::dap {

namespace {

/// How long the end of a session waits for a killed program to go.
constexpr std::chrono::milliseconds EndWait(5000);
/// One pump of the main-thread queue while the session waits.
constexpr std::chrono::milliseconds PumpSlice(20);
/// How long a launch waits for the client's terminal to start the stand-in.
constexpr std::chrono::seconds TerminalWait(30);
/// Frames a stack trace request without "levels" gets.
constexpr Integer DefaultLevels = 1000;

#if defined(__aarch64__)
constexpr TGDBCPU HostCPU = gcARM64;
#else
constexpr TGDBCPU HostCPU = gcAMD64;
#endif

/// The language of Program from a source file beside it of the same name;
/// C when there is none.
TGDBLanguage GuessLanguage(const std::string& Program) {
  namespace fs = std::filesystem;
  std::error_code Ignored;
  if (Program.empty())
    return glC;
  const fs::path Stem = fs::path(Program).replace_extension();
  for (const char* Pascal : {".pas", ".pp", ".lpr", ".dpr"})
    if (fs::exists(fs::path(Stem).concat(Pascal), Ignored))
      return glPascal;
  for (const char* CPP : {".cpp", ".cc", ".cxx", ".C"})
    if (fs::exists(fs::path(Stem).concat(CPP), Ignored))
      return glCPP;
  return glC;
}

/// The function part of a call header: the library leads it with the
/// frame's address, which the frame reports on its own.
std::string FrameName(const std::string& Header) {
  if (Header.size() > 1 && Header.front() == ':') {
    const size_t Blank = Header.find(' ');
    if (Blank != std::string::npos)
      return Header.substr(Blank + 1);
  }
  return Header.empty() ? "??" : Header;
}

} // namespace

// --- Arguments -----------------------------------------------------------------

const nlohmann::json* TDapArguments::Find(const char* Name) {
  if (!FArguments.is_object())
    return nullptr;
  const auto Found = FArguments.find(Name);
  return Found == FArguments.end() || Found->is_null() ? nullptr : &*Found;
}

void TDapArguments::Complain(const char* Name, const char* Expected) {
  if (FProblem.empty())
    FProblem = std::string("'") + Name + "' must be " + Expected;
}

std::optional<std::string> TDapArguments::String(const char* Name) {
  const nlohmann::json* Value = Find(Name);
  if (!Value)
    return std::nullopt;
  if (!Value->is_string()) {
    Complain(Name, "a string");
    return std::nullopt;
  }
  return Value->get<std::string>();
}

std::optional<bool> TDapArguments::Boolean(const char* Name) {
  const nlohmann::json* Value = Find(Name);
  if (!Value)
    return std::nullopt;
  if (!Value->is_boolean()) {
    Complain(Name, "true or false");
    return std::nullopt;
  }
  return Value->get<bool>();
}

std::optional<long long> TDapArguments::Number(const char* Name, long long Min, long long Max) {
  const nlohmann::json* Value = Find(Name);
  if (!Value)
    return std::nullopt;
  if (!Value->is_number_integer() || Value->get<long long>() < Min || Value->get<long long>() > Max) {
    const std::string Range = "a whole number from " + std::to_string(Min) + " to " + std::to_string(Max);
    Complain(Name, Range.c_str());
    return std::nullopt;
  }
  return Value->get<long long>();
}

const nlohmann::json* TDapArguments::Object(const char* Name) {
  const nlohmann::json* Value = Find(Name);
  if (Value && !Value->is_object()) {
    Complain(Name, "an object");
    return nullptr;
  }
  return Value;
}

std::optional<TStringArray> TDapArguments::Strings(const char* Name) {
  const nlohmann::json* Value = Find(Name);
  if (!Value)
    return std::nullopt;
  TStringArray Items;
  if (Value->is_array())
    for (const nlohmann::json& Item : *Value) {
      if (!Item.is_string())
        break;
      Items.push_back(Item.get<std::string>());
    }
  if (!Value->is_array() || Items.size() != Value->size()) {
    Complain(Name, "a list of strings");
    return std::nullopt;
  }
  return Items;
}

// --- Dispatch --------------------------------------------------------------------

TDapSession::TDapSession() : FListener(new TDapListener(this)) {}

TDapSession::~TDapSession() { End(); }

const std::vector<TDapSession::TRequestEntry>& TDapSession::Requests() {
  static const std::vector<TRequestEntry> Table = {
      {"initialize", &TDapSession::Initialize},
      {"launch", &TDapSession::Launch},
      {"attach", &TDapSession::Attach},
      {"configurationDone", &TDapSession::ConfigurationDone},
      {"disconnect", &TDapSession::Disconnect},
      {"terminate", &TDapSession::Terminate},
      {"threads", &TDapSession::Threads},
      {"stackTrace", &TDapSession::StackTrace},
      {"continue", &TDapSession::Continue},
      {"next", &TDapSession::Next},
      {"stepIn", &TDapSession::StepIn},
      {"stepOut", &TDapSession::StepOut},
      {"pause", &TDapSession::Pause},
      {"cancel", &TDapSession::Cancel},
      {"setBreakpoints", &TDapSession::SetBreakpoints},
      {"setFunctionBreakpoints", &TDapSession::SetFunctionBreakpoints},
      {"setExceptionBreakpoints", &TDapSession::SetExceptionBreakpoints},
      {"setInstructionBreakpoints", &TDapSession::SetInstructionBreakpoints},
      {"breakpointLocations", &TDapSession::BreakpointLocations},
      {"exceptionInfo", &TDapSession::ExceptionInfo},
      {"scopes", &TDapSession::Scopes},
      {"variables", &TDapSession::Variables},
      {"evaluate", &TDapSession::Evaluate},
      {"setVariable", &TDapSession::SetVariable},
      {"setExpression", &TDapSession::SetExpression},
      {"readMemory", &TDapSession::ReadMemory},
      {"writeMemory", &TDapSession::WriteMemory},
      {"modules", &TDapSession::Modules},
      {"disassemble", &TDapSession::Disassemble},
      {"gotoTargets", &TDapSession::GotoTargets},
      {"goto", &TDapSession::Goto},
      {"dataBreakpointInfo", &TDapSession::DataBreakpointInfo},
      {"setDataBreakpoints", &TDapSession::SetDataBreakpoints},
      {"loadedSources", &TDapSession::LoadedSources},
      {"source", &TDapSession::Source},
  };
  return Table;
}

void TDapSession::HandleMessage(const std::string& Body) {
  const nlohmann::json Message = nlohmann::json::parse(Body, nullptr, false);
  if (Message.is_discarded() || !Message.is_object()) {
    HandleGarbage("a message that is not a JSON object");
    return;
  }
  FInGarbage = false;
  const auto Type = Message.find("type");
  if (Type == Message.end() || *Type != "request") {
    if (Type != Message.end() && *Type == "response")
      HandleResponse(Message);
    // Events from the client need no answer.
    else if (Type == Message.end() || *Type != "event")
      HandleGarbage("a message that is neither request, response nor event");
    return;
  }
  Dispatch(Message);
}

void TDapSession::HandleResponse(const nlohmann::json& Response) {
  const auto Seq = Response.find("request_seq");
  if (FTerminalRequest < 0 || Seq == Response.end() || *Seq != FTerminalRequest)
    return;
  const auto Success = Response.find("success");
  const auto Message = Response.find("message");
  FTerminalAnswer = Success != Response.end() && *Success == true
                        ? TDapReply::Ok()
                        : TDapReply::Refuse(Message != Response.end() && Message->is_string() ? Message->get<std::string>()
                                                                                             : std::string());
}

void TDapSession::HandleGarbage(const std::string& What) {
  if (FInGarbage)
    return;
  FInGarbage = true;
  Output("console", "midebug-dap: ignored " + What + "\n");
}

void TDapSession::Dispatch(const nlohmann::json& Request) {
  const auto Command = Request.find("command");
  const auto Seq = Request.find("seq");
  if (Command == Request.end() || !Command->is_string() || Seq == Request.end() || !Seq->is_number_integer()) {
    Respond(Request, TDapReply::Refuse("a request needs a whole-number 'seq' and a 'command' string"));
    return;
  }
  const std::string Name = Command->get<std::string>();
  for (const TRequestEntry& Entry : Requests()) {
    if (Name != Entry.Command)
      continue;
    const auto Found = Request.find("arguments");
    static const nlohmann::json NoArguments = nlohmann::json::object();
    const nlohmann::json& Given = Found == Request.end() || Found->is_null() ? NoArguments : *Found;
    if (!Given.is_object()) {
      Respond(Request, TDapReply::Refuse("the arguments of '" + Name + "' must be an object"));
      return;
    }
    if (FEnding && Name != "disconnect") {
      Respond(Request, TDapReply::Refuse("the session is ending"));
      return;
    }
    TDapArguments Arguments(Given);
    TDapReply Reply;
    try {
      Reply = (this->*Entry.Handler)(Arguments);
    } catch (const std::exception& Error) {
      // The library raises at its boundary when the debugger fails.
      Reply = TDapReply::Refuse(Error.what());
    }
    if (Reply.Success && !Arguments.Problem().empty())
      Reply = TDapReply::Refuse(Arguments.Problem());
    else if (!Reply.Success && !Arguments.Problem().empty())
      Reply.Message = Arguments.Problem();
    Respond(Request, Reply);
    if (Name == "initialize" && Reply.Success)
      SendEvent("initialized");
    if (FPendingMemoryEvent) {
      const auto [Address, Count] = *std::exchange(FPendingMemoryEvent, std::nullopt);
      SendEvent("memory", {{"memoryReference", HexAddress(Address)}, {"offset", 0}, {"count", Count}});
    }
    if (FPendingGotoStop)
      SendEvent("stopped", {{"reason", "goto"},
                            {"threadId", *std::exchange(FPendingGotoStop, std::nullopt)},
                            {"allThreadsStopped", true}});
    return;
  }
  Respond(Request, TDapReply::Refuse("midebug-dap does not know the request '" + Name + "'"));
}

void TDapSession::Respond(const nlohmann::json& Request, const TDapReply& Reply) {
  nlohmann::json Response = {{"type", "response"}, {"success", Reply.Success}};
  // The request is an object; its seq and command may be of any type.
  const auto Seq = Request.find("seq");
  const auto Command = Request.find("command");
  Response["request_seq"] = Seq != Request.end() && Seq->is_number_integer() ? *Seq : nlohmann::json(0);
  Response["command"] = Command != Request.end() && Command->is_string() ? *Command : nlohmann::json("");
  if (!Reply.Success)
    Response["message"] = Reply.Message;
  if (!Reply.Body.is_null())
    Response["body"] = Reply.Body;
  else if (!Reply.Success)
    Response["body"] = {{"error", {{"id", 1}, {"format", Reply.Message}, {"showUser", false}}}};
  Send(std::move(Response));
}

void TDapSession::SendEvent(const std::string& Event, nlohmann::json Body) {
  nlohmann::json Message = {{"type", "event"}, {"event", Event}};
  if (!Body.is_null())
    Message["body"] = std::move(Body);
  Send(std::move(Message));
}

Integer TDapSession::Send(nlohmann::json Message) {
  Message["seq"] = ++FSequence;
  // Invalid UTF-8 from the program or the debugger is replaced, not thrown.
  const std::string Body = Message.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
  // A client that has gone is noticed when its end of the input closes.
  if (FWriter)
    FWriter(FrameMessage(Body));
  else
    WriteStandardOutput(FrameMessage(Body));
  return FSequence;
}

void TDapSession::Output(const std::string& Category, const std::string& Text) {
  SendEvent("output", {{"category", Category}, {"output", Text}});
}

// --- Start-up --------------------------------------------------------------------

TDapReply TDapSession::Initialize(TDapArguments& Arguments) {
  if (FInitialized)
    return TDapReply::Refuse("the session is already initialized");
  const bool LinesStartAt1 = Arguments.Boolean("linesStartAt1").value_or(true);
  const bool ColumnsStartAt1 = Arguments.Boolean("columnsStartAt1").value_or(true);
  const bool ClientHasTerminal = Arguments.Boolean("supportsRunInTerminalRequest").value_or(false);
  const bool ClientHasMemoryViews = Arguments.Boolean("supportsMemoryReferences").value_or(false);
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  FInitialized = true;
  FLinesStartAt1 = LinesStartAt1;
  FColumnsStartAt1 = ColumnsStartAt1;
  FClientHasTerminal = ClientHasTerminal;
  FClientHasMemoryViews = ClientHasMemoryViews;
  // Exactly what works.
  return TDapReply::Ok({
      {"supportsConfigurationDoneRequest", true},
      {"supportsTerminateRequest", true},
      {"supportTerminateDebuggee", true},
      {"supportsCancelRequest", true},
      {"supportsSteppingGranularity", true},
      {"supportsDelayedStackTraceLoading", true},
      {"supportsFunctionBreakpoints", true},
      {"supportsConditionalBreakpoints", true},
      {"supportsHitConditionalBreakpoints", true},
      {"supportsLogPoints", true},
      {"supportsBreakpointLocationsRequest", true},
      {"supportsExceptionInfoRequest", true},
      {"supportsEvaluateForHovers", true},
      {"supportsSetVariable", true},
      {"supportsSetExpression", true},
      {"supportsValueFormattingOptions", true},
      {"exceptionBreakpointFilters",
       {{{"filter", "cpp_throw"}, {"label", "C++: on throw"}, {"default", false}},
        {{"filter", "cpp_catch"}, {"label", "C++: on catch"}, {"default", false}},
        {{"filter", "pascal_raise"}, {"label", "Pascal: on raise"}, {"default", false}}}},
      {"supportsReadMemoryRequest", true},
      {"supportsWriteMemoryRequest", true},
      {"supportsModulesRequest", true},
      {"supportsInstructionBreakpoints", true},
      {"supportsDisassembleRequest", true},
      {"supportsGotoTargetsRequest", true},
      {"supportsDataBreakpoints", true},
      {"supportsLoadedSourcesRequest", true},
  });
}

std::optional<TDapReply> TDapSession::ReadDebuggerChoice(TDapArguments& Arguments, const std::string& Program,
                                                         TDebuggerChoice& Choice) {
  if (const auto Debugger = Arguments.String("debugger"); Debugger && !Debugger->empty())
    Choice.Debugger = *Debugger;
  Choice.Language = GuessLanguage(Program);
  if (const auto Language = Arguments.String("language")) {
    bool Known = false;
    for (size_t Index = 0; Index < GDBLanguageNames.size(); ++Index)
      if (*Language == GDBLanguageNames[Index]) {
        Choice.Language = static_cast<TGDBLanguage>(Index);
        Known = true;
      }
    if (!Known)
      return TDapReply::Refuse("'language' must be \"c\", \"c++\" or \"pascal\"");
  }
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  return std::nullopt;
}

TDapReply TDapSession::Launch(TDapArguments& Arguments) {
  if (!FInitialized)
    return TDapReply::Refuse("'initialize' must come first");
  // A launch waiting for the client's terminal has a meeting folder.
  if (FProcess || !FMeeting.Folder().empty())
    return TDapReply::Refuse("this adapter already debugs a program; start another adapter for another");
  const auto Program = Arguments.String("program");
  if (!Program || Program->empty())
    return TDapReply::Refuse(Arguments.Problem().empty() ? "launch needs 'program': the path of the program to debug"
                                                         : Arguments.Problem());
  const TStringArray ProgramArguments = Arguments.Strings("args").value_or(TStringArray());
  std::string WorkingDir = Arguments.String("cwd").value_or("");
  FStopAtEntry = Arguments.Boolean("stopAtEntry").value_or(false);
  TDebuggerChoice Choice;
  if (auto Refusal = ReadDebuggerChoice(Arguments, *Program, Choice))
    return *Refusal;
  std::error_code Ignored;
  if (WorkingDir.empty())
    WorkingDir = std::filesystem::current_path(Ignored).string();
  else if (!std::filesystem::is_directory(WorkingDir, Ignored))
    return TDapReply::Refuse("'cwd' is not a directory: " + WorkingDir);
  // The debugger, and through it the program, inherits the adapter's own
  // environment: the variables are set there before it starts; null unsets
  // one.
  const nlohmann::json* Environment = Arguments.Object("env");
  if (Environment) {
    for (const auto& [Name, Value] : Environment->items())
      if (Name.empty() || Name.find('=') != std::string::npos || (!Value.is_string() && !Value.is_null()))
        return TDapReply::Refuse("'env' maps variable names to strings (or null to unset one); '" + Name +
                                 "' does not");
    for (const auto& [Name, Value] : Environment->items()) {
      if (Value.is_null())
        ::unsetenv(Name.c_str());
      else
        ::setenv(Name.c_str(), Value.get<std::string>().c_str(), 1);
    }
  }
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  const std::string Console = Arguments.String("console").value_or("integratedTerminal");
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  if (FClientHasTerminal && Console != "internalConsole")
    return LaunchInTerminal(*Program, ProgramArguments, WorkingDir,
                            Environment ? *Environment : nlohmann::json::object(), Choice);
  const bool ForLLDB = std::filesystem::path(Choice.Debugger).filename().string().find("lldb") != std::string::npos;
  FProcess = TGDBProcessManager::CreateProcess(FListener, *Program,
                                               QuoteProgramArguments(ProgramArguments, ForLLDB), WorkingDir,
                                               LocalProfileName, "Linux64", Choice.Language, HostCPU,
                                               Choice.Debugger);
  FState = TProgramState::Loaded;
  StartWhenReady();
  return TDapReply::Ok();
}

TDapReply TDapSession::Attach(TDapArguments& Arguments) {
  if (!FInitialized)
    return TDapReply::Refuse("'initialize' must come first");
  // A launch waiting for the client's terminal has a meeting folder.
  if (FProcess || !FMeeting.Folder().empty())
    return TDapReply::Refuse("this adapter already debugs a program; start another adapter for another");
  const auto Pid = Arguments.Number("pid", 1, 0x7fffffff);
  if (!Pid)
    return TDapReply::Refuse(Arguments.Problem().empty() ? "attach needs 'pid': the process id of the program"
                                                         : Arguments.Problem());
  FStopAtEntry = Arguments.Boolean("stopAtEntry").value_or(false);
  TDebuggerChoice Choice;
  std::error_code Unknown;
  const std::string Program = std::filesystem::read_symlink("/proc/" + std::to_string(*Pid) + "/exe", Unknown);
  if (auto Refusal = ReadDebuggerChoice(Arguments, Program, Choice))
    return *Refusal;
  FProcess = TGDBProcessManager::AttachProcess(FListener, static_cast<Integer>(*Pid), "Linux64", Choice.Language,
                                               HostCPU, Choice.Debugger);
  FAttached = true;
  // The program stands where the debugger caught it; the stop reaches the
  // listener a little later.
  FState = TProgramState::Stopped;
  FStarted = true;
  FHoldAttachStop = !FStopAtEntry;
  FEntryPending = FStopAtEntry;
  StartWhenReady();
  return TDapReply::Ok();
}

TDapReply TDapSession::LaunchInTerminal(const std::string& Program, const TStringArray& Arguments,
                                        const std::string& WorkingDir, const nlohmann::json& Environment,
                                        const TDebuggerChoice& Choice) {
  namespace fs = std::filesystem;
  std::error_code Failure;
  const fs::path Self = fs::read_symlink("/proc/self/exe", Failure);
  std::string Error;
  if (Failure || !FMeeting.Create(Error))
    return TDapReply::Refuse("cannot prepare the client's terminal for the program: " +
                             (Failure ? Failure.message() : Error));
  nlohmann::json CommandLine = {Self.string(), StandInOption, FMeeting.Folder(), Program};
  for (const std::string& Argument : Arguments)
    CommandLine.push_back(Argument);
  FTerminalAnswer.reset();
  FTerminalRequest = Send({{"type", "request"},
                           {"command", "runInTerminal"},
                           {"arguments",
                            {{"kind", "integrated"},
                             {"title", fs::path(Program).filename().string()},
                             {"cwd", WorkingDir},
                             {"args", CommandLine},
                             {"env", Environment}}}});
  // The stand-in leaves its process id once the terminal runs it; requests
  // that come meanwhile are served as they come.
  const auto Deadline = std::chrono::steady_clock::now() + TerminalWait;
  Integer Pid = -1;
  while (!FEnding && (Pid = FMeeting.StandInPid()) < 0 && std::chrono::steady_clock::now() < Deadline &&
         (!FTerminalAnswer || FTerminalAnswer->Success))
    WaitAndProcess(PumpSlice);
  if (FEnding || Pid < 0)
    FMeeting.Dismiss();
  if (FEnding)
    return TDapReply::Refuse("the session is ending");
  if (Pid < 0)
    return TDapReply::Refuse("the client's terminal did not start the program" +
                             (FTerminalAnswer && !FTerminalAnswer->Message.empty() ? ": " + FTerminalAnswer->Message
                                                                                    : std::string()));
  try {
    FProcess = TGDBProcessManager::AttachProcess(FListener, Pid, "Linux64", Choice.Language, HostCPU, Choice.Debugger);
  } catch (const std::exception&) {
    FMeeting.Dismiss();
    throw;
  }
  FInTerminal = true;
  FState = TProgramState::Stopped;
  FStarted = true;
  FHoldAttachStop = true;
  // Held by the debugger, the stand-in sees this only when it runs again.
  FMeeting.Release();
  StartWhenReady();
  return TDapReply::Ok();
}

TDapReply TDapSession::ConfigurationDone(TDapArguments& /*Arguments*/) {
  if (FConfigured)
    return TDapReply::Refuse("the configuration is already done");
  FConfigured = true;
  StartWhenReady();
  return TDapReply::Ok();
}

void TDapSession::StartWhenReady() {
  if (FProcess && !ProgramGone())
    PlaceBreakpoints();
  if (!FProcess || !FConfigured)
    return;
  if (FAttached || FInTerminal) {
    // Attached: the program goes on from the stop that attaching caused,
    // unless the client asked to see it there.
    if (!FHoldAttachStop || !FAttachStopSeen)
      return;
    FHoldAttachStop = false;
    // In the terminal the stand-in is still to become the program: its
    // main is the program's entry.
    if (FInTerminal && FStopAtEntry)
      FEntryPending = FProcess->SetRunToMainBreakpoint();
    FProcess->Resume();
    return;
  }
  if (FStarted)
    return;
  FStarted = true;
  if (FStopAtEntry) {
    FEntryPending = FProcess->SetRunToMainBreakpoint();
    if (!FEntryPending)
      Output("console", "midebug-dap: the program has no main function to stop at; it runs\n");
  }
  FState = TProgramState::Running;
  FProcess->Run();
}

// --- The end -----------------------------------------------------------------------

TDapReply TDapSession::Disconnect(TDapArguments& Arguments) {
  const auto TerminateDebuggee = Arguments.Boolean("terminateDebuggee");
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  End(TerminateDebuggee);
  return TDapReply::Ok();
}

TDapReply TDapSession::Terminate(TDapArguments& /*Arguments*/) {
  if (!FProcess || (FState != TProgramState::Running && FState != TProgramState::Stopped &&
                    FState != TProgramState::Loaded))
    return TDapReply::Refuse("no program runs");
  FProcess->Terminate();
  return TDapReply::Ok();
}

void TDapSession::HandleClientGone() { End(); }

void TDapSession::End(std::optional<bool> TerminateDebuggee) {
  if (FFinished)
    return;
  FEnding = true;
  if (FProcess) {
    try {
      // A program in the client's terminal was launched, though attached to.
      const bool Kill = TerminateDebuggee.value_or(!FAttached);
      const TProgramState Before = FState;
      const bool Alive = Before == TProgramState::Stopped || Before == TProgramState::Running;
      if (Alive && !Kill) {
        // The debugger can only let a stopped program go.
        if (Before == TProgramState::Running) {
          FProcess->Pause();
          PumpWhile(Before, EndWait);
        }
        FProcess->Detach();
        FState = TProgramState::Detached;
      } else if (Alive) {
        // The exit may be reported while Terminate still runs.
        FProcess->Terminate();
        PumpWhile(Before, EndWait);
      }
    } catch (const std::exception& Error) {
      Output("console", std::string("midebug-dap: ") + Error.what() + "\n");
    }
    // The inspectors go before the process they ask.
    FVariables.clear();
    // Releasing the process stops the debugger (and a program loaded but
    // never started).
    FProcess = nullptr;
    ProcessPending();
  }
  FListener->Forget();
  FFinished = true;
}

void TDapSession::PumpWhile(TProgramState State, std::chrono::milliseconds Limit) {
  const auto Deadline = std::chrono::steady_clock::now() + Limit;
  while (FState == State && std::chrono::steady_clock::now() < Deadline)
    WaitAndProcess(PumpSlice);
}

// --- Run control -------------------------------------------------------------------

std::string TDapSession::NotStoppedReason() const {
  switch (FState) {
  case TProgramState::None:
    return "no program is being debugged";
  case TProgramState::Loaded:
    return "the program has not started yet";
  case TProgramState::Running:
    return "the program is running";
  case TProgramState::Exited:
    return "the program has exited";
  case TProgramState::Detached:
    return "the program was detached";
  case TProgramState::Lost:
    return "the debugger is gone";
  case TProgramState::Stopped:
  default:
    return "the program is stopped";
  }
}

TIntfPtr<IGDBThread> TDapSession::StoppedThread(TDapArguments& Arguments, TDapReply& Refusal) {
  const auto ThreadId = Arguments.Number("threadId", 0, 0x7fffffff);
  if (!ThreadId) {
    Refusal = TDapReply::Refuse(Arguments.Problem().empty() ? "'threadId' is missing" : Arguments.Problem());
    return nullptr;
  }
  if (!FProcess || FState != TProgramState::Stopped) {
    Refusal = TDapReply::Refuse(NotStoppedReason());
    return nullptr;
  }
  TIntfPtr<IGDBThread> Thread = FProcess->GetThread(static_cast<Integer>(*ThreadId));
  if (!Thread || Thread->GetId() != *ThreadId) {
    Refusal = TDapReply::Refuse("there is no thread " + std::to_string(*ThreadId));
    return nullptr;
  }
  return Thread;
}

TDapReply TDapSession::Continue(TDapArguments& Arguments) {
  Arguments.Number("threadId", 0, 0x7fffffff);
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  if (!FProcess || FState != TProgramState::Stopped)
    return TDapReply::Refuse(NotStoppedReason());
  FProcess->Resume();
  return TDapReply::Ok({{"allThreadsContinued", true}});
}

TDapReply TDapSession::Step(TDapArguments& Arguments, void (IGDBThread::*Line)(), void (IGDBThread::*Instruction)()) {
  TDapReply Refusal;
  TIntfPtr<IGDBThread> Thread = StoppedThread(Arguments, Refusal);
  if (!Thread)
    return Refusal;
  const std::string Granularity = Arguments.String("granularity").value_or("statement");
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  if (Granularity != "statement" && Granularity != "line" && Granularity != "instruction")
    return TDapReply::Refuse("'granularity' must be \"statement\", \"line\" or \"instruction\"");
  ((*Thread).*(Granularity == "instruction" ? Instruction : Line))();
  return TDapReply::Ok();
}

TDapReply TDapSession::Next(TDapArguments& Arguments) {
  return Step(Arguments, &IGDBThread::StepOver, &IGDBThread::InstStepOver);
}

TDapReply TDapSession::StepIn(TDapArguments& Arguments) {
  return Step(Arguments, &IGDBThread::StepInto, &IGDBThread::InstStepInto);
}

TDapReply TDapSession::StepOut(TDapArguments& Arguments) {
  // There is no instruction-sized way out of a function: the whole call ends.
  return Step(Arguments, &IGDBThread::StepOut, &IGDBThread::StepOut);
}

TDapReply TDapSession::Pause(TDapArguments& Arguments) {
  Arguments.Number("threadId", 0, 0x7fffffff);
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  if (FProcess && FState == TProgramState::Stopped)
    return TDapReply::Ok();
  if (!FProcess || FState != TProgramState::Running)
    return TDapReply::Refuse(NotStoppedReason());
  FPausePending = true;
  FProcess->Pause();
  return TDapReply::Ok();
}

TDapReply TDapSession::Cancel(TDapArguments& /*Arguments*/) {
  // Every request is answered before the next is read: nothing is left to
  // cancel by the time this one is.
  return TDapReply::Ok();
}

// --- Threads and stacks ----------------------------------------------------------

TDapReply TDapSession::Threads(TDapArguments& /*Arguments*/) {
  std::set<Integer> Ids = FThreads;
  const bool Stopped = FProcess && FState == TProgramState::Stopped;
  if (Stopped)
    if (const Integer Suspended = FProcess->GetSuspendedThreadId(); Suspended >= 0)
      Ids.insert(Suspended);
  nlohmann::json List = nlohmann::json::array();
  for (const Integer Id : Ids) {
    std::string Name;
    // A running thread's name would have to be asked of the running program.
    if (Stopped)
      if (TIntfPtr<IGDBThread> Thread = FProcess->GetThread(Id); Thread && Thread->GetId() == Id)
        Name = Thread->GetName();
    List.push_back({{"id", Id}, {"name", "Thread " + std::to_string(Id) + (Name.empty() ? "" : " (" + Name + ")")}});
  }
  return TDapReply::Ok({{"threads", List}});
}

Integer TDapSession::FrameHandle(Integer ThreadId, Integer Level) {
  FFrames.emplace_back(ThreadId, Level);
  return static_cast<Integer>(FFrames.size());
}

TDapReply TDapSession::StackTrace(TDapArguments& Arguments) {
  TDapReply Refusal;
  TIntfPtr<IGDBThread> Thread = StoppedThread(Arguments, Refusal);
  if (!Thread)
    return Refusal;
  const Integer Start = static_cast<Integer>(Arguments.Number("startFrame", 0, 0x7fffffff).value_or(0));
  Integer Levels = static_cast<Integer>(Arguments.Number("levels", 0, 0x7fffffff).value_or(0));
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  if (Levels == 0)
    Levels = DefaultLevels;
  const Integer Total = Thread->GetCallCount();
  const Integer ThreadId = Thread->GetId();
  nlohmann::json Frames = nlohmann::json::array();
  for (Integer Level = Start; Level < Total && Level - Start < Levels; ++Level) {
    const TGDBLocation Location = Thread->GetCallLocation(Level + 1);
    nlohmann::json Frame = {{"id", FrameHandle(ThreadId, Level)},
                            {"name", FrameName(Thread->GetCallHeader(Level + 1))},
                            {"line", 0},
                            {"column", 0}};
    if (!Location.Source.empty() && Location.Line > 0) {
      Frame["source"] = {{"name", std::filesystem::path(Location.Source).filename().string()},
                         {"path", Location.Source}};
      Frame["line"] = ClientLine(Location.Line);
      Frame["column"] = FColumnsStartAt1 ? 1 : 0;
    } else {
      Frame["presentationHint"] = "subtle";
    }
    if (Location.Address != 0)
      Frame["instructionPointerReference"] = HexAddress(Location.Address);
    Frames.push_back(std::move(Frame));
  }
  return TDapReply::Ok({{"stackFrames", Frames}, {"totalFrames", Total}});
}

} // namespace midebug::dap
