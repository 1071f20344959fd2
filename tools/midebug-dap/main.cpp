// midebug-dap: a debug adapter built on the library's public interfaces. It
// speaks the debug adapter protocol over standard input and output to one
// client (an editor) and debugs one program per run; with --port it serves
// one client after another on a port of the loopback address.

#include "dapframing.h"
#include "dapsession.h"
#include "dapterminal.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <functional>
#include <memory>
#include <string>
#include <thread>
#include <vector>

namespace {

using namespace midebug;
using namespace midebug::dap;

constexpr std::chrono::milliseconds PumpSlice(250);
constexpr size_t ReadChunk = 64 * 1024;
/// The exit code after a terminating signal is this plus its number, as a
/// shell reports a program the signal ended.
constexpr int ExitBySignal = 128;

const char* const UsageText =
    "usage: midebug-dap [--port N]\n"
    "A debug adapter: an editor starts it and speaks the debug adapter protocol\n"
    "over its standard input and output. See the README for the launch settings.\n"
    "--port N  serve one client at a time on TCP port N of 127.0.0.1 instead\n"
    "          (0: a free port, printed on standard error). Only the loopback\n"
    "          address is served, yet any local user who reaches the port can\n"
    "          run programs as you: use it on a machine you alone log into.\n"
    "(midebug-dap --run-in-terminal FOLDER PROGRAM [ARGUMENTS...] is the stand-in\n"
    "it has an editor's terminal run for a program.)\n";

/// Reads up to Count bytes from the client: the number read, 0 at its end.
using TClientReader = std::function<Int64(char* Buffer, size_t Count)>;

/// Reads the client's bytes and hands each message to the main thread. The
/// only state it shares with the main thread is the delivery queue.
void ReadClient(TDapSession& Session, const TClientReader& Read) {
  TDapFrameReader Reader;
  std::string Chunk(ReadChunk, '\0');
  auto Hand = [&Session](TDapFrameReader::TNext Next, std::string Body) {
    if (Next == TDapFrameReader::TNext::Message)
      Post([&Session, Body = std::move(Body)] { Session.HandleMessage(Body); });
    else if (Next == TDapFrameReader::TNext::Garbage)
      Post([&Session, Body = std::move(Body)] { Session.HandleGarbage(Body); });
  };
  for (;;) {
    const Int64 Got = Read(Chunk.data(), Chunk.size());
    if (Got <= 0)
      break;
    Reader.Feed(std::string_view(Chunk.data(), static_cast<size_t>(Got)));
    std::string Body;
    for (TDapFrameReader::TNext Next; (Next = Reader.Next(Body)) != TDapFrameReader::TNext::NeedMore;)
      Hand(Next, std::move(Body));
  }
  std::string Body;
  for (TDapFrameReader::TNext Next; (Next = Reader.Finish(Body)) != TDapFrameReader::TNext::NeedMore;)
    Hand(Next, std::move(Body));
  Post([&Session] { Session.HandleClientGone(); });
}

/// Runs the main thread's queue until Session is over (or a termination
/// signal ended it).
void Serve(TDapSession& Session) {
  while (!Session.Finished()) {
    try {
      WaitAndProcess(PumpSlice);
    } catch (const std::exception& Error) {
      // Whatever a client sends, the adapter stays: the failure is reported.
      Session.HandleGarbage(std::string("a message it failed on: ") + Error.what());
    }
    if (TakeHostSignal() == THostSignal::Terminate)
      Session.HandleClientGone();
  }
}

/// Serves one client after another on Port of the loopback address until a
/// termination signal.
int ServePort(const char* PortText) {
  char* End = nullptr;
  const long Port = std::strtol(PortText, &End, 10);
  TLoopbackServer Server;
  std::string Error = "the port must be a number from 0 to 65535";
  if (End == PortText || *End != '\0' || Port < 0 || Port > 65535 || !Server.Listen(static_cast<int>(Port), Error)) {
    std::fprintf(stderr, "midebug-dap: cannot serve port %s: %s\n", PortText, Error.c_str());
    return 2;
  }
  std::fprintf(stderr, "midebug-dap: listening on 127.0.0.1:%d\n", Server.Port());
  std::fflush(stderr);
  // A session's reader may have posted to it after its end, and the library
  // may hold its listener: each lives until the process ends.
  std::vector<std::unique_ptr<TDapSession>> Sessions;
  while (CaughtTerminationSignal() == 0) {
    std::unique_ptr<TLoopbackConnection> Connection = Server.Accept(PumpSlice);
    if (!Connection) {
      if (TakeHostSignal() == THostSignal::Terminate)
        break;
      continue;
    }
    TDapSession& Session = *Sessions.emplace_back(std::make_unique<TDapSession>());
    TLoopbackConnection& Client = *Connection;
    Session.SetWriter([&Client](const std::string& Text) { Client.Write(Text); });
    std::thread Reader(ReadClient, std::ref(Session),
                       TClientReader([&Client](char* Buffer, size_t Count) { return Client.Read(Buffer, Count); }));
    Serve(Session);
    // The reader wakes when the connection is shut; what it posts after that
    // goes to a finished session that writes nowhere.
    Session.SetWriter([](const std::string&) {});
    Client.Shut();
    Reader.join();
    WaitAndProcess(std::chrono::milliseconds(0));
  }
  std::fflush(stderr);
  return 0;
}

} // namespace

int main(int ArgCount, char** Args) {
  if (ArgCount > 1 && std::strcmp(Args[1], StandInOption) == 0)
    return RunStandIn(ArgCount, Args);
  if (ArgCount == 3 && std::strcmp(Args[1], "--port") == 0) {
    SetMainThread();
    CatchHostSignals();
    const int Result = ServePort(Args[2]);
    const int Signal = CaughtTerminationSignal();
    std::_Exit(Signal != 0 ? ExitBySignal + Signal : Result);
  }
  if (ArgCount > 1) {
    const bool Help = std::strcmp(Args[1], "--help") == 0 || std::strcmp(Args[1], "-h") == 0;
    std::fputs(UsageText, Help ? stdout : stderr);
    return Help ? 0 : 2;
  }
  SetMainThread();
  // An editor may end the adapter with SIGTERM or SIGHUP, and an interrupt
  // typed at its terminal may reach it: none of them may end the adapter
  // before it has let the debugger and the program go.
  CatchHostSignals();
  // Lives until the process ends: the reader may still post to it.
  static TDapSession Session;
  std::thread Reader(ReadClient, std::ref(Session), TClientReader([](char* Buffer, size_t Count) {
                       return ReadStandardInput(Buffer, Count);
                     }));
  // The reader blocks on the client's input, which may never close; the
  // process ends without waiting for it.
  Reader.detach();
  Serve(Session);
  std::fflush(stderr);
  const int Signal = CaughtTerminationSignal();
  std::_Exit(Signal != 0 ? ExitBySignal + Signal : 0);
}
