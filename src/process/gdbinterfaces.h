#pragma once
/// \file
/// The interfaces that cross the library's boundary. Operations are declared
/// in method-table order: after the three reference-counting operations of
/// IInterface, each interface's operations follow in the order below, and
/// that order must not change.

#include "mi/gdbinternalprocess.h"
#include "mi/gdbresult.h"
#include "platform/interfaced.h"
#include "platform/types.h"

#include <array>
#include <stdexcept>
#include <cstdint>
#include <string>
#include <string_view>

namespace midebug {

/// Raised only where a process cannot be started, created, attached or given
/// a process id; it reaches the IDE through the process manager.
class ENonAIRException : public std::runtime_error {
public:
  using std::runtime_error::runtime_error;
};


// ---------------------------------------------------------------------------
// Enumerations

enum TGDBLanguage : uint8_t { glPascal = 0, glCPP = 1, glC = 2 };

/// The debugger's names of the languages, by TGDBLanguage.
inline constexpr std::array<std::string_view, 3> GDBLanguageNames = {"pascal", "c++", "c"};

/// The answer to an evaluation request: ercBusy while another evaluation of
/// the same process is in progress, ercError when the request failed or
/// timed out.
enum TGDBRetCode : uint8_t { ercOk = 0, ercError = 1, ercDeferred = 2, ercBusy = 3 };

enum TThreadState : uint8_t { tsStop = 0, tsRunnable = 1, tsBlocked = 2, tsNone = 3, tsZombie = 4 };

// ---------------------------------------------------------------------------
// The library's boundary

/// What an inspector's child is.
enum TInspectItem : uint8_t { iiUnknown = 0, iiVariable = 1, iiMethod = 2, iiProperty = 3 };

enum TInspectKind : uint8_t { ikObject = 0, ikScalar = 1, ikError = 2, ikFunction = 3 };

enum TInspectFlag : uint8_t { ifCanModify = 0, ifCanInspect = 1 };

/// A set of TInspectFlag: bit n stands for the flag of ordinal n.
using TInspectFlags = uint8_t;

constexpr TInspectFlags InspectFlagBit(TInspectFlag Flag) { return static_cast<TInspectFlags>(1u << Flag); }

/// Implemented by the IDE's breakpoints and by the process's own ones.
class IGDBBreakpointListener : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{66A5F7EE-63F4-41D8-99C6-36142FD81119}");

  /// The breakpoint was hit; ShouldStop decides whether the program stays
  /// stopped.
  virtual void BreakpointHits(bool& ShouldStop, Integer ThreadId, TGDBLocation& Location) = 0;
  /// Called once, when the debugger has answered the insertion.
  virtual void BreakpointVerified(bool Verified, Integer Breakpoint, const TGDBLocation& Location) = 0;
};

/// Implemented by the IDE: what happens to the debugged process. Everything
/// is called on the IDE's main thread except InternalError (the thread that
/// found the error, usually the output thread) and ProcessRestart (the
/// output thread).
class IGDBProcessListener : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{A42DADA6-847E-44F2-9CD1-E186F8A9EF66}");

  virtual void ProcessSuspended(Integer ThreadId) = 0;
  virtual void ProcessResumed(Integer ThreadId) = 0;
  virtual void ProcessExited(Integer Code, const std::string& Signal) = 0;
  virtual void ThreadCreated(Integer ThreadId) = 0;
  virtual void ThreadExited(Integer ThreadId) = 0;
  virtual void ModuleLoaded(const TGDBModule& Module) = 0;
  virtual void ModuleUnLoaded(const TGDBModule& Module) = 0;
  /// ShouldStop enters false.
  virtual void SignalReceived(bool& ShouldStop, Integer ThreadId, const TGDBException& SignalException) = 0;
  /// ShouldStop enters false.
  virtual void ExceptionRaised(bool& ShouldStop, Integer ThreadId, const TGDBException& LanguageException) = 0;
  virtual void LogEvent(const TGDBLogEvent& Event) = 0;
  virtual void InternalError(const std::string& Message) = 0;
  /// The debugger does not answer; true gives it up.
  virtual bool FatalError() = 0;
  virtual void ProcessRestart() = 0;
};

/// A disassembly cursor.
class IGDBDisassemble : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{96e65eff-cd2e-4c27-b325-244459324681}");

  /// Decodes at Address; Actual is the start of the instruction found there.
  virtual void ToAddress(UInt64 Address, UInt64& Actual) = 0;
  virtual void ToNext(UInt64& Address) = 0;
  /// Moves to the following instruction and gives its address.
  virtual void GetNextAddress(UInt64& Address) = 0;
  virtual bool IsValid() = 0;
};

