#pragma once
/// \file
/// The debugger's numbers of one process's registers.

#include "platform/types.h"

#include <mutex>

namespace midebug {

/// The debugger's register numbers of the general, x87 and SSE registers, in
/// the order of the processor's name tables; empty until learnt from the
/// debugger's register names. FLock is a leaf lock.
class TGDBRegisterIds {
public:
  /// Guards the fields below; the operations that read and fill them come
  /// with the services that need them.
  std::mutex FLock;
  TIntegerArray FRegisterIds;
  TIntegerArray FFPURegisterIds;
  TIntegerArray FXMMRegisterIds;
};

} // namespace midebug
