// The host platform layer: text encodings, command lines, child processes and
// pipes, files and PATH, the shared log file and thread names.

#include "platform/hostfiles.h"
#include "platform/hostprocess.h"
#include "platform/hostthread.h"
#include "platform/logwriter.h"
#include "platform/textencoding.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <atomic>
#include <cerrno>
#include <csignal>
#include <fcntl.h>
#include <filesystem>
#include <fstream>
#include <pthread.h>
#include <sstream>
#include <sys/stat.h>
#include <thread>
#include <unistd.h>

namespace midebug {
namespace {

using test::SplitLines;
using test::ReadWholeFile;
using test::TScopedEnv;
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

TEST(PlatformText, AnsiToUTF8ReadsWindows1252) {
  const std::pair<std::string, std::string> Cases[] = {
      {"\x81", "\xC2\x81"},                                 // undefined: the C1 control U+0081
      {"\x9F", "\xC5\xB8"},                                 // Y with diaeresis U+0178
      {"caf\xE9 \x80\x35", "caf\xC3\xA9 \xE2\x82\xAC\x35"}, // mixed
  };
  for (const auto& [Ansi, Expected] : Cases)
    EXPECT_EQ(AnsiToUTF8(Ansi), Expected) << "input " << ::testing::PrintToString(Ansi);
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

// --- Child processes -------------------------------------------------------

struct TChildRun {
  bool Started = false;
  Integer Pid = -1;
  std::string Output;
  std::string Error;
  Integer ExitCode = -1;
};

/// Runs a child on fresh pipes with empty input and waits for it to end.
TChildRun RunChild(const TStringArray& Arguments, const std::string& WorkingDir = {}) {
  TChildRun Run;
  TPipe Input;
  TPipe Output;
  TChildProcess Child;
  Run.Started = StartChildProcess(Arguments, WorkingDir, Input.ReadHandle(), Output.WriteHandle(), Child, Run.Error);
  if (!Run.Started)
    return Run;
  Run.Pid = Child.Pid;
  Input.CloseRead();
  Input.CloseWrite();
  Output.CloseWrite();
  char Buffer[4096];
  for (Int64 Read; (Read = ReadHandle(Output.ReadHandle(), Buffer, sizeof Buffer)) > 0;)
    Run.Output.append(Buffer, static_cast<size_t>(Read));
  Run.ExitCode = ReapChildProcess(Child.Pid);
  return Run;
}

/// A descriptor the test opens without close-on-exec, as careless host code
/// would; closed at the end of the scope.
class TInheritableDescriptor {
public:
  explicit TInheritableDescriptor(int MinimumNumber) {
    const int Opened = open("/dev/null", O_RDONLY);
    FHandle = fcntl(Opened, F_DUPFD, MinimumNumber);
    close(Opened);
  }
  ~TInheritableDescriptor() { close(FHandle); }
  TInheritableDescriptor(const TInheritableDescriptor&) = delete;
  TInheritableDescriptor& operator=(const TInheritableDescriptor&) = delete;
  int Handle() const { return FHandle; }

private:
  int FHandle;
};

TEST(PlatformChildProcess, ChildInheritsOnlyStandardDescriptors) {
  TInheritableDescriptor Low(3);
  TInheritableDescriptor High(100);
  ASSERT_GE(Low.Handle(), 3);
  ASSERT_GE(High.Handle(), 100);
  ASSERT_EQ(fcntl(High.Handle(), F_GETFD) & FD_CLOEXEC, 0);

  const TChildRun Run = RunChild({"ls", "-1", "/proc/self/fd"});
  ASSERT_TRUE(Run.Started) << Run.Error;
  // 3 is the directory ls opens to list itself.
  EXPECT_EQ(SplitLines(Run.Output), (TStringArray{"0", "1", "2", "3"})) << Run.Output;
  EXPECT_EQ(Run.ExitCode, 0);
}

TEST(PlatformChildProcess, ProgramThatCannotStartGivesTheSystemMessage) {
  TScratchDir Scratch;
  const std::string NotExecutable = Scratch.WriteFile("data.txt", "not a program\n");
  const struct {
    TStringArray Arguments;
    std::string WorkingDir;
    int ErrorNumber;
  } Cases[] = {
      {{"midebug-no-such-program-on-path"}, {}, ENOENT},
      {{NotExecutable}, {}, EACCES},
      {{"true"}, Scratch.Path() + "/no-such-dir", ENOENT},
  };
  for (const auto& Case : Cases) {
    const TChildRun Run = RunChild(Case.Arguments, Case.WorkingDir);
    EXPECT_FALSE(Run.Started) << ::testing::PrintToString(Case.Arguments);
    EXPECT_EQ(Run.Error, SystemErrorMessage(Case.ErrorNumber)) << ::testing::PrintToString(Case.Arguments);
  }
  EXPECT_EQ(SystemErrorMessage(ENOENT), "No such file or directory");
}

TEST(PlatformChildProcess, ChildStartsWithNoSignalsBlockedOrIgnored) {
  // Block SIGINT on this thread and ignore SIGUSR2 in the process, as a host
  // might; the child must not inherit either.
  sigset_t Blocked;
  sigset_t OldMask;
  sigemptyset(&Blocked);
  sigaddset(&Blocked, SIGINT);
  pthread_sigmask(SIG_BLOCK, &Blocked, &OldMask);
  struct sigaction Ignore {};
  struct sigaction OldAction {};
  Ignore.sa_handler = SIG_IGN;
  sigaction(SIGUSR2, &Ignore, &OldAction);

  const TChildRun Run = RunChild({"grep", "-E", "^Sig(Blk|Ign)", "/proc/self/status"});

  sigaction(SIGUSR2, &OldAction, nullptr);
  pthread_sigmask(SIG_SETMASK, &OldMask, nullptr);
  ASSERT_TRUE(Run.Started) << Run.Error;
  const TStringArray Lines = SplitLines(Run.Output);
  ASSERT_EQ(Lines.size(), 2u) << Run.Output;
  EXPECT_EQ(Lines[0], "SigBlk:\t0000000000000000");
  // The C library keeps its two internal real-time signals (32 and 33)
  // ignored across the start; the 31 standard signals must be default.
  ASSERT_EQ(Lines[1].rfind("SigIgn:\t", 0), 0u) << Lines[1];
  EXPECT_EQ(std::stoull(Lines[1].substr(8), nullptr, 16) & 0x7FFFFFFFull, 0u) << Lines[1];
}

// --- Pipes -----------------------------------------------------------------

bool SigPipeBlocked() {
  sigset_t Mask;
  pthread_sigmask(SIG_BLOCK, nullptr, &Mask);
  return sigismember(&Mask, SIGPIPE) == 1;
}

bool SigPipePending() {
  sigset_t Pending;
  sigpending(&Pending);
  return sigismember(&Pending, SIGPIPE) == 1;
}

TEST(PlatformPipe, WriteToPipeWithoutReaderFailsWithoutSignal) {
  TPipe Pipe;
  ASSERT_TRUE(Pipe.Created());
  Pipe.CloseRead();
  const std::string Text = "nobody listens";
  // The default disposition of SIGPIPE would end this test program here.
  EXPECT_EQ(WriteHandle(Pipe.WriteHandle(), Text.data(), Text.size()), -1);
  EXPECT_EQ(errno, EPIPE);
  EXPECT_FALSE(SigPipeBlocked());
  EXPECT_FALSE(SigPipePending());
}

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
  EXPECT_TRUE(SigPipeBlocked());
  EXPECT_TRUE(SigPipePending());
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

// --- Threads ---------------------------------------------------------------

TEST(PlatformThread, LongThreadNameIsCutToWhatTheSystemKeeps) {
  std::string Name;
  std::thread Named([&] {
    SetCurrentThreadName("midebug-thread-with-a-long-name");
    char Buffer[64] = {};
    pthread_getname_np(pthread_self(), Buffer, sizeof Buffer);
    Name = Buffer;
  });
  Named.join();
  EXPECT_EQ(Name, "midebug-thread-");
}

} // namespace
} // namespace midebug
