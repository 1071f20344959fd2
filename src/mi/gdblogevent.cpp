#include "mi/gdblogevent.h"

namespace midebug {

TGDBLogEvent CreateGDBLogEvent(TGDBEvent Event, const std::string& Data, Integer ThreadId) {
  return TGDBLogEvent{Event, Data, ThreadId};
}

TGDBLogEvent CreateUnknownLogEvent(const std::string& Data) { return CreateGDBLogEvent(etUnknown, Data, -1); }
TGDBLogEvent CreateErrorLogEvent(const std::string& Data) { return CreateGDBLogEvent(etError, Data, -1); }
TGDBLogEvent CreateConsoleLogEvent(const std::string& Data) { return CreateGDBLogEvent(etConsole, Data, -1); }
TGDBLogEvent CreateOdsLogEvent(const std::string& Data) { return CreateGDBLogEvent(etOds, Data, -1); }
TGDBLogEvent CreateInternalLogEvent(const std::string& Data) { return CreateGDBLogEvent(etInternal, Data, -1); }

} // namespace midebug
