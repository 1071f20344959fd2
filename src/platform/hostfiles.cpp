#include "platform/hostfiles.h"

#include <cstdlib>
#include <filesystem>
#include <mutex>
#include <string_view>
#include <unistd.h>

namespace midebug {

namespace fs = std::filesystem;

bool FileExists(const std::string& Path) {
  std::error_code Error;
  return !Path.empty() && fs::is_regular_file(Path, Error);
}

bool DirectoryExists(const std::string& Path) {
  std::error_code Error;
  return !Path.empty() && fs::is_directory(Path, Error);
}

bool ForceDirectories(const std::string& Path) {
  if (Path.empty())
    return false;
  std::error_code Error;
  fs::create_directories(Path, Error);
  return DirectoryExists(Path);
}

std::string ExpandFileName(const std::string& Path) {
  std::error_code Error;
  const fs::path Absolute = fs::absolute(Path, Error);
  return Error ? Path : Absolute.lexically_normal().string();
}

std::string ExtractFileDir(const std::string& Path) {
  const size_t Slash = Path.rfind(PathDelimiter);
  if (Slash == std::string::npos)
    return {};
  return Slash == 0 ? std::string(1, PathDelimiter) : Path.substr(0, Slash);
}

std::string ExtractFileName(const std::string& Path) {
  const size_t Slash = Path.rfind(PathDelimiter);
  return Slash == std::string::npos ? Path : Path.substr(Slash + 1);
}

std::string FindOnPath(const std::string& Name) {
  if (Name.empty() || Name.find(PathDelimiter) != std::string::npos)
    return {};
  const std::string SearchPath = GetEnvironmentVariable("PATH");
  size_t Start = 0;
  while (Start <= SearchPath.size()) {
    size_t End = SearchPath.find(':', Start);
    if (End == std::string::npos)
      End = SearchPath.size();
    // An empty PATH entry means the current directory.
    const std::string_view Dir = std::string_view(SearchPath).substr(Start, End - Start);
    const std::string Candidate = (Dir.empty() ? std::string(".") : std::string(Dir)) + PathDelimiter + Name;
    if (FileExists(Candidate) && access(Candidate.c_str(), X_OK) == 0)
      return Candidate;
    Start = End + 1;
  }
  return {};
}

bool ProgramExists(const std::string& Path) { return FileExists(Path) || !FindOnPath(Path).empty(); }

std::string GetEnvironmentVariable(const std::string& Name) {
  const char* Value = std::getenv(Name.c_str());
  return Value ? Value : std::string();
}

std::string GetCurrentDir() {
  std::error_code Error;
  const fs::path Current = fs::current_path(Error);
  return Error ? std::string() : Current.string();
}

std::string HostExecutableDir() {
  std::error_code Error;
  const fs::path Exe = fs::read_symlink("/proc/self/exe", Error);
  return Error ? GetCurrentDir() : Exe.parent_path().string();
}

namespace {

/// Guards the root directory the host sets; taken alone, never with another
/// lock held.
std::mutex RootDirectoryLock;
std::string RootDirectory;
bool RootDirectorySet = false;

} // namespace

std::string HostRootDirectory() {
  {
    std::lock_guard Guard(RootDirectoryLock);
    if (RootDirectorySet)
      return RootDirectory;
  }
  return GetEnvironmentVariable("MIDEBUG_ROOT");
}

void SetHostRootDirectory(const std::string& Path) {
  std::lock_guard Guard(RootDirectoryLock);
  RootDirectory = Path;
  RootDirectorySet = true;
}

} // namespace midebug
