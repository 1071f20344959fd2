#pragma once
/// \file
/// The parser of everything the debugger prints: it walks one reply block
/// record by record, completes the request a result record answers, and turns
/// stop, thread, library and stream records into calls on the process.

#include "mi/gdbresult.h"
#include "mi/miscanner.h"
#include "platform/types.h"
#include "mi/gdbinternalprocess.h"

#include <string>
#include <string_view>

namespace midebug {

/// Parses one reply block: everything the debugger printed up to (without)
/// its prompt, lines ending in LF or CR LF. Takes any bytes; never throws for
/// malformed input, which reads as empty values and defaults.
void ProcessGDBOutput(const std::string& ReplyBlock, IGDBInternalProcess& Process);

// --- Result payloads (the per-command decoders live in gdbdecode.cpp) -------

/// Decodes the payload at the scanner's cursor (the first result after the
/// class of a done record) into Result, by its FCommand. False when the
/// payload does not hold what the command answers, or the command has no
/// decoder; the parser then sets FError.
bool DecodeResult(TGDBResult& Result, TMIScanner& Scanner, bool IsLLDB);
/// Decodes the console record that answers a CLI command, with the cursor
/// just after its "~".
bool DecodeConsoleResult(TGDBResult& Result, TMIScanner& Scanner);
/// Reads "addr", "fullname" (else "file", else "from"), "line" and
/// "original-location" among the results at the cursor.
void ParseLocation(TMIScanner& Scanner, TGDBLocation& Location);
/// Reads the location of the "frame" tuple (DummyLocation without one) and
/// "thread-id" (-1 without one) among the results at the cursor.
void ParseStopFrame(TMIScanner& Scanner, TGDBLocation& Location, Integer& ThreadId);

/// The name of a Darwin/BSD signal number ("11" gives "SIGSEGV"); any text
/// that is not a number from 1 to 31 is returned unchanged.
std::string SignalName(std::string_view Text);

/// Reads GDB's exit code, which GDB prints in octal with a leading zero
/// ("010" is 8); other forms are read as ordinary integers. Default when the
/// text is not a number.
Integer ReadExitCode(std::string_view Text, Integer Default);

/// Reads one reply block; one object per block, holding the cursor and the
/// scratch records that the records of the block share.
class TGDBOutputParser {
public:
  TGDBOutputParser(std::string_view Block, IGDBInternalProcess& Process);
  TGDBOutputParser(const TGDBOutputParser&) = delete;
  TGDBOutputParser& operator=(const TGDBOutputParser&) = delete;

  void Run();

private:
  // Each handler returns true when it has consumed its line already.
  bool ProcessResultRecord();
  bool ProcessExecAsyncRecord();
  bool ProcessStatusAsyncRecord();
  bool ProcessNotifyRecord();
  bool ProcessConsoleStream();
  bool ProcessTargetStream();
  bool ProcessLogStream();
  bool ProcessNonMIText();

  void ProcessStopRecord();
  void ProcessErrorWithoutWaiter(const std::string& Message);
  bool ParseLibraryRecord(bool Loaded);
  bool ParseSharedLibraryInfo();
  bool ParseBreakpointTuple(Integer& Number);
  void ParseExceptionRaised();
  void ParseExceptionReceived();

  void Log(TGDBEvent Event, const std::string& Data);
  static void CompleteWaitObject(TGDBResult* WaitObject);

  TMIScanner FScanner;
  IGDBInternalProcess& FProcess;
  const std::string FEndOfLineMarker;
  const bool FIsLLDB;
  std::string FToken;
  /// LLDB reports a failed CLI write as an "error: " log line before a plain
  /// done record: the last such line of the block, for the record after it.
  std::string FCLIError;

  // Scratch records shared by the records of one block.
  TGDBLocation FLocation;
  TGDBException FSignal;
  TGDBException FException;
  TGDBModule FModule;
};

} // namespace midebug
