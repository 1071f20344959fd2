#pragma once
/// \file
/// A debuggee stopped under the real GDB through the "local" profile, for
/// the evaluation and inspector tests: breakpoints on source lines found by
/// a marker comment, stops awaited through the listener.

#include "inspect/gdbthread.h"
#include "inspect/gdbthreadtable.h"
#include "stoppedprogram.h"

#include <string>
#include <vector>

namespace midebug::test {

class ValueSession : public StoppedProgram {
protected:
  /// "FILE:LINE" of the line of FileName holding Marker.
  static std::string At(const std::string& FileName, const std::string& Marker) {
    return FileName + ":" + std::to_string(LineOf(FileName, Marker));
  }

  void StepOver() {
    Thread()->StepOver();
    WaitForStop();
  }
  TIntfPtr<IGDBThread> Thread() { return Process->GetThread(Process->GetSuspendedThreadId()); }

  /// The value Evaluate gives, or "error: " and the message.
  std::string Eval(const std::string& Expr, const std::string& Suffix = "", Integer Frame = 1) {
    std::string Value, TypeName;
    bool CanModify = false;
    const TGDBRetCode Code = Thread()->Evaluate(Expr, Suffix, Frame, Value, CanModify, TypeName);
    return Code == ercOk ? Value : "error: " + Value;
  }

  /// Member Index of Inspector as "name=value" ("name!error" on failure).
  static std::string Member(const TIntfPtr<IGDBInspect>& Inspector, Integer Index) {
    std::string Name, TypeName, Value;
    UInt64 Address = 0;
    TInspectFlags Flags = 0;
    const bool Ok = Inspector->GetMember(Index, Name, TypeName, Value, Address, Flags);
    return Name + (Ok ? "=" : "!") + Value;
  }
  /// Every member of Inspector, as Member gives them.
  static std::vector<std::string> Members(const TIntfPtr<IGDBInspect>& Inspector) {
    std::vector<std::string> All;
    for (Integer Index = 0; Index < Inspector->GetMemberCount(); ++Index)
      All.push_back(Member(Inspector, Index));
    return All;
  }
};

} // namespace midebug::test
