#pragma once
/// \file
/// One debugged process: start-up, run control, events to the IDE's listener. Its state lives in components
/// of one concern and one lock each: request engine, pending events, module table, language query, and the
/// inspection components (inspectcomponents.h), whose operations live in src/inspect.
///
/// Lock order, outer to inner: the live-process lock (liveprocesses.h, held for a whole delivery on the main
/// thread); the language query's lock (the whole question); the wait-object table, then a result's monitor
/// (gdbrequestengine.h); then the leaf locks, each held for one operation: the builder and send locks, the
/// language answer, the pending events, the module table, the program terminal and every inspection component.

#include "kernel/gdbkernel.h"
#include "process/gdbinterfaces.h"
#include "process/gdbconsolequery.h"
#include "process/gdbmoduletable.h"
#include "process/gdbrequestengine.h"
#include "process/inspectcomponents.h"
#include "process/liveprocesses.h"
#include "process/pendingevents.h"
#include "process/programterminal.h"

#include <atomic>
#include <functional>
#include <memory>
#include <mutex>
#include <string>
#include <thread>

namespace midebug {

/// The object behind one debugged process.
class TGDBProcess : public TInterfaced<IGDBInternalProcess, IGDBProcess> {
public:
  TGDBProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
              const std::string& LauncherPath, Integer Pid, const std::string& CommandFile, TGDBLanguage Language,
              TGDBCPU CPU, const std::string& Platform);
  ~TGDBProcess() override;

  // --- Start-up ----------------------------------------------------------
  /// Starts the debugger and its kind's settings; ENonAIRException when it fails.
  void Start();
  TIntfPtr<IGDBProcess> CreateProcess(const std::string& ExeName, const std::string& Arguments,
                                      const std::string& WorkingDir);
  /// Attaches to Pid; -1 when the kernel attaches by itself.
  TIntfPtr<IGDBProcess> AttachProcess(Integer Pid);
  virtual void WaitUntilProcessStarted() {}
  Int64 GetKernelCapabilities() { return FKernel->GetCapabilities(); }
  void SetKernelCapabilites(Int64 Value) { FKernel->SetCapabilites(Value); }

  // --- Requests ----------------------------------------------------------
  bool ProcessAsyncRequest(const std::string& Request) { return FRequests.Send(Request); } ///< written, unawaited
  /// Writes the line, awaits the reply in Result; true when written (then see FError, FTimeOut).
  bool ProcessSyncRequest(const std::string& Key, const std::string& Request, TGDBResult& Result) {
    return FRequests.SendAndWait(Key, Request, Result);
  }
  TGDBRequestEngine& Requests() { return FRequests; } ///< builds lines; waits with the time-outs

