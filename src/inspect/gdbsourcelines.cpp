// Source lines and code addresses: the file index table, the line of an
// address, the addresses of a line, the lines of a file, and moving the
// next statement.

#include "inspect/gdbfiletable.h"
#include "inspect/gdblinecache.h"
#include "inspect/gdbthreadtable.h"
#include "mi/gdbregisters.h"
#include "process/gdbprocess.h"

#include <algorithm>
#include <cstdio>
#include <optional>

namespace midebug {

namespace {

/// Windows targets list a file's lines in chunks of this many.
constexpr Integer WindowsLineChunk = 1024;

/// What "info line" is asked about: an address, a file's line, or (Line 0,
/// GDB only) a function.
struct TLineQuestion {
  std::optional<UInt64> Address;
  std::string File;
  Integer Line = 0;
};

/// Asks the debugger for the line and code range of Question: LLDB answers
/// "-data-info-line", GDB (which has no such command) its console "info
/// line". False, with GDB's words in FMessage when it gave some, unless a
/// code range came back.
bool AskInfoLine(TGDBProcess& Process, TGDBLineCache& Lines, const TLineQuestion& Question,
                 TCLInfoLineResult& Answer) {
  TGDBRequestEngine& Requests = Process.Requests();
  const bool LLDB = Process.IsLLDB();
  TDataInfoLineResult LLDBReply;
  TDataInfoLineResult& Reply = LLDB ? LLDBReply : Answer;
  // GDB names a file as it was compiled, often relative to a directory we
  // do not know, unless told to name it in full; the answer to this comes
  // before the question's.
  if (!LLDB && !Lines.FFullFileNames.exchange(true))
    Requests.Fire(&TGDBCommand::CreateGDBSetCommand, "filename-display", "absolute");
  const bool Found = Requests.Ask(Reply, [&](TGDBCommand& Builder, std::string& Token) {
    if (LLDB)
      return Question.Address ? Builder.CreateDataInfoLineCommand(Token, *Question.Address)
                              : Builder.CreateDataInfoLineCommand(Token, Question.File, Question.Line);
    if (Question.Address)
      return Builder.CreateCLInfoLineCommand(Token, *Question.Address);
    return Question.Line > 0 ? Builder.CreateCLInfoLineCommand(Token, Question.File, Question.Line)
                             : Builder.CreateCLInfoLineCommand(Token, Question.File);
  });
  if (LLDB) {
    Answer.FSource = Reply.FSource;
    Answer.FLine = Reply.FLine;
    Answer.FStartAddr = Reply.FStartAddr;
    Answer.FEndAddr = Reply.FEndAddr;
  }
  if (Answer.FMessage.empty())
    Answer.FMessage = Reply.FErrorMessage;
  return Found && Reply.GetSize() > 0;
}

/// The name of the program counter in the debugger's register names.
std::string_view PCRegisterName(TGDBCPU CPU) {
  switch (CPU) {
  case gcARM32:
  case gcARM64:
    return "pc";
  case gcAMD64:
    return "rip";
  case gcIA32:
    break;
  }
  return "eip";
}

std::string AddressText(UInt64 Address) {
  char Text[24];
  std::snprintf(Text, sizeof Text, "0x%llX", static_cast<unsigned long long>(Address));
  return Text;
}

} // namespace

// --- The file index table ------------------------------------------------------

Integer TGDBProcess::AddFileName(const std::string& FileName) { return FFiles->AddFileName(FileName, IsWindows()); }
Integer TGDBProcess::GetFileIndex(const std::string& FileName) { return FFiles->GetFileIndex(FileName, IsWindows()); }
std::string TGDBProcess::GetFileName(Integer FileIndex) { return FFiles->GetFileName(FileIndex); }
bool TGDBProcess::SetFileName(Integer FileIndex, const std::string& FileName) {
  return FFiles->SetFileName(FileIndex, FileName);
}

// --- Lines and addresses ---------------------------------------------------------

bool TGDBProcess::FindSourceLine(UInt64 Address, UInt64& StartAddr, Integer& Size, Integer& FileIndex,
                                 Integer& Line) {
  // GDB reports only the shared libraries as modules, not the program:
  // the lowest module would bar the program's own code.
  const bool Asked = Address >= FBaseAddress || !IsLLDB();
  TInfoLine Found;
  bool Known = Asked && FLines->FindInfoLine(Address, Found);
  if (!Known && Asked) {
    const UInt64 Epoch = FLines->InfoLineEpoch();
    TCLInfoLineResult Answer;
    if (AskInfoLine(*this, *FLines, {Address, {}, 0}, Answer) && Address >= Answer.FStartAddr &&
        Address < Answer.FEndAddr) {
      Found = {Answer.FStartAddr, Answer.FEndAddr, static_cast<Integer>(Answer.GetSize()), Answer.FLine,
               AddFileName(Answer.FSource)};
      FLines->SetInfoLine(Found, Epoch);
      Known = true;
    }
  }
  if (!Known)
    Found = {Address, Address, 0, 0, 0};
  StartAddr = Found.StartAddr;
  Size = Found.Size;
  FileIndex = Found.FileIndex;
  Line = Found.Line;
  return Known;
}

bool TGDBProcess::FindSourceLocation(const std::string& FileName, Integer Line, TGDBLocation& Location) {
  Location = DummyLocation;
  const bool Function = Line == 0 && !IsLLDB();
  const std::string Asked = Function ? FileName : TGDBFileTable::DebuggerName(FileName, IsWindows());
  if (Asked.empty() || (Line < 1 && !Function))
    return false;
  TCLInfoLineResult Answer;
  if (!AskInfoLine(*this, *FLines, {std::nullopt, Asked, Line}, Answer))
    return false;
  Location = Function ? TGDBLocation{Answer.FLine, Answer.FSource, Answer.FStartAddr}
                      : TGDBLocation{Line, FileName, Answer.FStartAddr};
  return true;
}

namespace {

/// A file's lines with code, and their addresses when WithAddresses, in
/// the debugger's order, line 0 (the end of a sequence) left out. Windows
/// targets are asked in chunks; a debugger that ignores the chunk asked for
/// and answers the whole table again ends the asking.
bool ListLines(TGDBRequestEngine& Requests, bool Windows, const std::string& FileName, bool WithAddresses,
               TIntegerArray& Lines, TAddressArray& Addresses) {
  Lines.clear();
  Addresses.clear();
  bool Listed = false;
  Integer Start = Windows ? 1 : -1;
  for (;;) {
    TSymbolListLinesResult Chunk(WithAddresses);
    if (!Requests.Ask(Chunk, &TGDBCommand::CreateSymbolListLinesCommand, FileName, Start, WindowsLineChunk))
      break;
    Listed = true;
    if (Windows && !Chunk.FLines.empty() && Chunk.FLines.back() < Start)
      break;
    for (size_t Index = 0; Index < Chunk.FLines.size(); ++Index) {
      if (Chunk.FLines[Index] == 0)
        continue;
      Lines.push_back(Chunk.FLines[Index]);
      if (WithAddresses)
        Addresses.push_back(Index < Chunk.FAddresses.size() ? Chunk.FAddresses[Index] : 0);
    }
    if (!Windows || Chunk.FLines.size() < static_cast<size_t>(WindowsLineChunk))
      break;
    Start = Chunk.FLines.back() + 1;
  }
  return Listed;
}

} // namespace

void TGDBProcess::GetSourceLines(const std::string& FileName, TIntegerArray& Lines) {
  Lines.clear();
  if (FileName.empty())
    return;
  bool Aborted = false;
  const bool Paused = SyncTargetPause(Aborted, false);
  if (Aborted)
    return;
  TAddressArray Unused;
  ListLines(FRequests, IsWindows(), TGDBFileTable::DebuggerName(FileName, IsWindows()), false, Lines, Unused);
  if (Paused && FAlive)
    ResumeUnheard(false);
}

TStringArray TGDBProcess::GetSourceFiles() {
  TFileListExecSourceFilesResult Sources;
  WhilePaused([&] { FRequests.Ask(Sources, &TGDBCommand::CreateFileListExecSourceFilesCommand); });
  return Sources.FFiles;
}

TAddressArray TGDBProcess::FindSourceAddress(Integer FileIndex, Integer Line) {
  TAddressArray Addresses;
  if (FLines->FindLineAddress(FileIndex, Line, Addresses))
    return Addresses;
  // A Windows target's debugger finds a file by its bare name; GDB by the
  // full one, which tells apart two files of one name.
  const bool Windows = IsWindows();
  const std::string Stored = GetFileName(FileIndex);
  const std::string FileName =
      Windows ? TGDBFileTable::BareName(Stored, true) : TGDBFileTable::DebuggerName(Stored, false);
  if (FileName.empty())
    return Addresses;
  const UInt64 Epoch = FLines->LineAddressEpoch();
  TIntegerArray AllLines;
  TAddressArray AllAddresses;
  if (!ListLines(FRequests, Windows, FileName, true, AllLines, AllAddresses) || (Windows && AllLines.empty()))
    return Addresses;
  FLines->SetLineAddress(FileIndex, AllLines, AllAddresses, Epoch);
  for (size_t Index = 0; Index < AllLines.size(); ++Index)
    if (AllLines[Index] == Line)
      Addresses.push_back(AllAddresses[Index]);
  return Addresses;
}

// --- Moving the next statement -----------------------------------------------------

bool TGDBProcess::SetNewEip(UInt64 Address) {
  const Integer ThreadId = FThreads->StoppedId();
  if (!FAlive || !FSuspended || FResuming || ThreadId == -1)
    return false;
  if (!IsLLDB()) {
    // The pc is written in the selected frame: an outer one would have its
    // return address overwritten. Selecting the thread selects its
    // innermost frame, and records where that stands.
    FThreads->Select(ThreadId);
    // Moving into another function would run its code on the wrong frame.
    TCLInfoLineResult Here;
    TCLInfoLineResult There;
    AskInfoLine(*this, *FLines, {FThreads->StoppedLocation().Address, {}, 0}, Here);
    AskInfoLine(*this, *FLines, {Address, {}, 0}, There);
    if (There.FFunction.empty() || There.FFunction != Here.FFunction) {
      NotifyLogEvent(CreateErrorLogEvent("Cannot move the next statement to " + AddressText(Address) +
                                         ": it is not in the current function" +
                                         (Here.FFunction.empty() ? "" : " " + Here.FFunction)));
      return false;
    }
  }
  const TRegisterTable Table = GeneralRegisterTable(CPU(), FRequests.Platform());
  const auto PC = std::find(Table.Registers.begin(), Table.Registers.end(), PCRegisterName(CPU()));
  const TIntfPtr<IGDBThread> Thread = FThreads->Get(ThreadId);
  TUInt64Array Old;
  UInt64 Unused = 0;
  const size_t Index = static_cast<size_t>(PC - Table.Registers.begin());
  if (PC == Table.Registers.end() || !Thread->GetRegisters(Old, Unused) || Old.size() <= Index)
    return false;
  TUInt64Array New = Old;
  New[Index] = Address;
  // The thread's register write selects the thread again afterwards, which
  // fetches the new location (and makes GDB forget the frames it unwound).
  return Thread->SetRegisters(Old, New);
}

} // namespace midebug
