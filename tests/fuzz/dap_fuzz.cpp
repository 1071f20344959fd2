// libFuzzer target: any bytes as what a client sends the debug adapter. The
// first byte chooses how the bytes arrive (in pieces of 1 to 64 bytes, or
// whole); the rest go through the adapter's framing into a fresh session.
// Requests that would start a debugger (launch, attach) are left out: the
// target runs without one. Every message the session writes must be framed
// JSON.

#include "../../tools/midebug-dap/dapframing.h"
#include "../../tools/midebug-dap/dapsession.h"

#include <nlohmann/json.hpp>

#include <cstddef>
#include <cstdint>
#include <string>
#include <string_view>

namespace {

using namespace midebug::dap;

/// True for a message that would start a debugger.
bool StartsDebugger(const std::string& Body) {
  const nlohmann::json Message = nlohmann::json::parse(Body, nullptr, false);
  if (!Message.is_object())
    return false;
  const auto Command = Message.find("command");
  return Command != Message.end() && (*Command == "launch" || *Command == "attach");
}

/// Aborts unless Framed is one header block and a JSON object.
void CheckFramed(const std::string& Framed) {
  TDapFrameReader Reader;
  Reader.Feed(Framed);
  std::string Body;
  if (Reader.Next(Body) != TDapFrameReader::TNext::Message || !nlohmann::json::parse(Body, nullptr, false).is_object())
    __builtin_trap();
  if (Reader.Next(Body) != TDapFrameReader::TNext::NeedMore)
    __builtin_trap();
}

void Deliver(TDapSession& Session, TDapFrameReader::TNext Next, const std::string& Body) {
  if (Next == TDapFrameReader::TNext::Garbage)
    Session.HandleGarbage(Body);
  else if (Next == TDapFrameReader::TNext::Message && !StartsDebugger(Body))
    Session.HandleMessage(Body);
}

} // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* Data, size_t Size) {
  if (Size == 0)
    return 0;
  const size_t Piece = Data[0] < 64 ? Data[0] + 1u : Size;
  const std::string_view Bytes(reinterpret_cast<const char*>(Data + 1), Size - 1);
  TDapSession Session;
  Session.SetWriter(CheckFramed);
  TDapFrameReader Reader;
  std::string Body;
  for (size_t At = 0; At < Bytes.size() && !Session.Finished(); At += Piece) {
    Reader.Feed(Bytes.substr(At, Piece));
    for (TDapFrameReader::TNext Next; (Next = Reader.Next(Body)) != TDapFrameReader::TNext::NeedMore;)
      Deliver(Session, Next, Body);
  }
  for (TDapFrameReader::TNext Next; (Next = Reader.Finish(Body)) != TDapFrameReader::TNext::NeedMore;)
    Deliver(Session, Next, Body);
  Session.HandleClientGone();
  return 0;
}
