#pragma once
/// \file
/// The debug adapter protocol's framing: each message is a header block
/// ("Content-Length: N", then an empty line) followed by N bytes of JSON.

#include <cstddef>
#include <string>
#include <string_view>

namespace midebug::dap {

/// Cuts the bytes a client sends into message bodies. A client that sends
/// garbage, or a length that does not match its body, costs the messages it
/// spoilt and no more: the reader finds the next header and goes on.
class TDapFrameReader {
public:
  enum class TNext {
    /// Nothing whole is waiting; feed more bytes.
    NeedMore,
    /// Body holds one message's bytes.
    Message,
    /// Bytes that belong to no message were dropped; Body says what.
    Garbage,
  };

  /// A body this long is refused rather than buffered.
  static constexpr size_t MaxBodyBytes = 64u << 20;
  /// A header block longer than this is not one.
  static constexpr size_t MaxHeaderBytes = 1024;

  void Feed(std::string_view Bytes) { FBuffer.append(Bytes); }
  /// The next message or the next run of dropped bytes.
  TNext Next(std::string& Body);
  /// Called when the client has closed its end: a message still waiting for
  /// its last bytes is handed over as it is (a length that lied too long).
  TNext Finish(std::string& Body);

private:
  /// Drops Count bytes from the front and reports them as garbage.
  TNext Drop(size_t Count, const std::string& Why, std::string& Body);

  std::string FBuffer;
};

/// The header and body that carry Body to the client.
std::string FrameMessage(std::string_view Body);

} // namespace midebug::dap
