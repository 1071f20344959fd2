#pragma once
/// \file
/// The disassembly cursor the IDE walks instructions with.

#include "process/gdbinterfaces.h"

#include <mutex>

namespace midebug {

class TGDBMemoryCache;

/// Walks forward instruction by instruction. A spot that does not decode is
/// skipped as two bytes, so the cursor never sticks. FLock guards the fields
/// (the output thread resets them when the program runs on) and is a leaf,
/// never held during a request.
class TGDBDisassemble : public TInterfaced<IGDBDisassemble> {
public:
  explicit TGDBDisassemble(TGDBMemoryCache* Owner) : FOwner(Owner) {}

  void ToAddress(UInt64 Address, UInt64& Actual) override;
  void ToNext(UInt64& Address) override { GetNextAddress(Address); }
  void GetNextAddress(UInt64& Address) override;
  bool IsValid() override;

  /// Forgets the current instruction.
  void Init();
  void ClearCache() { Init(); }
  /// The process is gone: every later decode fails.
  void Detach();

private:
  /// Decodes at Address and makes the instruction found there current.
  void Decode(UInt64 Address);

  std::mutex FLock;
  TGDBMemoryCache* FOwner;
  UInt64 FAddress = 0;
  /// -1: no current instruction.
  Integer FSize = -1;
  bool FValid = false;
};

} // namespace midebug