/// A tree view over a value and its children, fetched lazily, with a
/// visible window over the children.
class IGDBInspect : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{52acbd75-3ff9-4a71-9cf7-16d92ef6dd3a}");

  /// The child Index when Item is iiVariable, else null.
  virtual TIntfPtr<IGDBInspect> CreateSubInspector(TInspectItem Item, Integer Index) = 0;
  /// True when the inspector is no longer valid.
  virtual bool Refresh() = 0;
  virtual Integer GetAncestorCount() = 0;
  virtual Integer GetMemberCount() = 0;
  virtual Integer GetPropertyCount() = 0;
  virtual Integer GetMethodCount() = 0;
  virtual bool GetMember(Integer Index, std::string& Name, std::string& TypeName, std::string& Value,
                         UInt64& Address, TInspectFlags& Flags) = 0;
  virtual std::string GetExpr() = 0;
  virtual std::string GetFullExpr() = 0;
  virtual std::string GetType() = 0;
  virtual std::string GetValue() = 0;
  virtual std::string GetAddress() = 0;
  virtual TInspectKind GetKind() = 0;
  virtual TInspectFlags GetFlags() = 0;
  virtual bool ResultsAvailable() = 0;
  virtual bool HasError() = 0;
  virtual std::string GetLastError() = 0;
  virtual Integer GetInspectRangeStart() = 0;
  virtual void SetInspectRange(Integer Start, Integer Count) = 0;
};

/// One thread of the debugged process. Frame numbers (Index, Frame) are
/// 1-based: 1 is the innermost frame.
class IGDBThread : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{93066bc4-116e-4f84-b0e0-8389b955f195}");

  virtual Integer GetId() = 0;
  virtual Integer GetOsId() = 0;
  virtual std::string GetName() = 0;
  virtual TThreadState GetState() = 0;
  virtual TThreadStopReason GetStopReason() = 0;
  virtual TGDBLocation GetCurrentLocation() = 0;
  virtual TGDBCPU GetCPUType() = 0;
  virtual TGDBLanguage GetEvaluator() = 0;
  virtual Integer GetCallCount() = 0;
  virtual std::string GetCallHeader(Integer Index) = 0;
  virtual TGDBLocation GetCallLocation(Integer Index) = 0;
  virtual Integer GetFileIndex(const std::string& FileName) = 0;
  virtual bool GetRegisters(TUInt64Array& Values, UInt64& PC) = 0;
  virtual bool SetRegisters(const TUInt64Array& Old, const TUInt64Array& New) = 0;
  virtual bool GetFPURegisters(TFPURegValueArray& Values) = 0;
  virtual bool SetFPURegisters(const TFPURegValueArray& Old, const TFPURegValueArray& New) = 0;
  virtual bool GetXMMRegisters(TXMMRegValueArray& Values) = 0;
  virtual bool SetXMMRegisters(const TXMMRegValueArray& Old, const TXMMRegValueArray& New) = 0;
  virtual bool SetRunToMainBreakpoint(bool& NoEntryStop) = 0;
  virtual void StepInto() = 0;
  virtual void StepOver() = 0;
  virtual void StepOut() = 0;
  virtual void InstStepInto() = 0;
  virtual void InstStepOver() = 0;
  virtual void Stop() = 0;
  virtual void Run() = 0;
  virtual TGDBRetCode Evaluate(const std::string& Expr, const std::string& Suffix, Integer Frame, std::string& Value,
                               bool& CanModify, std::string& TypeName) = 0;
  virtual TGDBRetCode Modify(const std::string& NewValue, std::string& Value) = 0;
  virtual TIntfPtr<IGDBDisassemble> GetDisassembler() = 0;
  virtual TIntfPtr<IGDBInspect> CreateLocalVarsInspector(Integer Frame) = 0;
  virtual TIntfPtr<IGDBInspect> CreateInspector(const std::string& Expr, Integer Frame) = 0;
};

