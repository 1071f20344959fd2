// The program's source files: those the debugger knows, and the text of one.

#include "dapsession.h"

#include <filesystem>
#include <fstream>
#include <set>

namespace midebug::dap {

namespace {

/// The largest source file the source request sends.
constexpr std::uintmax_t MaxSourceSize = 16 << 20;

} // namespace

TDapReply TDapSession::LoadedSources(TDapArguments& /*Arguments*/) {
  namespace fs = std::filesystem;
  nlohmann::json List = nlohmann::json::array();
  if (!FProcess || ProgramGone())
    return TDapReply::Ok({{"sources", List}});
  // The debugger also names the sources of libraries built elsewhere, by
  // paths that lead nowhere here: only files the client can open are told.
  std::set<std::string> Seen;
  std::error_code Ignored;
  for (const std::string& File : FProcess->GetSourceFiles()) {
    const fs::path Path = fs::path(File).lexically_normal();
    if (!Path.is_absolute() || !fs::is_regular_file(Path, Ignored) || !Seen.insert(Path.string()).second)
      continue;
    List.push_back({{"name", Path.filename().string()}, {"path", Path.string()}});
  }
  return TDapReply::Ok({{"sources", List}});
}

TDapReply TDapSession::Source(TDapArguments& Arguments) {
  namespace fs = std::filesystem;
  const nlohmann::json* Given = Arguments.Object("source");
  const auto Reference = Arguments.Number("sourceReference", 0, 0x7fffffff);
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  std::string Path;
  long long Number = Reference.value_or(0);
  if (Given) {
    if (const auto Found = Given->find("path"); Found != Given->end() && Found->is_string())
      Path = Found->get<std::string>();
    // The source's own reference outranks the request's.
    if (const auto Found = Given->find("sourceReference"); Found != Given->end() && Found->is_number_integer())
      Number = Found->get<long long>();
  }
  if (Path.empty()) {
    // The adapter gives every source by its path and hands out no
    // references.
    if (Number != 0)
      return TDapReply::Refuse("the source reference " + std::to_string(Number) +
                               " is unknown: midebug-dap names its sources by path");
    return TDapReply::Refuse("source needs 'source' with a 'path'");
  }
  std::error_code Failure;
  const bool Regular = fs::is_regular_file(Path, Failure);
  const std::uintmax_t Size = Regular ? fs::file_size(Path, Failure) : 0;
  if (!Regular || Failure)
    return TDapReply::Refuse("cannot read " + Path + ": " + (Failure ? Failure.message() : "it is no file"));
  if (Size > MaxSourceSize)
    return TDapReply::Refuse(Path + " is larger than " + std::to_string(MaxSourceSize >> 20) +
                             " MiB; open it as a file instead");
  std::ifstream Stream(Path, std::ios::binary);
  std::string Content(static_cast<size_t>(Size), '\0');
  if (!Stream || !Stream.read(Content.data(), static_cast<std::streamsize>(Size)))
    return TDapReply::Refuse("cannot read " + Path);
  return TDapReply::Ok({{"content", std::move(Content)}});
}

} // namespace midebug::dap
