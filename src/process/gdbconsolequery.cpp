#include "process/gdbconsolequery.h"

namespace midebug {

std::string TGDBConsoleQuery::Query(TGDBRequestEngine& Requests) {
  std::lock_guard Query(FQueryLock);
  Expect(true);
  TGDBResult Reply(ctInterpreterExec);
  Requests.Ask(Reply, [this](TGDBCommand& Builder, std::string& Token) {
    return Builder.CreateMiCommand(ctInterpreterExec, Token) + " console \"" + std::string(FQuestion) + "\"";
  });
  return Expect(false);
}

bool TGDBConsoleQuery::TakeAnswer(const std::string& Text) {
  if (Text.find(FMarker) == std::string::npos)
    return false;
  std::lock_guard Guard(FAnswerLock);
  if (!FPending)
    return false;
  FAnswer = Text;
  return true;
}

std::string TGDBConsoleQuery::Expect(bool Pending) {
  std::string Answer;
  {
    std::lock_guard Guard(FAnswerLock);
    FPending = Pending;
    Answer.swap(FAnswer);
  }
  const size_t Marker = Answer.find(FMarker);
  if (Marker == std::string::npos)
    return {};
  const size_t Open = Marker + FMarker.size();
  const size_t Close = Answer.find(FTerminator, Open);
  return Answer.substr(Open, Close == std::string::npos ? std::string::npos : Close - Open);
}

} // namespace midebug