/// One debugged process as the IDE sees it.
class IGDBProcess : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{57313D26-3F2C-46F6-9814-062D7078F282}");

  // Breakpoints. The outcome of a create reaches the caller only through
  // the listener's BreakpointVerified.
  virtual void CreateSourceBreakpoint(const std::string& FileName, Integer Line,
                                      const TIntfPtr<IGDBBreakpointListener>& Listener) = 0;
  virtual void CreateAddressBreakpoint(UInt64 Address, const TIntfPtr<IGDBBreakpointListener>& Listener) = 0;
  virtual void CreateWatchBreakpoint(UInt64 Address, bool ReadFlag, bool AccessFlag,
                                     const TIntfPtr<IGDBBreakpointListener>& Listener) = 0;
  virtual void DeleteBreakpoint(Integer Breakpoint) = 0;
  virtual void EnableBreakpoint(Integer Breakpoint) = 0;
  virtual void DisableBreakpoint(Integer Breakpoint) = 0;

  // Source lines and files. File indexes are 1-based; 0 is no file.
  virtual void GetSourceLines(const std::string& FileName, TIntegerArray& Lines) = 0;
  virtual bool FindSourceLine(UInt64 Address, UInt64& StartAddr, Integer& Size, Integer& FileIndex,
                              Integer& Line) = 0;
  virtual TAddressArray FindSourceAddress(Integer FileIndex, Integer Line) = 0;
  virtual bool FindSourceLocation(const std::string& FileName, Integer Line, TGDBLocation& Location) = 0;
  virtual bool SetNewEip(UInt64 Address) = 0;
  virtual Integer GetFileIndex(const std::string& FileName) = 0;
  virtual std::string GetFileName(Integer FileIndex) = 0;
  virtual bool SetFileName(Integer FileIndex, const std::string& FileName) = 0;

  // Memory and disassembly.
  /// Bytes read, or -1.
  virtual Integer GetMemory(UInt64 Address, void* Buffer, Integer Size) = 0;
  /// Bytes written, or -1.
  virtual Integer SetMemory(UInt64 Address, const void* Buffer, Integer Size) = 0;
  virtual TIntfPtr<IGDBDisassemble> GetDisassembler() = 0;
  /// Size -1 when the address could not be decoded.
  virtual void DisassembleAt(UInt64 Address, Integer& Size, std::string& Text) = 0;

  // Run control.
  virtual void Run() = 0;
  virtual bool SetRunToMainBreakpoint() = 0;
  virtual void RunToFirstSource() = 0;
  virtual void RunToEntryPoint() = 0;
  virtual void Pause() = 0;
  virtual void Resume() = 0;
  virtual void Terminate() = 0;
  virtual void Detach() = 0;
  virtual TGDBLanguage GetEvaluator() = 0;
  virtual void SetOsException(const std::string& Signal, bool Stop, bool Pass) = 0;

  // The stopped process.
  virtual TGDBLocation GetSuspendedLocation() = 0;
  virtual Integer GetSuspendedThreadId() = 0;
  virtual bool EvaluatorBusy() = 0;
  virtual TIntfPtr<IGDBThread> GetThread(Integer Id) = 0;
  virtual Integer GetPid() = 0;
  virtual UInt64 GetBaseAddress() = 0;
  virtual TGDBModule GetModule(Integer Id) = 0;

  // Added after the operations above.
  /// The start of the function that holds Address, as its disassembly
  /// tells; 0 when unknown.
  virtual UInt64 GetFunctionStart(UInt64 Address) = 0;
  /// What the function that the last finish left returned, as the debugger
  /// prints it; empty when the program stopped otherwise or none was told.
  virtual std::string GetReturnValue() = 0;
  /// A breakpoint on every function of that name, in the program and in the
  /// libraries it loads (later ones included); reported as a source one.
  virtual void CreateFunctionBreakpoint(const std::string& FunctionName,
                                        const TIntfPtr<IGDBBreakpointListener>& Listener) = 0;
  /// Watches Size bytes (1 to 8, or more where the debugger splits them) at
  /// Address; LLDB watches what CreateWatchBreakpoint does.
  virtual void CreateSizedWatchBreakpoint(UInt64 Address, Integer Size, bool ReadFlag, bool AccessFlag,
                                          const TIntfPtr<IGDBBreakpointListener>& Listener) = 0;
  /// Up to Count instructions from Address, each with its function, bytes
  /// and source line where known; fewer where readable memory ends.
  virtual TGDBDisassembleDataArray Disassemble(UInt64 Address, Integer Count) = 0;
  /// The source files the debugger knows of the program and the libraries
  /// it has loaded, by full name where it found one; empty when it cannot
  /// tell.
  virtual TStringArray GetSourceFiles() = 0;
};

} // namespace midebug
