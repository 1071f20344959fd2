#pragma once
/// \file
/// Asking the debugger a console question the MI commands do not answer
/// (which language "auto" chose, how the program exited): its answer comes
/// as console output, read by the output thread, before the done record of
/// the question.

#include "process/gdbrequestengine.h"

#include <mutex>
#include <string>
#include <string_view>

namespace midebug {

/// One question at a time: FQueryLock is held for the whole question and
/// taken before FAnswerLock, which guards the pending flag and the answer
/// (a leaf lock).
class TGDBConsoleQuery {
public:
  /// Asks the console command Question; the answer is the console line
  /// holding Marker, the value asked for follows Marker and ends at
  /// Terminator (or with the line).
  TGDBConsoleQuery(std::string_view Question, std::string_view Marker, char Terminator)
      : FQuestion(Question), FMarker(Marker), FTerminator(Terminator) {}

  /// Sends the question, waits for its done record and returns the value
  /// the debugger answered; empty without an answer. Never on the output
  /// thread.
  std::string Query(TGDBRequestEngine& Requests);
  /// Takes Text when it is the answer to a pending question; true when it
  /// was (it is then not the user's to see).
  bool TakeAnswer(const std::string& Text);

private:
  /// Opens (Pending) or closes the question; closing gives the value named
  /// by the answer taken meanwhile.
  std::string Expect(bool Pending);

  const std::string_view FQuestion;
  const std::string_view FMarker;
  const char FTerminator;
  std::mutex FQueryLock;
  std::mutex FAnswerLock;
  bool FPending = false;
  std::string FAnswer;
};

} // namespace midebug
