#include "process/gdblanguagequery.h"

#include <string_view>

namespace midebug {

namespace {

/// GDB 13's console answer to "show language":
/// The current source language is "auto; currently c".
constexpr std::string_view LanguageAnswerPrefix = "The current source language is \"";

} // namespace

bool TGDBLanguageQuery::TakeAnswer(const std::string& Text) {
  if (!Text.starts_with(LanguageAnswerPrefix))
    return false;
  std::lock_guard Guard(FAnswerLock);
  if (!FPending)
    return false;
  FAnswer = Text;
  return true;
}

std::string TGDBLanguageQuery::Expect(bool Pending) {
  std::string Answer;
  {
    std::lock_guard Guard(FAnswerLock);
    FPending = Pending;
    Answer.swap(FAnswer);
  }
  const size_t Open = LanguageAnswerPrefix.size();
  const size_t Close = Answer.find('"', Open);
  if (Answer.empty() || Close == std::string::npos)
    return {};
  return Answer.substr(Open, Close - Open);
}

} // namespace midebug
