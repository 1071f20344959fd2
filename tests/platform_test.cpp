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

TEST(PlatformText, AnsiToUTF8ReadsWindows1252) {
  const std::pair<std::string, std::string> Cases[] = {
      {"\x81", "\xC2\x81"},                                 // undefined: the C1 control U+0081
      {"\x9F", "\xC5\xB8"},                                 // Y with diaeresis U+0178
      {"caf\xE9 \x80\x35", "caf\xC3\xA9 \xE2\x82\xAC\x35"}, // mixed
  };
  for (const auto& [Ansi, Expected] : Cases)
    EXPECT_EQ(AnsiToUTF8(Ansi), Expected) << "input " << ::testing::PrintToString(Ansi);
}

TEST(PlatformText, AnsiToUTF8LosesNoByte) {
  std::string AllBytes;
  for (int Value = 0; Value < 256; ++Value)
    AllBytes += static_cast<char>(Value);
  const std::string Text = AnsiToUTF8(AllBytes);
  EXPECT_TRUE(IsValidUTF8(Text));
  const auto CodePoints = std::count_if(Text.begin(), Text.end(),
                                        [](char Byte) { return (static_cast<unsigned char>(Byte) & 0xC0) != 0x80; });
  EXPECT_EQ(CodePoints, 256);
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

TEST(PlatformChildProcess, StandardOutputAndErrorBothReachTheOutputPipe) {
  const TChildRun Run = RunChild({"/bin/sh", "-c", "echo out; echo err >&2; exit 3"});
  ASSERT_TRUE(Run.Started) << Run.Error;
  EXPECT_EQ(Run.Output, "out\nerr\n");
  EXPECT_EQ(Run.ExitCode, 3);
}

TEST(PlatformChildProcess, WorkingDirectoryAppliesToTheChildOnly) {
  TScratchDir Scratch;
  const std::string HostDir = GetCurrentDir();
  const TChildRun Run = RunChild({"/bin/sh", "-c", "pwd -P"}, Scratch.Path());
  ASSERT_TRUE(Run.Started) << Run.Error;
  EXPECT_EQ(Run.Output, std::filesystem::canonical(Scratch.Path()).string() + "\n");
  EXPECT_EQ(GetCurrentDir(), HostDir);
}

TEST(PlatformChildProcess, ProgramThatCannotStartGivesTheSystemMessage) {
  TScratchDir Scratch;
  const std::string NotExecutable = Scratch.WriteFile("data.txt", "not a program\n");
  const struct {
    TStringArray Arguments;
    std::string WorkingDir;
    int ErrorNumber;
  } Cases[] = {
      {{Scratch.Path() + "/missing"}, {}, ENOENT},
      {{"midebug-no-such-program-on-path"}, {}, ENOENT},
      {{NotExecutable}, {}, EACCES},
      {{"true"}, Scratch.Path() + "/no-such-dir", ENOENT},
      {{}, {}, ENOENT},
  };
  for (const auto& Case : Cases) {
    const TChildRun Run = RunChild(Case.Arguments, Case.WorkingDir);
    EXPECT_FALSE(Run.Started) << ::testing::PrintToString(Case.Arguments);
    EXPECT_EQ(Run.Error, SystemErrorMessage(Case.ErrorNumber)) << ::testing::PrintToString(Case.Arguments);
  }
  EXPECT_EQ(SystemErrorMessage(ENOENT), "No such file or directory");
}

/// Field Index (1-based, after the parenthesised name) of /proc/<pid>/stat
/// as printed by the child itself.
std::string StatField(const std::string& Stat, int Index) {
  std::istringstream Fields(Stat.substr(Stat.rfind(')') + 2));
  std::string Field;
  for (int I = 3; I <= Index; ++I)
    Fields >> Field;
  return Field;
}

TEST(PlatformChildProcess, ChildLeadsItsOwnProcessGroup) {
  const TChildRun Run = RunChild({"cat", "/proc/self/stat"});
  ASSERT_TRUE(Run.Started) << Run.Error;
  const std::string ProcessGroup = StatField(Run.Output, 5);
  EXPECT_EQ(ProcessGroup, std::to_string(Run.Pid)) << Run.Output;
  EXPECT_NE(ProcessGroup, std::to_string(getpgrp()));
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

TEST(PlatformChildProcess, EndedChildKeepsItsExitCodeUntilReaped) {
  TPipe Input;
  TPipe Output;
  TChildProcess Child;
  std::string Error;
  ASSERT_TRUE(
      StartChildProcess({"/bin/sh", "-c", "exit 5"}, {}, Input.ReadHandle(), Output.WriteHandle(), Child, Error));
  Output.CloseWrite();
  char Byte;
  EXPECT_EQ(ReadHandle(Output.ReadHandle(), &Byte, 1), 0);
  for (int Tries = 0; Tries < 10000 && !ChildProcessEnded(Child.Pid); ++Tries)
    YieldAndSleep(1);
  EXPECT_TRUE(ChildProcessEnded(Child.Pid));
  EXPECT_EQ(ReapChildProcess(Child.Pid), 5);
}

TEST(PlatformChildProcess, KilledAndInterruptedChildrenReportTheirSignal) {
  const std::pair<bool (*)(Integer), int> Cases[] = {{KillProcess, SIGKILL}, {InterruptProcess, SIGINT}};
  for (const auto& [Signal, Number] : Cases) {
    TPipe Input;
    TPipe Output;
    TChildProcess Child;
    std::string Error;
    ASSERT_TRUE(StartChildProcess({"sleep", "60"}, {}, Input.ReadHandle(), Output.WriteHandle(), Child, Error));
    EXPECT_FALSE(ChildProcessEnded(Child.Pid));
    EXPECT_TRUE(Signal(Child.Pid));
    EXPECT_EQ(ReapChildProcess(Child.Pid), 128 + Number);
  }
  EXPECT_FALSE(KillProcess(-1));
  EXPECT_FALSE(KillProcess(0));
  EXPECT_FALSE(InterruptProcess(0));
  EXPECT_EQ(ReapChildProcess(0), -1);
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

TEST(PlatformPipe, WaitForPipeDataSeesDataThenClosed) {
  TPipe Pipe;
  EXPECT_EQ(WaitForPipeData(Pipe.ReadHandle(), 0), TPipeState::Empty);
  ASSERT_EQ(WriteHandle(Pipe.WriteHandle(), "abc", 3), 3);
  EXPECT_EQ(WaitForPipeData(Pipe.ReadHandle(), 0), TPipeState::Data);
  Pipe.CloseWrite();
  // Bytes left after the writer has gone are still data.
  EXPECT_EQ(WaitForPipeData(Pipe.ReadHandle(), 0), TPipeState::Data);
  char Buffer[8];
  EXPECT_EQ(ReadHandle(Pipe.ReadHandle(), Buffer, sizeof Buffer), 3);
  EXPECT_EQ(WaitForPipeData(Pipe.ReadHandle(), 1000), TPipeState::Closed);
  EXPECT_EQ(ReadHandle(Pipe.ReadHandle(), Buffer, sizeof Buffer), 0);
}

TEST(PlatformPipe, PipeEndsArePrivateUntilHandedToAChild) {
  TPipe Pipe;
  EXPECT_NE(fcntl(Pipe.ReadHandle(), F_GETFD) & FD_CLOEXEC, 0);
  EXPECT_NE(fcntl(Pipe.WriteHandle(), F_GETFD) & FD_CLOEXEC, 0);
  const THandle Read = Pipe.ReadHandle();
  Pipe.CloseRead();
  EXPECT_EQ(Pipe.ReadHandle(), InvalidHandle);
  EXPECT_EQ(fcntl(Read, F_GETFD), -1);
}

// --- Files and PATH --------------------------------------------------------

std::string MakeExecutable(const TScratchDir& Dir, const std::string& Name) {
  const std::string Path = Dir.WriteFile(Name, "#!/bin/sh\nexit 0\n");
  chmod(Path.c_str(), 0755);
  return Path;
}

TEST(PlatformFiles, FindOnPathTakesTheFirstExecutableFile) {
  TScratchDir First;
  TScratchDir Second;
  TScratchDir Third;
  // In the first directory the name is a plain file, in the second a
  // directory; only the third holds a program.
  First.WriteFile("mitool", "not executable\n");
  std::filesystem::create_directory(Second.Path() + "/mitool");
  chmod((Second.Path() + "/mitool").c_str(), 0755);
  const std::string Program = MakeExecutable(Third, "mitool");
  TScopedEnv Path("PATH", First.Path() + ":" + Second.Path() + ":" + Third.Path());

  EXPECT_EQ(FindOnPath("mitool"), Program);
  EXPECT_TRUE(ProgramExists("mitool"));
  EXPECT_EQ(FindOnPath("no-such-mitool"), "");
  EXPECT_FALSE(ProgramExists("no-such-mitool"));
  // A name with a separator is a path, not something to look up.
  EXPECT_EQ(FindOnPath("bin/mitool"), "");
  EXPECT_EQ(FindOnPath(""), "");
  EXPECT_TRUE(ProgramExists(Program));
  EXPECT_FALSE(ProgramExists(Third.Path() + "/missing"));
  EXPECT_FALSE(ProgramExists(""));
}

TEST(PlatformFiles, ForceDirectoriesCreatesEveryMissingParent) {
  TScratchDir Scratch;
  const std::string Nested = Scratch.Path() + "/a/b/c";
  EXPECT_TRUE(ForceDirectories(Nested));
  EXPECT_TRUE(DirectoryExists(Nested));
  EXPECT_TRUE(ForceDirectories(Nested));
  const std::string File = Scratch.WriteFile("file", "x");
  EXPECT_FALSE(ForceDirectories(File + "/sub"));
  EXPECT_FALSE(ForceDirectories(File));
  EXPECT_FALSE(ForceDirectories(""));
  EXPECT_TRUE(FileExists(File));
  EXPECT_FALSE(FileExists(Nested));
  EXPECT_FALSE(DirectoryExists(File));
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

TEST(PlatformLogWriter, OpenTruncatesAndAFailedOpenWritesNothing) {
  TScratchDir Scratch;
  const std::string Path = Scratch.WriteFile("log.txt", "old content\n");
  {
    TLogWriter Log;
    ASSERT_TRUE(Log.Open(Path));
    Log.Write("new");
    Log.Write(" text", true);
  }
  EXPECT_EQ(ReadWholeFile(Path), "new text\n");

  TLogWriter Broken;
  EXPECT_FALSE(Broken.Open(Scratch.Path() + "/missing/log.txt"));
  EXPECT_FALSE(Broken.IsOpen());
  Broken.Write("dropped", true);
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
