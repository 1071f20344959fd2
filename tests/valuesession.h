#pragma once
/// \file
/// A debuggee stopped under the real GDB through the "local" profile, for
/// the evaluation and inspector tests: breakpoints on source lines found by
/// a marker comment, stops awaited through the listener.

#include "inspect/gdbthread.h"
#include "inspect/gdbthreadtable.h"
#include "midebug.h"
#include "process/gdbprocess.h"
#include "testlistener.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <fstream>
#include <string>
#include <vector>

namespace midebug::test {

class ValueSession : public ::testing::Test {
protected:
  void SetUp() override { SetMainThread(); }

  /// Loads Program, breaks at each of Locations ("file:line" or a function)
  /// and runs to the first stop.
  void Launch(const std::string& Program, TGDBLanguage Language, const std::vector<std::string>& Locations) {
    Process = TGDBProcessManager::CreateProcess(Listener, Program, "", "", "local", "Linux64", Language, gcAMD64,
                                                "gdb");
    ASSERT_TRUE(Process);
    for (const std::string& Location : Locations)
      ASSERT_TRUE(Core().ProcessAsyncRequest("-break-insert " + Location));
    ASSERT_TRUE(Core().ProcessAsyncRequest("-exec-run"));
    WaitForStop();
  }
  /// "FILE:LINE" of the line of FileName holding Marker.
  static std::string At(const std::string& FileName, const std::string& Marker) {
    return FileName + ":" + std::to_string(LineOf(FileName, Marker));
  }

  void Continue() {
    ASSERT_TRUE(Core().ProcessAsyncRequest("-exec-continue"));
    WaitForStop();
  }
  void StepOver() {
    Thread()->StepOver();
    WaitForStop();
  }
  void WaitForStop() {
    const size_t Before = FStops;
    ASSERT_TRUE(Listener->PumpUntil([&] { return Stops() > Before; })) << "the program did not stop";
    FStops = Stops();
  }
  size_t Stops() const { return Listener->CountOf("Suspended("); }

  TIntfPtr<IGDBThread> Thread() { return Process->GetThread(Process->GetSuspendedThreadId()); }
  TGDBProcess& Core() { return *static_cast<TGDBProcess*>(Process.get()); }

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

  TIntfPtr<TTestListener> Listener{new TTestListener};
  TIntfPtr<IGDBProcess> Process;

private:
  size_t FStops = 0;
};

} // namespace midebug::test
