// The program in the client's terminal: the stand-in and its meeting folder.

#include "dapterminal.h"

#include "midebug.h"

#include <chrono>
#include <cstdio>
#include <filesystem>
#include <fstream>
#include <random>
#include <thread>

namespace midebug::dap {

namespace {

namespace fs = std::filesystem;

const char* const PidFile = "pid";
const char* const ReleaseFile = "go";
/// How long the stand-in waits for the debugger before it gives up.
constexpr std::chrono::seconds StandInPatience(120);
/// How often the stand-in looks for its release; it runs only until then.
constexpr std::chrono::milliseconds StandInPoll(10);

} // namespace

int RunStandIn(int ArgCount, char** Args) {
  if (ArgCount < 4) {
    std::fprintf(stderr, "usage: midebug-dap %s FOLDER PROGRAM [ARGUMENTS...]\n", StandInOption);
    return 2;
  }
  const fs::path Folder = Args[2];
  AllowAnyDebuggerToAttach();
  {
    // Written whole under another name first: the adapter never reads half.
    std::ofstream Pid(Folder / "pid.new");
    Pid << CurrentProcessId() << "\n";
  }
  std::error_code Failure;
  fs::rename(Folder / "pid.new", Folder / PidFile, Failure);
  if (Failure) {
    std::fprintf(stderr, "midebug-dap: cannot meet the debugger in %s: %s\n", Args[2], Failure.message().c_str());
    return 1;
  }
  const auto Deadline = std::chrono::steady_clock::now() + StandInPatience;
  while (!fs::exists(Folder / ReleaseFile, Failure)) {
    if (!fs::exists(Folder / PidFile, Failure) || std::chrono::steady_clock::now() > Deadline) {
      std::fprintf(stderr, "midebug-dap: the debugger did not attach\n");
      return 1;
    }
    std::this_thread::sleep_for(StandInPoll);
  }
  const TStringArray Program(Args + 3, Args + ArgCount);
  const std::string Error = BecomeProgram(Program);
  std::fprintf(stderr, "midebug-dap: cannot run %s: %s\n", Args[3], Error.c_str());
  return 127;
}

TStandInMeeting::~TStandInMeeting() { Dismiss(); }

void TStandInMeeting::Dismiss() {
  if (FFolder.empty())
    return;
  std::error_code Ignored;
  fs::remove_all(FFolder, Ignored);
  FFolder.clear();
}

bool TStandInMeeting::Create(std::string& Error) {
  std::error_code Failure;
  const fs::path Temp = fs::temp_directory_path(Failure);
  std::random_device Random;
  for (int Attempt = 0; Attempt < 10 && !Failure; ++Attempt) {
    const fs::path Folder = Temp / ("midebug-dap-" + std::to_string(Random()));
    if (fs::create_directory(Folder, Failure)) {
      // Only this user may leave a process id there.
      fs::permissions(Folder, fs::perms::owner_all, Failure);
      FFolder = Folder.string();
      return true;
    }
  }
  Error = Failure ? Failure.message() : "no free name";
  return false;
}

int TStandInMeeting::StandInPid() const {
  std::ifstream File(fs::path(FFolder) / PidFile);
  int Pid = -1;
  if (!(File >> Pid) || Pid <= 0)
    return -1;
  return Pid;
}

void TStandInMeeting::Release() const { std::ofstream(fs::path(FFolder) / ReleaseFile) << "\n"; }

} // namespace midebug::dap
