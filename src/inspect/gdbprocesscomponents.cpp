// The inspection components of a process: made with it, freed with it, and
// told when the program runs on or its modules change.

#include "inspect/gdbbreakpointtable.h"
#include "inspect/gdbevaluator.h"
#include "inspect/gdbfiletable.h"
#include "inspect/gdblinecache.h"
#include "inspect/gdbmemorycache.h"
#include "inspect/gdbregisterids.h"
#include "inspect/gdbthreadtable.h"
#include "process/gdbprocess.h"

namespace midebug {

void TInspectDeleter::operator()(TGDBThreadTable* Component) const { delete Component; }
void TInspectDeleter::operator()(TGDBBreakpointTable* Component) const { delete Component; }
void TInspectDeleter::operator()(TGDBFileTable* Component) const { delete Component; }
void TInspectDeleter::operator()(TGDBLineCache* Component) const { delete Component; }
void TInspectDeleter::operator()(TGDBMemoryCache* Component) const { delete Component; }
void TInspectDeleter::operator()(TGDBRegisterIds* Component) const { delete Component; }
void TInspectDeleter::operator()(TGDBEvaluator* Component) const { delete Component; }

void TGDBProcess::MakeInspectComponents() {
  FThreads.reset(new TGDBThreadTable(*this));
  FBreakpoints.reset(new TGDBBreakpointTable);
  FFiles.reset(new TGDBFileTable);
  FLines.reset(new TGDBLineCache);
  FMemory.reset(new TGDBMemoryCache(*this));
  FRegisters.reset(new TGDBRegisterIds(*this));
  FEvaluator.reset(new TGDBEvaluator(*this, FEvaluating, FMaxChildrenCount));
}

Integer TGDBProcess::ForgetStop() {
  const Integer ThreadId = FThreads->Resume();
  // Without thread notifications the stacks are refreshed at the next stop.
  if (FKernel->SupportThreadNotification())
    FThreads->ResetCallStacks();
  FLines->ForgetInfoLine();
  FMemory->Clear();
  return ThreadId;
}

void TGDBProcess::ForgetLineAddresses() { FLines->ForgetLineAddresses(); }

void TGDBProcess::NotifyReturnValue(const std::string& Value) { FThreads->SetReturnValue(Value); }

std::string TGDBProcess::GetReturnValue() { return FThreads->ReturnValue(); }

} // namespace midebug
