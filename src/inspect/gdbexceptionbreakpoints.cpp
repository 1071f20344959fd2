// The process's own breakpoints on the language runtimes, and how a hit on
// one is read: argument registers, then the strings and objects they point
// at.

#include "inspect/gdbexceptionbreakpoints.h"
#include "inspect/gdbbreakpointtable.h"
#include "process/gdbprocess.h"

#include <algorithm>
#include <cstring>

namespace midebug {

namespace {

/// A string is read in pieces of this many bytes that never cross a page,
/// so the piece holding its end is readable whenever the string is.
constexpr UInt64 StringChunk = 64;
constexpr UInt64 PageSize = 4096;
/// A name or message longer than this is not one.
constexpr size_t MaxStringLength = 4096;

/// "GNUCC++\0" read as a number (its first letter highest), the class of an
/// exception the C++ runtime threw itself.
constexpr UInt64 GNUCPPExceptionClass = 0x474E5543432B2B00;
/// libstdc++ on AMD64 keeps the thrown type 80 bytes before the unwind
/// header that __cxa_begin_catch receives.
constexpr UInt64 CXAExceptionTypeOffset = 80;
/// The thrown object follows that header.
constexpr UInt64 CXAUnwindHeaderSize = 32;

/// Free Pascal 3.2.2's class layout on 64-bit targets: the object starts
/// with its class's method table, which holds the parent's table by
/// reference at 16 and the class name (a short string) at 24; an Exception
/// keeps its message (an ansistring, zero-terminated) right after the
/// method-table pointer.
constexpr UInt64 FPCParentRefOffset = 16;
constexpr UInt64 FPCClassNameOffset = 24;
constexpr UInt64 FPCMessageOffset = 8;
/// Deep enough for any class tree a program has.
constexpr int MaxClassDepth = 64;

struct TRuntimeBreakpoint {
  const char* Function;
  TGDBLanguage Language;
  bool LinuxOnly;
  TIntfPtr<IGDBBreakpointListener> (*Make)(TGDBProcess& Process, TGDBLanguage Language);
};

template <class TBreakpoint>
TIntfPtr<IGDBBreakpointListener> Make(TGDBProcess& Process, TGDBLanguage Language) {
  return TIntfPtr<IGDBBreakpointListener>(new TBreakpoint(Process, Language));
}

/// In the order they are placed; the index is the table's slot. Stock
/// runtimes have no notifier functions: a program may define them.
const std::array<TRuntimeBreakpoint, 5> RuntimeBreakpoints = {{
    {"_DbgExcNotify", glPascal, false, Make<TExceptionBreakpoint>},
    {"_CPPDbgExcNotify", glCPP, false, Make<TExceptionBreakpoint>},
    {"__cxa_throw", glCPP, true, Make<TCXAThrowBreakpoint>},
    {"__cxa_begin_catch", glCPP, true, Make<TCXACatchBreakpoint>},
    {"fpc_raiseexception", glPascal, true, Make<TFPCRaiseBreakpoint>},
}};

/// The C++ runtime's own stop is in a shared library; a program's stub
/// of the same name (or a static copy of the runtime) is not reported.
bool InRuntimeLibrary(const TGDBException& E) { return E.Location.Source.find("/lib") != std::string::npos; }

} // namespace

void TGDBProcess::InstallExceptionBreakpoints() {
  const bool LLDB = FKernel->IsLLDB();
  const bool Linux = FKernel->IsLinux();
  if (!LLDB && !Linux)
    return;
  for (size_t Slot = 0; Slot < RuntimeBreakpoints.size(); ++Slot) {
    const TRuntimeBreakpoint& Runtime = RuntimeBreakpoints[Slot];
    TIntfPtr<IGDBBreakpointListener>& Installed = FBreakpoints->ExceptionSlot(Slot);
    if (Installed || (Runtime.LinuxOnly && !Linux))
      continue;
    TBreakInsertResult Inserted;
    if (!FRequests.Ask(Inserted, [&](TGDBCommand& Builder, std::string& Token) {
          return Builder.CreateBreakInsertCommand(Token, Runtime.Function, false, true);
        }))
      continue;
    Installed = Runtime.Make(*this, Runtime.Language);
    TAddressArray Addresses = Inserted.FAddresses;
    if (Addresses.empty() && !Inserted.FPending)
      Addresses.push_back(Inserted.FLocation.Address);
    FBreakpoints->Add(Inserted.FBreakpoint, Installed, bkException, Addresses);
  }
}

bool TExceptionBreakpoint::ReadArguments(TUInt64Array& Values, size_t Count) {
  static const TIntegerArray ARMIds = {0, 1, 2, 3, 4};
  static const TIntegerArray LLDBIds = {4, 5, 3, 2, 8};
  static const TIntegerArray GDBIds = {5, 4, 3, 2, 8};
  const bool LLDB = FProcess.IsLLDB();
  const TIntegerArray& All = !LLDB ? GDBIds : (FProcess.CPU() == gcARM32 || FProcess.CPU() == gcARM64) ? ARMIds : LLDBIds;
  const TIntegerArray Ids(All.begin(), All.begin() + static_cast<std::ptrdiff_t>(std::min(Count, All.size())));
  TDataListRegisterValuesResult Registers(Ids);
  if (!FProcess.Requests().Ask(Registers, [&](TGDBCommand& Builder, std::string& Token) {
        return Builder.CreateDataListRegisterValues(Token, Ids, dvfHex);
      }))
    return false;
  if (Registers.FValues.size() < Ids.size())
    return false;
  Values.assign(Registers.FValues.begin(), Registers.FValues.begin() + static_cast<std::ptrdiff_t>(Ids.size()));
  return true;
}

namespace {

/// Count bytes at Address, through the process's memory cache; empty when
/// unreadable.
TDataByteArray ReadBytes(TGDBProcess& Process, UInt64 Address, Integer Count) {
  if (Address == 0 || Count <= 0)
    return {};
  TDataByteArray Bytes(static_cast<size_t>(Count));
  const Integer Read = Process.GetMemory(Address, Bytes.data(), Count);
  if (Read <= 0)
    return {};
  Bytes.resize(static_cast<size_t>(Read));
  return Bytes;
}

} // namespace

bool TExceptionBreakpoint::ReadWord(UInt64 Address, UInt64& Value) {
  const TDataByteArray Bytes = ReadBytes(FProcess, Address, 8);
  if (Bytes.size() < 8)
    return false;
  Value = 0;
  for (size_t Index = 8; Index-- > 0;)
    Value = (Value << 8) | Bytes[Index];
  return true;
}

std::string TExceptionBreakpoint::ReadPChar(UInt64 Address) {
  std::string Text;
  while (Address != 0 && Text.size() < MaxStringLength) {
    const UInt64 Chunk = std::min(StringChunk, PageSize - Address % PageSize);
    const TDataByteArray Bytes = ReadBytes(FProcess, Address, static_cast<Integer>(Chunk));
    if (Bytes.empty())
      return {};
    const auto End = std::find(Bytes.begin(), Bytes.end(), Byte{0});
    Text.append(Bytes.begin(), End);
    if (End != Bytes.end())
      return Text;
    Address += Bytes.size();
  }
  return {};
}

std::string TExceptionBreakpoint::ReadString(UInt64 Address) {
  // The length byte and what follows it in its page; the rest, if the
  // string goes on into the next page, in a second read.
  const UInt64 InPage = std::min<UInt64>(256, PageSize - Address % PageSize);
  TDataByteArray Bytes = ReadBytes(FProcess, Address, static_cast<Integer>(InPage));
  if (Bytes.empty())
    return {};
  const size_t Length = Bytes[0];
  if (Bytes.size() <= Length) {
    const TDataByteArray Rest =
        ReadBytes(FProcess, Address + Bytes.size(), static_cast<Integer>(Length + 1 - Bytes.size()));
    Bytes.insert(Bytes.end(), Rest.begin(), Rest.end());
  }
  const auto Begin = Bytes.begin() + 1;
  const auto End = Begin + static_cast<std::ptrdiff_t>(std::min(Length, Bytes.size() - 1));
  return std::string(Begin, std::find(Begin, End, Byte{0}));
}

bool TExceptionBreakpoint::CallerLocation(TGDBLocation& Location) {
  TStackListFramesResult Frames;
  if (!FProcess.Requests().Ask(Frames, [](TGDBCommand& Builder, std::string& Token) {
        return Builder.CreateStackListFramesCommand(Token, 1, 1);
      }))
    return false;
  if (Frames.FStackFrames.size() < 2)
    return false;
  Location = Frames.FStackFrames[1].Location;
  return true;
}

bool TExceptionBreakpoint::GetExceptionInfo(TGDBException& E) {
  TUInt64Array Arguments;
  if (!ReadArguments(Arguments, 5)) {
    E = DummyException;
    return true;
  }
  E.Kind = static_cast<Integer>(static_cast<uint32_t>(Arguments[0]));
  E.EObject = Arguments[1];
  E.Location.Address = Arguments[3] != 0 ? Arguments[3] : Arguments[4];
  E.Name = FLanguage == glPascal ? ReadString(Arguments[2]) : ReadPChar(Arguments[2]);
  return true;
}

bool TCXAThrowBreakpoint::GetExceptionInfo(TGDBException& E) {
  if (!InRuntimeLibrary(E))
    return false;
  // r11 holds __cxa_throw's own address here, not the throw's: the place is
  // where the program called it.
  TUInt64Array Arguments;
  if (!ReadArguments(Arguments, 2)) {
    E = DummyException;
    return true;
  }
  E = DummyException;
  E.Kind = ExceptionKindThrow;
  E.EObject = Arguments[0];
  CallerLocation(E.Location);
  UInt64 MangledName = 0;
  if (ReadWord(Arguments[1] + 8, MangledName))
    E.Name = ReadPChar(MangledName);
  return true;
}

bool TCXACatchBreakpoint::GetExceptionInfo(TGDBException& E) {
  if (!InRuntimeLibrary(E))
    return false;
  E = DummyException;
  if (CallerLocation(E.Location))
    E.Kind = ExceptionKindCatch;
  // The type caught, when the runtime threw the exception itself.
  TUInt64Array Arguments;
  UInt64 ExceptionClass = 0, TypeInfo = 0, MangledName = 0;
  if (!ReadArguments(Arguments, 1) || Arguments[0] <= CXAExceptionTypeOffset ||
      !ReadWord(Arguments[0], ExceptionClass) || ExceptionClass != GNUCPPExceptionClass)
    return true;
  E.EObject = Arguments[0] + CXAUnwindHeaderSize;
  if (ReadWord(Arguments[0] - CXAExceptionTypeOffset, TypeInfo) && ReadWord(TypeInfo + 8, MangledName))
    E.Name = ReadPChar(MangledName);
  return true;
}

bool TFPCRaiseBreakpoint::GetExceptionInfo(TGDBException& E) {
  TUInt64Array Arguments;
  E = DummyException;
  if (!ReadArguments(Arguments, 2))
    return true;
  E.Kind = ExceptionKindRaise;
  E.EObject = Arguments[0];
  if (!CallerLocation(E.Location))
    E.Location.Address = Arguments[1];
  UInt64 ClassTable = 0, NameAddress = 0;
  if (!ReadWord(E.EObject, ClassTable) || !ReadWord(ClassTable + FPCClassNameOffset, NameAddress))
    return true;
  E.Name = ReadString(NameAddress);
  // An Exception, or a class derived from it, carries a message.
  for (int Depth = 0; ClassTable != 0 && Depth < MaxClassDepth; ++Depth) {
    UInt64 ClassName = 0, ParentRef = 0;
    if (!ReadWord(ClassTable + FPCClassNameOffset, ClassName))
      break;
    if (ReadString(ClassName) == "Exception") {
      UInt64 Message = 0;
      if (ReadWord(E.EObject + FPCMessageOffset, Message))
        E.Desc = ReadPChar(Message);
      break;
    }
    if (!ReadWord(ClassTable + FPCParentRefOffset, ParentRef) || ParentRef == 0 || !ReadWord(ParentRef, ClassTable))
      break;
  }
  return true;
}

} // namespace midebug
