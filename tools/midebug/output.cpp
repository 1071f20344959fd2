// The console debugger's output in its two forms.

#include "output.h"

#include <cstdio>
#include <fstream>

namespace midebug::cli {

void TCliOutput::LeavePrompt() {
  if (FPromptShown)
    std::fputc('\n', stdout);
  FPromptShown = false;
}

void TCliOutput::Emit(const nlohmann::json& Object, const std::string& Text) {
  if (FJson) {
    // Program output and file names need not be UTF-8; replace what is not.
    const std::string Line = Object.dump(-1, ' ', false, nlohmann::json::error_handler_t::replace);
    std::fprintf(stdout, "%s\n", Line.c_str());
  } else if (!Text.empty()) {
    LeavePrompt();
    std::fputs(Text.c_str(), stdout);
    if (Text.back() != '\n')
      std::fputc('\n', stdout);
  }
  std::fflush(stdout);
}

void TCliOutput::Error(const std::string& Command, const std::string& Message) {
  FFailed = true;
  if (FJson) {
    Emit({{"answer", Command}, {"error", Message}}, "");
    return;
  }
  LeavePrompt();
  std::fflush(stdout);
  std::fprintf(stderr, "error: %s\n", Message.c_str());
  std::fflush(stderr);
}

void TCliOutput::Prompt() {
  if (FJson)
    return;
  std::fputs("(midebug) ", stdout);
  std::fflush(stdout);
  FPromptShown = true;
}

void TCliOutput::Echo(const std::string& Line) {
  if (FJson)
    return;
  std::fprintf(stdout, "(midebug) %s\n", Line.c_str());
  std::fflush(stdout);
}

std::string HexAddress(uint64_t Address, bool Padded) {
  char Buffer[32];
  std::snprintf(Buffer, sizeof Buffer, Padded ? "0x%016llx" : "0x%llx", static_cast<unsigned long long>(Address));
  return Buffer;
}

std::string TSourceLines::Line(const std::string& File, long Line) {
  if (File.empty() || Line <= 0)
    return {};
  auto Found = FFiles.find(File);
  if (Found == FFiles.end()) {
    std::vector<std::string> Lines;
    std::ifstream Stream(File);
    for (std::string Text; std::getline(Stream, Text);) {
      if (!Text.empty() && Text.back() == '\r')
        Text.pop_back();
      Lines.push_back(Text);
    }
    Found = FFiles.emplace(File, std::move(Lines)).first;
  }
  if (static_cast<size_t>(Line) > Found->second.size())
    return {};
  return Found->second[static_cast<size_t>(Line) - 1];
}

} // namespace midebug::cli
