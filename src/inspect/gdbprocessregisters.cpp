// Registers: the register numbers of a process, and the reads and writes of
// the general, x87 and SSE registers of its current thread.

#include "inspect/gdbregisterids.h"

#include "mi/gdbregisters.h"
#include "process/gdbprocess.h"

#include <cmath>
#include <cstdio>
#include <cstring>

namespace midebug {

namespace {

/// The first eight of the x87 table are the stack st0 to st7, the first
/// sixteen of the SSE table xmm0 to xmm15; the rest are control words.
constexpr size_t X87StackCount = 8;
constexpr size_t XMMDataCount = 16;

bool Same(UInt64 A, UInt64 B) { return A == B; }
bool Same(const TXMMFPURegValue& A, const TXMMFPURegValue& B) { return XMMRegisterEqual(A, B); }

UInt64 Low64(const TXMMFPURegValue& Value) {
  UInt64 Number = 0;
  for (size_t Index = 0; Index < 8; ++Index)
    Number |= static_cast<UInt64>(Value.ByteReg[Index]) << (8 * Index);
  return Number;
}

/// "{1, -2, ...}": the 16 bytes as GDB's C parser assigns them to v16_int8.
std::string SignedByteList(const TXMMFPURegValue& Value) {
  std::string List = "{";
  for (size_t Index = 0; Index < sizeof Value.ByteReg; ++Index) {
    if (Index != 0)
      List += ", ";
    List += std::to_string(static_cast<int>(static_cast<int8_t>(Value.ByteReg[Index])));
  }
  return List + "}";
}

} // namespace

bool TGDBRegisterIds::X87ValueText(const TXMMFPURegValue& Value, std::string& Text, std::string& Why) {
  const UInt64 Mantissa = Low64(Value);
  const unsigned SignExponent = Value.ByteReg[8] | (Value.ByteReg[9] << 8);
  const int Exponent = static_cast<int>(SignExponent & 0x7fff);
  const bool Negative = (SignExponent & 0x8000) != 0;
  const bool IntegerBit = (Mantissa >> 63) != 0;
  if (Exponent == 0x7fff) {
    if (Mantissa == UInt64{1} << 63) {
      Text = Negative ? "-1.0L/0" : "1.0L/0";
      return true;
    }
    Why = "a NaN cannot be written to an x87 register";
    return false;
  }
  if (Exponent != 0 && !IntegerBit) {
    Why = "an unnormal cannot be written to an x87 register";
    return false;
  }
  if (Exponent == 0 && IntegerBit) {
    Why = "a pseudo-denormal cannot be written to an x87 register";
    return false;
  }
  // The mantissa's 64 bits scaled by the exponent: exact in an x87 long
  // double, and 21 significant digits with the "L" suffix bring every bit
  // back (GDB rounds an unsuffixed constant through a double).
  const int Scale = (Exponent == 0 ? 1 : Exponent) - 16383 - 63;
  long double Number = std::ldexp(static_cast<long double>(Mantissa), Scale);
  if (Negative)
    Number = -Number;
  char Buffer[64];
  std::snprintf(Buffer, sizeof Buffer, "%.20LeL", Number);
  Text = Buffer;
  return true;
}

std::string TGDBRegisterIds::LastError() {
  std::lock_guard Guard(FLock);
  return FLastError;
}

void TGDBRegisterIds::SetLastError(const std::string& Message) {
  {
    std::lock_guard Guard(FLock);
    FLastError = Message;
  }
  if (!Message.empty())
    FProcess.NotifyLogEvent(CreateGDBLogEvent(etError, Message, -1));
}

bool TGDBRegisterIds::GetRegisterIds() {
  {
    std::lock_guard Guard(FLock);
    if (!FRegisterIds.empty())
      return true;
  }
  TDataListRegisterNamesResult Names(FProcess.CPU(), FProcess.Requests().Platform());
  if (!FProcess.Requests().Ask(Names, [](TGDBCommand& Builder, std::string& Token) {
        return Builder.CreateDataListRegisterNames(Token, {});
      }))
    return !Names.FTimeOut;
  std::lock_guard Guard(FLock);
  FRegisterIds = Names.GetRegisterIds();
  FFPURegisterIds = Names.GetFPURegisterIds();
  FXMMRegisterIds = Names.GetXMMRegisterIds();
  return true;
}

template <class TResult, class TValue, class TList, class TSingle>
bool TGDBRegisterIds::Read(const TIntegerArray TGDBRegisterIds::*IdList, std::vector<TValue>& Values, TList List,
                           TSingle Single) {
  Values.clear();
  if (!GetRegisterIds())
    return false;
  TIntegerArray Ids;
  {
    std::lock_guard Guard(FLock);
    Ids = this->*IdList;
  }
  if (Ids.empty())
    return false;
  TResult All(Ids);
  if (FProcess.Requests().Ask(All, List, Ids)) {
    Values = std::move(All.FValues);
    Values.resize(Ids.size());
    return true;
  }
  // A debugger that did not answer in time would not answer each register
  // either: the IDE has been asked about it once already.
  if (All.FTimeOut)
    return false;
  Values.assign(Ids.size(), TValue{});
  bool Any = false;
  for (size_t Index = 0; Index < Ids.size(); ++Index)
    Any = Single(Ids[Index], Index + 1 == Ids.size(), Values[Index]) || Any;
  return Any;
}

bool TGDBRegisterIds::GetRegisters(TUInt64Array& Values) {
  return Read<TDataListRegisterValuesResult>(
      &TGDBRegisterIds::FRegisterIds, Values,
      [](TGDBCommand& Builder, std::string& Token, const TIntegerArray& Ids) {
        return Builder.CreateDataListRegisterValues(Token, Ids, dvfHex);
      },
      [this](Integer Id, bool Last, UInt64& Value) {
        // Only the last of the list may be the flags register that ARM
        // debuggers wrap in braces.
        TDataListRegisterValuesResult One(Id, Last);
        const bool Read = FProcess.Requests().Ask(
            One, [](TGDBCommand& Builder, std::string& Token, Integer Number) {
              return Builder.CreateDataListRegisterValues(Token, Number, dvfHex);
            },
            Id);
        if (Read)
          Value = One.FValue;
        return Read;
      });
}

bool TGDBRegisterIds::GetFPURegisters(TFPURegValueArray& Values) {
  return Read<TDataListFPURegisterValuesResult>(
      &TGDBRegisterIds::FFPURegisterIds, Values,
      [](TGDBCommand& Builder, std::string& Token, const TIntegerArray& Ids) {
        return Builder.CreateDataListFPURegisterValues(Token, Ids, dvfHex);
      },
      [this](Integer Id, bool, TXMMFPURegValue& Value) {
        TDataListFPURegisterValuesResult One(Id);
        const bool Read = FProcess.Requests().Ask(
            One, [](TGDBCommand& Builder, std::string& Token, Integer Number) {
              return Builder.CreateDataListFPURegisterValues(Token, Number, dvfHex);
            },
            Id);
        if (Read)
          Value = One.FValue;
        return Read;
      });
}

bool TGDBRegisterIds::GetXMMRegisters(TXMMRegValueArray& Values) {
  return Read<TDataListXMMRegisterValuesResult>(
      &TGDBRegisterIds::FXMMRegisterIds, Values,
      [](TGDBCommand& Builder, std::string& Token, const TIntegerArray& Ids) {
        return Builder.CreateDataListXMMRegisterValues(Token, Ids, dvfHex);
      },
      [this](Integer Id, bool, TXMMFPURegValue& Value) {
        TDataListXMMRegisterValuesResult One(Id);
        const bool Read = FProcess.Requests().Ask(
            One, [](TGDBCommand& Builder, std::string& Token, Integer Number) {
              return Builder.CreateDataListXMMRegisterValues(Token, Number, dvfHex);
            },
            Id);
        if (Read)
          Value = One.FValue;
        return Read;
      });
}

// --- Writes ------------------------------------------------------------------

template <class TValue, class TWrite>
bool TGDBRegisterIds::Write(const TIntegerArray TGDBRegisterIds::*IdList, const std::vector<TValue>& Old,
                            const std::vector<TValue>& New, TWrite WriteOne) {
  SetLastError("");
  if (!GetRegisterIds()) {
    SetLastError("the debugger did not list its registers in time");
    return false;
  }
  TIntegerArray Ids;
  {
    std::lock_guard Guard(FLock);
    Ids = this->*IdList;
  }
  if (Ids.empty())
    return true;
  if (Old.size() != Ids.size() || New.size() != Ids.size()) {
    SetLastError("register write: " + std::to_string(Ids.size()) + " values expected, got " +
                 std::to_string(Old.size()) + " and " + std::to_string(New.size()));
    return false;
  }
  std::vector<size_t> Changed;
  for (size_t Index = 0; Index < Ids.size(); ++Index)
    if (!Same(Old[Index], New[Index]))
      Changed.push_back(Index);
  if (Changed.empty())
    return true;
  // GDB dies of an internal error when a register is written without a
  // live thread.
  if (!FProcess.Alive() || !FProcess.Suspended() || FProcess.GetSuspendedThreadId() == -1) {
    SetLastError("register write: no stopped thread");
    return false;
  }
  bool All = true;
  for (size_t Index : Changed)
    All = WriteOne(Index, Ids[Index], New[Index]) && All;
  return All;
}

template <class TCreate, class... TArgs>
bool TGDBRegisterIds::AskWrite(TMiCommand Command, TCreate&& Create, TArgs&&... Args) {
  TGDBResult Result(Command);
  if (FProcess.Requests().Ask(Result, std::forward<TCreate>(Create), std::forward<TArgs>(Args)...))
    return true;
  SetLastError(Result.FTimeOut                ? FProcess.Requests().GetTimeOutMessage()
               : Result.FErrorMessage.empty() ? std::string("register write refused")
                                              : Result.FErrorMessage);
  return false;
}

bool TGDBRegisterIds::AskCLIWrite(const std::string& Line) {
  // LLDB's console takes a token in front of a CLI line and answers with a
  // done record under it; a refusal is an "error: " line before that.
  return AskWrite(ctCLRegisterWrite, [&](TGDBCommand& Builder, std::string& Token) {
    Builder.CreateMiCommand(ctCLRegisterWrite, Token);
    return Token + Line;
  });
}

bool TGDBRegisterIds::AskCExpression(const std::string& Expression) {
  TDataEvaluateExpressionResult Result;
  if (FProcess.Requests().Ask(Result, &TGDBCommand::CreateDataEvaluateExpressionCommand, Expression))
    return true;
  SetLastError(Result.FErrorMessage.empty() ? "register write refused: " + Expression : Result.FErrorMessage);
  return false;
}

/// Brackets writes through C expressions: the language is C from the first
/// such write until the object goes.
class TCSyntax {
public:
  explicit TCSyntax(TGDBProcess& Process) : FProcess(Process) {}
  ~TCSyntax() {
    if (FSwitched)
      SetLanguage("auto");
  }
  void Enter() {
    if (!FSwitched)
      FSwitched = SetLanguage("c");
  }

private:
  bool SetLanguage(const std::string& Language) {
    TGDBResult Result(ctGdbSet);
    return FProcess.Requests().Ask(Result, &TGDBCommand::CreateGDBSetCommand, "language", Language);
  }
  TGDBProcess& FProcess;
  bool FSwitched = false;
};

bool TGDBRegisterIds::SetRegisters(const TUInt64Array& Old, const TUInt64Array& New) {
  const std::string& Platform = FProcess.Requests().Platform();
  return Write(&TGDBRegisterIds::FRegisterIds, Old, New, [&](size_t Index, Integer Id, UInt64 Value) {
    if (FProcess.IsLLDB()) {
      std::string Unused;
      std::string Line;
      FProcess.Requests().Build(Unused, [&](TGDBCommand& Builder, std::string& Token) {
        Line = Builder.CreateDataWriteRegisterValues(Token, static_cast<Integer>(Index), Value, Platform);
        return Line;
      });
      return AskCLIWrite(Line);
    }
    return AskWrite(ctDataWriteRegisterValues, &TGDBCommand::CreateGDBDataWriteRegisterValues,
                    ctDataWriteRegisterValues, Id, Value);
  });
}

bool TGDBRegisterIds::SetFPURegisters(const TFPURegValueArray& Old, const TFPURegValueArray& New) {
  const std::string& Platform = FProcess.Requests().Platform();
  TCSyntax CSyntax(FProcess);
  return Write(&TGDBRegisterIds::FFPURegisterIds, Old, New,
               [&](size_t Index, Integer Id, const TXMMFPURegValue& Value) {
                 if (FProcess.IsLLDB()) {
                   std::string Unused;
                   std::string Line;
                   FProcess.Requests().Build(Unused, [&](TGDBCommand& Builder, std::string& Token) {
                     Line = Builder.CreateDataWriteFPURegisterValues(Token, static_cast<Integer>(Index), Value,
                                                                     Platform);
                     return Line;
                   });
                   return AskCLIWrite(Line);
                 }
                 if (Index >= X87StackCount)
                   return AskWrite(ctDataWriteFPURegisterValues, &TGDBCommand::CreateGDBDataWriteRegisterValues,
                                   ctDataWriteFPURegisterValues, Id, Low64(Value));
                 // GDB refuses a raw 80-bit number: the value goes as text.
                 std::string Text;
                 std::string Why;
                 if (!X87ValueText(Value, Text, Why)) {
                   SetLastError(Why);
                   return false;
                 }
                 CSyntax.Enter();
                 return AskCExpression("$" + std::string(FPURegisterTable(Platform).At(static_cast<Integer>(Index))) +
                                       " = " + Text);
               });
}

bool TGDBRegisterIds::SetXMMRegisters(const TXMMRegValueArray& Old, const TXMMRegValueArray& New) {
  TCSyntax CSyntax(FProcess);
  return Write(&TGDBRegisterIds::FXMMRegisterIds, Old, New,
               [&](size_t Index, Integer Id, const TXMMFPURegValue& Value) {
                 if (FProcess.IsLLDB()) {
                   std::string Unused;
                   std::string Line;
                   FProcess.Requests().Build(Unused, [&](TGDBCommand& Builder, std::string& Token) {
                     Line = Builder.CreateDataWriteXMMRegisterValues(Token, static_cast<Integer>(Index), Value);
                     return Line;
                   });
                   return AskCLIWrite(Line);
                 }
                 if (Index >= XMMDataCount)
                   return AskWrite(ctDataWriteXMMRegisterValues, &TGDBCommand::CreateGDBDataWriteRegisterValues,
                                   ctDataWriteXMMRegisterValues, Id, Low64(Value));
                 // "-data-write-register-values" writes only the low 64 bits
                 // of an SSE register.
                 CSyntax.Enter();
                 return AskCExpression("$" + std::string(XMMRegisterTable().At(static_cast<Integer>(Index))) +
                                       ".v16_int8 = " + SignedByteList(Value));
               });
}

} // namespace midebug
