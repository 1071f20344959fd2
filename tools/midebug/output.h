#pragma once
/// \file
/// Where the console debugger's events and answers go: lines a person reads,
/// or one JSON object per line for tools.

#include <nlohmann/json.hpp>

#include <cstdint>
#include <map>
#include <string>
#include <vector>

namespace midebug::cli {

/// Prints each event and answer in the chosen form and flushes it at once,
/// so that a tool reading the pipe sees it as it happens.
class TCliOutput {
public:
  explicit TCliOutput(bool Json) : FJson(Json) {}

  bool Json() const { return FJson; }
  /// Prints Object in JSON form, or Text (any number of lines) otherwise.
  void Emit(const nlohmann::json& Object, const std::string& Text);
  /// An answer that reports a failure: {"answer":Command,"error":Message},
  /// or "error: Message" on the error stream.
  void Error(const std::string& Command, const std::string& Message);
  /// The prompt of an interactive session (never in JSON form). Output
  /// printed while it waits starts on a line of its own; PromptShown says
  /// whether the prompt is the last thing printed.
  void Prompt();
  bool PromptShown() const { return FPromptShown; }
  /// The person ended a line: the terminal's echo moved past the prompt.
  void LineRead() { FPromptShown = false; }
  /// True once an answer reported a failure.
  bool Failed() const { return FFailed; }
  /// The command being run, echoed in text form when it came from a script.
  void Echo(const std::string& Line);

private:
  /// Ends the line of a prompt that output now interrupts.
  void LeavePrompt();

  bool FJson;
  bool FPromptShown = false;
  bool FFailed = false;
};

/// An address as "0x" and lower-case digits, Padded to 16 digits the way
/// GDB prints frames.
std::string HexAddress(uint64_t Address, bool Padded = false);

/// The lines of the source files stops are reported in, read once each.
class TSourceLines {
public:
  /// The text of line Line (1-based) of File; empty when unreadable.
  std::string Line(const std::string& File, long Line);

private:
  std::map<std::string, std::vector<std::string>> FFiles;
};

} // namespace midebug::cli
