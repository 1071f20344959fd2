#pragma once
/// \file
/// The debugged program's own terminal and the IDE's view of what the
/// program writes to it.

#include "platform/pseudoterminal.h"

#include <atomic>
#include <condition_variable>
#include <functional>
#include <mutex>
#include <string>
#include <thread>
#include <vector>

namespace midebug {

/// A pseudo-terminal for the program's standard input, output and error,
/// kept apart from the debugger's pipes, and its reader thread ("Terminal"),
/// which hands what the program writes to the IDE as program output.
///
/// Bytes reach the IDE in the order written, whole UTF-8 characters only.
/// The reader reads only as fast as the IDE takes the text: while
/// MaxPendingBytes wait undelivered it stops, the terminal fills and the
/// program's writes block.
///
/// FLock guards the text not yet delivered and serialises the reads of the
/// terminal, so that two readers (the reader thread and a drain) cannot
/// swap two pieces. It is a leaf lock: neither Defer nor Tell is called
/// while it is held.
class TProgramTerminal {
public:
  using TDefer = std::function<void(std::function<void()>)>;
  using TTell = std::function<void(const std::string&)>;

  /// Defer queues a delivery to the IDE's main thread; Tell, called by that
  /// delivery, hands the IDE a piece of the program's output.
  TProgramTerminal(TDefer Defer, TTell Tell) : FDefer(std::move(Defer)), FTell(std::move(Tell)) {}
  ~TProgramTerminal() { Close(); }
  TProgramTerminal(const TProgramTerminal&) = delete;
  TProgramTerminal& operator=(const TProgramTerminal&) = delete;

  /// Opens the terminal and starts the reader. False with the reason in
  /// Error; the program then keeps the debugger's pipes.
  bool Open(std::string& Error);
  /// The device the program is to open; empty before Open succeeds.
  std::string SlavePath() const { return FOpen ? FTerminal.SlavePath() : std::string(); }
  /// Reads what the program has written so far and queues it for the IDE,
  /// ahead of whatever the caller queues next (a stop, an exit). On the main
  /// thread it is delivered at once. Final also hands over an unfinished
  /// UTF-8 sequence: no more bytes will complete it.
  void Drain(bool Final);
  /// Stops and awaits the reader, then closes the terminal.
  void Close();

  /// Undelivered text at which the reader stops reading.
  static constexpr size_t MaxPendingBytes = 256 * 1024;

private:
  void ReaderExecute();
  /// One read of the terminal into the pending text; Read's result. FLock
  /// held.
  Int64 ReadOnce();
  /// Marks a delivery queued; true when the caller is to queue one. FLock
  /// held.
  bool NeedsDelivery();
  void DeliverPending();

  TDefer FDefer;
  TTell FTell;
  TPseudoTerminal FTerminal;
  std::thread FReader;
  /// Set once the terminal is open and the reader runs; cleared by Close.
  std::atomic<bool> FOpen{false};
  std::atomic<bool> FStopping{false};

  std::mutex FLock;
  std::condition_variable FDelivered;
  std::vector<char> FReadBuffer;
  /// Text read and decoded, not yet delivered.
  std::string FPending;
  /// The unfinished UTF-8 sequence that ended the last read.
  std::string FHeldBytes;
  bool FDeliveryQueued = false;
};

} // namespace midebug
