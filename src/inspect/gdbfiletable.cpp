#include "inspect/gdbfiletable.h"

#include "platform/hostfiles.h"

#include <algorithm>
#include <vector>

namespace midebug {

namespace {

/// Grown in steps, as names come a few at a time.
constexpr size_t FileNameArrayStep = 100;

char Separator(bool Windows) { return Windows ? '\\' : '/'; }

/// "C:\x", "\\server\x" and "/x" on a Windows target, "/x" elsewhere.
bool IsAbsolute(const std::string& Name, bool Windows) {
  if (!Name.empty() && Name[0] == Separator(Windows))
    return true;
  return Windows && Name.size() >= 2 && Name[1] == ':';
}

/// Name without "." steps, "dir/.." pairs and repeated separators; ".." that
/// climbs above a relative name's start stays.
std::string Normalized(const std::string& Name, bool Windows) {
  const char Slash = Separator(Windows);
  std::vector<std::string> Steps;
  size_t Start = 0;
  while (Start <= Name.size()) {
    const size_t End = std::min(Name.find(Slash, Start), Name.size());
    const std::string Step = Name.substr(Start, End - Start);
    if (Step == "..") {
      if (!Steps.empty() && Steps.back() != ".." && Steps.back().back() != ':')
        Steps.pop_back();
      else if (!IsAbsolute(Name, Windows))
        Steps.push_back(Step);
    } else if (!Step.empty() && Step != ".") {
      Steps.push_back(Step);
    }
    Start = End + 1;
  }
  std::string Result = Name.starts_with(std::string(2, Slash)) ? std::string(2, Slash)
                       : Name.starts_with(Slash)               ? std::string(1, Slash)
                                                               : std::string();
  for (size_t Index = 0; Index < Steps.size(); ++Index)
    Result += (Index == 0 ? "" : std::string(1, Slash)) + Steps[Index];
  return Result;
}

std::string WithWindowsSeparators(std::string Name) {
  std::replace(Name.begin(), Name.end(), '/', '\\');
  return Name;
}

} // namespace

TGDBFileTable::TGDBFileTable() : FBaseDirectory(GetCurrentDir()) {}

std::string TGDBFileTable::DebuggerName(const std::string& FileName, bool Windows) {
  return Normalized(Windows ? WithWindowsSeparators(FileName) : FileName, Windows);
}

std::string TGDBFileTable::BareName(const std::string& FileName, bool Windows) {
  const size_t Last = FileName.find_last_of(Windows ? "\\/:" : "/");
  return Last == std::string::npos ? FileName : FileName.substr(Last + 1);
}

std::string TGDBFileTable::Key(const std::string& FileName, bool Windows) const {
  const std::string Name = Windows ? WithWindowsSeparators(FileName) : FileName;
  if (Name.empty() || IsAbsolute(Name, Windows))
    return Normalized(Name, Windows);
  const std::string Base = Windows ? WithWindowsSeparators(FBaseDirectory) : FBaseDirectory;
  return Normalized(Base + Separator(Windows) + Name, Windows);
}

Integer TGDBFileTable::AddFileName(const std::string& FileName, bool Windows) {
  if (FileName.empty())
    return 0;
  const std::string FileKey = Key(FileName, Windows);
  std::lock_guard Guard(FLock);
  const auto Known = FFileNameList.find(FileKey);
  if (Known != FFileNameList.end())
    return Known->second;
  if (FFileNameArray.size() <= static_cast<size_t>(FFileNameIndex))
    FFileNameArray.resize(FFileNameArray.size() + FileNameArrayStep);
  // Windows targets keep one spelling of a path, with backslashes.
  FFileNameArray[static_cast<size_t>(FFileNameIndex)] = Windows ? WithWindowsSeparators(FileName) : FileName;
  ++FFileNameIndex;
  FFileNameList.emplace(FileKey, FFileNameIndex);
  return FFileNameIndex;
}

Integer TGDBFileTable::GetFileIndex(const std::string& FileName, bool Windows) {
  if (FileName.empty())
    return 0;
  const std::string FileKey = Key(FileName, Windows);
  // A name the debugger gave without its folder stands for that file
  // wherever it lies.
  const std::string BareKey = Key(BareName(FileName, Windows), Windows);
  std::lock_guard Guard(FLock);
  auto Known = FFileNameList.find(FileKey);
  if (Known == FFileNameList.end())
    Known = FFileNameList.find(BareKey);
  return Known == FFileNameList.end() ? 0 : Known->second;
}

std::string TGDBFileTable::GetFileName(Integer FileIndex) {
  std::lock_guard Guard(FLock);
  if (FileIndex < 1 || FileIndex > FFileNameIndex)
    return {};
  return FFileNameArray[static_cast<size_t>(FileIndex - 1)];
}

bool TGDBFileTable::SetFileName(Integer FileIndex, const std::string& FileName) {
  std::lock_guard Guard(FLock);
  if (FileIndex < 1 || FileIndex > FFileNameIndex)
    return false;
  FFileNameArray[static_cast<size_t>(FileIndex - 1)] = FileName;
  return true;
}

} // namespace midebug
