// lldb-server on an Android device, driven through a stand-in for the debug
// bridge: a shell script that keeps its state in files beside it.

#include "kernel/gdbkernel.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <memory>
#include <signal.h>
#include <sstream>
#include <sys/stat.h>
#include <thread>

namespace midebug {
namespace {

using test::SplitLines;
using test::ReadWholeFile;
using test::TScratchDir;

constexpr const char* ServerArgs = "shell /data/local/tmp/lldb-server platform --server";
constexpr const char* PsArgs = "shell ps";
constexpr const char* KillArgs = "shell kill -9";

/// The bridge. The server run records its host pid in server.pid, then
/// sleeps until killed; it quits at once instead when server.quits exists,
/// and first makes the bridge itself unrunnable when server.locks-bridge
/// exists. A listing shows only the header until the server runs (and
/// always while the bridge is being locked); the n-th listing after that
/// prints ps.<n> when it exists, else ps.default. A kill appends its id to
/// kills and ends the server when the id is the one in server.devpid.
constexpr const char* FakeBridgeScript = R"sh(#!/bin/sh
state=$(dirname "$0")
case "$1 $2" in
"shell /data/local/tmp/lldb-server")
  [ -e "$state/server.quits" ] && exit 0
  [ -e "$state/server.locks-bridge" ] && chmod a-x "$0"
  echo $$ > "$state/server.pid.new" && mv "$state/server.pid.new" "$state/server.pid"
  exec sleep 60 ;;
"shell ps")
  echo "USER           PID  PPID     VSZ    RSS WCHAN            ADDR S NAME"
  [ -e "$state/server.pid" ] && [ ! -e "$state/server.locks-bridge" ] || exit 0
  n=$(( $(cat "$state/ps.count" 2>/dev/null || echo 0) + 1 ))
  echo $n > "$state/ps.count"
  if [ -e "$state/ps.$n" ]; then cat "$state/ps.$n"; else cat "$state/ps.default"; fi ;;
"shell kill")
  echo "$4" >> "$state/kills"
  if [ "$4" = "$(cat "$state/server.devpid" 2>/dev/null)" ] && [ -e "$state/server.pid" ]; then
    kill "$(cat "$state/server.pid")"
  fi ;;
*)
  echo "unexpected arguments: $*" >&2
  exit 2 ;;
esac
)sh";

/// A process-list line in the device's layout for a process Name with the
/// given id column.
std::string PsLine(const std::string& User, const std::string& Id, const std::string& Name) {
  return User + "         " + Id + "     1 1234567  12345 do_sys_poll         0 S " + Name + "\n";
}

/// The bridge script in a scratch directory of its own, and a view of the
/// state it keeps there.
class TFakeBridge {
public:
  TFakeBridge() : FPath(FState.WriteFile("adb", FakeBridgeScript)) { chmod(FPath.c_str(), 0755); }

  const std::string& Path() const { return FPath; }
  std::unique_ptr<TAndroidDevice> MakeDevice() const { return MakeDevice(FPath); }
  static std::unique_ptr<TAndroidDevice> MakeDevice(const std::string& AdbPath) {
    return std::make_unique<TAndroidDevice>(AdbPath, ServerArgs, PsArgs, KillArgs);
  }

  /// The listings shown once the server runs: one per round, the last one
  /// for every round after.
  void SetListings(const TStringArray& Listings) const {
    for (size_t I = 0; I + 1 < Listings.size(); ++I)
      FState.WriteFile("ps." + std::to_string(I + 1), Listings[I]);
    FState.WriteFile("ps.default", Listings.back());
  }
  /// The device id whose kill ends the server run.
  void SetServerDeviceId(Integer Id) const { FState.WriteFile("server.devpid", std::to_string(Id) + "\n"); }
  void MakeServerQuitAtOnce() const { FState.WriteFile("server.quits", ""); }
  void MakeServerLockTheBridge() const { FState.WriteFile("server.locks-bridge", ""); }
  void UnlockTheBridge() const { chmod(FPath.c_str(), 0755); }

  TStringArray Kills() const { return SplitLines(ReadWholeFile(State("kills"))); }
  bool KillsRecorded() const { return std::filesystem::exists(State("kills")); }
  bool ServerRan() const { return std::filesystem::exists(State("server.pid")); }
  int ServerHostPid() const { return std::atoi(ReadWholeFile(State("server.pid")).c_str()); }
  int ListingsWithServer() const { return std::atoi(ReadWholeFile(State("ps.count")).c_str()); }

private:
  std::string State(const std::string& Name) const { return FState.Path() + "/" + Name; }

  TScratchDir FState;
  std::string FPath;
};

/// True when every line is Id, and there is at least one.
bool AllKillsAre(const TStringArray& Kills, const std::string& Id) {
  return !Kills.empty() && std::all_of(Kills.begin(), Kills.end(), [&](const std::string& Kill) { return Kill == Id; });
}

