#pragma once
/// \file
/// Helpers shared by the tests: locating the fake debugger and test data,
/// scratch directories, and compiling small programs to debug.

#include "kernel/gdbkernel.h"
#include "midebug.h"

#include <string>

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

} // namespace midebug::test
