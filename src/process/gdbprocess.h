#pragma once
/// \file
/// One debugged process: the request and reply engine over its debugger
/// kernel, the output thread that reads the debugger, start-up, and the
/// events it hands to the IDE's listener.
///
/// Lock order, outer to inner:
///   1. the live-process lock (liveprocesses.h), held for a whole delivery
///      on the main thread;
///   2. a result object's monitor, held by its waiter (never while it takes
///      the wait-object table's lock: a waiter that gives up leaves the
///      monitor first);
///   3. the leaf locks, each held for one table operation only: the
///      wait-object table, the send lock, the thread table, the module-id
///      table, the breakpoint table and the pending-event stacks.

#include "kernel/gdbkernel.h"
#include "mi/gdbcommand.h"
#include "mi/gdbresult.h"
#include "process/gdbinterfaces.h"
#include "process/liveprocesses.h"

#include <atomic>
#include <chrono>
#include <functional>
#include <map>
#include <memory>
#include <mutex>
#include <stack>
#include <string>
#include <thread>
#include <unordered_map>
#include <vector>

namespace midebug {

class TGDBThread;

/// How long synchronous requests wait. Production uses the defaults; tests
/// shorten them so that time-out behaviour takes milliseconds.
struct TWaitPolicy {
  /// The first wait of a request during start-up (GDB_WAITTIMEOUT replaces it).
  Integer StartupTimeoutMs = 40000;
  /// The first wait of a request after start-up.
  Integer RunningTimeoutMs = 6000;
  /// After each expiry that the IDE answers with "keep waiting", the wait
  /// grows by this much while it is below MaxTimeoutMs.
  Integer TimeoutStepMs = 3000;
  Integer MaxTimeoutMs = 15000;
  /// The wait while a program is terminated or detached.
  Integer TerminateTimeoutMs = 5000;
  /// The polling step while the IDE answers, and of WaitForReplyTimeOut.
  Integer PollMs = 2;
  /// Told the length of every wait for a reply before it starts (tests).
  std::function<void(Integer TimeoutMs)> WaitObserver;
};

/// The policy new processes take. Not thread-safe: set it before creating
/// processes.
TWaitPolicy& DefaultWaitPolicy();

/// The object behind one debugged process.
class TGDBProcess : public TInterfaced<IGDBInternalProcess, IGDBProcess> {
public:
  TGDBProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& RemoteProfile,
              const std::string& LauncherPath, Integer Pid, const std::string& CommandFile, TGDBLanguage Language,
              TGDBCPU CPU, const std::string& Platform);
  ~TGDBProcess() override;

  // --- Start-up --------------------------------------------------------
  /// Starts the debugger and sends the settings for its kind. Raises
  /// ENonAIRException when the kernel does not start.
  void Start();
  /// Loads ExeName with its arguments and working directory.
  TIntfPtr<IGDBProcess> CreateProcess(const std::string& ExeName, const std::string& Arguments,
                                      const std::string& WorkingDir);
  /// Attaches to Pid; -1 when the kernel attaches by itself.
  TIntfPtr<IGDBProcess> AttachProcess(Integer Pid);
  virtual void WaitUntilProcessStarted() {}
  Int64 GetKernelCapabilities();
  void SetKernelCapabilites(Int64 Value);
  /// The location of the current frame, or the empty location.
  TGDBLocation GetCurrentLocation();
  TGDBLocation FixupInlineLocation(const TGDBLocation& Location);

  // --- Requests and replies ---------------------------------------------
  /// Writes one command line without waiting; true when it was written.
  bool ProcessAsyncRequest(const std::string& Request);
  /// Writes the line and waits for the reply to fill Result; true when the
  /// line was written (read Result's FError and FTimeOut for the outcome).
  bool ProcessSyncRequest(const std::string& Key, const std::string& Request, TGDBResult& Result);
  void AddWaitObject(const std::string& Key, TGDBResult& Result);
  void WaitForReply(const std::string& Key, TGDBResult& Result);
  /// One step of a polling wait: false while TimeOutMs lasts (after a sleep),
  /// true once it has run out for good. With FatalOnExpiry the IDE is asked
  /// first and may extend the wait.
  bool WaitForReplyTimeOut(Integer& TimeOutMs, bool FatalOnExpiry);
  std::string GetTimeOutMessage() const;
  /// Wakes every waiting request and empties the table.
  void NotifyWaitObjects();
  /// Asks the IDE, on its main thread, whether the debugger is lost.
  void NotifyFatalError();
  /// Reports an internal error to the IDE at once, on the calling thread.
  void NotifyInternalError(const std::string& Message);

