#pragma once
/// \file
/// A buffered UTF-8 text file shared by several threads.

#include <cstdio>
#include <mutex>
#include <string>
#include <string_view>

namespace midebug {

/// Writes text to a file created anew, through a 4096-byte buffer flushed
/// after every write. Every write holds the writer's own lock, so text from
/// two threads never interleaves within one write. The lock is a leaf: no
/// other lock is taken while it is held.
class TLogWriter {
public:
  TLogWriter() = default;
  ~TLogWriter();
  TLogWriter(const TLogWriter&) = delete;
  TLogWriter& operator=(const TLogWriter&) = delete;

  /// Creates (or truncates) Path. False when it cannot be created.
  bool Open(const std::string& Path);
  bool IsOpen() const { return FFile != nullptr; }
  const std::string& Path() const { return FPath; }

  /// Writes Text unchanged, then a line break when NewLine is set.
  void Write(std::string_view Text, bool NewLine = false);

private:
  std::mutex FLock;
  std::FILE* FFile = nullptr;
  std::string FPath;
};

} // namespace midebug