  // --- IGDBInternalProcess -----------------------------------------------
  void NotifyLogEvent(const TGDBLogEvent& Event) override;
  void NotifyProcessStarted() override {}
  void NotifyProcessExited(Integer Code, const std::string& Signal) override;
  void NotifyProcessResumed() override;
  void NotifyProcessFaulted(const std::string& Message) override;
  void NotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) override;
  void NotifySignalReceived(const TGDBException& SignalException, Integer ThreadId) override;
  void NotifyExceptionRaised(const TGDBException& LanguageException, Integer ThreadId) override;
  void NotifyThreadCreated(Integer ThreadId, Integer OsId) override;
  void NotifyThreadExited(Integer ThreadId) override;
  void NotifyThreadSelected(Integer ThreadId) override;
  void NotifyProcessPidCreated(Integer Pid) override;
  void NotifyLanguageChanged(const std::string& LanguageName) override;
  void NotifySettingMaxChildrenCountChanged(Integer Count) override;
  void NotifyModuleLoaded(const TGDBModule& Module) override;
  void NotifyModuleUnLoaded(const TGDBModule& Module) override;
  bool NotifyBreakpointOccurred(Integer Breakpoint, const TGDBLocation& Location, Integer ThreadId) override;
  void NotifyBreakpointModified(Integer Breakpoint, const TGDBLocation& Location) override;
  void NotifyWatchpointOutOfScope() override;
  void NotifyProcessRestart() override;
  TGDBResult* RemoveWaitObject(const std::string& Key) override { return FRequests.RemoveWaitObject(Key); }
  std::string GetEndOfLineMarker() override { return FEndOfLineMarker; }
  bool IsLLDB() override { return FKernel->IsLLDB(); }
  bool IsAndroid64() override { return FKernel->IsAndroid64(); }
  bool IsLinux() override { return FKernel->IsLinux(); }
  bool IsWindows() override { return FKernel->IsWindows(); }
  bool IsAttachMode() override { return FAttachMode; }
  bool SupportHXConsole() override { return FKernel->SupportHXConsole(); }
  bool IsDying() override { return FDying; }
  Integer GetModuleId(const std::string& Name) override { return FModules.GetModuleId(Name); }
  void NotifyCommandRefused(const std::string& Message) override;
  void NotifyReturnValue(const std::string& Value) override;
  void NotifyBreakpointLocations(Integer Breakpoint, const TGDBLocationArray& Locations) override;

  // --- IGDBProcess ---------------------------------------------------------
  void CreateSourceBreakpoint(const std::string& FileName, Integer Line,
                              const TIntfPtr<IGDBBreakpointListener>& Listener) override;
  void CreateAddressBreakpoint(UInt64 Address, const TIntfPtr<IGDBBreakpointListener>& Listener) override;
  void CreateWatchBreakpoint(UInt64 Address, bool ReadFlag, bool AccessFlag,
                             const TIntfPtr<IGDBBreakpointListener>& Listener) override;
  void DeleteBreakpoint(Integer Breakpoint) override;
  void EnableBreakpoint(Integer Breakpoint) override;
  void DisableBreakpoint(Integer Breakpoint) override;
  void GetSourceLines(const std::string& FileName, TIntegerArray& Lines) override;
  bool FindSourceLine(UInt64 Address, UInt64& StartAddr, Integer& Size, Integer& FileIndex, Integer& Line) override;
  TAddressArray FindSourceAddress(Integer FileIndex, Integer Line) override;
  bool FindSourceLocation(const std::string& FileName, Integer Line, TGDBLocation& Location) override;
  bool SetNewEip(UInt64 Address) override;
  Integer GetFileIndex(const std::string& FileName) override;
  Integer AddFileName(const std::string& FileName); ///< GetFileIndex that adds a name it does not know
  std::string GetFileName(Integer FileIndex) override;
  bool SetFileName(Integer FileIndex, const std::string& FileName) override;
  Integer GetMemory(UInt64 Address, void* Buffer, Integer Size) override;
  Integer SetMemory(UInt64 Address, const void* Buffer, Integer Size) override;
  TIntfPtr<IGDBDisassemble> GetDisassembler() override;
  void DisassembleAt(UInt64 Address, Integer& Size, std::string& Text) override;
  void Run() override;
  bool SetRunToMainBreakpoint() override;
  void RunToFirstSource() override;
  void RunToEntryPoint() override;
  void Pause() override;
  void Resume() override;
  void Terminate() override;
  void Detach() override;
  TGDBLanguage GetEvaluator() override { return FLanguage; }
  void SetOsException(const std::string& Signal, bool Stop, bool Pass) override;
  TGDBLocation GetSuspendedLocation() override;
  Integer GetSuspendedThreadId() override;
  bool EvaluatorBusy() override { return FEvaluating; }
  TIntfPtr<IGDBThread> GetThread(Integer Id) override;
  Integer GetPid() override;
  UInt64 GetBaseAddress() override { return FBaseAddress; }
  TGDBModule GetModule(Integer Id) override { return FModules.Current(Id); }
  UInt64 GetFunctionStart(UInt64 Address) override;
  std::string GetReturnValue() override;
  void CreateFunctionBreakpoint(const std::string& Name, const TIntfPtr<IGDBBreakpointListener>& Listener) override;
  void CreateSizedWatchBreakpoint(UInt64 Address, Integer Size, bool ReadFlag, bool AccessFlag,
                                  const TIntfPtr<IGDBBreakpointListener>& Listener) override;
  TGDBDisassembleDataArray Disassemble(UInt64 Address, Integer Count) override;
  TStringArray GetSourceFiles() override;
  bool CanSetRunToMainBreakpoint() const { return FBreakOnMain != nullptr; } ///< run-to-main breakpoint placed
  TGDBThreadTable& Threads() { return *FThreads; }
  TGDBRegisterIds& Registers() { return *FRegisters; }
  TGDBEvaluator& Evaluator() { return *FEvaluator; }
  TGDBKernel& Kernel() { return *FKernel; }
  TGDBCPU CPU() const { return FRequests.CPU(); }
  const TWaitPolicy& WaitPolicy() const { return FRequests.Policy(); }
  bool Alive() const { return FAlive; }
  bool Suspended() const { return FSuspended; }

