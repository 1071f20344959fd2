#pragma once
/// \file
/// Child processes joined by anonymous pipes, and the pipe I/O the kernels
/// need: a non-blocking look at what is waiting, a bounded wait for data,
/// whole reads and writes. A Windows host would supply the same functions.

#include "platform/types.h"

#include <string>
#include <vector>

namespace midebug {

/// An operating-system handle of a pipe end (a file descriptor here).
using THandle = int;
constexpr THandle InvalidHandle = -1;

/// An anonymous pipe. Both ends are private to this process (close-on-exec)
/// until a child is started on them; freeing the pipe closes both ends.
class TPipe {
public:
  TPipe();
  ~TPipe();
  TPipe(const TPipe&) = delete;
  TPipe& operator=(const TPipe&) = delete;

  bool Created() const { return FReadHandle != InvalidHandle; }
  THandle ReadHandle() const { return FReadHandle; }
  THandle WriteHandle() const { return FWriteHandle; }
  /// Closes one end early, e.g. the end that now belongs to a child.
  void CloseRead();
  void CloseWrite();

private:
  THandle FReadHandle = InvalidHandle;
  THandle FWriteHandle = InvalidHandle;
};

/// What waiting on a pipe found.
enum class TPipeState { Data, Empty, Closed, Failed };

/// Waits at most TimeoutMs for bytes on Handle. Data when bytes can be read,
/// Empty when the time passed, Closed when the writer has gone and nothing
/// is left, Failed on an error.
TPipeState WaitForPipeData(THandle Handle, int TimeoutMs);

/// Reads up to Count bytes; the number read, 0 at end of file, -1 on failure.
Int64 ReadHandle(THandle Handle, void* Buffer, size_t Count);

/// Writes all Count bytes, retrying partial writes; the number written, or -1
/// on failure. A reader that has gone away is an error (EPIPE), never a
/// signal that ends the host.
Int64 WriteHandle(THandle Handle, const void* Buffer, size_t Count);

/// Splits a command line into program and arguments: blanks separate words,
/// double quotes group, a backslash escapes a double quote or a backslash.
TStringArray SplitCommandLine(const std::string& CommandLine);

/// A started child process.
struct TChildProcess {
  Integer Pid = -1;
};

/// Starts Arguments[0] (looked up on PATH when it holds no "/") with the
/// host's environment in WorkingDir (the host's own when empty). Its standard
/// input reads StdIn, its standard output and error write StdOut; no other
/// descriptor is inherited, and the host's own current directory is never
/// changed. The child gets a process group of its own, so an interrupt typed
/// at the host's terminal does not reach it. On failure returns false with
/// the system's message in Error.
bool StartChildProcess(const TStringArray& Arguments, const std::string& WorkingDir, THandle StdIn,
                       THandle StdOut, TChildProcess& Child, std::string& Error);

/// Sends SIGKILL to Pid. False when there is no such process.
bool KillProcess(Integer Pid);

/// Sends SIGINT to Pid. False when there is no such process.
bool InterruptProcess(Integer Pid);

/// True when the child Pid has ended (its status stays to be collected).
bool ChildProcessEnded(Integer Pid);

/// Collects the exit status of a child started here, waiting for it to end.
/// Returns the exit code, 128 + signal number for a killed child, or -1.
Integer ReapChildProcess(Integer Pid);

/// The system's message for an error number.
std::string SystemErrorMessage(int ErrorNumber);

} // namespace midebug
