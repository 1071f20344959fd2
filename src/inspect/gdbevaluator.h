#pragma once
/// \file
/// Expression evaluation of one process: the variable-object wrappers, the
/// one-shot Evaluate and Modify, and the locals view.

#include "mi/gdbcommand.h"
#include "mi/gdbresult.h"
#include "process/gdbinterfaces.h"

#include <atomic>
#include <mutex>
#include <string>

namespace midebug {

class TGDBProcess;
class TGDBLocalInspect;

/// Sends the variable-object commands and keeps the one variable object that
/// the last Evaluate made, for Modify. FLock guards the evaluation's name and
/// type and is a leaf lock: no request is made while it is held.
class TGDBEvaluator {
public:
  /// Evaluating is the process's flag behind EvaluatorBusy; it is also set
  /// while any expression the program may run a function for is evaluated,
  /// so that a fault in such a call is not taken for the program's own stop.
  /// MaxChildrenCount is LLDB's child limit as first reported, or -1.
  TGDBEvaluator(TGDBProcess& Process, std::atomic<bool>& Evaluating, const std::atomic<Integer>& MaxChildrenCount);

  /// "var1", "var2", ...: never reused for the life of the process.
  std::string GetUniqueVarName();

  // --- Variable objects. Every name is quoted unless the debugger is LLDB
  // on a target other than Windows: GDB's child names hold blanks.
  /// Creates a variable object for Expr in the current frame (Address 0)
  /// with its value and editability. A Pascal program's objects are made
  /// and listed with the language set to C: GDB dies printing a Pascal
  /// array's type.
  void VarCreate(const std::string& Expr, UInt64 Address, TVarCreateResult& Created);
  void VarDelete(const std::string& Name);
  /// Children From to To - 1; From -1 lists them all (LLDB: up to its limit).
  bool VarListChildren(const std::string& Name, Integer From, Integer To, TVarListChildrenResult& Children);
  bool VarInfoPathExpression(const std::string& Name, TVarInfoPathExpressionResult& Path);
  bool VarShowAttributes(const std::string& Name, TVarShowAttributesResult& Attributes);
  bool VarEvaluateExpression(const std::string& Name, TVarEvaluateExpressionResult& Value);
  bool VarAssign(const std::string& Name, const std::string& TypeName, const std::string& Value,
                 TVarAssignResult& Assigned);
  bool VarUpdate(const std::string& Name, TVarUpdateResult& Update);

  // --- One-shot evaluation ----------------------------------------------
  /// Suffix is a display format: "x" (hexadecimal), "d" (decimal), "o",
  /// "t" (binary), "c" (character) or "r"/"" (as the type shows it).
  TGDBRetCode Evaluate(const std::string& Expr, const std::string& Suffix, UInt64 Address, std::string& Value,
                       bool& CanModify, std::string& TypeName);
  /// Clears the outputs; Value says why when Reason is given.
  static TGDBRetCode EvaluateError(std::string& Value, bool& CanModify, std::string& TypeName,
                                   const std::string& Reason = {});
  /// Assigns NewValue to the expression Evaluate saw last.
  TGDBRetCode Modify(const std::string& NewValue, std::string& Value);

  // --- Locals -------------------------------------------------------------
  /// Fills Existing, or a new locals inspector, with the parameters (Params)
  /// and the locals of the selected frame Frame (1-based) of Thread.
  TIntfPtr<IGDBInspect> CreateLocalVarsInspector(const TIntfPtr<IGDBThread>& Thread, Integer Frame,
                                                 Integer CallCount, const TStringArray& Params,
                                                 TGDBLocalInspect* Existing);
  /// The number of locals of the selected frame; 0 on error.
  Integer GetLocalVarsCount();

  TGDBProcess& Process() { return FProcess; }
  /// Children listed at a time: a screenful of the IDE's view, and the most a
  /// pretty printer is asked for at once.
  static constexpr Integer ChildWindow = 100;
  /// A pretty printer's children are counted up to this many: an
  /// uninitialised container may claim billions.
  static constexpr Integer MaxDynamicChildren = 1000;

private:
  bool Quoted();
  /// Sends what GDB needs once before the first variable object.
  void Prepare();
  /// Sets the process's evaluating flag for a scope and restores it.
  class TEvaluatingScope;
  /// Sets GDB's language to C for a scope in a Pascal program.
  class TCLanguageScope;
  bool PascalOnGDB();

  TGDBProcess& FProcess;
  std::atomic<bool>& FEvaluating;
  const std::atomic<Integer>& FMaxChildrenCount;
  std::atomic<Integer> FVarCreateId{0};
  std::once_flag FPrepared;
  std::mutex FLock;
  std::string FEvalVarName;
  std::string FEvalVarType;
};

} // namespace midebug
