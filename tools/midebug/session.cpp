// The console debugger's session: start-up, the commands and the end.

#include "session.h"

#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <sstream>
#include <string_view>

namespace midebug::cli {

namespace {

/// How long the end of a session waits for the program to go after kill.
constexpr std::chrono::milliseconds EndWait(5000);
/// The frames 'bt' shows when not told how many.
constexpr Integer DefaultFrames = 20;
/// One pump of the main-thread queue while a command waits.
constexpr std::chrono::milliseconds PumpSlice(20);

const char* const DebuggerLogPrefix = "gdb_";
const char* const DebuggerLogSuffix = ".log";

std::vector<std::string> SplitWords(const std::string& Line) {
  std::istringstream Stream(Line);
  std::vector<std::string> Words;
  for (std::string Word; Stream >> Word;)
    Words.push_back(Word);
  return Words;
}

bool ParseNumber(const std::string& Text, Integer& Value) {
  if (Text.empty() || Text.size() > 9 || Text.find_first_not_of("0123456789") != std::string::npos)
    return false;
  Value = std::stoi(Text);
  return true;
}

std::string ThreadStateWord(TThreadState State) {
  switch (State) {
  case tsStop:
    return "stopped";
  case tsRunnable:
    return "running";
  case tsBlocked:
    return "blocked";
  case tsZombie:
    return "zombie";
  case tsNone:
  default:
    return "none";
  }
}

/// The debugger logs in Dir.
std::set<std::string> DebuggerLogs(const std::string& Dir) {
  std::set<std::string> Logs;
  std::error_code Ignored;
  for (const auto& Entry : std::filesystem::directory_iterator(Dir, Ignored)) {
    const std::string Name = Entry.path().filename().string();
    if (Name.starts_with(DebuggerLogPrefix) && Name.ends_with(DebuggerLogSuffix))
      Logs.insert(Entry.path().string());
  }
  return Logs;
}

} // namespace

TCliSession::TCliSession(const TCliOptions& Options, TCliOutput& Output)
    : FOptions(Options), FOutput(Output), FListener(new TCliListener(this)) {}

TCliSession::~TCliSession() { End(); }

const std::vector<TCliSession::TCommandEntry>& TCliSession::Commands() {
  static const std::vector<TCommandEntry> Table = {
      {"run", &TCliSession::CmdRun, 0, "run", "start the program (again after it ended) and let it run"},
      {"start", &TCliSession::CmdStart, 0, "start", "start the program and stop at main"},
      {"continue", &TCliSession::CmdContinue, 0, "continue", "resume the stopped program"},
      {"next", &TCliSession::CmdStep, 0, "next", "step over one source line"},
      {"step", &TCliSession::CmdStep, 0, "step", "step into one source line"},
      {"finish", &TCliSession::CmdStep, 0, "finish", "run until the current function returns"},
      {"stepi", &TCliSession::CmdStep, 0, "stepi", "step one instruction, into calls"},
      {"nexti", &TCliSession::CmdStep, 0, "nexti", "step one instruction, over calls"},
      {"pause", &TCliSession::CmdPause, 0, "pause", "interrupt the running program (Ctrl-C does too)"},
      {"bt", &TCliSession::CmdBacktrace, 1, "bt [N|-N]",
       "the call stack of the current thread: the innermost frames, the innermost N, or the outermost N"},
      {"threads", &TCliSession::CmdThreads, 0, "threads", "the program's threads"},
      {"thread", &TCliSession::CmdThread, 1, "thread N", "make thread N the current thread"},
      {"frame", &TCliSession::CmdFrame, 1, "frame N", "show frame N of the current thread and select it"},
      {"kill", &TCliSession::CmdKill, 0, "kill", "end the program"},
      {"detach", &TCliSession::CmdDetach, 0, "detach", "let the program go on without the debugger"},
      {"quit", &TCliSession::CmdQuit, 0, "quit",
       "end the session (a launched program is killed, an attached one detached)"},
      {"x", &TCliSession::CmdExamine, 2, "x ADDRESS [COUNT]", "COUNT bytes of memory at ADDRESS (64), in hex and text"},
      {"write", &TCliSession::CmdWrite, 2, "write ADDRESS HEXBYTES", "write bytes (\"90c3\") to memory at ADDRESS"},
      {"disassemble", &TCliSession::CmdDisassemble, 2, "disassemble [ADDRESS] [COUNT]",
       "COUNT instructions (20) from ADDRESS, by default from the start of the current function"},
      {"info registers", &TCliSession::CmdInfoRegisters, 1, "info registers [general|fpu|sse|NAME]",
       "the registers of the current thread"},
      {"set register", &TCliSession::CmdSetRegister, 2, "set register NAME VALUE", "write a register"},
      {"break", &TCliSession::CmdBreak, AnyArguments, "break FILE:LINE | FUNCTION | *ADDRESS [if CONDITION]",
       "set a breakpoint (that stops only where CONDITION holds)"},
      {"tbreak", &TCliSession::CmdBreak, AnyArguments, "tbreak FILE:LINE | FUNCTION | *ADDRESS [if CONDITION]",
       "set a breakpoint deleted at its first stop"},
      {"watch", &TCliSession::CmdWatch, 3, "watch [-r|-a] ADDRESS [SIZE]",
       "stop where the memory is written (-r read, -a either); SIZE bytes, else an int"},
      {"delete", &TCliSession::CmdDelete, 1000, "delete [N...]", "delete breakpoints (all without N)"},
      {"enable", &TCliSession::CmdEnable, 1000, "enable N...", "enable breakpoints"},
      {"disable", &TCliSession::CmdEnable, 1000, "disable N...", "disable breakpoints"},
      {"info breakpoints", &TCliSession::CmdInfo, 0, "info breakpoints", "the breakpoints with their hit counts"},
      {"condition", &TCliSession::CmdCondition, AnyArguments, "condition N [CONDITION]",
       "make breakpoint N stop only where CONDITION holds (always without one)"},
      {"ignore", &TCliSession::CmdIgnore, 2, "ignore N COUNT", "let breakpoint N pass its next COUNT hits"},
      {"catch", &TCliSession::CmdCatch, 1, "catch throw|catch|raise",
       "stop where a C++ exception is thrown or caught, or a Pascal one raised"},
      {"uncatch", &TCliSession::CmdCatch, 1, "uncatch [throw|catch|raise]", "stop catching (all without a kind)"},
      {"list", &TCliSession::CmdList, 1, "list [FILE:]LINE | FUNCTION",
       "ten source lines around LINE or FUNCTION, the current line marked"},
      {"info line", &TCliSession::CmdInfoLine, 1, "info line FILE:LINE | *ADDRESS", "the code addresses of a source line"},
      {"jump", &TCliSession::CmdJump, 1, "jump LINE",
       "make LINE of the current function the next statement ('continue' runs on from there)"},
      {"print", &TCliSession::CmdPrint, AnyArguments, "print[/x|/d|/c] EXPRESSION", "the value of an expression"},
      {"print/x", &TCliSession::CmdPrint, AnyArguments, "print/x EXPRESSION", "the value in hexadecimal"},
      {"print/d", &TCliSession::CmdPrint, AnyArguments, "print/d EXPRESSION", "the value in decimal"},
      {"print/c", &TCliSession::CmdPrint, AnyArguments, "print/c EXPRESSION", "the value as a character"},
      {"set var", &TCliSession::CmdSetVar, AnyArguments, "set var EXPRESSION = VALUE", "assign a value to a variable"},
      {"info locals", &TCliSession::CmdInfoValues, 0, "info locals", "the current frame's local variables"},
      {"info args", &TCliSession::CmdInfoValues, 0, "info args", "the current frame's arguments"},
      {"inspect", &TCliSession::CmdInspect, AnyArguments, "inspect EXPRESSION [FROM COUNT]",
       "a value's children, one level"},
      {"display", &TCliSession::CmdDisplay, AnyArguments, "display EXPRESSION", "print an expression at every stop"},
      {"help", &TCliSession::CmdHelp, 0, "help", "this list"},
  };
  return Table;
}

bool TCliSession::Start() {
  if (!FOptions.LogFile.empty()) {
    namespace fs = std::filesystem;
    std::error_code Ignored;
    FLogDir = fs::absolute(FOptions.LogFile, Ignored).parent_path().string();
    fs::create_directories(FLogDir, Ignored);
    FLogsBefore = DebuggerLogs(FLogDir);
    // The debugger's transport reads these when it starts.
    ::setenv("GDB_DEBUG", "1", 1);
    ::setenv("GDB_OUTDIR", FLogDir.c_str(), 1);
  }
  try {
    if (FOptions.AttachPid != 0) {
      const TGDBLanguage Language = FOptions.Language.value_or(glC);
      const TGDBCPU CPU = FOptions.CPU.value_or(GuessCPU("/proc/" + std::to_string(FOptions.AttachPid) + "/exe"));
      FProcess = FOptions.DebuggerGiven
                     ? TGDBProcessManager::AttachProcess(FListener, FOptions.AttachPid, FOptions.Platform, Language,
                                                         CPU, FOptions.Debugger)
                     : TGDBProcessManager::AttachProcess(FListener, FOptions.AttachPid, FOptions.Profile,
                                                         FOptions.Platform, Language, CPU);
      // An attached program is stopped where the debugger caught it; the stop
      // reaches the listener a little later, and the first command needs it.
      FState = TRunState::Stopped;
      FOutput.Emit({{"event", "attached"}, {"pid", FOptions.AttachPid}},
                   "Attached to process " + std::to_string(FOptions.AttachPid));
      PumpUntilStopAfter(0, std::chrono::seconds(FOptions.WaitSeconds));
      return true;
    }
    // A program on this host is checked now: the debugger would only fail
    // once it is run, with a shell's exit code.
    if (FOptions.Profile == "local" && !IsExecutableFile(FOptions.Program)) {
      std::error_code Ignored;
      FOutput.Error("start", std::filesystem::exists(FOptions.Program, Ignored)
                                 ? FOptions.Program + " is not an executable program"
                                 : FOptions.Program + ": no such file");
      return false;
    }
    if (!FOptions.StdinFile.empty() && !std::filesystem::is_regular_file(FOptions.StdinFile)) {
      FOutput.Error("start", "the program's input " + FOptions.StdinFile + " is not a readable file");
      return false;
    }
    const TGDBLanguage Language = FOptions.Language.value_or(GuessLanguage(FOptions.Program));
    const TGDBCPU CPU = FOptions.CPU.value_or(GuessCPU(FOptions.Program));
    Load(Language, CPU);
    FOutput.Emit({{"event", "loaded"},
                  {"program", FOptions.Program},
                  {"language", LanguageName(Language)},
                  {"cpu", CPUName(CPU)}},
                 "Loaded " + FOptions.Program + " (" + LanguageName(Language) + ", " + CPUName(CPU) +
                     "). Type 'start' to stop at main, 'run' to run it, 'help' for the commands.");
    return true;
  } catch (const std::exception& Error) {
    FOutput.Error("start", Error.what());
    return false;
  }
}

void TCliSession::Load(TGDBLanguage Language, TGDBCPU CPU) {
  FLanguage = Language;
  FCPU = CPU;
  // A local program is named by its full path: the debugger need not share
  // the session's idea of the current directory.
  std::string Program = FOptions.Program;
  if (FOptions.Profile == "local")
    Program = std::filesystem::absolute(Program).lexically_normal().string();
  FProcess = TGDBProcessManager::CreateProcess(FListener, Program, ProgramArgumentLine(FOptions),
                                               std::filesystem::current_path().string(), FOptions.Profile,
                                               FOptions.Platform, Language, CPU, FOptions.Debugger);
  FState = TRunState::Loaded;
  FQuietConsole = true;
  FEnding = TEnding::None;
  FThreads.clear();
  FCurrentThread = -1;
  FCurrentFrame = 0;
  RestoreBreakpoints();
}

bool TCliSession::Execute(const std::string& Line) {
  std::vector<std::string> Words = SplitWords(Line.substr(0, Line.find('#')));
  if (Words.empty())
    return true;
  const std::string Name = Words.front();
  Words.erase(Words.begin());
  for (const TCommandEntry& Entry : Commands()) {
    // A command of two words ("info registers") takes the second as well.
    const std::string_view EntryName = Entry.Name;
    const size_t Blank = EntryName.find(' ');
    if (EntryName.substr(0, Blank) != Name ||
        (Blank != std::string_view::npos && (Words.empty() || EntryName.substr(Blank + 1) != Words.front())))
      continue;
    if (Blank != std::string_view::npos)
      Words.erase(Words.begin());
    if (Words.size() > Entry.MaxArguments) {
      FOutput.Error(Entry.Name, Entry.MaxArguments == 0 ? "'" + std::string(Entry.Name) + "' takes no arguments"
                                                        : "usage: " + std::string(Entry.Usage));
      return true;
    }
    try {
      (this->*Entry.Handler)(Entry.Name, Words);
    } catch (const std::exception& Error) {
      // The library raises at its boundary when the debugger fails.
      FOutput.Error(Entry.Name, Error.what());
    }
    return !FQuit;
  }
  FOutput.Error(Name, "unknown command '" + Name + "'; 'help' lists the commands");
  return true;
}

void TCliSession::End() {
  if (FProcess) {
    try {
      // Whatever ends the session, a program that was attached to goes on
      // and one that was launched ends with it; the library pauses a running
      // program first.
      if (FState == TRunState::Stopped || FState == TRunState::Running)
        EndProgram(FOptions.AttachPid != 0 ? TEnding::Detach : TEnding::Kill);
    } catch (const std::exception& Error) {
      FOutput.Error("quit", Error.what());
    }
    // Releasing the process stops the debugger and closes its log.
    FProcess = nullptr;
    ProcessPending();
  }
  FListener->Forget();
  KeepLog();
}

bool TCliSession::EndProgram(TEnding How) {
  // Both pause the program first, which the library skips while it still
  // counts the program as stopped: the resume must be under way.
  const auto Deadline = std::chrono::steady_clock::now() + EndWait;
  while (FState == TRunState::Running && !FResumeConfirmed && std::chrono::steady_clock::now() < Deadline)
    WaitAndProcess(PumpSlice);
  if (FState != TRunState::Running && FState != TRunState::Stopped)
    return true;
  const uint64_t Before = FStopCount;
  FEnding = How;
  if (How == TEnding::Detach)
    FProcess->Detach();
  else
    FProcess->Terminate();
  // Both calls return once done, and report the end unless they failed.
  ProcessPending();
  if (FStopCount == Before) {
    FEnding = TEnding::None;
    return false;
  }
  return true;
}

bool TCliSession::HandleSignals() {
  switch (TakeHostSignal()) {
  case THostSignal::Terminate:
    FTerminated = true;
    FQuit = true;
    return false;
  case THostSignal::Interrupt:
    if (FState == TRunState::Running)
      RequestPause();
    return true;
  case THostSignal::None:
  default:
    return true;
  }
}

void TCliSession::RequestPause() {
  FPausing = true;
  // The library ignores a pause until the debugger has said the program
  // runs: one asked for sooner is asked again then.
  FPauseWhenResumed = !FResumeConfirmed;
  try {
    FProcess->Pause();
  } catch (const std::exception& Error) {
    FPausing = false;
    FOutput.Error("pause", Error.what());
  }
}

void TCliSession::KeepLog() {
  if (FLogDir.empty())
    return;
  namespace fs = std::filesystem;
  std::string Newest;
  fs::file_time_type NewestTime{};
  for (const std::string& Log : DebuggerLogs(FLogDir)) {
    std::error_code Ignored;
    const fs::file_time_type Time = fs::last_write_time(Log, Ignored);
    if (FLogsBefore.contains(Log) || Ignored || (!Newest.empty() && Time < NewestTime))
      continue;
    Newest = Log;
    NewestTime = Time;
  }
  FLogDir.clear();
  if (Newest.empty()) {
    FOutput.Error("log", "the debugger wrote no log in " + fs::path(FOptions.LogFile).parent_path().string());
    return;
  }
  std::error_code Failure;
  fs::rename(Newest, FOptions.LogFile, Failure);
  if (Failure)
    FOutput.Error("log", "cannot rename " + Newest + " to " + FOptions.LogFile + ": " + Failure.message());
}

// --- Waiting -----------------------------------------------------------------

bool TCliSession::PumpUntilStopAfter(uint64_t Before, std::chrono::milliseconds Limit) {
  const auto Deadline = std::chrono::steady_clock::now() + Limit;
  while (FStopCount == Before) {
    if (!HandleSignals() || std::chrono::steady_clock::now() >= Deadline)
      return false;
    WaitAndProcess(PumpSlice);
  }
  // Events raised together with the stop (program output, thread exits)
  // are printed before the next command is read.
  ProcessPending();
  return true;
}

namespace {

std::string RunStateWord(TRunState State) {
  switch (State) {
  case TRunState::Loaded:
    return "loaded";
  case TRunState::Running:
    return "running";
  case TRunState::Stopped:
    return "stopped";
  case TRunState::Exited:
    return "exited";
  case TRunState::Detached:
    return "detached";
  case TRunState::Lost:
  default:
    return "lost";
  }
}

} // namespace

std::chrono::milliseconds TCliSession::WaitLimit() const {
  if (FOptions.Batch)
    return std::chrono::seconds(FOptions.WaitSeconds);
  return std::chrono::hours(24 * 365);
}

void TCliSession::ResumeAndWait(const std::string& Name, const std::function<void()>& Resume) {
  // Counted before resuming, so that a stop reported during the resuming
  // call itself is not missed.
  const uint64_t Before = FStopCount;
  // The library counts a program it saw stopped as stopped until the
  // debugger reports it running again; a launch it never counted so.
  if (FState == TRunState::Stopped)
    FResumeConfirmed = false;
  Resume();
  if (!FWaitForStops) {
    // The prompt comes back at once; the stop is printed when it comes.
    if (FStopCount == Before && Name != "kill" && FState != TRunState::Lost)
      FState = TRunState::Running;
    FOutput.Emit({{"answer", Name}, {"state", RunStateWord(FState)}}, "");
    return;
  }
  if (!PumpUntilStopAfter(Before, WaitLimit())) {
    if (FQuit)
      return;
    // Still running as far as anyone knows: 'pause' and 'kill' now apply.
    if (Name != "pause" && Name != "kill")
      FState = TRunState::Running;
    FOutput.Error(Name, "the program did not stop within " + std::to_string(FOptions.WaitSeconds) + " s; " +
                            "'pause' interrupts it");
    return;
  }
  FOutput.Emit({{"answer", Name}, {"state", RunStateWord(FState)}}, "");
}

// --- Commands ----------------------------------------------------------------

bool TCliSession::RequireStopped(const std::string& Name) {
  switch (FState) {
  case TRunState::Stopped:
    return true;
  case TRunState::Loaded:
    FOutput.Error(Name, "the program is not running; use 'run' or 'start'");
    return false;
  case TRunState::Running:
    FOutput.Error(Name, "the program is running");
    return false;
  case TRunState::Exited:
    FOutput.Error(Name, "the program has exited");
    return false;
  case TRunState::Detached:
    FOutput.Error(Name, "the program was detached");
    return false;
  case TRunState::Lost:
  default:
    FOutput.Error(Name, "the debugger is gone");
    return false;
  }
}

TIntfPtr<IGDBThread> TCliSession::StoppedThread(const std::string& Name) {
  if (!RequireStopped(Name))
    return nullptr;
  if (FCurrentThread < 0)
    FCurrentThread = FProcess->GetSuspendedThreadId();
  TIntfPtr<IGDBThread> Thread = FCurrentThread < 0 ? nullptr : FProcess->GetThread(FCurrentThread);
  if (!Thread)
    FOutput.Error(Name, "no current thread");
  return Thread;
}

bool TCliSession::RequireStartable(const std::string& Name) {
  if (FState == TRunState::Loaded)
    return true;
  if (FState == TRunState::Exited && FOptions.AttachPid == 0) {
    // The debugger goes with the program it ran: a new one runs it again.
    FProcess = nullptr;
    ProcessPending();
    Load(FLanguage, FCPU);
    return true;
  }
  FOutput.Error(Name, FState == TRunState::Stopped || FState == TRunState::Running
                          ? "the program is already running; 'kill' ends it"
                          : "the program cannot be started again (state: " + RunStateWord(FState) + ")");
  return false;
}

void TCliSession::CmdRun(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  if (!RequireStartable(Name))
    return;
  ResumeAndWait(Name, [this] { FProcess->Run(); });
}

void TCliSession::CmdStart(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  if (!RequireStartable(Name))
    return;
  if (!FProcess->SetRunToMainBreakpoint()) {
    FOutput.Error(Name, "the program has no main function; 'run' runs it");
    return;
  }
  // The debugger accepts a breakpoint on a main it has not found yet, in
  // case a library brings one: an end before any stop means there was none.
  FAwaitingMain = true;
  ResumeAndWait(Name, [this] { FProcess->Run(); });
}

void TCliSession::CmdContinue(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  if (!RequireStopped(Name))
    return;
  ResumeAndWait(Name, [this] { FProcess->Resume(); });
}

void TCliSession::CmdStep(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  ResumeAndWait(Name, [&] {
    if (Name == "next")
      Thread->StepOver();
    else if (Name == "step")
      Thread->StepInto();
    else if (Name == "finish")
      Thread->StepOut();
    else if (Name == "stepi")
      Thread->InstStepInto();
    else
      Thread->InstStepOver();
  });
}

void TCliSession::CmdPause(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  if (FState != TRunState::Running) {
    FOutput.Error(Name, "the program is not running");
    return;
  }
  ResumeAndWait(Name, [this] { RequestPause(); });
}

void TCliSession::CmdBacktrace(const std::string& Name, const std::vector<std::string>& Arguments) {
  // "bt N": the innermost N frames; "bt -N": the outermost N.
  Integer Wanted = DefaultFrames;
  bool Outermost = false;
  if (!Arguments.empty()) {
    Outermost = Arguments[0].starts_with('-');
    if (!ParseNumber(Arguments[0].substr(Outermost ? 1 : 0), Wanted) || Wanted == 0) {
      FOutput.Error(Name, "usage: bt [N|-N]");
      return;
    }
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  const Integer Count = Thread->GetCallCount();
  const Integer First = Outermost ? std::max<Integer>(1, Count - Wanted + 1) : 1;
  const Integer Last = Outermost ? Count : std::min(Count, Wanted);
  nlohmann::json Frames = nlohmann::json::array();
  std::string Text;
  for (Integer Index = First; Index <= Last; ++Index) {
    const std::string Header = Thread->GetCallHeader(Index);
    const TGDBLocation Location = Thread->GetCallLocation(Index);
    nlohmann::json Frame = {{"level", Index - 1}, {"header", Header}};
    Frame.update(LocationJson(Location));
    Frames.push_back(Frame);
    Text += (Index - 1 == FCurrentFrame ? "* " : "  ") + FrameText(Index - 1, Header, Location) + "\n";
  }
  const Integer Hidden = Count - (Last - First + 1);
  if (Count <= 0)
    Text = "No stack.";
  else if (Hidden > 0)
    Text += "(" + std::to_string(Hidden) + (Outermost ? " inner" : " more") +
            " frames; 'bt N' shows the innermost N, 'bt -N' the outermost N, 'frame N' any one)\n";
  FOutput.Emit({{"answer", Name}, {"thread", FCurrentThread}, {"frames", Frames}, {"total", Count}}, Text);
}

void TCliSession::CmdThreads(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  if (FState == TRunState::Running) {
    // A running program's threads are not asked where they are.
    nlohmann::json Threads = nlohmann::json::array();
    std::string Text;
    for (const Integer Id : FThreads) {
      Threads.push_back({{"id", Id}, {"state", "running"}, {"current", Id == FCurrentThread}});
      Text += (Id == FCurrentThread ? "* " : "  ") + std::to_string(Id) + "  running\n";
    }
    FOutput.Emit({{"answer", Name}, {"current", FCurrentThread}, {"threads", Threads}},
                 Threads.empty() ? "No threads known yet." : Text);
    return;
  }
  if (!RequireStopped(Name))
    return;
  // The interfaces list no threads: the session knows them from the events
  // and from the stops.
  std::set<Integer> Ids = FThreads;
  if (const Integer Suspended = FProcess->GetSuspendedThreadId(); Suspended >= 0)
    Ids.insert(Suspended);
  nlohmann::json Threads = nlohmann::json::array();
  std::string Text;
  for (const Integer Id : Ids) {
    TIntfPtr<IGDBThread> Thread = FProcess->GetThread(Id);
    if (!Thread || Thread->GetId() != Id)
      continue;
    const TGDBLocation Location = Thread->GetCurrentLocation();
    nlohmann::json Entry = {{"id", Id},
                            {"name", Thread->GetName()},
                            {"state", ThreadStateWord(Thread->GetState())},
                            {"current", Id == FCurrentThread}};
    Entry.update(LocationJson(Location));
    Threads.push_back(Entry);
    Text += (Id == FCurrentThread ? "* " : "  ") + std::to_string(Id) + "  " + Thread->GetName() + "  " +
            ThreadStateWord(Thread->GetState()) + "  " + LocationText(Location) + "\n";
  }
  if (Threads.empty())
    Text = "No threads.";
  FOutput.Emit({{"answer", Name}, {"current", FCurrentThread}, {"threads", Threads}}, Text);
}

void TCliSession::CmdThread(const std::string& Name, const std::vector<std::string>& Arguments) {
  Integer Id = 0;
  if (Arguments.size() != 1 || !ParseNumber(Arguments[0], Id)) {
    FOutput.Error(Name, "usage: thread N");
    return;
  }
  if (!RequireStopped(Name))
    return;
  TIntfPtr<IGDBThread> Thread = FProcess->GetThread(Id);
  if (!Thread || Thread->GetId() != Id) {
    FOutput.Error(Name, "no thread " + std::to_string(Id));
    return;
  }
  FCurrentThread = Id;
  FCurrentFrame = 0;
  const TGDBLocation Location = Thread->GetCurrentLocation();
  nlohmann::json Answer = {{"answer", Name}, {"thread", Id}, {"name", Thread->GetName()}};
  Answer.update(LocationJson(Location));
  std::string Text = "Thread " + std::to_string(Id) + " (" + Thread->GetName() + ") at " + LocationText(Location);
  if (const std::string Source = SourceText(Location); !Source.empty())
    Text += "\n" + Source;
  FOutput.Emit(Answer, Text);
}

void TCliSession::CmdFrame(const std::string& Name, const std::vector<std::string>& Arguments) {
  Integer Level = 0;
  if (Arguments.size() != 1 || !ParseNumber(Arguments[0], Level)) {
    FOutput.Error(Name, "usage: frame N (0 is the innermost frame)");
    return;
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  if (Level >= Thread->GetCallCount()) {
    FOutput.Error(Name, "no frame " + std::to_string(Level));
    return;
  }
  // The interfaces take the frame with each question that needs one; the
  // session remembers the choice for the commands that will ask them.
  FCurrentFrame = Level;
  const std::string Header = Thread->GetCallHeader(Level + 1);
  const TGDBLocation Location = Thread->GetCallLocation(Level + 1);
  nlohmann::json Answer = {{"answer", Name}, {"thread", FCurrentThread}, {"level", Level}, {"header", Header}};
  Answer.update(LocationJson(Location));
  std::string Text = FrameText(Level, Header, Location);
  if (const std::string Source = SourceText(Location); !Source.empty())
    Text += "\n" + Source;
  FOutput.Emit(Answer, Text);
}

void TCliSession::CmdKill(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  if (FState != TRunState::Stopped && FState != TRunState::Running) {
    FOutput.Error(Name, "the program is not running");
    return;
  }
  if (!EndProgram(TEnding::Kill))
    FOutput.Error(Name, "the program did not end");
  else
    FOutput.Emit({{"answer", Name}, {"state", RunStateWord(FState)}}, "");
}

void TCliSession::CmdDetach(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  if (FState != TRunState::Stopped && FState != TRunState::Running) {
    FOutput.Error(Name, "the program is not running");
    return;
  }
  if (!EndProgram(TEnding::Detach))
    FOutput.Error(Name, "the debugger could not detach from the program");
  else
    FOutput.Emit({{"answer", Name}, {"state", RunStateWord(FState)}}, "");
}

void TCliSession::CmdQuit(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  FQuit = true;
  FOutput.Emit({{"answer", Name}}, "");
}

void TCliSession::CmdHelp(const std::string& Name, const std::vector<std::string>& /*Arguments*/) {
  nlohmann::json List = nlohmann::json::array();
  std::string Text = "Commands:\n";
  for (const TCommandEntry& Entry : Commands()) {
    List.push_back({{"name", Entry.Name}, {"usage", Entry.Usage}, {"help", Entry.Help}});
    std::string Usage = Entry.Usage;
    Usage.resize(std::max<size_t>(Usage.size(), 10), ' ');
    Text += "  " + Usage + "  " + Entry.Help + "\n";
  }
  Text += "While the program runs: pause (or Ctrl-C), kill, detach, threads, quit.\n"
          "The program's input is empty unless midebug was started with --stdin FILE or --tty DEVICE.\n";
  FOutput.Emit({{"answer", Name}, {"commands", List}}, Text);
}

// --- Locations ---------------------------------------------------------------

nlohmann::json TCliSession::LocationJson(const TGDBLocation& Location) const {
  nlohmann::json Fields = nlohmann::json::object();
  if (!Location.Source.empty())
    Fields["file"] = Location.Source;
  if (Location.Line > 0)
    Fields["line"] = Location.Line;
  if (Location.Address != 0)
    Fields["address"] = HexAddress(Location.Address);
  return Fields;
}

std::string TCliSession::LocationText(const TGDBLocation& Location) const {
  const std::string Address = Location.Address != 0 ? HexAddress(Location.Address) : "";
  if (Location.Source.empty())
    return Address.empty() ? "an unknown place" : Address;
  std::string Text = Location.Source;
  if (Location.Line > 0)
    Text += ":" + std::to_string(Location.Line);
  if (!Address.empty())
    Text += " (" + Address + ")";
  return Text;
}

namespace {

/// Drops the ", a@entry=V" that GDB adds beside "a=V" when the argument
/// still has the value it entered with.
std::string DropUnchangedEntryValues(std::string Call) {
  static const std::string Marker = "@entry=";
  for (size_t At = Call.find(Marker); At != std::string::npos; At = Call.find(Marker, At + 1)) {
    const size_t NameStart = Call.rfind(", ", At);
    if (NameStart == std::string::npos)
      continue;
    const std::string ArgName = Call.substr(NameStart + 2, At - NameStart - 2);
    const size_t ValueStart = At + Marker.size();
    for (const std::string& Before : {"(" + ArgName + "=", ", " + ArgName + "="}) {
      const size_t Plain = Call.find(Before);
      if (Plain == std::string::npos || Plain >= NameStart)
        continue;
      const size_t PlainValue = Plain + Before.size();
      const std::string Value = Call.substr(PlainValue, NameStart - PlainValue);
      if (Call.compare(ValueStart, Value.size(), Value) != 0)
        continue;
      const size_t After = ValueStart + Value.size();
      if (After == Call.size() || Call[After] == ',' || Call[After] == ')') {
        Call.erase(NameStart, After - NameStart);
        At = NameStart;
        break;
      }
    }
  }
  return Call;
}

} // namespace

std::string TCliSession::FrameText(Integer Level, const std::string& Header, const TGDBLocation& Location) const {
  // The library writes ":ADDRESS name(arguments)"; GDB users read
  // "0xADDRESS in name (arguments)", the address left out for the innermost
  // frame at a source line.
  std::string Call = Header;
  if (Call.starts_with(':')) {
    const size_t Blank = Call.find(' ');
    Call = Blank == std::string::npos ? "" : Call.substr(Blank + 1);
  }
  if (const size_t Open = Call.find('('); Open != std::string::npos && Open > 0 && Call[Open - 1] != ' ')
    Call.insert(Open, " ");
  Call = DropUnchangedEntryValues(Call);
  if (Call.empty() || Call == ";")
    Call = "??";
  std::string Text = Level >= 0 ? "#" + std::to_string(Level) + "  " : "";
  if (Location.Address != 0 && (Level > 0 || Location.Source.empty() || Location.Line <= 0))
    Text += HexAddress(Location.Address, true) + " in ";
  Text += Call;
  if (!Location.Source.empty()) {
    Text += " at " + std::filesystem::path(Location.Source).filename().string();
    if (Location.Line > 0)
      Text += ":" + std::to_string(Location.Line);
  }
  return Text;
}

std::string TCliSession::SourceText(const TGDBLocation& Location) {
  const std::string Line = FSources.Line(Location.Source, Location.Line);
  if (Line.empty())
    return {};
  return std::to_string(Location.Line) + "\t" + Line;
}

} // namespace midebug::cli
