// The adapter's view of machine code: disassembly windows around an
// address, before it as well as after, and moving the next statement.

#include "dapaddress.h"
#include "dapsession.h"

#include <algorithm>
#include <deque>
#include <filesystem>

namespace midebug::dap {

namespace {

/// The most instructions one disassemble request may ask for.
constexpr long long MaxInstructions = 10000;
/// Instruction offsets a request may name, either way.
constexpr long long MaxInstructionOffset = 1000000;
/// Unreadable memory is reported a byte an instruction up to the next page,
/// where reading is tried again.
constexpr UInt64 PageSize = 4096;
/// A function start further back than this is not decoded from: the window
/// before an address starts closer and is checked to meet it.
constexpr UInt64 FurthestFunctionStart = 16 * 1024;
/// Bytes an instruction before an address is guessed to take.
constexpr UInt64 GuessedInstructionBytes = 8;
/// How often the walk back takes another step towards the window's start.
constexpr int MaxStepsBack = 16;

/// One byte that could not be decoded.
TGDBDisassembleData Unreadable(UInt64 Address) {
  TGDBDisassembleData Byte;
  Byte.Address = Address;
  Byte.Size = 1;
  return Byte;
}

/// The instructions from Start that begin before End; true when the last
/// one ends exactly at End.
bool DecodeUpTo(IGDBProcess& Process, UInt64 Start, UInt64 End, TGDBDisassembleDataArray& Found) {
  Found.clear();
  UInt64 At = Start;
  while (At < End) {
    // Compiled code averages about four bytes an instruction; a shorter
    // part is followed by another request.
    const Integer Count = static_cast<Integer>(std::min<UInt64>((End - At) / 4 + 2, MaxInstructions));
    TGDBDisassembleDataArray Part = Process.Disassemble(At, Count);
    if (Part.empty())
      return false;
    for (TGDBDisassembleData& Instruction : Part) {
      if (Instruction.Address >= End)
        break;
      Found.push_back(std::move(Instruction));
    }
    if (Found.empty())
      return false;
    const UInt64 Next = Found.back().Address + static_cast<UInt64>(Found.back().Size);
    if (Next <= At || Next > End)
      return Next == End;
    At = Next;
  }
  return At == End;
}

/// Count instructions from Address; where memory cannot be read, a byte
/// each, up to the next page, which is tried again.
TGDBDisassembleDataArray ListForward(IGDBProcess& Process, UInt64 Address, size_t Count) {
  TGDBDisassembleDataArray Listing;
  UInt64 At = Address;
  while (Listing.size() < Count) {
    TGDBDisassembleDataArray Part = Process.Disassemble(At, static_cast<Integer>(Count - Listing.size()));
    for (TGDBDisassembleData& Instruction : Part)
      Listing.push_back(std::move(Instruction));
    if (!Part.empty())
      At = Listing.back().Address + static_cast<UInt64>(Listing.back().Size);
    if (Listing.size() >= Count)
      break;
    const UInt64 NextPage = (At / PageSize + 1) * PageSize;
    while (Listing.size() < Count && At < NextPage && At != 0)
      Listing.push_back(Unreadable(At++));
    if (At == 0)
      break;
  }
  return Listing;
}

/// The Count instructions that end at Address, aligned so that the last
/// one ends exactly there; where that cannot be found, unreadable bytes.
TGDBDisassembleDataArray ListBackward(IGDBProcess& Process, UInt64 Address, size_t Count) {
  std::deque<TGDBDisassembleData> Window;
  UInt64 Anchor = Address;
  TGDBDisassembleDataArray Found;
  for (int Step = 0; Window.size() < Count && Anchor > 0 && Step < MaxStepsBack; ++Step) {
    const size_t Needed = Count - Window.size();
    // The function holding the byte before the anchor is a start that is
    // known to line up with it.
    const UInt64 Function = Process.GetFunctionStart(Anchor - 1);
    bool Met = false;
    if (Function != 0 && Function < Anchor && Anchor - Function <= FurthestFunctionStart)
      Met = DecodeUpTo(Process, Function, Anchor, Found);
    if (!Met) {
      // Code without symbols: decoding settles on the real instruction
      // starts within a few instructions, so a start a little further back
      // is tried until one meets the anchor.
      const UInt64 Reach = std::min<UInt64>(Anchor, Needed * GuessedInstructionBytes + 64);
      UInt64 Start = Anchor - Reach;
      for (UInt64 Shift = 0; Shift < 16 && !Met && Start + Shift < Anchor; ++Shift)
        Met = DecodeUpTo(Process, Start + Shift, Anchor, Found);
      // Nothing readable there: perhaps from the anchor's page on.
      const UInt64 PageStart = Anchor / PageSize * PageSize;
      if (!Met && Found.empty() && PageStart > Start && PageStart < Anchor)
        Met = DecodeUpTo(Process, PageStart, Anchor, Found);
    }
    if (!Met || Found.empty())
      break;
    const size_t Take = std::min(Needed, Found.size());
    Window.insert(Window.begin(), Found.end() - static_cast<std::ptrdiff_t>(Take), Found.end());
    Anchor = Window.front().Address;
  }
  while (Window.size() < Count && Anchor > 0)
    Window.push_front(Unreadable(--Anchor));
  return TGDBDisassembleDataArray(Window.begin(), Window.end());
}

} // namespace

TDapReply TDapSession::Disassemble(TDapArguments& Arguments) {
  const auto Address = MemoryAddress(Arguments);
  const long long Offset = Arguments.Number("instructionOffset", -MaxInstructionOffset, MaxInstructionOffset).value_or(0);
  const auto Count = Arguments.Number("instructionCount", 0, MaxInstructions);
  const bool Symbols = Arguments.Boolean("resolveSymbols").value_or(true);
  if (!Arguments.Problem().empty() || !Address)
    return TDapReply::Refuse(Arguments.Problem());
  if (!Count)
    return TDapReply::Refuse("'instructionCount' is missing");
  if (!FProcess || FState != TProgramState::Stopped)
    return TDapReply::Refuse(NotStoppedReason());
  // The window is instructions [Offset, Offset + Count) counted from the one
  // at the address: those before it are found walking back from it, so that
  // both windows agree on where instructions start.
  TGDBDisassembleDataArray Listing;
  if (Offset < 0 && *Count > 0) {
    Listing = ListBackward(*FProcess, *Address, static_cast<size_t>(-Offset));
    // Fewer may exist before address 0.
    Listing.resize(std::min<size_t>(Listing.size(), static_cast<size_t>(*Count)));
  }
  if (Offset + *Count > 0) {
    const size_t Skip = static_cast<size_t>(std::max<long long>(Offset, 0));
    const size_t Wanted = static_cast<size_t>(*Count) - Listing.size();
    TGDBDisassembleDataArray After = ListForward(*FProcess, *Address, Skip + Wanted);
    Listing.insert(Listing.end(), After.begin() + static_cast<std::ptrdiff_t>(std::min(Skip, After.size())),
                   After.end());
  }
  nlohmann::json Instructions = nlohmann::json::array();
  for (const TGDBDisassembleData& Instruction : Listing) {
    nlohmann::json Entry = {{"address", HexAddress(Instruction.Address)}};
    if (Instruction.AsmData.empty()) {
      Entry["instruction"] = "(unreadable)";
      Entry["presentationHint"] = "invalid";
      Instructions.push_back(std::move(Entry));
      continue;
    }
    Entry["instruction"] = Instruction.AsmData;
    if (!Instruction.Opcodes.empty())
      Entry["instructionBytes"] = Instruction.Opcodes;
    if (Symbols && !Instruction.FunctionName.empty())
      Entry["symbol"] = Instruction.FunctionName;
    if (!Instruction.Source.empty() && Instruction.Line > 0) {
      Entry["location"] = {{"name", std::filesystem::path(Instruction.Source).filename().string()},
                           {"path", Instruction.Source}};
      Entry["line"] = ClientLine(Instruction.Line);
    }
    Instructions.push_back(std::move(Entry));
  }
  return TDapReply::Ok({{"instructions", std::move(Instructions)}});
}

TDapReply TDapSession::GotoTargets(TDapArguments& Arguments) {
  const nlohmann::json* Source = Arguments.Object("source");
  const auto Line = Arguments.Number("line", 0, 0x7fffffff);
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  const auto Path = Source ? Source->find("path") : nlohmann::json::const_iterator();
  if (!Source || Path == Source->end() || !Path->is_string() || Path->get<std::string>().empty() || !Line)
    return TDapReply::Refuse("gotoTargets needs 'source' with a 'path', and 'line'");
  if (!FProcess || FState != TProgramState::Stopped)
    return TDapReply::Refuse(NotStoppedReason());
  const Integer Wanted = static_cast<Integer>(*Line + (FLinesStartAt1 ? 0 : 1));
  TGDBLocation Location;
  nlohmann::json Targets = nlohmann::json::array();
  if (FProcess->FindSourceLocation(Path->get<std::string>(), Wanted, Location) && Location.Address != 0) {
    // The debugger places a line on the first line with code at or after it.
    const Integer Found = Location.Line > 0 ? Location.Line : Wanted;
    FGotoTargets.push_back(Location.Address);
    Targets.push_back({{"id", FGotoTargets.size()},
                       {"label", "line " + std::to_string(ClientLine(Found))},
                       {"line", ClientLine(Found)},
                       {"instructionPointerReference", HexAddress(Location.Address)}});
  }
  return TDapReply::Ok({{"targets", std::move(Targets)}});
}

TDapReply TDapSession::Goto(TDapArguments& Arguments) {
  TDapReply Refusal;
  TIntfPtr<IGDBThread> Thread = StoppedThread(Arguments, Refusal);
  const auto Target = Arguments.Number("targetId", 1, 0x7fffffff);
  if (!Thread)
    return Refusal;
  if (!Target || static_cast<size_t>(*Target) > FGotoTargets.size())
    return TDapReply::Refuse(Arguments.Problem().empty() ? "'targetId' names no target gotoTargets gave"
                                                         : Arguments.Problem());
  const Integer Stopped = FProcess->GetSuspendedThreadId();
  if (Thread->GetId() != Stopped)
    return TDapReply::Refuse("only the thread that stopped (" + std::to_string(Stopped) +
                             ") can be moved to another statement");
  const UInt64 Address = FGotoTargets[static_cast<size_t>(*Target - 1)];
  if (!FProcess->SetNewEip(Address))
    return TDapReply::Refuse("the next statement cannot move to " + HexAddress(Address) +
                             ": it must lie in the function that runs now");
  // The program stands elsewhere without having run: frames and values the
  // client holds are stale, and it learns so from a stop.
  FFrames.clear();
  FVariables.clear();
  FPendingGotoStop = Stopped;
  return TDapReply::Ok();
}

} // namespace midebug::dap
