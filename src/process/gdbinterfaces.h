#pragma once
/// \file
/// The interfaces that cross the library's boundary and the one through
/// which the output parser drives a process, with the reference counting
/// they share. Operations are declared in method-table order: after the
/// three reference-counting operations of IInterface, each interface's
/// operations follow in the order below, and that order must not change.

#include "kernel/gdblogevent.h"
#include "mi/gdbresult.h"
#include "platform/hexdigits.h"
#include "platform/types.h"

#include <array>
#include <atomic>
#include <compare>
#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>
#include <tuple>
#include <type_traits>
#include <utility>

namespace midebug {

// ---------------------------------------------------------------------------
// Interface identity and reference counting

/// A 128-bit interface identifier.
struct TGUID {
  uint32_t D1 = 0;
  uint16_t D2 = 0;
  uint16_t D3 = 0;
  std::array<uint8_t, 8> D4{};

  /// Reads the registry form "{XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX}"
  /// (hexadecimal digits in either case). Any other text gives the null
  /// identifier, which no interface uses.
  static constexpr TGUID Parse(std::string_view Text);

  friend constexpr bool operator==(const TGUID&, const TGUID&) = default;
  friend constexpr auto operator<=>(const TGUID&, const TGUID&) = default;
};

namespace guiddetail {

/// The value of Count hexadecimal digits at Pos, or -1 when one is not a
/// digit.
constexpr int64_t HexValue(std::string_view Text, std::size_t Pos, std::size_t Count) {
  int64_t Value = 0;
  for (std::size_t Index = Pos; Index < Pos + Count; ++Index) {
    int Digit = HexDigitValue(Text[Index]);
    if (Digit < 0)
      return -1;
    Value = Value * 16 + Digit;
  }
  return Value;
}

} // namespace guiddetail

constexpr TGUID TGUID::Parse(std::string_view Text) {
  // {XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX}: 38 characters.
  if (Text.size() != 38 || Text[0] != '{' || Text[37] != '}' || Text[9] != '-' || Text[14] != '-' ||
      Text[19] != '-' || Text[24] != '-')
    return TGUID{};
  const int64_t D1 = guiddetail::HexValue(Text, 1, 8);
  const int64_t D2 = guiddetail::HexValue(Text, 10, 4);
  const int64_t D3 = guiddetail::HexValue(Text, 15, 4);
  if (D1 < 0 || D2 < 0 || D3 < 0)
    return TGUID{};
  TGUID Result{static_cast<uint32_t>(D1), static_cast<uint16_t>(D2), static_cast<uint16_t>(D3), {}};
  // The last eight bytes: two before the fourth hyphen, six after it.
  constexpr std::array<std::size_t, 8> BytePos = {20, 22, 25, 27, 29, 31, 33, 35};
  for (std::size_t Index = 0; Index < BytePos.size(); ++Index) {
    const int64_t Byte = guiddetail::HexValue(Text, BytePos[Index], 2);
    if (Byte < 0)
      return TGUID{};
    Result.D4[Index] = static_cast<uint8_t>(Byte);
  }
  return Result;
}

/// QueryInterface answers.
inline constexpr int32_t IntfResultOk = 0;
inline constexpr int32_t IntfResultNoInterface = static_cast<int32_t>(0x80004002u);

/// The root of every interface: reference counting and the question for
/// another interface of the same object. Interfaces are never deleted
/// through a pointer to them; the object deletes itself on its last
/// Release.
class IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{00000000-0000-0000-C000-000000000046}");

  virtual int32_t QueryInterface(const TGUID& IID, void** Obj) = 0;
  virtual int32_t AddRef() = 0;
  virtual int32_t Release() = 0;
protected:
  ~IInterface() = default;
};

