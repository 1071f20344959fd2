#pragma once
/// \file
/// A TCP port on the loopback address, for a host that serves its protocol
/// to one client at a time over a socket rather than its standard streams.
/// Only programs on this machine can reach it.

#include "platform/types.h"

#include <chrono>
#include <cstddef>
#include <memory>
#include <string>
#include <string_view>

namespace midebug {

/// One client's connection. Reading and writing may happen on different
/// threads; Shut wakes a reader that waits.
class TLoopbackConnection {
public:
  explicit TLoopbackConnection(int Handle) : FHandle(Handle) {}
  ~TLoopbackConnection();
  TLoopbackConnection(const TLoopbackConnection&) = delete;
  TLoopbackConnection& operator=(const TLoopbackConnection&) = delete;

  /// Reads up to Count bytes, waiting for at least one: the number read, 0
  /// once the client has closed its end or the connection was shut, -1 on
  /// failure.
  Int64 Read(void* Buffer, size_t Count);
  /// Writes all of Text. False when the client has gone; never raises a
  /// signal that ends the host.
  bool Write(std::string_view Text);
  /// Ends both directions; a waiting Read returns 0.
  void Shut();

private:
  int FHandle;
};

/// A listening socket on 127.0.0.1.
class TLoopbackServer {
public:
  TLoopbackServer() = default;
  ~TLoopbackServer();
  TLoopbackServer(const TLoopbackServer&) = delete;
  TLoopbackServer& operator=(const TLoopbackServer&) = delete;

  /// Listens on Port (0: one the system picks). False with Error set when
  /// the port cannot be had.
  bool Listen(int Port, std::string& Error);
  /// The port listened on.
  int Port() const { return FPort; }
  /// Waits at most Timeout for the next client; null when none came (or on
  /// failure), so that the caller can look at signals between two waits.
  std::unique_ptr<TLoopbackConnection> Accept(std::chrono::milliseconds Timeout);

private:
  int FHandle = -1;
  int FPort = 0;
};

} // namespace midebug
