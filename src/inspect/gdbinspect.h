#pragma once
/// \file
/// Inspectors: a tree view over a variable object and its children, fetched
/// lazily, and the view over a frame's arguments and locals.

#include "process/gdbinterfaces.h"

#include <map>
#include <memory>
#include <string>
#include <vector>

namespace midebug {

class TGDBProcess;
class TGDBEvaluator;

/// A variable object and its children. A root owns its variable object; a
/// child belongs to its parent's and is registered with its thread by name,
/// so that an update of the root reaches it. Every operation runs on the
/// IDE's thread.
class TGDBInspect : public TInterfaced<IGDBInspect> {
public:
  /// An inspector without a variable object yet; "process not suspended"
  /// when Thread is null.
  TGDBInspect(TGDBProcess& Process, const TIntfPtr<IGDBThread>& Thread, const std::string& Expr,
              Integer NumChildren);
  /// The root inspector of Expr, evaluated in the current frame (Address 0).
  TGDBInspect(const std::string& Expr, UInt64 Address, TGDBProcess& Process, const TIntfPtr<IGDBThread>& Thread);
  ~TGDBInspect() override;

  TIntfPtr<IGDBInspect> CreateSubInspector(TInspectItem Item, Integer Index) override;
  bool Refresh() override;
  Integer GetAncestorCount() override { return 0; }
  Integer GetMemberCount() override;
  Integer GetPropertyCount() override { return 0; }
  Integer GetMethodCount() override { return 0; }
  bool GetMember(Integer Index, std::string& Name, std::string& TypeName, std::string& Value, UInt64& Address,
                 TInspectFlags& Flags) override;
  std::string GetExpr() override { return FExpr; }
  std::string GetFullExpr() override;
  std::string GetType() override { return FType; }
  std::string GetValue() override { return FValue; }
  std::string GetAddress() override { return FNumChildren != 0 ? FValue : std::string(); }
  TInspectKind GetKind() override;
  TInspectFlags GetFlags() override;
  bool ResultsAvailable() override { return FError; }
  bool HasError() override { return FError; }
  std::string GetLastError() override { return FLastError; }
  Integer GetInspectRangeStart() override { return FRangeStart; }
  void SetInspectRange(Integer Start, Integer Count) override;

  /// The child at Index, its variable object and value fetched on first
  /// demand; null outside the children.
  TIntfPtr<TGDBInspect> GetChildren(Integer Index);
  /// True while the variable object is valid; takes the changed values.
  bool Update();
  void SetValue(const std::string& Value) { FValue = Value; }
  const std::string& Name() const { return FName; }

protected:
  /// A variable object, deleted with the last inspector that shares it.
  struct TVarObject;

  void SetName(const std::string& Name, bool Register);
  void SetNumChildren(Integer Count);
  /// Takes the variable object the debugger made: its name, type, value and
  /// children.
  void Adopt(const TVarCreateResult& Created);
  void FetchValueAndAttribute();
  /// Gives an inspector without a variable object one, in its frame.
  void CreateVariableObject();
  /// Selects the frame the inspector's expressions are read in; the locals
  /// view reads its children in its own frame, not the one shown last.
  virtual void SelectOwnFrame() {}
  /// Every slot a placeholder with Error as its text.
  void FillPlaceholders(const std::string& Error);
  /// Lists the children around Index that are not listed yet.
  void ListChildren(Integer Index);
  /// Counts a pretty printer's children by listing them in windows.
  void ListDynamicChildren();
  /// Stores listed children from slot First on; false when a name is taken.
  /// Children of a slice (Owner given) are named by their index in this array.
  bool StoreChildren(const TGDBVarChildArray& Children, Integer First,
                     const std::shared_ptr<TVarObject>& Owner = nullptr);
  /// Lists the elements From to To - 1 of a large array through a variable
  /// object of that slice alone: GDB makes a variable object for every element
  /// of an array whose children are listed, however few are asked for.
  bool ListSlice(Integer From, Integer To, std::string& Error);
  TGDBEvaluator& Evaluator();

  TGDBProcess& FProcess;
  /// Keeps the process alive while an inspector may still delete its
  /// variable object.
  TIntfPtr<IGDBProcess> FProcessRef;
  TIntfPtr<IGDBThread> FThread;
  /// The root's variable object, deleted when the root and every child
  /// handed out are gone: GDB deletes the children with it.
  std::shared_ptr<TVarObject> FVarObject;
  /// The slices a large array's windows were listed through, updated with it.
  std::vector<std::shared_ptr<TVarObject>> FSlices;
  std::string FExpr;
  std::string FFullExpr;
  bool FFullExprDefined = false;
  std::string FName;
  std::string FType;
  std::string FValue;
  bool FValueDefined = false;
  bool FEditable = false;
  /// The children listed so far, by index: a huge array holds a window.
  std::map<Integer, TIntfPtr<TGDBInspect>> FChildren;
  Integer FNumChildren = 0;
  bool FAutoDelete = true;
  bool FRegistered = false;
  bool FError = false;
  std::string FLastError;
  Integer FRangeStart = 0;
  Integer FRangeCount = -1;
  /// A pretty printer's object, whose children are counted by listing.
  bool FDynamic = false;
  /// The printer shows key and value children in turn: one member each pair.
  bool FMapHint = false;
};

/// The arguments (first) and locals of one frame of one thread.
class TGDBLocalInspect : public TGDBInspect {
public:
  TGDBLocalInspect(TGDBProcess& Process, const TIntfPtr<IGDBThread>& Thread, Integer Frame, Integer CallCount,
                   Integer LocalCount, Integer NumChildren);

  bool Refresh() override;
  /// Rebuilds the children from Params and Locals.
  void Reset(Integer CallCount, const TStringArray& Params, const TStringArray& Locals);
  void SetError(const std::string& Error);

protected:
  void SelectOwnFrame() override;

private:
  /// The frame's function and depth: another frame at the same depth (a
  /// different function, or another call) is not this one.
  std::string FrameKey();

  Integer FFrame;
  Integer FCallCount;
  Integer FLocalCount;
  std::string FFrameKey;
};

} // namespace midebug
