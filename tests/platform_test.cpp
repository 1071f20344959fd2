// The host platform layer where debugger sessions cannot reach: text
// encodings, command lines, a pipe write with SIGPIPE blocked, the log file.

#include "platform/hostprocess.h"
#include "platform/logwriter.h"
#include "platform/textencoding.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <pthread.h>
#include <thread>

namespace midebug {
namespace {

using test::SplitLines;
using test::ReadWholeFile;
using test::TScratchDir;

// --- Text encodings --------------------------------------------------------

struct TUTF8Case {
  const char* Name;
  std::string Bytes;
  bool Valid;
};

TEST(PlatformText, IsValidUTF8AcceptsWellFormedAndRejectsMalformedSequences) {
  const TUTF8Case Cases[] = {
      {"ASCII with controls", "abc\t\n\x7F", true},
      {"smallest 3-byte U+0800", "\xE0\xA0\x80", true},
      {"last before surrogates U+D7FF", "\xED\x9F\xBF", true},
      {"largest code point U+10FFFF", "\xF4\x8F\xBF\xBF", true},
      {"overlong NUL C0 80", std::string("\xC0\x80", 2), false},
      {"overlong 3-byte E0 9F BF", "\xE0\x9F\xBF", false},
      {"overlong 4-byte F0 8F BF BF", "\xF0\x8F\xBF\xBF", false},
      {"high surrogate ED A0 80", "\xED\xA0\x80", false},
      {"above U+10FFFF F4 90 80 80", "\xF4\x90\x80\x80", false},
      {"lead followed by ASCII", "\xC3\x41", false},
      {"stray continuation byte", "\x80", false},
  };
  for (const TUTF8Case& Case : Cases)
    EXPECT_EQ(IsValidUTF8(Case.Bytes), Case.Valid) << Case.Name;
}

TEST(PlatformText, IsValidUTF8StopsAtTheEndOfAViewCutInsideASequence) {
  // The bytes after the view's end would complete the sequence; they must not
  // be read.
  const std::string Whole = "x\xC3\xA9 x\xE2\x82\xAC x\xF0\x9F\x98\x80";
  for (size_t Length = 0; Length <= Whole.size(); ++Length) {
    const std::string_view Prefix = std::string_view(Whole).substr(0, Length);
    const bool EndsInsideSequence = Length < Whole.size() && (static_cast<unsigned char>(Whole[Length]) & 0xC0) == 0x80;
    EXPECT_EQ(IsValidUTF8(Prefix), !EndsInsideSequence) << "first " << Length << " bytes";
  }
}

TEST(PlatformText, CompleteUTF8LengthHoldsBackOnlyASequenceTheEndCutsShort) {
  const std::string Whole = "x\xC3\xA9 x\xE2\x82\xAC x\xF0\x9F\x98\x80";
  for (size_t Length = 0; Length <= Whole.size(); ++Length) {
    const std::string_view Prefix = std::string_view(Whole).substr(0, Length);
    const bool EndsInsideSequence = Length < Whole.size() && (static_cast<unsigned char>(Whole[Length]) & 0xC0) == 0x80;
    const size_t Complete = CompleteUTF8Length(Prefix);
    EXPECT_EQ(Complete == Length, !EndsInsideSequence) << "first " << Length << " bytes";
    EXPECT_TRUE(IsValidUTF8(Prefix.substr(0, Complete))) << "first " << Length << " bytes";
  }
  // A stray continuation byte completes nothing later: it is not held.
  EXPECT_EQ(CompleteUTF8Length("a\x80"), 2u);
}

// --- Command lines ---------------------------------------------------------

TEST(PlatformCommandLine, SplitCommandLineHonoursBlanksQuotesAndEscapes) {
  const std::pair<std::string, TStringArray> Cases[] = {
      {"   ", {}},
      {"  prog  a\t\tb  ", {"prog", "a", "b"}},
      {"pre\"mid dle\"post", {"premid dlepost"}},
      {"a \"\" b", {"a", "", "b"}},
      {"\\\"x\\\"", {"\"x\""}},
      {"\"say \\\"hi\\\"\"", {"say \"hi\""}},
      {"a\\\\b", {"a\\b"}},
      {"\"\\\\\"", {"\\"}},
      // A backslash before anything else is an ordinary character.
      {"C:\\dir\\file.exe", {"C:\\dir\\file.exe"}},
      {"trailing\\", {"trailing\\"}},
  };
  for (const auto& [Line, Words] : Cases)
    EXPECT_EQ(SplitCommandLine(Line), Words) << "command line " << Line;
}

// --- Pipes -----------------------------------------------------------------

TEST(PlatformPipe, WriteWithSigPipeAlreadyBlockedLeavesTheSignalToTheCaller) {
  sigset_t PipeSet;
  sigset_t OldMask;
  sigemptyset(&PipeSet);
  sigaddset(&PipeSet, SIGPIPE);
  pthread_sigmask(SIG_BLOCK, &PipeSet, &OldMask);
  TPipe Pipe;
  Pipe.CloseRead();
  EXPECT_EQ(WriteHandle(Pipe.WriteHandle(), "x", 1), -1);
  EXPECT_EQ(errno, EPIPE);
  // Still blocked and pending: the write must not have swallowed it.
  sigset_t Mask;
  pthread_sigmask(SIG_BLOCK, nullptr, &Mask);
  EXPECT_TRUE(sigismember(&Mask, SIGPIPE));
  sigset_t Pending;
  sigpending(&Pending);
  EXPECT_TRUE(sigismember(&Pending, SIGPIPE));
  // Collect it here: unblocking with the signal pending would end the test.
  const timespec NoWait{0, 0};
  while (sigtimedwait(&PipeSet, nullptr, &NoWait) == SIGPIPE) {
  }
  pthread_sigmask(SIG_SETMASK, &OldMask, nullptr);
}

// --- Log file --------------------------------------------------------------

TEST(PlatformLogWriter, ConcurrentWritesNeverInterleave) {
  TScratchDir Scratch;
  const std::string Path = Scratch.Path() + "/log.txt";
  TLogWriter Log;
  ASSERT_TRUE(Log.Open(Path));
  EXPECT_EQ(Log.Path(), Path);

  constexpr int LinesPerThread = 2000;
  // Every 100th line is longer than the writer's 4096-byte buffer.
  auto LineOf = [](char Letter, int Number) {
    const size_t Length = Number % 100 == 0 ? 9000 : static_cast<size_t>((Number * 37) % 200);
    return std::string(1, Letter) + std::to_string(Number) + ":" + std::string(Length, Letter);
  };
  std::atomic<int> Ready{0};
  auto WriteLines = [&](char Letter) {
    ++Ready;
    while (Ready < 2)
      std::this_thread::yield();
    for (int Number = 0; Number < LinesPerThread; ++Number)
      Log.Write(LineOf(Letter, Number), true);
  };
  std::thread First(WriteLines, 'a');
  std::thread Second(WriteLines, 'b');
  First.join();
  Second.join();

  // Written and flushed by every Write: readable before the writer closes.
  const TStringArray Lines = SplitLines(ReadWholeFile(Path));
  ASSERT_EQ(Lines.size(), 2u * LinesPerThread);
  int Next['c'] = {};
  for (const std::string& Line : Lines) {
    ASSERT_FALSE(Line.empty());
    const char Letter = Line[0];
    ASSERT_TRUE(Letter == 'a' || Letter == 'b') << Line.substr(0, 20);
    ASSERT_EQ(Line, LineOf(Letter, Next[static_cast<int>(Letter)])) << "line starting " << Line.substr(0, 20);
    ++Next[static_cast<int>(Letter)];
  }
}

} // namespace
} // namespace midebug
