#pragma once
/// \file
/// Asking GDB which language "auto" chose: its answer comes as console
/// output, read by the output thread, before the done record of the
/// question.

#include <mutex>
#include <string>

namespace midebug {

/// One question at a time: FQueryLock is held for the whole question and
/// taken before FAnswerLock, which guards the pending flag and the answer
/// (a leaf lock).
class TGDBLanguageQuery {
public:
  /// The console line that asks, after the interpreter-exec command.
  static constexpr const char* ConsoleCommand = " console \"show language\"";

  /// Runs Ask (which sends the question and waits for its done record)
  /// and returns the language name GDB answered; empty without an answer.
  template <class TAsk>
  std::string Query(TAsk&& Ask) {
    std::lock_guard Query(FQueryLock);
    Expect(true);
    Ask();
    return Expect(false);
  }
  /// Takes Text when it is the answer to a pending question; true when it
  /// was (it is then not the user's to see).
  bool TakeAnswer(const std::string& Text);

private:
  /// Opens (Pending) or closes the question; closing gives the language
  /// named by the answer taken meanwhile.
  std::string Expect(bool Pending);

  std::mutex FQueryLock;
  std::mutex FAnswerLock;
  bool FPending = false;
  std::string FAnswer;
};

} // namespace midebug