protected:
  /// Stops the debugger's reading and awaits the output thread.
  void BeforeDestruction() override;
  /// Runs Delivery on the main thread (at once there) while the process lives, under its lock.
  void DeferIfLive(std::function<void()> Delivery);

  std::atomic<bool> FAlive{false};
  std::unique_ptr<TGDBKernel> FKernel;

private:
  friend class TGDBThreadTable; ///< refreshes the threads through the requests and tells the IDE
  void OutputThreadExecute();
  void SendStartupSettings();
  void SetProgramEnvironment();
  void NotifyFatalError();
  void NotifyInternalError(const std::string& Message);
  /// Pauses a synchronous target unheard; true when this call paused it; Aborted when it failed.
  bool SyncTargetPause(bool& Aborted, bool FatalOnExpiry);
  void ASyncTargetResume(); ///< resumes an asynchronous target paused inside the process, unheard
  void ResumeUnheard(bool FatalOnExpiry); ///< resumes and awaits the running report; the IDE hears neither
  TGDBLanguage GetCurrentLanguage();
  /// A signal or language exception stopped it: an Expected one is a plain stop, else the IDE decides.
  void NotifyInterruption(const TGDBException& Event, Integer ThreadId, bool Expected, TThreadStopReason Reason);

  // Defined in src/inspect beside the components they use.
  void MakeInspectComponents();
  /// The program runs on: forgets the stop and stale caches; the thread that was stopped.
  Integer ForgetStop();
  /// The stop's main-thread part: refreshes the threads, records the stop, tells the IDE.
  void DoNotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason);
  void SetCurrentSuspendedThread(Integer ThreadId, const TGDBLocation& Location);
  void EnsureThreadCreated(Integer ThreadId);
  void NotifyAllThreadExited();
  /// A module came or went: the line addresses cached may have moved.
  void ForgetLineAddresses();
  /// Runs Work with a running synchronous target paused, unheard; not at all when the pause fails.
  void WhilePaused(const std::function<void()>& Work);
  /// Sends the insert (or Watch) Create builds; tells Listener what came of it.
  void InsertBreakpoint(const std::function<std::string(TGDBCommand&, std::string&)>& Create,
                        const TIntfPtr<IGDBBreakpointListener>& Listener, bool Watch = false);
  void InstallExceptionBreakpoints(); ///< the language runtimes' raise, throw and catch, once each

  TIntfPtr<IGDBProcessListener> FProcessListener;
  std::atomic<TGDBLanguage> FLanguage;
  const TProgramTerminal::TDefer FDeferIfLive{[this](std::function<void()> Run) { DeferIfLive(std::move(Run)); }};
  std::string FEndOfLineMarker;
  TGDBRequestEngine FRequests;
  TGDBModuleTable FModules;
  TPendingEvents<TGDBModule> FModuleLoadedPending, FModuleUnLoadedPending;
  TPendingEvents<Integer> FThreadCreatedPending, FThreadExitedPending;
  TInspectPtr<TGDBThreadTable> FThreads;
  TInspectPtr<TGDBBreakpointTable> FBreakpoints;
  TInspectPtr<TGDBFileTable> FFiles;
  TInspectPtr<TGDBLineCache> FLines;
  TInspectPtr<TGDBMemoryCache> FMemory;
  TInspectPtr<TGDBRegisterIds> FRegisters;
  TInspectPtr<TGDBEvaluator> FEvaluator;
  TIntfPtr<IGDBBreakpointListener> FBreakOnMain;
  TGDBConsoleQuery FLanguageQuery{"show language", "The current source language is \"", '"'}; ///< GDB 13's words
  TProgramTerminal FTerminal;
  TLiveProcessKey FLiveKey;
  std::thread FOutputThread; ///< the only reader of the debugger
  std::string FLaunchErrorMessage;
  std::atomic<Integer> FMaxChildrenCount{-1}, FPid{-1}, FLastSuspendedThreadId{-1};
  std::atomic<UInt64> FBaseAddress{0};
  std::atomic<bool> FDying{false}, FExiting{false}, FStarted{false}, FStoppedAtEntryPoint{false}, FSuspended{false};
  std::atomic<bool> FSuspending{false}, FResuming{false}, FEvaluating{false}, FUpdateThreadState{true};
  std::atomic<bool> FAsyncTarget{false}, FAttachMode{false}, FAttachNotifySuspended{false}, FInternalPause{false};
  std::atomic<bool> FInternalResume{false}, FInternalError{false}, FRestarting{false};
};

} // namespace midebug
