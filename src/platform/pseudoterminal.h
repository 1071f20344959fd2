#pragma once
/// \file
/// A pseudo-terminal for a debugged program: the program writes to and reads
/// from the terminal's slave side, the host reads the master side.

#include "platform/hostprocess.h"

#include <string>

namespace midebug {

/// A pseudo-terminal in raw mode: the program's "\n" reaches the master as
/// it was written, not as "\r\n", and nothing typed is echoed. The host keeps
/// the slave open as well, so that the terminal outlives the programs run on
/// it and the master never reads end of file between two runs. Every
/// descriptor is close-on-exec. Open, Close and destruction belong to the
/// owner; Read and WaitForOutput to one reader at a time; Wake to any thread.
class TPseudoTerminal {
public:
  TPseudoTerminal() = default;
  ~TPseudoTerminal() { Close(); }
  TPseudoTerminal(const TPseudoTerminal&) = delete;
  TPseudoTerminal& operator=(const TPseudoTerminal&) = delete;

  /// Opens a new terminal. False with the step that failed and the
  /// system's message in Error; nothing stays open then.
  bool Open(std::string& Error);
  void Close();
  bool IsOpen() const { return FMaster != InvalidHandle; }
  /// The slave's device path, for the program to open.
  const std::string& SlavePath() const { return FSlavePath; }
  /// Reads what the program wrote without waiting: the count read, 0 when
  /// nothing waits, -1 when the terminal failed or was hung up.
  Int64 Read(void* Buffer, size_t Count);
  /// Waits at most TimeoutMs for output. True when Read has something to
  /// tell (output, or the terminal's failure); false when the time passed or
  /// Wake was called.
  bool WaitForOutput(int TimeoutMs);
  /// Ends every WaitForOutput from now on at once.
  void Wake();

private:
  THandle FMaster = InvalidHandle;
  THandle FSlave = InvalidHandle;
  std::string FSlavePath;
  TPipe FWakePipe;
};

} // namespace midebug