TEST(AndroidDeviceServerId, FoundInTheProcessList) {
  const struct {
    const char* Name;
    TStringArray Listings;
    Integer Id;
    int Rounds;
  } Cases[] = {
      {"second token of the line with a blank before lldb-server",
       {PsLine("root", "1", "init") + PsLine("shell", "1234", "lldb-server") + PsLine("shell", "1240", "sh")},
       1234,
       1},
      {"a path ending in lldb-server is not the server",
       {PsLine("shell", "999", "/data/local/tmp/lldb-server"), PsLine("shell", "1234", "lldb-server")},
       1234,
       2},
      {"./lldb-server is taken when nothing else matches",
       {PsLine("root", "1", "init") + PsLine("shell", "4321", "./lldb-server")},
       4321,
       1},
      {"an id that is not a number is listed again",
       {PsLine("shell", "12ab", "lldb-server"), PsLine("shell", "1234", "lldb-server")},
       1234,
       2},
      {"lines ending in CR LF", {"root 1 0 100 10 0 0 S init\r\nshell 1234 1 100 10 0 0 S lldb-server\r\n"}, 1234, 1},
      {"tabs between the columns", {"shell\t1234\t1\t100\t10\t0\t0\tS lldb-server\n"}, 1234, 1},
  };
  for (const auto& Case : Cases) {
    SCOPED_TRACE(Case.Name);
    const TFakeBridge Bridge;
    Bridge.SetListings(Case.Listings);

    auto Device = Bridge.MakeDevice();
    ASSERT_TRUE(Device->StartLLDBServer()) << Device->FLastError;
    EXPECT_EQ(Device->FLLDBServerPid, Case.Id);
    EXPECT_EQ(Bridge.ListingsWithServer(), Case.Rounds);
    // Whatever id was found, its kill ends the server, so that a wrong id
    // fails here instead of keeping the device from ever shutting down.
    Bridge.SetServerDeviceId(Device->FLLDBServerPid);
    Device.reset();
    EXPECT_TRUE(AllKillsAre(Bridge.Kills(), std::to_string(Case.Id))) << ::testing::PrintToString(Bridge.Kills());
  }
}

TEST(AndroidDeviceLifetime, TerminateKillsTheGivenDeviceProcess) {
  const TFakeBridge Bridge;
  Bridge.SetListings({PsLine("shell", "1234", "lldb-server")});
  Bridge.SetServerDeviceId(1234);
  auto Device = Bridge.MakeDevice();
  ASSERT_TRUE(Device->StartLLDBServer()) << Device->FLastError;

  Device->Terminate(4321);
  EXPECT_EQ(Bridge.Kills(), TStringArray{"4321"});
  EXPECT_EQ(kill(Bridge.ServerHostPid(), 0), 0) << "the server run ended with the debuggee";
}

TEST(AndroidDeviceLifetime, DestroyingTheDeviceKillsTheServerAndAwaitsItsRun) {
  const TFakeBridge Bridge;
  Bridge.SetListings({PsLine("shell", "1234", "lldb-server")});
  Bridge.SetServerDeviceId(1234);
  auto Device = Bridge.MakeDevice();
  ASSERT_TRUE(Device->StartLLDBServer()) << Device->FLastError;
  const int ServerPid = Bridge.ServerHostPid();
  ASSERT_GT(ServerPid, 0);
  EXPECT_FALSE(Bridge.KillsRecorded());

  Device.reset();
  EXPECT_TRUE(AllKillsAre(Bridge.Kills(), "1234")) << ::testing::PrintToString(Bridge.Kills());
  // The run has ended and its process has been collected.
  EXPECT_EQ(kill(ServerPid, 0), -1);
  EXPECT_EQ(errno, ESRCH);
}

TEST(AndroidDeviceLifetime, MissingBridgeFailsWithTheReason) {
  const TScratchDir Scratch;
  const std::string Missing = Scratch.Path() + "/no-such-adb";
  auto Device = TFakeBridge::MakeDevice(Missing);
  EXPECT_FALSE(Device->StartLLDBServer());
  EXPECT_NE(Device->FLastError.find(Missing), std::string::npos) << Device->FLastError;
  EXPECT_NE(Device->FLastError.find("No such file or directory"), std::string::npos) << Device->FLastError;
  EXPECT_EQ(Device->FLLDBServerPid, -1);
}

TEST(AndroidDeviceLifetime, ServerEndingBeforeItIsListedFailsAndIsNotKilled) {
  const TFakeBridge Bridge;
  Bridge.SetListings({PsLine("shell", "1234", "lldb-server")});
  Bridge.MakeServerQuitAtOnce();
  auto Device = Bridge.MakeDevice();
  EXPECT_FALSE(Device->StartLLDBServer());
  // The run itself succeeded, so there is no error text to give.
  EXPECT_EQ(Device->FLastError, "");
  EXPECT_EQ(Device->FLLDBServerPid, -1);
  Device.reset();
  EXPECT_FALSE(Bridge.KillsRecorded());
}

TEST(AndroidDeviceLifetime, ProcessListThatCannotRunFailsAndKillsNothing) {
  const TFakeBridge Bridge;
  Bridge.SetListings({PsLine("shell", "1234", "lldb-server")});
  Bridge.MakeServerLockTheBridge();
  auto Device = Bridge.MakeDevice();
  EXPECT_FALSE(Device->StartLLDBServer());
  EXPECT_NE(Device->FLastError.find("Permission denied"), std::string::npos) << Device->FLastError;
  EXPECT_EQ(Device->FLLDBServerPid, -1);

  // With no id there is nothing to kill: the device waits for the server to
  // end by itself, which the helper brings about after a while.
  Bridge.UnlockTheBridge();
  std::thread ServerEnder([&Bridge] {
    while (!Bridge.ServerRan())
      std::this_thread::yield();
    std::this_thread::sleep_for(std::chrono::milliseconds(100));
    kill(Bridge.ServerHostPid(), SIGTERM);
  });
  Device.reset();
  ServerEnder.join();
  EXPECT_FALSE(Bridge.KillsRecorded()) << ::testing::PrintToString(Bridge.Kills());
}

} // namespace
} // namespace midebug
