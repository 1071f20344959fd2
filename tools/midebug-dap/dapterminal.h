#pragma once
/// \file
/// Running the program in the client's terminal: a stand-in process that
/// the client starts there, that the debugger attaches to, and that then
/// becomes the program. The adapter and the stand-in meet in a folder of
/// their own: the stand-in leaves its process id there, the adapter a mark
/// that the debugger holds it.

#include <string>

namespace midebug::dap {

/// The argument that makes midebug-dap the stand-in:
/// midebug-dap --run-in-terminal FOLDER PROGRAM [ARGUMENTS...]
inline constexpr const char* StandInOption = "--run-in-terminal";

/// The stand-in's side; returns only when it could not become the program.
int RunStandIn(int ArgCount, char** Args);

/// The adapter's side of one meeting folder, removed with the object.
class TStandInMeeting {
public:
  TStandInMeeting() = default;
  ~TStandInMeeting();
  TStandInMeeting(const TStandInMeeting&) = delete;
  TStandInMeeting& operator=(const TStandInMeeting&) = delete;

  /// Makes the folder; false with the reason in Error.
  bool Create(std::string& Error);
  const std::string& Folder() const { return FFolder; }
  /// The stand-in's process id once it has left it; -1 before.
  int StandInPid() const;
  /// Tells the stand-in to become the program once it runs again.
  void Release() const;
  /// Removes the folder: a stand-in still waiting gives up.
  void Dismiss();

private:
  std::string FFolder;
};

} // namespace midebug::dap
