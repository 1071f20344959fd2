#pragma once
/// \file
/// One thread of the debugged process as the IDE holds it.

#include "mi/gdbcommand.h"
#include "process/gdbinterfaces.h"

#include <functional>
#include <map>
#include <mutex>
#include <string>
#include <unordered_map>

namespace midebug {

class TGDBProcess;
class TGDBInspect;

/// A thread's identity, state and last stop. Every question that needs the
/// debugger is routed to the owning process.
class TGDBThread : public TInterfaced<IGDBThread> {
public:
  TGDBThread(Integer Id, Integer OsId, const std::string& Name, const std::string& State, TGDBProcess* Process);

  /// The state a debugger's state text names; letter case is ignored and
  /// unknown text gives tsNone.
  static TThreadState StrToState(const std::string& State);
  /// Forgets the call stack, the selected frame and the last stop: the
  /// program has moved on.
  void ResetCallStack();
  bool ZombieState() const { return FState == tsZombie; }

  /// Makes this thread the debugger's current thread, at its innermost
  /// frame, unless it already is. Does nothing while the process has no
  /// current thread.
  void SetAsSuspendedThread();
  /// Selects Frame (1-based) of this thread in the debugger unless it is
  /// selected already; call after SetAsSuspendedThread. Skipped unless this
  /// thread is the process's current thread, and for frame numbers outside
  /// the stack.
  void SelectFrame(Integer Frame);
  /// Parameter names of frame Index (1-based); empty out of range.
  TStringArray GetCallParams(Integer Index);

  Integer GetId() override { return FId; }
  Integer GetOsId() override { return FOsId; }
  /// Asks the debugger for every thread's name and state first while this
  /// thread's name is unknown.
  std::string GetName() override;
  /// Refreshes every thread's state first when the program ran since.
  TThreadState GetState() override;
  TThreadStopReason GetStopReason() override;
  TGDBLocation GetCurrentLocation() override { return FLocation; }
  TGDBCPU GetCPUType() override;
  TGDBLanguage GetEvaluator() override;
  Integer GetCallCount() override;
  std::string GetCallHeader(Integer Index) override;
  TGDBLocation GetCallLocation(Integer Index) override;
  Integer GetFileIndex(const std::string& FileName) override;
  bool GetRegisters(TUInt64Array& Values, UInt64& PC) override;
  bool SetRegisters(const TUInt64Array& Old, const TUInt64Array& New) override;
  bool GetFPURegisters(TFPURegValueArray& Values) override;
  bool SetFPURegisters(const TFPURegValueArray& Old, const TFPURegValueArray& New) override;
  bool GetXMMRegisters(TXMMRegValueArray& Values) override;
  bool SetXMMRegisters(const TXMMRegValueArray& Old, const TXMMRegValueArray& New) override;
  bool SetRunToMainBreakpoint(bool& NoEntryStop) override;
  void StepInto() override;
  void StepOver() override;
  void StepOut() override;
  void InstStepInto() override;
  void InstStepOver() override;
  void Stop() override {}
  void Run() override {}
  TGDBRetCode Evaluate(const std::string& Expr, const std::string& Suffix, Integer Frame, std::string& Value,
                       bool& CanModify, std::string& TypeName) override;
  TGDBRetCode Modify(const std::string& NewValue, std::string& Value) override;
  TIntfPtr<IGDBDisassemble> GetDisassembler() override;
  TIntfPtr<IGDBInspect> CreateLocalVarsInspector(Integer Frame) override;
  TIntfPtr<IGDBInspect> CreateInspector(const std::string& Expr, Integer Frame) override;

  // --- The children of inspectors, by variable-object name, so that an
  // update of their root reaches them. Not owned: each leaves on destruction.
  /// Raises std::logic_error when Name is taken; nothing for an empty name.
  void AddInspect(const std::string& Name, TGDBInspect* Inspect);
  void RemoveInspect(const std::string& Name);
  TGDBInspect* GetInspect(const std::string& Name);

  Integer FId;
  Integer FOsId;
  std::string FName;
  /// The real depth, -1 until known. When the stack goes deeper than the
  /// thread table counts, one more than the frames counted: the last "frame"
  /// then only says that the stack goes on.
  Integer FCallCount = -1;
  /// The frames fetched since the stop, by window: a window's first level
  /// (a multiple of CallWindow) to its frames, innermost first.
  std::map<Integer, TStackFrameArray> FCallWindows;
  /// Frames fetched at a time: a screenful of the IDE's call stack view, so
  /// that a stop costs the same whatever the depth.
  static constexpr Integer CallWindow = 32;
  TThreadState FState;
  bool FActive = true;
  TGDBProcess* FProcess;
  /// 0-based: the frame selected in the debugger for this thread.
  Integer FFrameIndex = 0;
  TGDBLocation FLocation;
  TThreadStopReason FReason = tsrNotStopped;

private:
  /// Guards FInspects; a leaf lock.
  std::mutex FInspectLock;
  std::unordered_map<std::string, TGDBInspect*> FInspects;

  using TStepCreate = std::string (TGDBCommand::*)(std::string& Token);
  /// Makes this thread the debugger's current one and starts the step.
  void Step(TStepCreate Create);
  /// True when the debugger's current thread is this one, or when the
  /// process has none (a program whose threads are not listed yet); never
  /// for the zombie.
  bool ActsOnThisThread();
  /// The frame at Index (1-based), fetching its window once per stop, or
  /// nullptr. A failed fetch is tried again on the next call.
  const TGDBStackFrame* CallFrame(Integer Index);
  /// True for the entry past the frames counted on a stack cut short.
  bool IsCutMarker(Integer Index) const;
  /// Runs Read with this thread current at its innermost frame; false when
  /// the debugger acts on another thread.
  bool AtFrameZero(const std::function<bool()>& Read);
  /// Makes this thread current; true when it is and can be written to.
  bool Writable();
  /// Fetches the location and stack again after a register write.
  void Relocate();
};

} // namespace midebug
