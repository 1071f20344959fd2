#include "mi/gdboutput.h"

#include "mi/gdbcommand.h"
#include "platform/hexdigits.h"

#include <array>
#include <utility>

namespace midebug {

namespace {

/// Darwin/BSD signal numbers, which LLDB reports without names.
constexpr std::array<std::string_view, 31> SignalNames = {
    "SIGHUP",  "SIGINT",  "SIGQUIT", "SIGILL",  "SIGTRAP", "SIGABRT",   "SIGEMT",  "SIGFPE",
    "SIGKILL", "SIGBUS",  "SIGSEGV", "SIGSYS",  "SIGPIPE", "SIGALRM",   "SIGTERM", "SIGURG",
    "SIGSTOP", "SIGTSTP", "SIGCONT", "SIGCHLD", "SIGTTIN", "SIGTTOU",   "SIGIO",   "SIGXCPU",
    "SIGXFSZ", "SIGVTALRM", "SIGPROF", "SIGWINCH", "SIGINFO", "SIGUSR1", "SIGUSR2",
};

/// LLDB's table of signal handling, which the system asks for itself.
constexpr std::string_view LLDBSignalTableHeader =
    "NAME         PASS   STOP   NOTIFY\\n===========  =====  =====  ======\\n";
constexpr std::string_view LLDBMaxChildrenSetting = "target.max-children-count (int) = ";
constexpr std::string_view LanguageAnnouncement = "Current language:  auto; currently ";
constexpr std::string_view WindowsDebugStringPrefix = "ODS: ";
constexpr std::string_view LLDBNotInCommandFactory = " not in Command Factory";
constexpr std::string_view LLDBProcessRunning =
    "error: Process is running.  Use 'process interrupt' to pause execution";
constexpr std::string_view AttachFailed = "error: attach failed";
constexpr std::string_view LLDBProcessReady = "Process ready to launch\n";

std::string ReplaceAll(std::string Text, std::string_view From, std::string_view To) {
  size_t At = 0;
  while ((At = Text.find(From, At)) != std::string::npos) {
    Text.replace(At, From.size(), To);
    At += To.size();
  }
  return Text;
}

/// The bytes a program wrote, from lldb-mi's target-stream text (its \"
/// already undone by the scanner). lldb-mi writes a byte above 0x7f as a
/// sign-extended \xffffffc3; the terminal LLDB gives the program ends its
/// lines with \r\n, which GDB's program output and the IDE write as \n.
std::string DecodeLLDBProgramOutput(std::string_view Text) {
  std::string Bytes;
  Bytes.reserve(Text.size());
  for (size_t I = 0; I < Text.size(); ++I) {
    if (Text[I] != '\\' || I + 1 >= Text.size()) {
      Bytes += Text[I];
      continue;
    }
    const char Escaped = Text[++I];
    if (Escaped == 'x') {
      // Only the last two digits name the byte.
      unsigned Value = 0;
      while (I + 1 < Text.size() && HexDigitValue(Text[I + 1]) >= 0)
        Value = Value * 16 + static_cast<unsigned>(HexDigitValue(Text[++I]));
      Bytes += static_cast<char>(Value & 0xff);
      continue;
    }
    const std::string_view Letters = "nrtabfve", Controls = "\n\r\t\a\b\f\v\x1b";
    const size_t Letter = Letters.find(Escaped);
    Bytes += Letter == std::string_view::npos ? Escaped : Controls[Letter];
  }
  return ReplaceAll(std::move(Bytes), "\r\n", "\n");
}

/// Console text with the escape \n as a line break (GDB writes its console
/// lines in pieces; a reader joins them at the breaks) and \t as three blanks. An
/// escaped backslash is kept as written and does not start an escape, so a
/// path such as "C:\\new" is not broken.
std::string FlattenConsoleEscapes(std::string_view Text) {
  std::string Flat;
  Flat.reserve(Text.size());
  for (size_t I = 0; I < Text.size(); ++I) {
    if (Text[I] != '\\' || I + 1 >= Text.size()) {
      Flat += Text[I];
      continue;
    }
    const char Escaped = Text[++I];
    if (Escaped == 'n')
      Flat += '\n';
    else if (Escaped == 't')
      Flat += "   ";
    else {
      Flat += '\\';
      Flat += Escaped;
    }
  }
  return Flat;
}

/// The text from From to the first line break, without blanks around it.
std::string_view FirstLineTrimmed(std::string_view Text, size_t From) {
  const std::string_view Rest = Text.substr(From);
  return TrimBlanks(Rest.substr(0, Rest.find('\n')));
}

/// Drops one trailing \n and then one trailing \r escape of a target-stream
/// text longer than two characters.
std::string_view StripTrailingEscapes(std::string_view Text) {
  if (Text.size() > 2 && Text.ends_with("\\n"))
    Text.remove_suffix(2);
  if (Text.size() > 2 && Text.ends_with("\\r"))
    Text.remove_suffix(2);
  return Text;
}

/// The file-name part of a path: what follows its last backslash or colon.
std::string_view FileNamePart(std::string_view Path) {
  const size_t Separator = Path.find_last_of("\\/:");
  return Separator == std::string_view::npos ? Path : Path.substr(Separator + 1);
}

std::string Between(std::string_view Text, size_t From, size_t To) {
  return From <= To && To <= Text.size() ? std::string(Text.substr(From, To - From)) : std::string();
}

} // namespace

std::string SignalName(std::string_view Text) {
  const Integer Number = MIStrToIntDef(Text, 0);
  if (Number >= 1 && Number <= static_cast<Integer>(SignalNames.size()))
    return std::string(SignalNames[static_cast<size_t>(Number - 1)]);
  return std::string(Text);
}

Integer ReadExitCode(std::string_view Text, Integer Default) {
  const bool Octal = Text.size() > 1 && Text.size() <= 12 && Text.front() == '0' &&
                     Text.find_first_not_of("01234567") == std::string_view::npos;
  if (!Octal)
    return MIStrToIntDef(Text, Default);
  uint64_t Code = 0;
  for (char Digit : Text)
    Code = Code * 8 + static_cast<uint64_t>(Digit - '0');
  return Code > 0x7fffffff ? Default : static_cast<Integer>(Code);
}

void ProcessGDBOutput(const std::string& ReplyBlock, IGDBInternalProcess& Process) {
  TGDBOutputParser Parser(ReplyBlock, Process);
  Parser.Run();
}

TGDBOutputParser::TGDBOutputParser(std::string_view Block, IGDBInternalProcess& Process)
    : FScanner(Block), FProcess(Process), FEndOfLineMarker(Process.GetEndOfLineMarker()),
      FIsLLDB(Process.IsLLDB()) {}

void TGDBOutputParser::Run() {
  while (!FScanner.AtEnd()) {
    const size_t RecordStart = FScanner.Pos();
    FToken = std::string(FScanner.ReadToken());
    bool Consumed = false;
    switch (FScanner.Char()) {
    case '^':
      Consumed = ProcessResultRecord();
      break;
    case '*':
      Consumed = ProcessExecAsyncRecord();
      break;
    case '+':
      Consumed = ProcessStatusAsyncRecord();
      break;
    case '=':
      Consumed = ProcessNotifyRecord();
      break;
    case '~':
      Consumed = ProcessConsoleStream();
      break;
    case '@':
      Consumed = ProcessTargetStream();
      break;
    case '&':
      Consumed = ProcessLogStream();
      break;
    default:
      Consumed = ProcessNonMIText();
      break;
    }
    if (!Consumed)
      FScanner.SkipLine();
    // Every record moves the cursor; this only guards against a handler that
    // did not, so that no input can hold the loop.
    if (FScanner.Pos() == RecordStart)
      FScanner.SkipLine();
  }
}

void TGDBOutputParser::Log(TGDBEvent Event, const std::string& Data) {
  FProcess.NotifyLogEvent(CreateGDBLogEvent(Event, Data, -1));
}

void TGDBOutputParser::CompleteWaitObject(TGDBResult* WaitObject) {
  if (WaitObject)
    WaitObject->Complete();
}

// --- Result records -------------------------------------------------------

bool TGDBOutputParser::ProcessResultRecord() {
  FScanner.NextChar();
  const std::string Class(FScanner.ReadIdentifier());
  // The object leaves the table here, whatever the class: a second result
  // record for the same token (GDB answers "-exec-continue" with ^running and
  // may later add ^error) finds nobody waiting.
  TGDBResult* WaitObject = FToken.empty() ? nullptr : FProcess.RemoveWaitObject(FToken);

  const std::string CLIError = std::exchange(FCLIError, std::string());
  if (Class == "done") {
    if (FScanner.Char() == ',' && !FScanner.AtEnd()) {
      FScanner.NextChar();
      if (WaitObject)
        WaitObject->FError = !DecodeResult(*WaitObject, FScanner, FIsLLDB);
    } else if (WaitObject && !CLIError.empty() &&
               (WaitObject->FCommand == ctCLRegisterWrite || WaitObject->FCommand == ctCLMemoryWrite)) {
      WaitObject->FError = true;
      WaitObject->SetErrorMessage(CLIError);
    }
  } else if (Class == "running") {
    FProcess.NotifyProcessResumed();
  } else if (Class == "connected" || Class == "exit") {
    // Nothing to read.
  } else if (Class == "error") {
    std::string Message;
    if (FScanner.Char() == ',' && !FScanner.AtEnd()) {
      FScanner.NextChar();
      Message = FScanner.FindValue("msg");
      if (Message.empty())
        Message = FScanner.FindValue("message");
    }
    if (WaitObject && (WaitObject->FCommand == ctStackListFrames || WaitObject->FCommand == ctStackListArguments)) {
      // Frames the debugger could still list before it failed are kept.
      WaitObject->FError = !DecodeResult(*WaitObject, FScanner, FIsLLDB);
    } else if (WaitObject) {
      WaitObject->FError = true;
      WaitObject->SetErrorMessage(Message);
    } else {
      ProcessErrorWithoutWaiter(Message);
    }
  } else {
    const std::string Rest(FScanner.ReadRestOfLine(FEndOfLineMarker));
    Log(etUnknown, "^" + Class + Rest);
    // A reply the parser cannot read is still the reply: fail the request now
    // rather than leave its requester waiting for a time-out.
    if (WaitObject) {
      WaitObject->FError = true;
      std::string Record = "^" + Class + Rest;
      while (!Record.empty() && (Record.back() == '\n' || Record.back() == '\r'))
        Record.pop_back();
      WaitObject->SetErrorMessage(Record);
      CompleteWaitObject(WaitObject);
    }
    return true;
  }
  CompleteWaitObject(WaitObject);
  return false;
}

void TGDBOutputParser::ProcessErrorWithoutWaiter(const std::string& Message) {
  if (FIsLLDB && Message.find(LLDBNotInCommandFactory) != std::string::npos) {
    Log(etError, Message);
    return;
  }
  if (FIsLLDB && Message.find(LLDBProcessRunning) != std::string::npos) {
    FProcess.NotifyProcessResumed();
    return;
  }
  if (!Message.empty())
    Log(etError, Message);
  // An error answering a request nobody waits for (an asynchronous run
  // command) is a fault of the debugged process, or its exit when the
  // request launched it.
  if (IsProcessLaunchCommand(FToken))
    FProcess.NotifyProcessExited(-1, Message);
  else if (IsRunControlCommand(FToken))
    FProcess.NotifyCommandRefused(Message);
  else
    FProcess.NotifyProcessFaulted(Message);
}

// --- Asynchronous records -------------------------------------------------

bool TGDBOutputParser::ProcessExecAsyncRecord() {
  FScanner.NextChar();
  const std::string Class(FScanner.ReadIdentifier());
  if (Class == "stopped") {
    ProcessStopRecord();
    return false;
  }
  if (Class == "running")
    return false;
  const std::string Rest(FScanner.ReadRestOfLine(FEndOfLineMarker));
  Log(etUnknown, "*" + Class + Rest);
  return true;
}

bool TGDBOutputParser::ProcessStatusAsyncRecord() {
  FScanner.NextChar();
  const std::string Rest(FScanner.ReadRestOfLine(FEndOfLineMarker));
  Log(etUnknown, "+" + Rest);
  return true;
}

void TGDBOutputParser::ProcessStopRecord() {
  if (FScanner.Char() != ',' || FScanner.AtEnd()) {
    FProcess.NotifyProcessSuspended(DummyLocation, -1, tsrUnknown);
    return;
  }
  FScanner.NextChar();
  std::string Reason(FScanner.FindValue("reason"));
  // GDB writes the announcement of a signal it passed on without stopping
  // into the record of the next real stop, ahead of that stop's own reason.
  if (Reason == "signal-received") {
    const std::string_view Later = FScanner.FindValue("reason");
    if (!Later.empty())
      Reason = Later;
  }
  Integer ThreadId = -1;

  if (Reason == "breakpoint-hit") {
    ParseStopFrame(FScanner, FLocation, ThreadId);
    const Integer Breakpoint = FScanner.FindInteger("bkptno", -1);
    if (!FProcess.NotifyBreakpointOccurred(Breakpoint, FLocation, ThreadId))
      FProcess.NotifyProcessSuspended(FLocation, ThreadId, tsrAtBreakpoint);
  } else if (Reason == "watchpoint-trigger" || Reason == "read-watchpoint-trigger" ||
             Reason == "access-watchpoint-trigger") {
    // The watchpoint's number lets its listener hear the hit like any
    // breakpoint's; one nobody registered is a plain stop.
    Integer Watchpoint = -1;
    for (const std::string_view Name : {"wpt", "hw-rwpt", "hw-awpt"}) {
      const std::string_view Tuple = FScanner.FindValue(Name);
      if (Tuple.empty())
        continue;
      TMIScanner::TNestedScan InTuple(FScanner, Tuple);
      Watchpoint = FScanner.FindInteger("number", -1);
      break;
    }
    ParseStopFrame(FScanner, FLocation, ThreadId);
    if (!FProcess.NotifyBreakpointOccurred(Watchpoint, FLocation, ThreadId))
      FProcess.NotifyProcessSuspended(FLocation, ThreadId, tsrAtBreakpoint);
  } else if (Reason == "function-finished" || Reason == "location-reached" || Reason == "end-stepping-range") {
    ParseStopFrame(FScanner, FLocation, ThreadId);
    if (Reason == "function-finished")
      FProcess.NotifyReturnValue(std::string(FScanner.FindValue("return-value")));
    FProcess.NotifyProcessSuspended(FLocation, ThreadId, tsrStepDone);
  } else if (Reason == "watchpoint-scope") {
    FProcess.NotifyWatchpointOutOfScope();
  } else if (Reason == "exited-signalled") {
    FProcess.NotifyProcessExited(0, std::string(FScanner.FindValue("signal-name")));
  } else if (Reason == "exited") {
    FProcess.NotifyProcessExited(ReadExitCode(FScanner.FindValue("exit-code"), -1), "");
  } else if (Reason == "exited-normally") {
    if (!FProcess.IsDying())
      FProcess.NotifyProcessExited(0, "");
  } else if (Reason == "signal-received") {
    FSignal.Name = std::string(FScanner.FindValue("signal-name"));
    FSignal.Desc = std::string(FScanner.FindValue("signal-meaning"));
    ParseStopFrame(FScanner, FSignal.Location, ThreadId);
    if (!FIsLLDB) {
      FProcess.NotifySignalReceived(FSignal, ThreadId);
      return;
    }
    if (FSignal.Name.empty())
      FSignal.Name = SignalName(FScanner.FindValue("signal"));
    if (FSignal.Name == "SIGKILL")
      FProcess.NotifyProcessExited(0, FSignal.Name);
    else
      FProcess.NotifySignalReceived(FSignal, ThreadId);
  } else if (Reason == "exception-received") {
    ParseExceptionReceived();
    FProcess.NotifyExceptionRaised(FException, FScanner.FindInteger("thread-id", -1));
  } else if (Reason == "exception-raised") {
    ParseExceptionRaised();
    FProcess.NotifyExceptionRaised(FException, FScanner.FindInteger("thread-id", -1));
  } else {
    ParseLocation(FScanner, FLocation);
    FProcess.NotifyProcessSuspended(FLocation, FScanner.FindInteger("thread-id", -1), tsrUnknown);
  }
}

void TGDBOutputParser::ParseExceptionRaised() {
  FException.Kind = FScanner.FindInteger("kind", 0);
  FException.EObject = FScanner.FindUInt64("object", 0);
  FException.Name = std::string(FScanner.FindValue("name"));
  FException.Location.Address = FScanner.FindUInt64("addr", 0);
  if (FException.Location.Address == 0)
    FException.Location.Address = FScanner.FindUInt64("handler", 0);
}

void TGDBOutputParser::ParseExceptionReceived() {
  // Some debuggers report a language exception only as text, e.g.
  // "Exception throw 'EMyError' object 0x1234 encountered at address 0x5678".
  FException.Kind = 16;
  FException.EObject = 0;
  FException.Name = std::string(FScanner.FindValue("name"));
  FException.Location.Address = FScanner.FindUInt64("addr", 0);
  FException.Desc = std::string(FScanner.FindValue("exception"));
  if (FException.Desc.empty())
    return;
  const std::string Text = FException.Desc;
  constexpr std::string_view Throw = "Exception throw '";
  constexpr std::string_view Object = "' object ";
  constexpr std::string_view EncounteredAt = " encountered at";
  constexpr std::string_view Catch = "Exception catch ";
  constexpr std::string_view ExceptionWord = "Exception ";
  constexpr std::string_view AtAddress = "at address ";

  if (FException.Name.empty()) {
    const size_t ThrowAt = Text.find(Throw);
    if (ThrowAt != std::string::npos) {
      const size_t ObjectAt = Text.find(Object);
      if (ObjectAt != std::string::npos) {
        FException.Name = Between(Text, ThrowAt + Throw.size(), ObjectAt);
        const size_t EncounteredAtPos = Text.find(EncounteredAt);
        if (EncounteredAtPos != std::string::npos) {
          FException.EObject = MIStrToUInt64Def(Between(Text, ObjectAt + Object.size() - 1, EncounteredAtPos), 0);
          FException.Desc.clear();
        }
      }
    } else if (Text.find(Catch) != std::string::npos) {
      FException.Kind = 1;
    } else {
      const size_t ExceptionAt = Text.find(ExceptionWord);
      const size_t EncounteredAtPos = Text.find(EncounteredAt);
      if (ExceptionAt != std::string::npos && EncounteredAtPos != std::string::npos)
        FException.Name = Between(Text, ExceptionAt + ExceptionWord.size(), EncounteredAtPos);
    }
  }
  const size_t AddressAt = Text.find(AtAddress);
  if (FException.Location.Address == 0 && AddressAt != std::string::npos)
    FException.Location.Address = MIStrToUInt64Def(std::string_view(Text).substr(AddressAt + AtAddress.size()), 0);
  if (FException.Name == "EThreadNameException" && FException.Desc.starts_with("Type=$1000,Name=")) {
    // The consumer reads the thread name between double quotes.
    FException.Desc = ReplaceAll(FException.Desc, "Name=", "\"Name=");
    FException.Desc = ReplaceAll(FException.Desc, ",ThreadID=", "\",ThreadID=");
  }
}

bool TGDBOutputParser::ProcessNotifyRecord() {
  FScanner.NextChar();
  const std::string Class(FScanner.ReadIdentifier());
  if (Class == "dyld-load-address-was-not-resolved") {
    FProcess.NotifyProcessRestart();
    return false;
  }
  const bool HasResults = FScanner.Char() == ',' && !FScanner.AtEnd();
  auto Results = [&] {
    if (!HasResults)
      return false;
    FScanner.NextChar();
    return true;
  };

  if (Class == "library-loaded") {
    if (Results() && ParseLibraryRecord(true))
      FProcess.NotifyModuleLoaded(FModule);
  } else if (Class == "library-unloaded") {
    if (Results() && ParseLibraryRecord(false))
      FProcess.NotifyModuleUnLoaded(FModule);
  } else if (Class == "shlibs-added") {
    if (Results() && ParseSharedLibraryInfo())
      FProcess.NotifyModuleLoaded(FModule);
  } else if (Class == "breakpoint-modified") {
    // GDB reports every hit this way too, and a pending breakpoint that
    // resolved; the process sorts out what changed.
    Integer Breakpoint = -1;
    if (FIsLLDB && Results() && ParseBreakpointTuple(Breakpoint))
      FProcess.NotifyBreakpointModified(Breakpoint, FLocation);
    else if (!FIsLLDB && Results()) {
      TGDBLocationArray Locations;
      const std::string_view Bkpt = FScanner.FindValue("bkpt");
      if (ReadGDBBreakpoint(FScanner, Bkpt, Breakpoint, Locations))
        FProcess.NotifyBreakpointLocations(Breakpoint, Locations);
    }
  } else if (Class == "thread-group-created") {
    // GDB's group ids ("i1") are not process ids and read as 0.
    if (Results()) {
      const Integer Pid = FScanner.FindInteger("id", 0);
      if (Pid != 0)
        FProcess.NotifyProcessPidCreated(Pid);
    }
  } else if (Class == "thread-group-started") {
    if (Results()) {
      const Integer Pid = FScanner.FindInteger("pid", 0);
      if (Pid != 0)
        FProcess.NotifyProcessPidCreated(Pid);
    }
  } else if (Class == "thread-created") {
    if (Results()) {
      const Integer Id = FScanner.FindInteger("id", -1);
      const Integer OsId = FScanner.FindInteger("osid", Id);
      if (Id != -1)
        FProcess.NotifyThreadCreated(Id, OsId);
    }
  } else if (Class == "thread-exited") {
    if (Results()) {
      const Integer Id = FScanner.FindInteger("id", -1);
      if (Id != -1)
        FProcess.NotifyThreadExited(Id);
    }
  } else if (Class == "thread-selected") {
    if (Results()) {
      const Integer Id = FScanner.FindInteger("id", -1);
      if (Id != -1)
        FProcess.NotifyThreadSelected(Id);
    }
  } else if (Class == "shlib-state-modified" || Class == "dyld-load-address-was-resolved" ||
             Class == "breakpoint-created" || Class == "thread-group-added" || Class == "thread-group-exited" ||
             Class == "cmd-param-changed" || Class == "memory-changed") {
    // Nothing the process tracks; a changed setting is the echo of one the
    // process made itself ("set args"), changed memory the echo of a write.
  } else {
    const std::string Rest(FScanner.ReadRestOfLine(FEndOfLineMarker));
    if (Rest == "\n" || (FIsLLDB && Rest.starts_with("==")))
      return true;
    Log(etUnknown, "=" + Class + Rest);
    return true;
  }
  return false;
}

bool TGDBOutputParser::ParseLibraryRecord(bool Loaded) {
  const bool IsWindows = FProcess.IsWindows();
  // A Linux target's paths stay as they are: turning their "/" into "\"
  // would name files that do not exist.
  const bool PosixPaths = FProcess.IsLinux() && !IsWindows;
  FModule.Id = FProcess.GetModuleId(std::string(FScanner.FindValue("id")));
  const std::string TargetName = PosixPaths ? std::string(FScanner.FindValue("target-name"))
                                            : ReplaceAll(std::string(FScanner.FindValue("target-name")), "/", "\\");
  FModule.Name = std::string(FileNamePart(TargetName));
  if (!Loaded)
    return true;

  // The host name still holds the c-string's escapes: a Windows path arrives
  // with doubled backslashes.
  const std::string HostName(FScanner.FindValue("host-name"));
  FModule.Path = IsWindows    ? ReplaceAll(HostName, "\\\\", "\\")
                 : PosixPaths ? HostName
                              : ReplaceAll(HostName, "/", "\\");
  if (FScanner.FindValue("symbols-loaded") == "1") {
    FModule.SymPath = FIsLLDB ? std::string(FScanner.FindValue("symbols-path")) : FModule.Path;
    if (IsWindows || FProcess.IsAndroid64())
      FModule.SymPath = ReplaceAll(FModule.SymPath, "\\\\", "\\");
  } else {
    FModule.SymPath.clear();
  }
  bool Known = true;
  if (FIsLLDB) {
    FModule.EntryPoint = FScanner.FindUInt64("loaded_addr", 0);
    Known = FModule.EntryPoint != 0;
  } else {
    FModule.EntryPoint = FScanner.FindUInt64("addr-low", 0);
    // GDB 13 gives the library's address ranges instead of "addr-low".
    if (FModule.EntryPoint == 0) {
      const std::string_view Ranges = FScanner.FindValue("ranges");
      if (!Ranges.empty()) {
        TMIScanner::TNestedScan InRanges(FScanner, Ranges);
        const std::string_view FirstRange = FScanner.ReadValue();
        TMIScanner::TNestedScan InRange(FScanner, FirstRange);
        FModule.EntryPoint = FScanner.FindUInt64("from", 0);
      }
    }
  }
  FModule.BaseAddress = FModule.EntryPoint;
  FModule.Kind.clear();
  return Known;
}

bool TGDBOutputParser::ParseSharedLibraryInfo() {
  const std::string_view Info = FScanner.FindValue("shlib-info");
  if (Info.empty())
    return false;
  TMIScanner::TNestedScan Nested(FScanner, Info);
  FModule.Id = FScanner.FindInteger("num", -1);
  FModule.Name = std::string(FScanner.FindValue("name"));
  FModule.BaseAddress = FScanner.FindUInt64("dyld-addr", 0);
  FModule.Kind = std::string(FScanner.FindValue("reason"));
  FModule.Path = std::string(FScanner.FindValue("path"));
  FModule.EntryPoint = FScanner.FindUInt64("loaded_addr", FModule.BaseAddress);
  FModule.SymPath = std::string(FScanner.FindValue("dsym-objpath"));
  return true;
}

bool TGDBOutputParser::ParseBreakpointTuple(Integer& Number) {
  const std::string_view Tuple = FScanner.FindValue("bkpt");
  TMIScanner::TNestedScan Nested(FScanner, Tuple);
  Number = FScanner.FindInteger("number", -1);
  if (Number == -1)
    return false;
  ParseLocation(FScanner, FLocation);
  return true;
}

// --- Streams --------------------------------------------------------------

bool TGDBOutputParser::ProcessConsoleStream() {
  FScanner.NextChar();
  const std::string_view Raw = FScanner.ReadCString();
  if (Raw.empty())
    return false;
  if (FIsLLDB && Raw.starts_with(LLDBSignalTableHeader))
    return false;
  if (FProcess.IsWindows() && Raw.starts_with(WindowsDebugStringPrefix)) {
    Log(etOds, std::string(Raw.substr(WindowsDebugStringPrefix.size())));
    return false;
  }
  const std::string Text = FlattenConsoleEscapes(Raw);
  if (FIsLLDB && Text.starts_with(LLDBMaxChildrenSetting)) {
    const std::string_view Count = FirstLineTrimmed(Text, LLDBMaxChildrenSetting.size());
    FProcess.NotifySettingMaxChildrenCountChanged(MIStrToIntDef(Count, -1));
    return false;
  }
  Log(etConsole, Text);
  if (Text.starts_with(LanguageAnnouncement))
    FProcess.NotifyLanguageChanged(std::string(FirstLineTrimmed(Text, LanguageAnnouncement.size())));
  return false;
}

bool TGDBOutputParser::ProcessTargetStream() {
  FScanner.NextChar();
  const std::string_view Text = FScanner.ReadCString();
  if (Text.empty())
    return false;
  // LLDB relays the program's own output on this stream; GDB writes it to
  // the program's terminal and keeps this stream for its remote targets.
  if (FIsLLDB)
    Log(etUnknown, DecodeLLDBProgramOutput(Text));
  else
    Log(etConsole, std::string(StripTrailingEscapes(Text)));
  return false;
}

bool TGDBOutputParser::ProcessLogStream() {
  FScanner.NextChar();
  const std::string Text(FScanner.ReadCString());
  if (Text.empty())
    return false;
  // The debugger echoes a CLI command on the log stream; requests answered
  // that way wait under the echoed text.
  TGDBResult* WaitObject = FProcess.RemoveWaitObject(Text);
  if (!WaitObject) {
    // GDB accepts more watchpoints than the hardware holds and finds out at
    // the next resume, which it then refuses: that one is not placed.
    constexpr std::string_view NoWatchSlot = "Could not insert hardware watchpoint ";
    if (!FIsLLDB && Text.starts_with(NoWatchSlot)) {
      const std::string_view Rest = std::string_view(Text).substr(NoWatchSlot.size());
      const size_t End = Rest.find('.');
      const Integer Watchpoint = MIStrToIntDef(Rest.substr(0, End), -1);
      if (Watchpoint != -1) {
        Log(etError, std::string(NoWatchSlot) + std::string(Rest.substr(0, End)) + ".");
        FProcess.NotifyBreakpointLocations(Watchpoint, {});
      }
    }
    if (FProcess.IsWindows() && FProcess.IsAttachMode() && Text.find(AttachFailed) != std::string::npos)
      FProcess.NotifyProcessExited(-1, "");
    if (FIsLLDB && Text.starts_with("error: "))
      FCLIError = std::string(StripTrailingEscapes(Text));
    return false;
  }
  if (WaitObject->FCommand == ctCLKill) {
    WaitObject->FError = false;
    CompleteWaitObject(WaitObject);
    return false;
  }
  FScanner.SkipLine();
  // Only the console answer belongs to the request; any other record that
  // follows is left for the record loop.
  const bool ConsoleAnswer = FScanner.Char() == '~' && !FScanner.AtEnd();
  if (ConsoleAnswer) {
    FScanner.NextChar();
    WaitObject->FError = !DecodeConsoleResult(*WaitObject, FScanner);
  }
  CompleteWaitObject(WaitObject);
  return !ConsoleAnswer;
}

bool TGDBOutputParser::ProcessNonMIText() {
  const bool GluedRecords = FProcess.IsLinux() && !FProcess.SupportHXConsole();
  const std::string_view Text =
      GluedRecords ? FScanner.ReadConsoleLine(FEndOfLineMarker) : FScanner.ReadRestOfLine(FEndOfLineMarker);
  if (Text.empty())
    return true;
  if (FIsLLDB) {
    if (Text == LLDBProcessReady)
      FProcess.NotifyProcessStarted();
    return true;
  }
  // Program output that begins with digits was first read as a token.
  Log(etUnknown, FToken + std::string(Text));
  return true;
}

} // namespace midebug