  // --- IGDBInternalProcess -------------------------------------------------
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
  TGDBResult* RemoveWaitObject(const std::string& Key) override;
  std::string GetEndOfLineMarker() override { return FEndOfLineMarker; }
  bool IsLLDB() override { return FKernel->IsLLDB(); }
  bool IsAndroid64() override { return FKernel->IsAndroid64(); }
  bool IsLinux() override { return FKernel->IsLinux(); }
  bool IsWindows() override { return FKernel->IsWindows(); }
  bool IsAttachMode() override { return FAttachMode; }
  bool SupportHXConsole() override { return FKernel->SupportHXConsole(); }
  bool IsDying() override { return FDying; }
  Integer GetModuleId(const std::string& Name) override;

  // --- IGDBProcess -----------------------------------------------------
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
  TGDBModule GetModule(Integer Id) override;

  // --- Threads and call stacks ----------------------------------------
  /// Makes ThreadId the debugger's current thread. On success the thread
  /// becomes the process's current thread and takes the reply's location and
  /// frame; a number not in the thread table leaves no current thread. A
  /// rejected selection changes nothing.
  void SetSuspendedThread(Integer ThreadId);
  /// Selects Frame (0-based) of the current thread in the debugger and
  /// records it, with its location, on the current thread.
  void SetSuspendedThreadFrame(Integer Frame);
  /// Depth of the current thread's stack, at most MaxCallFrames; 0 on error.
  Integer GetCallCount();
  /// The current thread's frames (at most MaxCallFrames) with their header
  /// lines and parameter names; empty on error.
  void GetCallHeaders(TStackFrameArray& Frames);
  /// The deepest stack fetched or counted.
  static constexpr Integer MaxCallFrames = 512;
  /// True while the threads' states may be stale (the program ran since
  /// they were last asked for).
  bool ThreadStatesStale() const { return FUpdateThreadState; }

  /// The builder of this process's command lines; use it under
  /// FCommandLock, which keeps its request counter consistent.
  TGDBCommand& Command() { return *FCommand; }
  std::mutex& CommandLock() { return FCommandLock; }
  TGDBKernel& Kernel() { return *FKernel; }
  const TWaitPolicy& WaitPolicy() const { return FWaitPolicy; }
  bool Alive() const { return FAlive; }
  bool Suspended() const { return FSuspended; }
  Integer SyncRequestTimeout() const { return FSyncRequestTimeout; }

  // --- Run control -------------------------------------------------------
  /// The step commands; each is sent without waiting, and the stop that ends
  /// it arrives as a notification.
  void StepInto();
  void StepOver();
  void StepOut();
  void InstStepInto();
  void InstStepOver();
  /// True once the run-to-main breakpoint is placed.
  bool CanSetRunToMainBreakpoint() const { return FBreakOnMain != nullptr; }
  /// Stops a synchronous target so that it accepts commands. True when this
  /// call paused it (the caller must then SyncTargetResume); Aborted when the
  /// pause could not be made in time or another internal pause is running.
  bool SyncTargetPause(bool& Aborted, bool FatalOnExpiry);
  /// Resumes a synchronous target paused by SyncTargetPause, unreported.
  void SyncTargetResume();
  /// As SyncTargetResume, for an asynchronous target.
  void ASyncTargetResume();
  /// Refreshes the thread table from the debugger's list of thread ids;
  /// reports the threads it gains and loses. Call on the main thread.
  void UpdateThreadList();
  /// Refreshes the state, location and (unless StateOnly) the name of every
  /// known thread. Call on the main thread.
  void UpdateAllThreadState(bool StateOnly);
  void ResetAllThreadCallStack();
  /// Adds ThreadId to the table, and reports it, when the debugger does not
  /// announce threads by itself.
  void EnsureThreadCreated(Integer ThreadId);
  /// The stop's main-thread part: refreshes the threads, records the stop on
  /// the thread and tells the IDE.
  void DoNotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason);

private:
  /// Starts a resume whose resumed notification the IDE does not hear, and
  /// waits for it.
  void InternalResume();
  /// Takes GDB's console answer to the language question; true when Text
  /// was that answer (it is then not shown to the IDE).
  bool TakeLanguageAnswer(const std::string& Text);

  /// The run-to-main breakpoint's listener, once placed.
  TIntfPtr<IGDBBreakpointListener> FBreakOnMain;
  /// Held by the one thread asking the debugger for the current language,
  /// for the whole question; taken before FLanguageAnswerLock.
  std::mutex FLanguageQueryLock;
  /// Guards FLanguageQueryPending and FLanguageAnswer, written by the output
  /// thread. A leaf lock.
  std::mutex FLanguageAnswerLock;
  bool FLanguageQueryPending = false;
  std::string FLanguageAnswer;

