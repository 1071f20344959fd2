/// \file
/// Decoders of the data commands: disassembly, register names and values
/// (general, x87 and SSE), memory and line information.

#include "mi/gdbdecodeinternal.h"

#include <array>
#include <cstring>
#include <optional>

namespace midebug::decode {

namespace {

// --- Disassembly ------------------------------------------------------------

/// The instruction's length: "size" where the debugger gives it, else the
/// byte count of "opcodes" ("48 89 e5" is 3), which is all GDB 13 gives in
/// its opcode modes.
Integer ReadInstructionSize(TMIScanner& Scanner) {
  const Integer Size = Scanner.FindInteger("size", 0);
  if (Size != 0)
    return Size;
  Integer Bytes = 0;
  bool InByte = false;
  for (char Letter : Scanner.FindValue("opcodes")) {
    const bool HexDigit = HexDigitValue(Letter) >= 0;
    if (HexDigit && !InByte)
      ++Bytes;
    InByte = HexDigit;
  }
  return Bytes;
}

void ReadInstructions(TMIScanner& Scanner, std::string_view List, TGDBDisassembleDataArray& Data, Integer Line,
                      std::string File) {
  ForEachElement(Scanner, List, [&](std::string_view Element) {
    if (Element.empty())
      return;
    TGDBDisassembleData Instruction;
    Instruction.Address = Scanner.FindUInt64("address", 0);
    Instruction.Size = ReadInstructionSize(Scanner);
    Instruction.AsmData = std::string(Scanner.FindValue("inst"));
    Instruction.FunctionOffset = Scanner.FindInteger("offset", -1);
    Instruction.FunctionName = std::string(Scanner.FindValue("func-name"));
    Instruction.Opcodes = std::string(Scanner.FindValue("opcodes"));
    // Only the first instruction of a source line carries its file and line.
    Instruction.Source = std::move(File);
    Instruction.Line = Line;
    File.clear();
    Line = 0;
    Data.push_back(std::move(Instruction));
  });
}

// --- Register values ----------------------------------------------------------

/// A bit of the x86 flags register or of MXCSR, by the name GDB gives it
/// when it prints the register in natural format ("[ ZF PF IF ]").
struct TFlagBit {
  std::string_view Name;
  unsigned Bit;
};

constexpr std::array<TFlagBit, 16> EFlagsBits = {{
    {"CF", 0}, {"PF", 2}, {"AF", 4}, {"ZF", 6}, {"SF", 7}, {"TF", 8}, {"IF", 9}, {"DF", 10},
    {"OF", 11}, {"NT", 14}, {"RF", 16}, {"VM", 17}, {"AC", 18}, {"VIF", 19}, {"VIP", 20}, {"ID", 21},
}};

constexpr std::array<TFlagBit, 14> MXCSRBits = {{
    {"IE", 0}, {"DE", 1}, {"ZE", 2}, {"OE", 3}, {"UE", 4}, {"PE", 5}, {"DAZ", 6},
    {"IM", 7}, {"DM", 8}, {"ZM", 9}, {"OM", 10}, {"UM", 11}, {"PM", 12}, {"FZ", 15},
}};

/// The bits named in "[ NAME NAME ]"; Known counts the names found in Table.
template <size_t Count>
UInt64 ReadFlagNames(std::string_view Text, const std::array<TFlagBit, Count>& Table, int& Known) {
  UInt64 Bits = 0;
  Known = 0;
  Text = Text.substr(1, Text.size() - 2);
  while (!Text.empty()) {
    const size_t Blank = Text.find(' ');
    const std::string_view Name = Text.substr(0, Blank);
    Text = Blank == std::string_view::npos ? std::string_view() : Text.substr(Blank + 1);
    for (const TFlagBit& Flag : Table)
      if (Flag.Name == Name) {
        Bits |= UInt64{1} << Flag.Bit;
        ++Known;
      }
  }
  return Bits;
}

bool IsFlagList(std::string_view Text) { return Text.size() >= 2 && Text.front() == '[' && Text.back() == ']'; }

/// Writes a hexadecimal number of up to 32 digits (after "0x") into Bytes,
/// least significant byte first. False when the text is not such a number.
bool ReadHexBytes(std::string_view Text, TXMMFPURegValue& Value) {
  if (!(Text.starts_with("0x") || Text.starts_with("0X")))
    return false;
  Text.remove_prefix(2);
  while (Text.size() > 1 && Text.front() == '0')
    Text.remove_prefix(1);
  if (Text.empty() || Text.size() > 2 * sizeof Value.ByteReg)
    return false;
  TXMMFPURegValue Read{};
  size_t Nibble = 0;
  for (size_t Index = Text.size(); Index-- > 0; ++Nibble) {
    const int Digit = HexDigitValue(Text[Index]);
    if (Digit < 0)
      return false;
    Read.ByteReg[Nibble / 2] = static_cast<Byte>(Read.ByteReg[Nibble / 2] | (Digit << (4 * (Nibble % 2))));
  }
  Value = Read;
  return true;
}

/// Writes a decimal number of up to 128 bits into Bytes, least significant
/// byte first (GDB prints uint128 in decimal in natural format).
bool ReadDecimalBytes(std::string_view Text, TXMMFPURegValue& Value) {
  if (Text.empty())
    return false;
  TXMMFPURegValue Read{};
  for (char Digit : Text) {
    if (Digit < '0' || Digit > '9')
      return false;
    unsigned Carry = static_cast<unsigned>(Digit - '0');
    for (Byte& Part : Read.ByteReg) {
      const unsigned Product = Part * 10u + Carry;
      Part = static_cast<Byte>(Product & 0xff);
      Carry = Product >> 8;
    }
    if (Carry != 0)
      return false;
  }
  Value = Read;
  return true;
}

/// The value of the field called Name among the top-level fields of a GDB
/// aggregate "{a = 1, b = {2, 3}, c = 4}", or nothing.
std::optional<std::string_view> AggregateField(std::string_view Aggregate, std::string_view Name) {
  if (Aggregate.size() < 2 || Aggregate.front() != '{' || Aggregate.back() != '}')
    return std::nullopt;
  const std::string_view Inner = Aggregate.substr(1, Aggregate.size() - 2);
  size_t FieldStart = 0;
  int Depth = 0;
  for (size_t Index = 0; Index <= Inner.size(); ++Index) {
    const char Letter = Index < Inner.size() ? Inner[Index] : ',';
    if (Letter == '{') {
      ++Depth;
      continue;
    }
    if (Letter == '}') {
      --Depth;
      continue;
    }
    if (Letter != ',' || (Depth != 0 && Index < Inner.size()))
      continue;
    const std::string_view Field = TrimBlanks(Inner.substr(FieldStart, Index - FieldStart));
    FieldStart = Index + 1;
    const size_t Equals = Field.find(" = ");
    if (Equals != std::string_view::npos && TrimBlanks(Field.substr(0, Equals)) == Name)
      return TrimBlanks(Field.substr(Equals + 3));
  }
  return std::nullopt;
}

/// Fills Value from a byte vector "{0x44, 0x33, 0x0 <repeats 14 times>}"
/// (hexadecimal or signed decimal elements, GDB's repeat compression).
bool ReadByteVector(std::string_view Vector, TXMMFPURegValue& Value) {
  if (Vector.size() < 2 || Vector.front() != '{' || Vector.back() != '}')
    return false;
  std::string_view Elements = Vector.substr(1, Vector.size() - 2);
  constexpr std::string_view Repeats = " <repeats ";
  TXMMFPURegValue Read{};
  size_t Next = 0;
  while (!Elements.empty() && Next < sizeof Read.ByteReg) {
    const size_t Comma = Elements.find(',');
    std::string_view Element = TrimBlanks(Elements.substr(0, Comma));
    Elements = Comma == std::string_view::npos ? std::string_view() : Elements.substr(Comma + 1);
    Integer Times = 1;
    const size_t RepeatsAt = Element.find(Repeats);
    if (RepeatsAt != std::string_view::npos) {
      std::string_view Count = Element.substr(RepeatsAt + Repeats.size());
      Count = Count.substr(0, Count.find(' '));
      Times = MIStrToIntDef(Count, 1);
      Element = Element.substr(0, RepeatsAt);
    }
    const Byte Part = static_cast<Byte>(MIStrToIntDef(Element, 0) & 0xff);
    for (Integer Copy = 0; Copy < Times && Next < sizeof Read.ByteReg; ++Copy)
      Read.ByteReg[Next++] = Part;
  }
  Value = Read;
  return true;
}

/// The byte vector field of a GDB aggregate: v16_int8 for a 128-bit
/// register, or the first field named v<N>_int8 otherwise.
std::optional<std::string_view> ByteVectorField(std::string_view Aggregate) {
  if (auto Field = AggregateField(Aggregate, "v16_int8"))
    return Field;
  for (std::string_view Name : {"v32_int8", "v64_int8", "v8_int8"})
    if (auto Field = AggregateField(Aggregate, Name))
      return Field;
  return std::nullopt;
}

/// The parenthesised byte list "(0x1, 0x2, ...)" of other debuggers: one
/// byte per element from byte 0 up; elements beyond the 16th are ignored.
void ReadParenthesizedBytes(std::string_view Text, TXMMFPURegValue& Value) {
  const size_t Close = Text.find(')');
  if (Close == std::string_view::npos)
    return;
  std::string_view Elements = Text.substr(1, Close - 1);
  for (size_t Next = 0; !Elements.empty() && Next < sizeof Value.ByteReg; ++Next) {
    const size_t Comma = Elements.find(',');
    Value.ByteReg[Next] = static_cast<Byte>(MIStrToIntDef(TrimBlanks(Elements.substr(0, Comma)), 0) & 0xff);
    Elements = Comma == std::string_view::npos ? std::string_view() : Elements.substr(Comma + 1);
  }
}

void WriteLow64(TXMMFPURegValue& Value, UInt64 Number) {
  for (size_t Index = 0; Index < 8; ++Index)
    Value.ByteReg[Index] = static_cast<Byte>(Number >> (8 * Index));
}

/// The values of "register-values" at the cursor, for the positions asked
/// for: FIds empty means one register (FId), whose value is read only from
/// the first element. Convert(Text, Position) reads one value.
template <typename TValue, typename TConvert>
bool ReadRegisterValues(TMIScanner& Scanner, const TIntegerArray& Ids, Integer Id, TValue& Single,
                        std::vector<TValue>& Values, TConvert&& Convert) {
  std::string_view List;
  if (!FindResult(Scanner, "register-values", List))
    return false;
  if (Ids.empty()) {
    if (List.empty())
      return true;
    TMIScanner::TNestedScan InList(Scanner, List);
    TMIScanner::TNestedScan InFirst(Scanner, Scanner.ReadValue());
    if (Scanner.FindInteger("number", -1) == Id)
      Single = Convert(Scanner.FindValue("value"), 0);
    return true;
  }
  std::vector<TValue> Read;
  ForEachElement(Scanner, List, [&](std::string_view Element) {
    if (Element.empty() || Read.size() >= Ids.size())
      return;
    const Integer Number = Scanner.FindInteger("number", -1);
    if (Number == -1 || Number != Ids[Read.size()])
      return;
    Read.push_back(Convert(Scanner.FindValue("value"), static_cast<Integer>(Read.size())));
  });
  Values = std::move(Read);
  return true;
}

} // namespace

UInt64 ReadGeneralRegisterValue(std::string_view Text, bool FlagsRule) {
  if (FlagsRule) {
    if (Text.size() > 1 && Text.front() == '{' && Text.back() == '}')
      Text = Text.substr(1, Text.size() - 2);
    Text = Text.substr(0, Text.find(','));
  }
  if (IsFlagList(Text)) {
    // GDB prints eflags as its set flags in natural format; bit 1 of eflags
    // is reserved and always set, but never named.
    int Known = 0;
    const UInt64 Bits = ReadFlagNames(Text, EFlagsBits, Known);
    return Known > 0 ? Bits | 0x2 : 0;
  }
  return MIStrToUInt64Def(Text, 0);
}

TXMMFPURegValue ParseVectorValue(std::string_view Text, const TXMMFPURegValue& Default) {
  TXMMFPURegValue Value = Default;
  Text = TrimBlanks(Text);
  if (Text.starts_with('(')) {
    ReadParenthesizedBytes(Text, Value);
    return Value;
  }
  if (Text.starts_with('{')) {
    // GDB 13 prints an SSE register as a union of vector views. uint128 is
    // exact in every format; the byte vector serves where it is missing.
    if (auto Whole = AggregateField(Text, "uint128"))
      if (ReadHexBytes(*Whole, Value) || ReadDecimalBytes(*Whole, Value))
        return Value;
    if (auto Bytes = ByteVectorField(Text))
      ReadByteVector(*Bytes, Value);
    return Value;
  }
  if (IsFlagList(Text)) {
    int Known = 0;
    WriteLow64(Value, ReadFlagNames(Text, MXCSRBits, Known));
    return Value;
  }
  // A raw x87 value has 20 hexadecimal digits: all 10 bytes are kept.
  if (ReadHexBytes(Text, Value))
    return Value;
  WriteLow64(Value, MIStrToUInt64Def(Text, 0));
  return Value;
}

bool DecodeDataDisassemble(TDataDisassembleResult& Disassembly, TMIScanner& Scanner) {
  std::string_view Instructions;
  if (!FindResult(Scanner, "asm_insns", Instructions))
    return false;
  TGDBDisassembleDataArray Data;
  // The form follows the reply: GDB answers a source request for code
  // without line information with plain instructions.
  const bool SourceForm = !Instructions.empty() && Instructions.front() != '{';
  if (!SourceForm) {
    ReadInstructions(Scanner, Instructions, Data, 0, std::string());
  } else {
    TMIScanner::TNestedScan InInstructions(Scanner, Instructions);
    for (std::string_view SourceLine = TakeNext(Scanner, "src_and_asm_line"); !SourceLine.empty();
         SourceLine = TakeNext(Scanner, "src_and_asm_line")) {
      TMIScanner::TNestedScan InSourceLine(Scanner, SourceLine);
      const Integer Line = Scanner.FindInteger("line", 0);
      // The full name where told, as stops report it.
      std::string File(Scanner.FindValue("fullname"));
      if (File.empty())
        File = Scanner.FindValue("file");
      ReadInstructions(Scanner, Scanner.FindValue("line_asm_insn"), Data, Line, std::move(File));
    }
  }
  Disassembly.FData = std::move(Data);
  return true;
}

bool DecodeDataListRegisterNames(TDataListRegisterNamesResult& Names, TMIScanner& Scanner) {
  std::string_view List;
  if (!FindResult(Scanner, "register-names", List))
    return false;
  Names.FNames.clear();
  // Empty names keep their place, so that positions stay register numbers.
  ForEachElement(Scanner, List, [&](std::string_view Name) { Names.FNames.emplace_back(Name); });
  return true;
}

bool DecodeDataListRegisterValues(TDataListRegisterValuesResult& Registers, TMIScanner& Scanner) {
  const bool Single = Registers.FIds.empty();
  const Integer CpsrIndex = Registers.FCpsrIndex;
  return ReadRegisterValues(Scanner, Registers.FIds, Registers.FId, Registers.FValue, Registers.FValues,
                            [&](std::string_view Text, Integer Position) {
                              const bool FlagsRule = Single ? CpsrIndex != -1 : Position == CpsrIndex;
                              return ReadGeneralRegisterValue(Text, FlagsRule);
                            });
}

template <typename TResult>
bool DecodeDataListVectorRegisterValues(TResult& Registers, TMIScanner& Scanner) {
  return ReadRegisterValues(Scanner, Registers.FIds, Registers.FId, Registers.FValue, Registers.FValues,
                            [](std::string_view Text, Integer) { return ParseVectorValue(Text, DummyXMMRegValue); });
}

template bool DecodeDataListVectorRegisterValues(TDataListXMMRegisterValuesResult&, TMIScanner&);
template bool DecodeDataListVectorRegisterValues(TDataListFPURegisterValuesResult&, TMIScanner&);

bool DecodeDataReadMemory(TDataReadMemoryResult& Memory, TMIScanner& Scanner) {
  const Integer Count = Scanner.FindInteger("nr-bytes", 0);
  if (Count <= 0)
    return true;
  std::string_view Rows;
  if (!FindResult(Scanner, "memory", Rows))
    return false;
  TMIScanner::TNestedScan InRows(Scanner, Rows);
  std::string_view Data;
  if (!FindResult(Scanner, "data", Data))
    return false;
  // At most nr-bytes bytes, and no more than the data list holds: a count
  // from the reply must not size the buffer on its own.
  TDataByteArray Bytes;
  TMIScanner::TNestedScan InData(Scanner, Data);
  while (!Scanner.AtEnd() && Bytes.size() < static_cast<size_t>(Count)) {
    Bytes.push_back(static_cast<Byte>(MIStrToIntDef(Scanner.ReadValue(), 0) & 0xff));
    if (Scanner.AtEnd() || Scanner.Char() != ',')
      break;
    Scanner.NextChar();
  }
  Memory.FData = std::move(Bytes);
  return true;
}

bool DecodeDataReadMemoryBytes(TDataReadMemoryResult& Memory, TMIScanner& Scanner) {
  std::string_view Blocks;
  if (!FindResult(Scanner, "memory", Blocks))
    return false;
  TMIScanner::TNestedScan InBlocks(Scanner, Blocks);
  TMIScanner::TNestedScan InFirst(Scanner, Scanner.ReadValue());
  std::string_view Contents;
  if (!FindResult(Scanner, "contents", Contents))
    return false;
  // GDB skips what it cannot read: a first block that starts later than the
  // address asked for means nothing could be read there.
  if (Scanner.FindUInt64("offset", 0) != 0) {
    Memory.FData.clear();
    return true;
  }
  TDataByteArray Bytes(Contents.size() / 2);
  for (size_t Index = 0; Index < Bytes.size(); ++Index) {
    const int High = HexDigitValue(Contents[2 * Index]);
    const int Low = HexDigitValue(Contents[2 * Index + 1]);
    Bytes[Index] = High < 0 || Low < 0 ? 0 : static_cast<Byte>(High * 16 + Low);
  }
  Memory.FData = std::move(Bytes);
  return true;
}

bool DecodeDataInfoLine(TDataInfoLineResult& Info, TMIScanner& Scanner) {
  std::string_view Start;
  std::string_view End;
  if (!FindResult(Scanner, "start", Start) || !FindResult(Scanner, "end", End))
    return false;
  Info.FStartAddr = MIStrToUInt64Def(Start, 0);
  Info.FEndAddr = MIStrToUInt64Def(End, 0);
  Info.FLine = Scanner.FindInteger("line", 0);
  Info.FSource = std::string(Scanner.FindValue("file"));
  return Info.FEndAddr != 0 && Info.FLine != -1;
}

} // namespace midebug::decode
