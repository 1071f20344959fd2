#include "inspect/gdbdisassemble.h"

#include "inspect/gdbmemorycache.h"

namespace midebug {

void TGDBDisassemble::Init() {
  std::lock_guard Guard(FLock);
  FAddress = 0;
  FSize = -1;
  FValid = false;
}

void TGDBDisassemble::Detach() {
  std::lock_guard Guard(FLock);
  FOwner = nullptr;
}

bool TGDBDisassemble::IsValid() {
  std::lock_guard Guard(FLock);
  return FValid;
}

void TGDBDisassemble::Decode(UInt64 Address) {
  TGDBMemoryCache* Owner;
  {
    std::lock_guard Guard(FLock);
    Owner = FOwner;
  }
  Integer Size = -1;
  TGDBDisassembleData Data;
  if (Owner)
    Owner->DisassembleAt(Address, Size, Data);
  std::lock_guard Guard(FLock);
  if (Size == -1) {
    FAddress = Address;
    FSize = 2;
    FValid = false;
    return;
  }
  // The instruction found can start before Address, when Address is inside
  // it.
  FAddress = Data.Address;
  FSize = Size;
  FValid = true;
}

void TGDBDisassemble::ToAddress(UInt64 Address, UInt64& Actual) {
  Decode(Address);
  std::lock_guard Guard(FLock);
  Actual = FAddress;
}

void TGDBDisassemble::GetNextAddress(UInt64& Address) {
  UInt64 Next;
  {
    std::lock_guard Guard(FLock);
    if (FSize == -1) {
      Address = 0;
      return;
    }
    // A decoded size of 0 would hold the cursor on one address.
    Next = FAddress + static_cast<UInt64>(FSize > 0 ? FSize : 1);
  }
  Decode(Next);
  std::lock_guard Guard(FLock);
  Address = FAddress;
}

} // namespace midebug