/// Holds one reference to an interface: taking a raw pointer adds a
/// reference, dropping the holder releases it.
template <class I>
class TIntfPtr {
public:
  TIntfPtr() noexcept = default;
  TIntfPtr(std::nullptr_t) noexcept {}
  TIntfPtr(I* Intf) : FIntf(Intf) {
    if (FIntf)
      FIntf->AddRef();
  }
  TIntfPtr(const TIntfPtr& Other) : TIntfPtr(Other.FIntf) {}
  TIntfPtr(TIntfPtr&& Other) noexcept : FIntf(std::exchange(Other.FIntf, nullptr)) {}
  /// From a holder of a derived interface.
  template <class J>
    requires std::is_convertible_v<J*, I*>
  TIntfPtr(const TIntfPtr<J>& Other) : TIntfPtr(static_cast<I*>(Other.get())) {}
  template <class J>
    requires std::is_convertible_v<J*, I*>
  TIntfPtr(TIntfPtr<J>&& Other) noexcept : FIntf(Other.Detach()) {}

  ~TIntfPtr() {
    if (FIntf)
      FIntf->Release();
  }

  TIntfPtr& operator=(const TIntfPtr& Other) {
    TIntfPtr(Other).Swap(*this);
    return *this;
  }
  TIntfPtr& operator=(TIntfPtr&& Other) noexcept {
    TIntfPtr(std::move(Other)).Swap(*this);
    return *this;
  }
  TIntfPtr& operator=(std::nullptr_t) {
    reset();
    return *this;
  }

  /// Takes over a reference the caller already holds (the one QueryInterface
  /// added, for instance) without adding another.
  static TIntfPtr Adopt(I* Intf) noexcept {
    TIntfPtr Result;
    Result.FIntf = Intf;
    return Result;
  }
  /// Gives up the held reference to the caller without releasing it.
  I* Detach() noexcept { return std::exchange(FIntf, nullptr); }

  void reset() { TIntfPtr().Swap(*this); }
  void Swap(TIntfPtr& Other) noexcept { std::swap(FIntf, Other.FIntf); }

  I* get() const noexcept { return FIntf; }
  I* operator->() const noexcept { return FIntf; }
  I& operator*() const noexcept { return *FIntf; }
  explicit operator bool() const noexcept { return FIntf != nullptr; }

  friend bool operator==(const TIntfPtr& Left, std::nullptr_t) noexcept { return Left.FIntf == nullptr; }
  template <class J>
  friend bool operator==(const TIntfPtr& Left, const TIntfPtr<J>& Right) noexcept {
    return Left.get() == Right.get();
  }

private:
  I* FIntf = nullptr;
};

/// Asks the object behind Source for interface J; null when it has none.
template <class J, class I>
TIntfPtr<J> QueryIntf(const TIntfPtr<I>& Source) {
  void* Obj = nullptr;
  if (!Source || Source->QueryInterface(J::IID, &Obj) != IntfResultOk)
    return nullptr;
  return TIntfPtr<J>::Adopt(static_cast<J*>(Obj));
}

/// The reference count behind interfaces. The count starts at 0; the first
/// TIntfPtr takes it to 1, and the Release that brings it back to 0 deletes
/// the object. Counts may change on any thread.
class TInterfacedObject {
public:
  TInterfacedObject() = default;
  TInterfacedObject(const TInterfacedObject&) = delete;
  TInterfacedObject& operator=(const TInterfacedObject&) = delete;
  virtual ~TInterfacedObject() = default;

  Integer RefCount() const noexcept { return FRefCount.load(std::memory_order_relaxed); }

protected:
  int32_t DoAddRef() noexcept { return FRefCount.fetch_add(1, std::memory_order_relaxed) + 1; }
  int32_t DoRelease() noexcept {
    // acq_rel: every write made through other references happens before the
    // deletion on the thread that drops the last one.
    const int32_t Remaining = FRefCount.fetch_sub(1, std::memory_order_acq_rel) - 1;
    if (Remaining == 0) {
      BeforeDestruction();
      delete this;
    }
    return Remaining;
  }
  /// Runs when the last reference has gone, just before deletion, while the
  /// object is still whole: the place to stop threads that call into it.
  virtual void BeforeDestruction() {}

private:
  std::atomic<int32_t> FRefCount{0};
};

/// An object implementing the interfaces Intfs, each of which names its
/// identifier as I::IID. Supplies the three operations of IInterface once
/// for all of them; QueryInterface answers for each of Intfs and for
/// IInterface itself.
template <class... Intfs>
  requires(sizeof...(Intfs) > 0)