protected:
  /// Stops the debugger's reading and awaits the output thread.
  void BeforeDestruction() override;
  /// Runs Delivery on the IDE's main thread: at once when called there,
  /// else queued. It runs only while this process still exists, holding the
  /// live-process lock.
  void DeferIfLive(std::function<void()> Delivery);
  /// Builds a command line under the builder's lock.
  template <class TBuild>
  std::string BuildCommand(std::string& Token, TBuild&& Build) {
    std::lock_guard Guard(FCommandLock);
    return Build(*FCommand, Token);
  }

  TIntfPtr<IGDBProcessListener> FProcessListener;
  std::atomic<TGDBLanguage> FLanguage;
  TGDBCPU FCPUType;
  std::string FPlatform;
  std::string FEndOfLineMarker;
  std::unique_ptr<TGDBKernel> FKernel;
  std::unique_ptr<TGDBCommand> FCommand;

  std::atomic<bool> FAlive{false};
  std::atomic<bool> FDying{false};
  std::atomic<bool> FExiting{false};
  std::atomic<bool> FStarted{false};
  std::atomic<bool> FStoppedAtEntryPoint{false};
  std::string FLaunchErrorMessage;
  std::atomic<Integer> FMaxChildrenCount{-1};
  TGDBModule FCurrentLoadedModule = DummyModule;
  std::atomic<bool> FSuspended{false};
  std::atomic<bool> FSuspending{false};
  std::atomic<bool> FResuming{false};
  std::atomic<bool> FEvaluating{false};
  std::atomic<bool> FUpdateThreadState{true};
  std::atomic<Integer> FPid{-1};
  std::atomic<bool> FAsyncTarget{false};
  std::atomic<UInt64> FBaseAddress{0};
  std::atomic<bool> FAttachMode{false};
  std::atomic<bool> FAttachNotifySuspended{false};
  std::atomic<Integer> FLastSuspendedThreadId{-1};
  std::atomic<bool> FInternalPause{false};
  std::atomic<bool> FInternalResume{false};
  std::atomic<Integer> FSyncRequestTimeout;
  std::atomic<bool> FFatalError{false};
  std::atomic<bool> FFatalErrorNotified{false};
  std::atomic<bool> FInternalError{false};
  std::atomic<bool> FRestarting{false};

private:
  void OutputThreadExecute();
  void TerminateAndFreeOutputThread();
  void SendStartupSettings();
  void SetProgramEnvironment();
  /// Asks the IDE whether the debugger is lost and waits for the answer.
  void AskFatalError();
  /// Takes the current thread's location and makes ThreadId the suspended
  /// thread.
  void SetCurrentSuspendedThread(Integer ThreadId, const TGDBLocation& Location);
  void NotifyAllThreadExited();
  TGDBLanguage GetCurrentLanguage();

  TWaitPolicy FWaitPolicy;
  TLiveProcessKey FLiveKey;
  std::thread FOutputThread;
  std::atomic<std::thread::id> FOutputThreadId;

  /// Serialises writes of command lines: one line at a time.
  std::mutex FRequestLock;
  /// Guards the builder's request counter.
  std::mutex FCommandLock;
  /// Guards FWaitObjectList.
  std::mutex FWaitObjectLock;
  std::unordered_map<std::string, TGDBResult*> FWaitObjectList;

  /// Guards FThreadList and FSuspendedThread.
  std::recursive_mutex FThreadLock;
  std::map<Integer, TIntfPtr<IGDBThread>> FThreadList;
  TIntfPtr<IGDBThread> FZombieThread;
  TGDBThread* FSuspendedThread = nullptr;
  TGDBLocation FInlineLocation;

  /// Guards FBreakpointList.
  std::mutex FBreakpointLock;
  std::map<Integer, TIntfPtr<IGDBBreakpointListener>> FBreakpointList;

  /// Guards the module-id table and FCurrentLoadedModule.
  std::mutex FModuleLock;
  Integer FModuleId = 0;
  std::unordered_map<std::string, Integer> FModuleIdList;

  /// Guards the four pending-event stacks.
  std::mutex FPendingLock;
  std::stack<TGDBModule> FModuleLoadedPending;
  std::stack<TGDBModule> FModuleUnLoadedPending;
  std::stack<Integer> FThreadCreatedPending;
  std::stack<Integer> FThreadExitedPending;
  /// A delivery of FThreadExitedPending is queued and has not emptied it.
  bool FThreadExitedDeliveryQueued = false;
};

} // namespace midebug
