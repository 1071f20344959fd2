// The console debugger's memory, disassembly and register commands.

#include "session.h"

#include <algorithm>
#include <cstdio>
#include <cstring>
#include <limits>

namespace midebug::cli {

namespace {

/// The most bytes one "x" shows, and the most instructions one
/// "disassemble" lists.
constexpr Integer MaxExamine = 65536;
constexpr Integer MaxInstructions = 10000;

/// A number as a person types it: decimal, or hexadecimal after "0x"; the
/// whole text must be the number.
bool ParseUInt64(const std::string& Text, UInt64& Value) {
  if (Text.empty() || Text.front() == '-' || Text.front() == '+')
    return false;
  const bool Hex = Text.size() > 2 && Text[0] == '0' && (Text[1] == 'x' || Text[1] == 'X');
  const std::string Digits = Hex ? Text.substr(2) : Text;
  if (Digits.find_first_not_of(Hex ? "0123456789abcdefABCDEF" : "0123456789") != std::string::npos)
    return false;
  try {
    size_t Used = 0;
    Value = std::stoull(Digits, &Used, Hex ? 16 : 10);
    return Used == Digits.size();
  } catch (const std::exception&) {
    return false;
  }
}

std::string PaddedAddress(UInt64 Address) {
  char Text[24];
  std::snprintf(Text, sizeof Text, "0x%016llx", static_cast<unsigned long long>(Address));
  return Text;
}

std::string HexBytes(const Byte* Bytes, size_t Count, const char* Between = "") {
  std::string Text;
  char Pair[3];
  for (size_t Index = 0; Index < Count; ++Index) {
    if (Index != 0)
      Text += Between;
    std::snprintf(Pair, sizeof Pair, "%02x", Bytes[Index]);
    Text += Pair;
  }
  return Text;
}

/// "0x" and the 16 bytes as one number, most significant first; x87 values
/// use only their first ten.
std::string RegisterHex(const TXMMFPURegValue& Value, size_t Bytes) {
  Byte Reversed[16];
  for (size_t Index = 0; Index < Bytes; ++Index)
    Reversed[Index] = Value.ByteReg[Bytes - 1 - Index];
  return "0x" + HexBytes(Reversed, Bytes);
}

/// Reads "0x" and up to 2 * Size hexadecimal digits into the first Size bytes
/// of Value, least significant first.
bool ParseRegisterHex(const std::string& Text, size_t Size, TXMMFPURegValue& Value) {
  if (Text.size() < 3 || Text[0] != '0' || (Text[1] != 'x' && Text[1] != 'X') || Text.size() - 2 > 2 * Size ||
      Text.find_first_not_of("0123456789abcdefABCDEF", 2) != std::string::npos)
    return false;
  Value = TXMMFPURegValue{};
  size_t Nibble = 0;
  for (size_t Index = Text.size(); Index-- > 2; ++Nibble) {
    const char Digit = Text[Index];
    const int Number = Digit <= '9' ? Digit - '0' : (Digit | 0x20) - 'a' + 10;
    Value.ByteReg[Nibble / 2] = static_cast<Byte>(Value.ByteReg[Nibble / 2] | (Number << (4 * (Nibble % 2))));
  }
  return true;
}

/// Which register set a name belongs to, and where in its table.
enum class TRegisterSet { General, FPU, SSE };
constexpr size_t X87StackRegisters = 8;
constexpr size_t SSEDataRegisters = 16;

} // namespace

void TCliSession::CmdExamine(const std::string& Name, const std::vector<std::string>& Arguments) {
  UInt64 Address = 0;
  UInt64 Count = 64;
  if (Arguments.empty() || Arguments.size() > 2 || !ResolveAddress(Arguments[0], Address) ||
      (Arguments.size() == 2 && (!ParseUInt64(Arguments[1], Count) || Count == 0 || Count > MaxExamine))) {
    FOutput.Error(Name, "usage: x ADDRESS [COUNT], a number of 1 to " + std::to_string(MaxExamine) + " bytes");
    return;
  }
  if (!RequireStopped(Name))
    return;
  std::vector<Byte> Bytes(Count);
  const Integer Read = FProcess->GetMemory(Address, Bytes.data(), static_cast<Integer>(Count));
  if (Read <= 0) {
    FOutput.Error(Name, "cannot read memory at " + PaddedAddress(Address));
    return;
  }
  Bytes.resize(static_cast<size_t>(Read));
  std::string Text;
  for (size_t Row = 0; Row < Bytes.size(); Row += 16) {
    const size_t Width = std::min<size_t>(16, Bytes.size() - Row);
    std::string Hex = HexBytes(Bytes.data() + Row, Width, " ");
    Hex.resize(16 * 3 - 1, ' ');
    std::string Printable;
    for (size_t Index = Row; Index < Row + Width; ++Index)
      Printable += Bytes[Index] >= 0x20 && Bytes[Index] < 0x7f ? static_cast<char>(Bytes[Index]) : '.';
    Text += PaddedAddress(Address + Row) + ": " + Hex + "  |" + Printable + "|\n";
  }
  if (Bytes.size() < Count)
    Text += "(only " + std::to_string(Bytes.size()) + " bytes could be read)\n";
  Text.pop_back();
  FOutput.Emit({{"answer", Name},
                {"address", PaddedAddress(Address)},
                {"count", Bytes.size()},
                {"bytes", HexBytes(Bytes.data(), Bytes.size())}},
               Text);
}

void TCliSession::CmdWrite(const std::string& Name, const std::vector<std::string>& Arguments) {
  UInt64 Address = 0;
  const bool HexText = Arguments.size() == 2 && !Arguments[1].empty() && Arguments[1].size() % 2 == 0 &&
                       Arguments[1].find_first_not_of("0123456789abcdefABCDEF") == std::string::npos;
  if (!HexText || !ResolveAddress(Arguments[0], Address) || Arguments[1].size() / 2 > MaxExamine) {
    FOutput.Error(Name, "usage: write ADDRESS HEXBYTES, two hexadecimal digits a byte (\"90c3\")");
    return;
  }
  if (!RequireStopped(Name))
    return;
  std::vector<Byte> Bytes;
  for (size_t Index = 0; Index < Arguments[1].size(); Index += 2)
    Bytes.push_back(static_cast<Byte>(std::stoul(Arguments[1].substr(Index, 2), nullptr, 16)));
  const Integer Size = static_cast<Integer>(Bytes.size());
  if (FProcess->SetMemory(Address, Bytes.data(), Size) != Size) {
    FOutput.Error(Name, "the debugger refused to write " + std::to_string(Size) + " bytes at " +
                            PaddedAddress(Address));
    return;
  }
  FOutput.Emit({{"answer", Name}, {"address", PaddedAddress(Address)}, {"count", Size}},
               "Wrote " + std::to_string(Size) + " bytes at " + PaddedAddress(Address) + ".");
}

void TCliSession::CmdDisassemble(const std::string& Name, const std::vector<std::string>& Arguments) {
  UInt64 Address = 0;
  UInt64 Count = 20;
  if (Arguments.size() > 2 || (!Arguments.empty() && !ResolveAddress(Arguments[0], Address)) ||
      (Arguments.size() == 2 && (!ParseUInt64(Arguments[1], Count) || Count == 0 || Count > MaxInstructions))) {
    FOutput.Error(Name, "usage: disassemble [ADDRESS] [COUNT], a count of 1 to " +
                            std::to_string(MaxInstructions) + " instructions");
    return;
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  const UInt64 Current = Thread->GetCallLocation(FCurrentFrame + 1).Address;
  if (Arguments.empty()) {
    // x86 cannot be decoded backwards: from the function's start, or from
    // the current instruction when the start is unknown.
    Address = FProcess->GetFunctionStart(Current);
    if (Address == 0)
      Address = Current;
  }
  const TIntfPtr<IGDBDisassemble> Cursor = FProcess->GetDisassembler();
  if (!Cursor) {
    FOutput.Error(Name, "no disassembly");
    return;
  }
  nlohmann::json Instructions = nlohmann::json::array();
  std::string Text;
  UInt64 At = 0;
  Cursor->ToAddress(Address, At);
  for (UInt64 Index = 0; Index < Count; ++Index) {
    if (Index != 0)
      Cursor->GetNextAddress(At);
    Integer Size = -1;
    std::string Instruction;
    if (Cursor->IsValid())
      FProcess->DisassembleAt(At, Size, Instruction);
    if (Size == -1) {
      if (Index == 0) {
        FOutput.Error(Name, "cannot disassemble at " + PaddedAddress(Address));
        return;
      }
      break;
    }
    UInt64 LineStart = 0;
    Integer LineSize = 0;
    Integer FileIndex = 0;
    Integer Line = 0;
    if (FProcess->FindSourceLine(At, LineStart, LineSize, FileIndex, Line) && LineStart == At && Line > 0) {
      const std::string File = FProcess->GetFileName(FileIndex);
      Text += File + ":" + std::to_string(Line) + "  " + FSources.Line(File, Line) + "\n";
    }
    const bool IsCurrent = At == Current;
    Instructions.push_back({{"address", PaddedAddress(At)}, {"size", Size}, {"text", Instruction}, {"current", IsCurrent}});
    Text += (IsCurrent ? "=> " : "   ") + PaddedAddress(At) + "  " + Instruction + "\n";
  }
  Text.pop_back();
  FOutput.Emit({{"answer", Name}, {"instructions", Instructions}}, Text);
}

bool TCliSession::ResolveAddress(const std::string& Text, UInt64& Address) {
  if (ParseUInt64(Text, Address))
    return true;
  // Any other word is an expression of the stopped program: its value (a
  // pointer "(int *) 0x4010 <counter>", or a number) is the address.
  const TIntfPtr<IGDBThread> Thread =
      FProcess && FState == TRunState::Stopped ? FProcess->GetThread(FCurrentThread) : nullptr;
  std::string Value, TypeName;
  bool CanModify = false;
  if (!Thread || Thread->Evaluate(Text, "", FCurrentFrame + 1, Value, CanModify, TypeName) != ercOk)
    return false;
  const size_t Hex = Value.find("0x");
  const size_t Start = Hex == std::string::npos ? 0 : Hex;
  const size_t End = Value.find_first_of(" \t", Start);
  return ParseUInt64(Value.substr(Start, End == std::string::npos ? End : End - Start), Address);
}

void TCliSession::CmdInfoRegisters(const std::string& Name, const std::vector<std::string>& Arguments) {
  const std::string Which = Arguments.empty() ? "general" : Arguments[0];
  if (Arguments.size() > 1) {
    FOutput.Error(Name, "usage: info registers [general|fpu|sse|NAME]");
    return;
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  const TGDBCPU CPU = Thread->GetCPUType();
  const TRegisterTable General = GeneralRegisterTable(CPU, FOptions.Platform);
  const bool HasVectors = CPU == gcAMD64;
  nlohmann::json Registers = nlohmann::json::array();
  std::string Text;
  bool Failed = false;
  const auto Add = [&](std::string_view RegisterName, const std::string& Value) {
    if (Which != "general" && Which != "fpu" && Which != "sse" && Which != RegisterName)
      return;
    Registers.push_back({{"name", RegisterName}, {"value", Value}});
    std::string Shown(RegisterName);
    Shown.resize(std::max<size_t>(Shown.size(), 8), ' ');
    Text += Shown + " " + Value + "\n";
  };
  const bool Named = Which != "general" && Which != "fpu" && Which != "sse";
  if (Which == "general" || Named) {
    TUInt64Array Values;
    UInt64 PC = 0;
    if (Thread->GetRegisters(Values, PC))
      for (size_t Index = 0; Index < Values.size() && Index < General.Registers.size(); ++Index)
        Add(General.Registers[Index], PaddedAddress(Values[Index]));
    else
      Failed = !Named;
  }
  if (HasVectors && (Which == "fpu" || Named)) {
    TFPURegValueArray Values;
    const TRegisterTable Table = FPURegisterTable(FOptions.Platform);
    if (Thread->GetFPURegisters(Values))
      for (size_t Index = 0; Index < Values.size() && Index < Table.Registers.size(); ++Index)
        Add(Table.Registers[Index], RegisterHex(Values[Index], Index < X87StackRegisters ? 10 : 4));
    else
      Failed = !Named;
  }
  if (HasVectors && (Which == "sse" || Named)) {
    TXMMRegValueArray Values;
    const TRegisterTable Table = XMMRegisterTable();
    if (Thread->GetXMMRegisters(Values))
      for (size_t Index = 0; Index < Values.size() && Index < Table.Registers.size(); ++Index)
        Add(Table.Registers[Index], RegisterHex(Values[Index], Index < SSEDataRegisters ? 16 : 4));
    else
      Failed = !Named;
  }
  if (Failed || Registers.empty()) {
    FOutput.Error(Name, Failed ? "the debugger did not give the " + Which + " registers"
                               : "no register named '" + Which + "'");
    return;
  }
  Text.pop_back();
  FOutput.Emit({{"answer", Name}, {"registers", Registers}}, Text);
}

void TCliSession::CmdSetRegister(const std::string& Name, const std::vector<std::string>& Arguments) {
  if (Arguments.size() != 2) {
    FOutput.Error(Name, "usage: set register NAME VALUE");
    return;
  }
  const TIntfPtr<IGDBThread> Thread = StoppedThread(Name);
  if (!Thread)
    return;
  const std::string& Register = Arguments[0];
  const std::string& Text = Arguments[1];
  const TGDBCPU CPU = Thread->GetCPUType();
  const auto PositionIn = [&](const TRegisterTable& Table) -> size_t {
    return static_cast<size_t>(std::find(Table.Registers.begin(), Table.Registers.end(), Register) -
                               Table.Registers.begin());
  };
  const TRegisterTable General = GeneralRegisterTable(CPU, FOptions.Platform);
  const TRegisterTable FPU = FPURegisterTable(FOptions.Platform);
  const TRegisterTable SSE = XMMRegisterTable();
  const auto Refused = [&](const std::string& Why) { FOutput.Error(Name, Why); };
  bool Written = false;
  if (const size_t Index = PositionIn(General); Index < General.Registers.size()) {
    UInt64 Value = 0;
    if (!ParseUInt64(Text, Value))
      return Refused("a general register takes a number: decimal or 0x hexadecimal");
    TUInt64Array Old;
    UInt64 PC = 0;
    if (!Thread->GetRegisters(Old, PC) || Index >= Old.size())
      return Refused("the debugger did not give the general registers");
    TUInt64Array New = Old;
    New[Index] = Value;
    Written = Thread->SetRegisters(Old, New);
  } else if (const size_t Index = CPU == gcAMD64 ? PositionIn(FPU) : FPU.Registers.size();
             Index < FPU.Registers.size()) {
    TXMMFPURegValue Value{};
    if (Index < X87StackRegisters && !ParseRegisterHex(Text, 10, Value)) {
      // A decimal value is stored as the x87 unit holds it.
      char* End = nullptr;
      const long double Number = std::strtold(Text.c_str(), &End);
      if (End == Text.c_str() || *End != '\0' || std::numeric_limits<long double>::digits != 64)
        return Refused("an x87 register takes a decimal number or 0x and up to 20 hexadecimal digits");
      std::memcpy(Value.ByteReg, &Number, 10);
    } else if (Index >= X87StackRegisters && !ParseRegisterHex(Text, 4, Value)) {
      return Refused("an x87 control register takes 0x and up to 8 hexadecimal digits");
    }
    TFPURegValueArray Old;
    if (!Thread->GetFPURegisters(Old) || Index >= Old.size())
      return Refused("the debugger did not give the x87 registers");
    TFPURegValueArray New = Old;
    New[Index] = Value;
    Written = Thread->SetFPURegisters(Old, New);
  } else if (const size_t Index = CPU == gcAMD64 ? PositionIn(SSE) : SSE.Registers.size();
             Index < SSE.Registers.size()) {
    TXMMFPURegValue Value{};
    if (!ParseRegisterHex(Text, Index < SSEDataRegisters ? 16 : 4, Value))
      return Refused("an SSE register takes 0x and up to 32 hexadecimal digits");
    TXMMRegValueArray Old;
    if (!Thread->GetXMMRegisters(Old) || Index >= Old.size())
      return Refused("the debugger did not give the SSE registers");
    TXMMRegValueArray New = Old;
    New[Index] = Value;
    Written = Thread->SetXMMRegisters(Old, New);
  } else {
    return Refused("no register named '" + Register + "'");
  }
  if (!Written)
    return Refused("the debugger refused to write " + Register);
  FOutput.Emit({{"answer", Name}, {"name", Register}, {"value", Text}}, Register + " = " + Text);
}

} // namespace midebug::cli
