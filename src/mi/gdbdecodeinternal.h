#pragma once
/// \file
/// Helpers shared by the result decoders of gdbdecode.cpp and
/// gdbdecodedata.cpp; not part of the parser's interface.

#include "mi/gdbresult.h"
#include "mi/miscanner.h"

#include <string_view>
#include <type_traits>

namespace midebug::decode {

/// Runs Decode when Result is of the class Decode fills. A result object of
/// another class answers false, as a reply that cannot be placed: each
/// decoder then reads its own class only.
template <typename TResult, typename... TArgs>
bool DecodeAs(TGDBResult& Result, TMIScanner& Scanner, bool (*Decode)(TResult&, TMIScanner&, TArgs...),
              std::type_identity_t<TArgs>... Args) {
  auto* Typed = dynamic_cast<TResult*>(&Result);
  return Typed != nullptr && Decode(*Typed, Scanner, Args...);
}

/// True when a result called Name stands among the results at the cursor,
/// with its value in Value (possibly empty, as in "threads=[]"). The cursor
/// does not move.
bool FindResult(TMIScanner& Scanner, std::string_view Name, std::string_view& Value);

/// The value of the next result called Name at or after the cursor, leaving
/// the cursor after it (and its comma); empty with the cursor unmoved when
/// there is none. Walks a run of same-named results ("frame", "child") and,
/// unlike FindValue, always moves on, so a run that does not start at the
/// cursor cannot be read again and again.
std::string_view TakeNext(TMIScanner& Scanner, std::string_view Name);

/// Calls Visit(Element) for each element of the list whose inner text is
/// ListText. A non-empty element is scanned nested while Visit runs, so
/// Visit reads its results at the cursor. Stops at the first element that
/// is not followed by a comma.
template <typename TVisit>
void ForEachElement(TMIScanner& Scanner, std::string_view ListText, TVisit&& Visit) {
  if (ListText.empty())
    return;
  TMIScanner::TNestedScan InList(Scanner, ListText);
  while (!Scanner.AtEnd()) {
    const std::string_view Element = Scanner.ReadValue();
    if (Element.empty()) {
      Visit(Element);
    } else {
      TMIScanner::TNestedScan InElement(Scanner, Element);
      Visit(Element);
    }
    if (Scanner.AtEnd() || Scanner.Char() != ',')
      return;
    Scanner.NextChar();
  }
}

/// The decoders of disassembly, registers, memory and line information.
bool DecodeDataDisassemble(TDataDisassembleResult& Disassembly, TMIScanner& Scanner);
bool DecodeDataListRegisterNames(TDataListRegisterNamesResult& Names, TMIScanner& Scanner);
bool DecodeDataListRegisterValues(TDataListRegisterValuesResult& Registers, TMIScanner& Scanner);
/// TResult is TDataListXMMRegisterValuesResult or
/// TDataListFPURegisterValuesResult: both read the same 16-byte values.
template <typename TResult>
bool DecodeDataListVectorRegisterValues(TResult& Registers, TMIScanner& Scanner);
bool DecodeDataReadMemory(TDataReadMemoryResult& Memory, TMIScanner& Scanner);
bool DecodeDataReadMemoryBytes(TDataReadMemoryResult& Memory, TMIScanner& Scanner);
bool DecodeDataInfoLine(TDataInfoLineResult& Info, TMIScanner& Scanner);

/// Reads an x87 or SSE register value into its 16 bytes, starting from
/// Default: GDB's nested brace groups ("{..., v16_int8 = {...}, uint128 =
/// 0x...}"), a parenthesised byte list "(0x1, 0x2)", a bracketed list of
/// MXCSR flag names, or a number (hexadecimal numbers of up to 32 digits
/// fill the bytes little-endian, so an 80-bit x87 value keeps all 10).
TXMMFPURegValue ParseVectorValue(std::string_view Text, const TXMMFPURegValue& Default);

/// Reads a general register value; FlagsRule trims a flags register value
/// that the debugger wraps in braces with extra fields ("{0x60000000, N=0}").
UInt64 ReadGeneralRegisterValue(std::string_view Text, bool FlagsRule);

} // namespace midebug::decode
