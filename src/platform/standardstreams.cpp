#include "platform/standardstreams.h"

#include "platform/hostprocess.h"

#include <unistd.h>

namespace midebug {

Int64 ReadStandardInput(void* Buffer, size_t Count) { return ReadHandle(STDIN_FILENO, Buffer, Count); }

bool WriteStandardOutput(std::string_view Text) {
  return WriteHandle(STDOUT_FILENO, Text.data(), Text.size()) == static_cast<Int64>(Text.size());
}

} // namespace midebug
