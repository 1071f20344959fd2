// The adapter's data breakpoints: watches on the bytes of a value.
//
// A data breakpoint's dataId is "ADDRESS/SIZE" ("0x601040/8"): the bytes it
// watches, read back when the client sets it.

#include "dapaddress.h"
#include "dapsession.h"

#include <set>
#include <tuple>

namespace midebug::dap {

namespace {

/// The most bytes the library watches at once (GDB splits a range over
/// several debug registers).
constexpr Integer MaxWatchSize = 4096;

#if defined(__x86_64__)
/// x86-64 has four debug registers, each watching 1, 2, 4 or 8 bytes aligned
/// to their size. GDB splits a range into such pieces and, failing to fit
/// them, falls back to single-stepping the program (a write watch) or
/// refuses the next resume: the adapter counts the pieces first.
constexpr size_t WatchRegisters = 4;
constexpr UInt64 WatchWidth = 8;
constexpr const char* HardwareLimit = "it holds at most 4 hardware watchpoints of up to 8 bytes each";
#else
constexpr size_t WatchRegisters = 0;
constexpr UInt64 WatchWidth = 0;
constexpr const char* HardwareLimit = "it has too few hardware watchpoints for it";
#endif

/// One debug register's share of a watch: its address, its width and
/// whether it watches writes only. Equal pieces share a register.
using TWatchPiece = std::tuple<UInt64, UInt64, bool>;

/// Adds the pieces a watch of Size bytes at Address takes, as GDB splits
/// it, to Pieces; stops once they outnumber the registers.
void AddWatchPieces(UInt64 Address, Integer Size, bool WritesOnly, std::set<TWatchPiece>& Pieces) {
  UInt64 Left = static_cast<UInt64>(Size);
  while (Left > 0 && Pieces.size() <= WatchRegisters) {
    UInt64 Width = WatchWidth;
    while (Width > 1 && (Width > Left || Address % Width != 0))
      Width /= 2;
    Pieces.emplace(Address, Width, WritesOnly);
    Address += Width;
    Left -= Width;
  }
}

/// The whole number Text starts with (after blanks); nullopt when none.
std::optional<long long> LeadingNumber(const std::string& Text) {
  const size_t Start = Text.find_first_not_of(' ');
  if (Start == std::string::npos || Text[Start] < '0' || Text[Start] > '9')
    return std::nullopt;
  const size_t End = Text.find_first_not_of("0123456789", Start);
  const std::string Digits = Text.substr(Start, End == std::string::npos ? std::string::npos : End - Start);
  if (Digits.size() > 12)
    return std::nullopt;
  return std::stoll(Digits);
}

} // namespace

std::optional<std::pair<UInt64, Integer>> TDapSession::FindStorage(IGDBThread& Thread, Integer Frame,
                                                                   const std::string& Expr, std::string& Why) {
  std::string Value, TypeName;
  bool CanModify = false;
  const bool Pascal = Thread.GetEvaluator() == glPascal;
  if (Thread.Evaluate((Pascal ? "@(" : "&(") + Expr + ")", "", Frame, Value, CanModify, TypeName) != ercOk) {
    Why = Value.empty() ? "it has no address" : Value;
    return std::nullopt;
  }
  // The debugger gives a function a size of 1: its code is no data.
  if (TypeName.find(")(") != std::string::npos) {
    Why = "it is a function";
    return std::nullopt;
  }
  const auto Address = PointerValue(Value);
  if (!Address) {
    Why = "its address reads " + Value;
    return std::nullopt;
  }
  if (Thread.Evaluate("sizeof(" + Expr + ")", "", Frame, Value, CanModify, TypeName) != ercOk) {
    Why = Value.empty() ? "its size is unknown" : Value;
    return std::nullopt;
  }
  const auto Size = LeadingNumber(Value);
  if (!Size || *Size < 1 || *Size > 0x7fffffff) {
    Why = "it takes no bytes";
    return std::nullopt;
  }
  return std::make_pair(*Address, static_cast<Integer>(*Size));
}

// --- Data breakpoints ----------------------------------------------------------

TDapReply TDapSession::DataBreakpointInfo(TDapArguments& Arguments) {
  const auto Reference = Arguments.Number("variablesReference", 0, 0x7fffffff);
  const auto Name = Arguments.String("name");
  if (!Arguments.Problem().empty() || !Name || Name->empty())
    return TDapReply::Refuse(Arguments.Problem().empty() ? "dataBreakpointInfo needs a 'name'" : Arguments.Problem());
  auto Unwatchable = [&](const std::string& Why) {
    return TDapReply::Ok({{"dataId", nullptr}, {"description", *Name + " cannot be watched: " + Why}});
  };
  if (!FProcess || FState != TProgramState::Stopped)
    return Unwatchable(NotStoppedReason());
  TIntfPtr<IGDBThread> Thread;
  Integer Frame = 1;
  std::string Expr = *Name;
  if (Reference && *Reference > 0) {
    if (static_cast<size_t>(*Reference) > FVariables.size())
      return TDapReply::Refuse("there is no variables reference " + std::to_string(*Reference) +
                               " since the last stop");
    const TVariablesRef& Ref = FVariables[static_cast<size_t>(*Reference - 1)];
    const auto Found = Ref.Expressions.find(*Name);
    if (Found == Ref.Expressions.end())
      return TDapReply::Refuse("no variable '" + *Name + "' has been listed there");
    if (Ref.Registers)
      return Unwatchable("a register has no address");
    Expr = Found->second;
    Thread = Ref.Thread;
    Frame = Ref.Frame;
  } else {
    TDapReply Refusal;
    if (!(Thread = FrameThread(Arguments, Frame, Refusal, true)))
      return Refusal;
  }
  std::string Why;
  const auto Storage = FindStorage(*Thread, Frame, Expr, Why);
  if (!Storage)
    return Unwatchable(Why);
  const auto [Address, Size] = *Storage;
  const std::string DataId = HexAddress(Address) + "/" + std::to_string(Size);
  const std::string Description =
      *Name + " (" + std::to_string(Size) + (Size == 1 ? " byte" : " bytes") + " at " + HexAddress(Address) + ")";
  // Kept to name the data breakpoint when it stops the program; a client
  // asks for every value it offers to watch, so the oldest are let go.
  if (FDataDescriptions.size() >= 1000)
    FDataDescriptions.clear();
  FDataDescriptions[DataId] = Description;
  return TDapReply::Ok({{"dataId", DataId},
                        {"description", Description},
                        {"accessTypes", {"write", "read", "readWrite"}},
                        {"canPersist", false}});
}

void TDapSession::ReadDataBreakpoint(const nlohmann::json& Entry, TBreakpoint& Breakpoint) {
  const auto DataId = Entry.find("dataId");
  const auto Access = Entry.find("accessType");
  const std::string Id = DataId != Entry.end() && DataId->is_string() ? DataId->get<std::string>() : std::string();
  const size_t Slash = Id.find('/');
  const auto Address = ParseAddress(Id.substr(0, Slash));
  const auto Size = Slash == std::string::npos ? std::nullopt : LeadingNumber(Id.substr(Slash + 1));
  if (!Address || !Size || std::to_string(*Size) != Id.substr(Slash + 1)) {
    Breakpoint.Message = "a data breakpoint needs a 'dataId' that dataBreakpointInfo gave";
    return;
  }
  Breakpoint.Access = Access == Entry.end() || Access->is_null() ? "write"
                      : Access->is_string()                      ? Access->get<std::string>()
                                                                 : "";
  if (Breakpoint.Access != "write" && Breakpoint.Access != "read" && Breakpoint.Access != "readWrite") {
    Breakpoint.Message = "'accessType' must be \"write\", \"read\" or \"readWrite\"";
    return;
  }
  Breakpoint.Address = *Address;
  Breakpoint.Size = static_cast<Integer>(std::min<long long>(*Size, MaxWatchSize + 1));
  const auto Described = FDataDescriptions.find(Id);
  Breakpoint.Watched = Described != FDataDescriptions.end() ? Described->second : Id;
  if (*Size < 1 || *Size > MaxWatchSize) {
    Breakpoint.Message = "the debugger watches 1 to " + std::to_string(MaxWatchSize) + " bytes at once";
    return;
  }
  if (WatchRegisters == 0)
    return;
  // Read watches are access watches in the hardware.
  std::set<TWatchPiece> Alone, Together;
  AddWatchPieces(Breakpoint.Address, Breakpoint.Size, Breakpoint.Access == "write", Alone);
  for (const auto& Placed : FBreakpoints) {
    const TBreakpoint& Other = *Placed.second;
    if (Other.Kind == TBreakpointKind::Data && Other.Message.empty())
      AddWatchPieces(Other.Address, Other.Size, Other.Access == "write", Together);
  }
  Together.insert(Alone.begin(), Alone.end());
  if (Alone.size() > WatchRegisters)
    Breakpoint.Message = std::string("the processor cannot watch this many bytes: ") + HardwareLimit;
  else if (Together.size() > WatchRegisters)
    Breakpoint.Message =
        std::string("the processor cannot watch this many bytes together with the other data breakpoints: ") +
        HardwareLimit;
}

TDapReply TDapSession::SetDataBreakpoints(TDapArguments& Arguments) {
  return ReplaceBreakpoints(Arguments, TBreakpointKind::Data, "setDataBreakpoints");
}

std::string TDapSession::UnplacedWatchText() { return std::string("the processor cannot watch it: ") + HardwareLimit; }

} // namespace midebug::dap
