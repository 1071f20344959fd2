#include "platform/logwriter.h"

namespace midebug {

namespace {
constexpr size_t LogBufferSize = 4096;
}

TLogWriter::~TLogWriter() {
  if (FFile)
    std::fclose(FFile);
}

bool TLogWriter::Open(const std::string& Path) {
  std::lock_guard Guard(FLock);
  if (FFile)
    std::fclose(FFile);
  FFile = std::fopen(Path.c_str(), "wbe");
  if (!FFile)
    return false;
  std::setvbuf(FFile, nullptr, _IOFBF, LogBufferSize);
  FPath = Path;
  return true;
}

void TLogWriter::Write(std::string_view Text, bool NewLine) {
  std::lock_guard Guard(FLock);
  if (!FFile)
    return;
  std::fwrite(Text.data(), 1, Text.size(), FFile);
  if (NewLine)
    std::fputc('\n', FFile);
  std::fflush(FFile);
}

} // namespace midebug
