#pragma once
/// \file
/// Helpers shared by the tests: locating the fake debugger and test data,
/// scratch directories, and compiling small programs to debug.

#include "kernel/gdbkernel.h"
#include "midebug.h"

#include <nlohmann/json.hpp>

#include <functional>
#include <string>
#include <vector>

namespace midebug::test {

/// The whole content of a file, byte for byte (empty when unreadable).
std::string ReadWholeFile(const std::string& Path);

/// Text split at its line ends, without them.
TStringArray SplitLines(const std::string& Text);

/// Reads reply blocks until one contains Needle; on a read error, the error
/// text after "read failed: ".
std::string ReplyContaining(TGDBKernel& Kernel, const std::string& Needle);

/// Path of the scripted fake MI debugger built beside the tests.
std::string FakeDebuggerPath();

/// Directory of the committed test data (scripts, transcripts).
std::string TestDataDir();

/// A program under tests/debuggees, built once by CMake with debug
/// information; Name is its source's name without the extension.
std::string Debuggee(const std::string& Name);

/// The source file of a debuggee, e.g. DebuggeeSource("loop.c").
std::string DebuggeeSource(const std::string& FileName);

/// The 1-based line of the debuggee source FileName that holds Marker; 0
/// when none does.
Integer LineOf(const std::string& FileName, const std::string& Marker);

/// LLDB's MI front end (MIDEBUG_LLDB_MI, else the workplace's copy) when it
/// runs here; empty, with the reason for a skip in WhyNot, when it does not.
std::string LLDBMIPath(std::string& WhyNot);

/// Living child processes with the given name of Parent (0: of this test
/// program).
std::vector<int> ChildrenNamed(const std::string& Name, int Parent = 0);

/// Starts a debuggee in the background, its output dropped; its process id,
/// 0 when it did not start.
int StartDebuggee(const std::string& Name);

/// Whether Pid names a process that has not ended (a zombie has ended).
bool ProcessRuns(int Pid);

/// Path of a fake-debugger script under tests/data/fakemi.
std::string FakeScript(const std::string& Name);

/// A fresh directory under the system's temporary directory, removed when the
/// object is destroyed.
class TScratchDir {
public:
  TScratchDir();
  ~TScratchDir();
  TScratchDir(const TScratchDir&) = delete;
  TScratchDir& operator=(const TScratchDir&) = delete;
  const std::string& Path() const { return FPath; }
  /// Writes Text to Name inside the directory and returns the full path.
  std::string WriteFile(const std::string& Name, const std::string& Text) const;

private:
  std::string FPath;
};

/// What one batch run of the console debugger printed and how it ended.
struct TCliRun {
  std::vector<nlohmann::json> Lines; ///< the JSON objects printed, in order
  std::string Stdout, Stderr;
  int ExitCode = -1; ///< a batch in which a command failed ends with 3

  /// The first object for which Match holds, or null.
  const nlohmann::json* Find(const std::function<bool(const nlohmann::json&)>& Match) const;
  const nlohmann::json* Answer(const std::string& Name) const;
  const nlohmann::json* Event(const std::string& Name) const;
  /// Every object whose Key is Value, in order.
  std::vector<nlohmann::json> All(const std::string& Key, const std::string& Value) const;
  /// Everything the program printed, joined.
  std::string Output() const;
};

/// The address of Symbol in Program once GDB has loaded it (GDB turns
/// address randomisation off); 0 when nm does not list it.
UInt64 SymbolAddress(const std::string& Program, const std::string& Symbol);

/// An address as 0x and sixteen hex digits.
std::string Hex(UInt64 Address);

/// Text in single quotes, for a shell.
std::string Quote(const std::string& Text);

/// Runs `midebug --batch [--json] --wait 20 Arguments` inside Dir with Commands
/// on its standard input.
TCliRun RunCli(const TScratchDir& Dir, const std::string& Arguments, const std::string& Commands,
               bool Json = true);

/// Sets an environment variable for the lifetime of the object and restores
/// its previous state afterwards.
class TScopedEnv {
public:
  TScopedEnv(const std::string& Name, const std::string& Value);
  ~TScopedEnv();
  TScopedEnv(const TScopedEnv&) = delete;
  TScopedEnv& operator=(const TScopedEnv&) = delete;

private:
  std::string FName;
  std::string FOldValue;
  bool FHadValue;
};

/// The fake debugger installed as Name ("gdb", "lldb-mi") on a PATH of its
/// own, playing the given script under tests/data/fakemi, while the object
/// lives.
class TFakeOnPath {
public:
  TFakeOnPath(const std::string& Name, const std::string& Script);

private:
  TScratchDir FBin;
  TScopedEnv FPath;
  TScopedEnv FScript;
};

} // namespace midebug::test
