// The adapter's memory requests: reads that report what could not be read
// rather than failing whole, and writes that tell the client what changed;
// and the modules the program has loaded.

#include "dapaddress.h"
#include "dapsession.h"

#include <algorithm>
#include <cstring>
#include <vector>

namespace midebug::dap {

namespace {

/// The most bytes one read or write request may name.
constexpr long long MaxTransfer = 1 << 20;

const char* const Base64Digits = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

std::string EncodeBase64(const Byte* Bytes, size_t Count) {
  std::string Text;
  Text.reserve((Count + 2) / 3 * 4);
  for (size_t At = 0; At < Count; At += 3) {
    const unsigned Group = (unsigned(Bytes[At]) << 16) | (At + 1 < Count ? unsigned(Bytes[At + 1]) << 8 : 0u) |
                           (At + 2 < Count ? unsigned(Bytes[At + 2]) : 0u);
    Text += Base64Digits[(Group >> 18) & 63];
    Text += Base64Digits[(Group >> 12) & 63];
    Text += At + 1 < Count ? Base64Digits[(Group >> 6) & 63] : '=';
    Text += At + 2 < Count ? Base64Digits[Group & 63] : '=';
  }
  return Text;
}

/// The bytes of Text; nullopt when it is no base64.
std::optional<std::vector<Byte>> DecodeBase64(const std::string& Text) {
  std::vector<Byte> Bytes;
  unsigned Group = 0;
  int Bits = 0;
  size_t Padding = 0;
  for (const char Letter : Text) {
    if (Letter == '=') {
      ++Padding;
      continue;
    }
    const char* Found = Letter != '\0' ? std::strchr(Base64Digits, Letter) : nullptr;
    if (!Found || Padding > 0)
      return std::nullopt;
    Group = (Group << 6) | static_cast<unsigned>(Found - Base64Digits);
    Bits += 6;
    if (Bits >= 8) {
      Bits -= 8;
      Bytes.push_back(static_cast<Byte>((Group >> Bits) & 0xff));
    }
  }
  if (Padding > 2 || (Text.size() % 4 != 0 && Padding > 0))
    return std::nullopt;
  return Bytes;
}

} // namespace

std::optional<UInt64> TDapSession::MemoryAddress(TDapArguments& Arguments) {
  const auto Reference = Arguments.String("memoryReference");
  const auto Offset = Arguments.Number("offset", -MaxTransfer * 1024, MaxTransfer * 1024);
  if (!Reference) {
    if (Arguments.Problem().empty())
      Arguments.Refuse("'memoryReference' is missing");
    return std::nullopt;
  }
  const auto Address = ParseAddress(*Reference);
  if (!Address) {
    Arguments.Refuse("'memoryReference' must be an address such as 0x401000");
    return std::nullopt;
  }
  return *Address + static_cast<UInt64>(Offset.value_or(0));
}

TDapReply TDapSession::ReadMemory(TDapArguments& Arguments) {
  const auto Address = MemoryAddress(Arguments);
  const auto Count = Arguments.Number("count", 0, MaxTransfer);
  if (!Arguments.Problem().empty() || !Address)
    return TDapReply::Refuse(Arguments.Problem());
  if (!Count)
    return TDapReply::Refuse("'count' is missing");
  if (!FProcess || FState != TProgramState::Stopped)
    return TDapReply::Refuse(NotStoppedReason());
  std::vector<Byte> Bytes(static_cast<size_t>(*Count));
  Integer Read = *Count > 0 ? FProcess->GetMemory(*Address, Bytes.data(), static_cast<Integer>(*Count)) : 0;
  // Nothing readable at the address is no failure of the request: every
  // byte is reported unreadable.
  Read = std::clamp<Integer>(Read, 0, static_cast<Integer>(*Count));
  nlohmann::json Body = {{"address", HexAddress(*Address)}};
  if (Read > 0)
    Body["data"] = EncodeBase64(Bytes.data(), static_cast<size_t>(Read));
  if (Read < *Count)
    Body["unreadableBytes"] = *Count - Read;
  return TDapReply::Ok(std::move(Body));
}

TDapReply TDapSession::WriteMemory(TDapArguments& Arguments) {
  const auto Address = MemoryAddress(Arguments);
  const auto Data = Arguments.String("data");
  if (!Arguments.Problem().empty() || !Address)
    return TDapReply::Refuse(Arguments.Problem());
  const auto Bytes = DecodeBase64(Data.value_or(""));
  if (!Data || !Bytes)
    return TDapReply::Refuse("'data' must be the bytes to write in base64");
  if (Bytes->size() > static_cast<size_t>(MaxTransfer))
    return TDapReply::Refuse("at most " + std::to_string(MaxTransfer) + " bytes are written at once");
  if (!FProcess || FState != TProgramState::Stopped)
    return TDapReply::Refuse(NotStoppedReason());
  if (Bytes->empty())
    return TDapReply::Ok({{"bytesWritten", 0}});
  const Integer Written = FProcess->SetMemory(*Address, Bytes->data(), static_cast<Integer>(Bytes->size()));
  if (Written < 0)
    return TDapReply::Refuse("the memory at " + HexAddress(*Address) + " could not be written");
  FPendingMemoryEvent = {*Address, Written};
  return TDapReply::Ok({{"bytesWritten", Written}});
}

TDapReply TDapSession::Modules(TDapArguments& Arguments) {
  const auto Start = Arguments.Number("startModule", 0, 0x7fffffff).value_or(0);
  const auto Count = Arguments.Number("moduleCount", 0, 0x7fffffff).value_or(0);
  if (!Arguments.Problem().empty())
    return TDapReply::Refuse(Arguments.Problem());
  nlohmann::json List = nlohmann::json::array();
  long long Index = 0;
  for (const auto& [Id, Module] : FModules)
    if (Index++ >= Start && (Count == 0 || static_cast<long long>(List.size()) < Count))
      List.push_back(Module);
  return TDapReply::Ok({{"modules", std::move(List)}, {"totalModules", FModules.size()}});
}

} // namespace midebug::dap
