#pragma once
/// \file
/// The registers of one process: the debugger's numbers of the general, x87
/// and SSE registers, and their reads and writes.

#include "mi/gdbcommand.h"
#include "mi/gdbresult.h"
#include "platform/types.h"

#include <mutex>
#include <string>

namespace midebug {

class TGDBProcess;

/// The debugger's register numbers of the general, x87 and SSE registers, in
/// the order of the processor's name tables, learnt once from the
/// debugger's register names; and the requests that read and write the
/// registers of the current thread in its selected frame. Value arrays are
/// ordered like the name tables. FLock guards the fields and is a leaf lock.
class TGDBRegisterIds {
public:
  explicit TGDBRegisterIds(TGDBProcess& Process) : FProcess(Process) {}

  /// Learns the numbers unless known; false only when the debugger did not
  /// answer in time (any other failure leaves the lists empty, asked again
  /// next time).
  bool GetRegisterIds();
  /// All values in one request, else one request per register (a register
  /// that still fails reads as zero); true when any value was read.
  bool GetRegisters(TUInt64Array& Values);
  bool GetFPURegisters(TFPURegValueArray& Values);
  bool GetXMMRegisters(TXMMRegValueArray& Values);
  /// Writes the registers whose New value differs from Old, each awaited;
  /// true when every write was taken. Nothing is sent for equal arrays.
  bool SetRegisters(const TUInt64Array& Old, const TUInt64Array& New);
  bool SetFPURegisters(const TFPURegValueArray& Old, const TFPURegValueArray& New);
  bool SetXMMRegisters(const TXMMRegValueArray& Old, const TXMMRegValueArray& New);
  /// Why the last write failed, in one line; empty after a good one.
  std::string LastError();

  /// The decimal text with which GDB stores the 80-bit x87 value in Value's
  /// first ten bytes exactly; false, with Why, for values no text gives
  /// (NaNs, unnormals).
  static bool X87ValueText(const TXMMFPURegValue& Value, std::string& Text, std::string& Why);

private:
  template <class TResult, class TValue, class TList, class TSingle>
  bool Read(const TIntegerArray TGDBRegisterIds::*Ids, std::vector<TValue>& Values, TList List, TSingle Single);
  template <class TValue, class TWrite>
  bool Write(const TIntegerArray TGDBRegisterIds::*Ids, const std::vector<TValue>& Old,
             const std::vector<TValue>& New, TWrite WriteOne);
  /// Sends one write and waits for its answer; false, with the reason kept,
  /// when refused.
  template <class TCreate, class... TArgs>
  bool AskWrite(TMiCommand Command, TCreate&& Create, TArgs&&... Args);
  /// LLDB's "register write" line, behind a token so that its answer can be
  /// awaited.
  bool AskCLIWrite(const std::string& Line);
  /// Writes through a C expression (GDB parses "{...}" and "2.5L" only in
  /// C, whatever the frame's language).
  bool AskCExpression(const std::string& Expression);
  void SetLastError(const std::string& Message);

  TGDBProcess& FProcess;
  std::mutex FLock;
  TIntegerArray FRegisterIds;
  TIntegerArray FFPURegisterIds;
  TIntegerArray FXMMRegisterIds;
  std::string FLastError;
};

} // namespace midebug
