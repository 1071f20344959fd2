// lldb-server on an Android device, driven through a stand-in for the debug
// bridge: a shell script that keeps its state in files beside it.

#include "kernel/gdbkernel.h"
#include "testsupport.h"

#include <gtest/gtest.h>

#include <algorithm>
#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <memory>
#include <signal.h>
#include <sys/stat.h>

namespace midebug {
namespace {

using test::SplitLines;
using test::ReadWholeFile;
using test::TScratchDir;

constexpr const char* ServerArgs = "shell /data/local/tmp/lldb-server platform --server";
constexpr const char* PsArgs = "shell ps";
constexpr const char* KillArgs = "shell kill -9";

/// The bridge. The server run records its host pid in server.pid, then
/// sleeps until killed. A listing shows only the header until the server
/// runs; the n-th listing after that
/// prints ps.<n> when it exists, else ps.default. A kill appends its id to
/// kills and ends the server when the id is the one in server.devpid.
constexpr const char* FakeBridgeScript = R"sh(#!/bin/sh
state=$(dirname "$0")
case "$1 $2" in
"shell /data/local/tmp/lldb-server")
  echo $$ > "$state/server.pid.new" && mv "$state/server.pid.new" "$state/server.pid"
  exec sleep 60 ;;
"shell ps")
  echo "USER           PID  PPID     VSZ    RSS WCHAN            ADDR S NAME"
  [ -e "$state/server.pid" ] || exit 0
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

  std::unique_ptr<TAndroidDevice> MakeDevice() const {
    return std::make_unique<TAndroidDevice>(FPath, ServerArgs, PsArgs, KillArgs);
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

  TStringArray Kills() const { return SplitLines(ReadWholeFile(State("kills"))); }
  bool KillsRecorded() const { return std::filesystem::exists(State("kills")); }
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

TEST(AndroidDevice, StartFindsTheServerIdAndDestructionKillsItAndAwaitsItsRun) {
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
      {"an id that is not a number is listed again",
       {PsLine("shell", "12ab", "lldb-server"), PsLine("shell", "1234", "lldb-server")},
       1234,
       2},
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
    EXPECT_FALSE(Bridge.KillsRecorded());
    const int ServerPid = Bridge.ServerHostPid();
    Device.reset();
    EXPECT_TRUE(AllKillsAre(Bridge.Kills(), std::to_string(Case.Id))) << ::testing::PrintToString(Bridge.Kills());
    // The device awaited the server's run: its process has been collected.
    EXPECT_EQ(kill(ServerPid, 0), -1);
    EXPECT_EQ(errno, ESRCH);
  }
}

} // namespace
} // namespace midebug
