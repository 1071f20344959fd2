#pragma once
/// \file
/// The threads of one debugged process as the IDE holds them.

#include "inspect/gdbthread.h"
#include "mi/gdbresult.h"

#include <map>
#include <mutex>
#include <vector>

namespace midebug {

class TGDBProcess;

/// The thread table: the threads by the debugger's number, the thread the
/// program last stopped in, the location of a stop inside inlined code, and
/// the zombie that stands for any number the table does not hold. FLock
/// guards all of it and is a leaf lock: no request is made and no listener
/// is called while it is held.
class TGDBThreadTable {
public:
  explicit TGDBThreadTable(TGDBProcess& Process);
  ~TGDBThreadTable();

  /// The thread numbered Id, or the zombie.
  TIntfPtr<IGDBThread> Get(Integer Id);
  /// Adds a thread unless the table holds its number; true when added.
  bool Add(Integer Id, Integer OsId, const std::string& Name, const std::string& State);
  /// True when the table held Id; the stopped thread is let go first when it
  /// is that one.
  bool Remove(Integer Id);
  /// Empties the table; the numbers it held.
  std::vector<Integer> Clear();
  /// Merges the debugger's list of thread ids: known threads take its states
  /// and forget their stacks; Created and Exited receive the numbers gained
  /// and lost.
  void Merge(const TThreadListIdsResult& Ids, std::vector<Integer>& Created, std::vector<Integer>& Exited);
  /// Takes the states, locations and (unless StateOnly) names of the listed
  /// threads; RunningMeansStopped reads "running" as stopped.
  void Apply(const TThreadInfoResult& Info, bool RunningMeansStopped);
  /// Forgets every thread's stack.
  void ResetCallStacks();

  /// The stopped thread's number and location; -1 and the empty location
  /// without one.
  Integer StoppedId();
  TGDBLocation StoppedLocation();
  /// Makes thread Id the stopped thread at Location; no stopped thread when
  /// the table does not hold Id. Reason and Frame are recorded unless absent
  /// (tsrNotStopped, -1).
  void SetStopped(Integer Id, const TGDBLocation& Location, TThreadStopReason Reason = tsrNotStopped,
                  Integer Frame = -1);
  /// Records Frame (0-based) and its location on the stopped thread.
  void SetStoppedFrame(Integer Frame, const TGDBLocation& Location);
  /// The program runs on: the stopped thread's number (-1 without one); no
  /// thread is stopped, the inline location and return value are forgotten.
  Integer Resume();
  /// What the last finished function returned; empty after a resume.
  void SetReturnValue(const std::string& Value);
  std::string ReturnValue();

  // --- Requests (src/inspect/gdbprocessthreads.cpp) ----------------------
  /// The location of the debugger's current frame, or the empty location.
  TGDBLocation CurrentLocation();
  /// Makes ThreadId the debugger's current thread; on success it becomes
  /// the stopped thread, at the reply's location and frame (no stopped
  /// thread when the table does not hold it). A rejected selection changes
  /// nothing.
  void Select(Integer ThreadId);
  /// Selects Frame (0-based) of the stopped thread in the debugger.
  void SelectFrame(Integer Frame);
  /// Depth of the current thread's stack, counted up to MaxCallDepth + 1 (a
  /// count above MaxCallDepth means the stack goes deeper still); 0 on error.
  Integer CallCount();
  /// GDB unwinds about 30,000 frames a second; counting this many stays
  /// within a third of a synchronous request's time-out, so a runaway
  /// recursion cannot make the IDE ask whether the debugger is lost.
  static constexpr Integer MaxCallDepth = 50000;
  /// The current thread's frames at levels Low to High (0-based) with their
  /// header lines and parameter names, Frames[0] being level Low; fewer when
  /// the stack ends first. False, with Frames empty, when none was listed.
  bool CallHeaders(Integer Low, Integer High, TStackFrameArray& Frames);
  /// Refreshes the table from the debugger's list of thread ids and tells
  /// the IDE of the threads gained and lost. Call on the main thread.
  void RefreshList();
  /// Refreshes the state, location and (unless StateOnly) the name of every
  /// known thread. Call on the main thread.
  void RefreshStates(bool StateOnly);
  /// True while the threads' states may be stale (the program ran since).
  bool StatesStale() const;

  /// The location of a stop that named no thread: inlined code whose frame
  /// lacks the source.
  void SetInlineLocation(const TGDBLocation& Location);
  /// Location with the inline location's source and line when it has a line
  /// but no source.
  TGDBLocation FixupInlineLocation(const TGDBLocation& Location);

private:
  TGDBProcess& FProcess;
  std::mutex FLock;
  std::map<Integer, TIntfPtr<TGDBThread>> FThreads;
  TIntfPtr<TGDBThread> FZombie;
  /// Points into FThreads; the table holds the reference.
  TGDBThread* FStopped = nullptr;
  TGDBLocation FInlineLocation;
  std::string FReturnValue;
};

} // namespace midebug
