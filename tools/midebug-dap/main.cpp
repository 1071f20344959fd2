// midebug-dap: a debug adapter built on the library's public interfaces. It
// speaks the debug adapter protocol over standard input and output to one
// client (an editor) and debugs one program per run.

#include "dapframing.h"
#include "dapsession.h"
#include "dapterminal.h"

#include <chrono>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <string>
#include <thread>

namespace {

using namespace midebug;
using namespace midebug::dap;

constexpr std::chrono::milliseconds PumpSlice(250);
constexpr size_t ReadChunk = 64 * 1024;
/// The exit code after a terminating signal is this plus its number, as a
/// shell reports a program the signal ended.
constexpr int ExitBySignal = 128;

const char* const UsageText =
    "usage: midebug-dap\n"
    "A debug adapter: an editor starts it and speaks the debug adapter protocol\n"
    "over its standard input and output. See the README for the launch settings.\n"
    "(midebug-dap --run-in-terminal FOLDER PROGRAM [ARGUMENTS...] is the stand-in\n"
    "it has an editor's terminal run for a program.)\n";

/// Reads the client's bytes and hands each message to the main thread. The
/// only state it shares with the main thread is the delivery queue.
void ReadClient(TDapSession& Session) {
  TDapFrameReader Reader;
  std::string Chunk(ReadChunk, '\0');
  auto Hand = [&Session](TDapFrameReader::TNext Next, std::string Body) {
    if (Next == TDapFrameReader::TNext::Message)
      Post([&Session, Body = std::move(Body)] { Session.HandleMessage(Body); });
    else if (Next == TDapFrameReader::TNext::Garbage)
      Post([&Session, Body = std::move(Body)] { Session.HandleGarbage(Body); });
  };
  for (;;) {
    const Int64 Read = ReadStandardInput(Chunk.data(), Chunk.size());
    if (Read <= 0)
      break;
    Reader.Feed(std::string_view(Chunk.data(), static_cast<size_t>(Read)));
    std::string Body;
    for (TDapFrameReader::TNext Next; (Next = Reader.Next(Body)) != TDapFrameReader::TNext::NeedMore;)
      Hand(Next, std::move(Body));
  }
  std::string Body;
  for (TDapFrameReader::TNext Next; (Next = Reader.Finish(Body)) != TDapFrameReader::TNext::NeedMore;)
    Hand(Next, std::move(Body));
  Post([&Session] { Session.HandleClientGone(); });
}

} // namespace

int main(int ArgCount, char** Args) {
  if (ArgCount > 1 && std::strcmp(Args[1], StandInOption) == 0)
    return RunStandIn(ArgCount, Args);
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
  std::thread Reader(ReadClient, std::ref(Session));
  // The reader blocks on the client's input, which may never close; the
  // process ends without waiting for it.
  Reader.detach();
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
  std::fflush(stderr);
  const int Signal = CaughtTerminationSignal();
  std::_Exit(Signal != 0 ? ExitBySignal + Signal : 0);
}