class TInterfaced : public TInterfacedObject, public Intfs... {
public:
  int32_t QueryInterface(const TGUID& IID, void** Obj) override {
    if (!Obj)
      return IntfResultNoInterface;
    *Obj = nullptr;
    // The pointer handed out must be of exactly the interface asked for.
    const bool Found = IID == IInterface::IID ? Offer<IInterface, FirstIntf>(Obj) : (Offer<Intfs>(IID, Obj) || ...);
    if (!Found)
      return IntfResultNoInterface;
    DoAddRef();
    return IntfResultOk;
  }
  int32_t AddRef() final { return DoAddRef(); }
  int32_t Release() final { return DoRelease(); }

private:
  using FirstIntf = std::tuple_element_t<0, std::tuple<Intfs...>>;

  /// Stores this object as an I*, reached through Via when I is ambiguous.
  template <class I, class Via = I>
  bool Offer(void** Obj) {
    *Obj = static_cast<I*>(static_cast<Via*>(this));
    return true;
  }
  template <class I>
  bool Offer(const TGUID& IID, void** Obj) {
    return IID == I::IID && Offer<I>(Obj);
  }
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

/// Why a thread last stopped.
enum TThreadStopReason : uint8_t {
  tsrNotStopped = 0,
  tsrUnknown = 1,
  tsrAtBreakpoint = 2,
  tsrStepDone = 3,
  tsrFCallDone = 4,
  tsrSignal = 5,
  tsrError = 6,
  tsrExceptRaised = 7,
};

// ---------------------------------------------------------------------------
// The process as the output parser sees it

/// Implemented by the process; the output parser reports what it reads
/// through it and finds the result objects of pending requests.
class IGDBInternalProcess : public IInterface {
public:
  static constexpr TGUID IID = TGUID::Parse("{FF5F9453-8CDC-456A-8A94-A3640DD63033}");

  virtual void NotifyLogEvent(const TGDBLogEvent& Event) = 0;
  virtual void NotifyProcessStarted() = 0;
  virtual void NotifyProcessExited(Integer Code, const std::string& Signal) = 0;
  virtual void NotifyProcessResumed() = 0;
  virtual void NotifyProcessFaulted(const std::string& Message) = 0;
  virtual void NotifyProcessSuspended(const TGDBLocation& Location, Integer ThreadId, TThreadStopReason Reason) = 0;
  virtual void NotifySignalReceived(const TGDBException& SignalException, Integer ThreadId) = 0;
  virtual void NotifyExceptionRaised(const TGDBException& LanguageException, Integer ThreadId) = 0;
  virtual void NotifyThreadCreated(Integer ThreadId, Integer OsId) = 0;
  virtual void NotifyThreadExited(Integer ThreadId) = 0;
  virtual void NotifyThreadSelected(Integer ThreadId) = 0;
  virtual void NotifyProcessPidCreated(Integer Pid) = 0;
  virtual void NotifyLanguageChanged(const std::string& LanguageName) = 0;
  virtual void NotifySettingMaxChildrenCountChanged(Integer Count) = 0;
  virtual void NotifyModuleLoaded(const TGDBModule& Module) = 0;
  virtual void NotifyModuleUnLoaded(const TGDBModule& Module) = 0;
  /// True when the breakpoint has a listener.
  virtual bool NotifyBreakpointOccurred(Integer Breakpoint, const TGDBLocation& Location, Integer ThreadId) = 0;
  virtual void NotifyBreakpointModified(Integer Breakpoint, const TGDBLocation& Location) = 0;
  virtual void NotifyWatchpointOutOfScope() = 0;
  virtual void NotifyProcessRestart() = 0;
  /// Takes the result object waiting under Key out of the table; null when
  /// none waits. The object stays owned by its requester.
  virtual TGDBResult* RemoveWaitObject(const std::string& Key) = 0;   // not owned by the table
  virtual std::string GetEndOfLineMarker() = 0;
  virtual bool IsLLDB() = 0;
  virtual bool IsAndroid64() = 0;
  virtual bool IsLinux() = 0;
  virtual bool IsWindows() = 0;
  virtual bool IsAttachMode() = 0;
  virtual bool SupportHXConsole() = 0;
  virtual bool IsDying() = 0;
  /// A stable id per module name.
  virtual Integer GetModuleId(const std::string& Name) = 0;
};


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
};

} // namespace midebug
