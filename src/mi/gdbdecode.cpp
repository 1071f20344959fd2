/// \file
/// Decoding of result payloads into the result objects, and the location
/// readers shared with the stop records. Each command's decoder is a case of
/// DecodeResult; a command without one answers false, so a done record with
/// results completes its request with FError set.

#include "mi/gdboutput.h"

namespace midebug {

namespace {

bool DecodeStackInfoDepth(TGDBResult& Result, TMIScanner& Scanner) {
  auto* Depth = dynamic_cast<TStackInfoDepthResult*>(&Result);
  if (!Depth)
    return false;
  Depth->FStackDepth = Scanner.FindInteger("depth", -1);
  return Depth->FStackDepth != -1;
}

std::string LowerCaseASCII(std::string_view Text) {
  std::string Lower(Text);
  for (char& Letter : Lower)
    if (Letter >= 'A' && Letter <= 'Z')
      Letter = static_cast<char>(Letter - 'A' + 'a');
  return Lower;
}

bool DecodeCLInfoLineAddress(TGDBResult& Result, TMIScanner& Scanner) {
  auto* InfoLine = dynamic_cast<TCLInfoLineAddressResult*>(&Result);
  if (!InfoLine)
    return false;
  const std::string Text = LowerCaseASCII(Scanner.ReadCString());
  if (!Text.starts_with(InfoLine->FExpected))
    return false;
  std::string_view Address = std::string_view(Text).substr(InfoLine->FExpected.size());
  Address = Address.substr(0, Address.find(' '));
  InfoLine->FAddress = MIStrToUInt64Def(Address, 0);
  return true;
}

} // namespace

bool DecodeResult(TGDBResult& Result, TMIScanner& Scanner, bool IsLLDB) {
  (void)IsLLDB;
  switch (Result.FCommand) {
  case ctStackInfoDepth:
    return DecodeStackInfoDepth(Result, Scanner);
  case ctExecRun:
  case ctFileExecAndSymbols:
  case ctTargetAttach:
  case ctTargetDetach:
  case ctExecAbort:
    return true;
  default:
    return false;
  }
}

bool DecodeConsoleResult(TGDBResult& Result, TMIScanner& Scanner) {
  switch (Result.FCommand) {
  case ctCLInfoLineAddress:
    return DecodeCLInfoLineAddress(Result, Scanner);
  case ctCLKill:
  case ctCLMemoryWrite:
    return true;
  default:
    return false;
  }
}

void ParseLocation(TMIScanner& Scanner, TGDBLocation& Location) {
  Location.Address = Scanner.FindUInt64("addr", DummyLocation.Address);
  std::string_view Source = Scanner.FindValue("file");
  if (Source.empty())
    Source = Scanner.FindValue("from");
  if (Source == "??")
    Source = {};
  Location.Source = std::string(Source);
  Location.Line = Scanner.FindInteger("line", DummyLocation.Line);
  if (Location.Line == -1)
    Location.Line = 0;

  const std::string_view Original = Scanner.FindValue("original-location");
  size_t Colon = Original.find(':');
  if (Colon == std::string_view::npos)
    return;
  // "C:\src\unit.pas:12" names a file with a drive letter: when the text after
  // the last colon is a line number, the file is everything before it.
  const size_t LastColon = Original.rfind(':');
  if (LastColon != Colon && MIStrToIntDef(Original.substr(LastColon + 1), -1) >= 0)
    Colon = LastColon;
  Location.Source = std::string(Original.substr(0, Colon));
  if (Location.Line == 0)
    Location.Line = MIStrToIntDef(Original.substr(Colon + 1), 0);
}

void ParseStopFrame(TMIScanner& Scanner, TGDBLocation& Location, Integer& ThreadId) {
  const std::string_view Frame = Scanner.FindValue("frame");
  if (Frame.empty()) {
    Location = DummyLocation;
  } else {
    TMIScanner::TNestedScan Nested(Scanner, Frame);
    ParseLocation(Scanner, Location);
  }
  ThreadId = Scanner.FindInteger("thread-id", -1);
}

} // namespace midebug
