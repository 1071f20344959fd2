#pragma once
/// \file
/// The scalar types and the dynamic arrays shared by every
/// subsystem. Text is UTF-8 held in std::string; positions count bytes.

#include <cstdint>
#include <string>
#include <vector>

namespace midebug {

using Integer = int32_t;
using Cardinal = uint32_t;
using Int64 = int64_t;
using UInt64 = uint64_t;
using Byte = uint8_t;

using TIntegerArray = std::vector<Integer>;
using TStringArray = std::vector<std::string>;
using TAddressArray = std::vector<UInt64>;

} // namespace midebug
