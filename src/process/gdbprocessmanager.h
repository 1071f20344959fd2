#pragma once
/// \file
/// Where the IDE starts: create a debugged process for a program, or attach
/// to a running one. Failures raise ENonAIRException with the reason.

#include "process/gdbinterfaces.h"

#include <string>

namespace midebug {

class TGDBProcessManager {
public:
  /// Debugs ExeName through RemoteProfile (empty: LLDB's front end on this
  /// machine) with the debugger LauncherPath.
  static TIntfPtr<IGDBProcess> CreateProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& ExeName,
                                             const std::string& Arguments, const std::string& WorkingDir,
                                             const std::string& RemoteProfile, const std::string& Platform,
                                             TGDBLanguage Language, TGDBCPU CPU, const std::string& LauncherPath);
  /// As above, with the agent preparing the debugger under PrepCommandId.
  static TIntfPtr<IGDBProcess> CreateProcess(const TIntfPtr<IGDBProcessListener>& Listener, const std::string& ExeName,
                                             const std::string& Arguments, const std::string& WorkingDir,
                                             const std::string& RemoteProfile, const std::string& Platform,
                                             TGDBLanguage Language, TGDBCPU CPU, Integer PrepCommandId);
  /// Attaches a local debugger to Pid.
  static TIntfPtr<IGDBProcess> AttachProcess(const TIntfPtr<IGDBProcessListener>& Listener, Integer Pid,
                                             const std::string& Platform, TGDBLanguage Language, TGDBCPU CPU,
                                             const std::string& LauncherPath);
  /// Attaches through a command file that names the program.
  static TIntfPtr<IGDBProcess> AttachProcess(const TIntfPtr<IGDBProcessListener>& Listener,
                                             const std::string& CommandFile, Integer Pid, const std::string& Platform,
                                             TGDBLanguage Language, TGDBCPU CPU, const std::string& LauncherPath);
  /// Attaches to Pid through RemoteProfile.
  static TIntfPtr<IGDBProcess> AttachProcess(const TIntfPtr<IGDBProcessListener>& Listener, Integer Pid,
                                             const std::string& RemoteProfile, const std::string& Platform,
                                             TGDBLanguage Language, TGDBCPU CPU);
  /// As above, with the debugger LauncherPath (empty: the profile's own), so
  /// that the "local" profile attaches with LLDB's front end too.
  static TIntfPtr<IGDBProcess> AttachProcess(const TIntfPtr<IGDBProcessListener>& Listener, Integer Pid,
                                             const std::string& RemoteProfile, const std::string& Platform,
                                             TGDBLanguage Language, TGDBCPU CPU, const std::string& LauncherPath);
};

} // namespace midebug
