#pragma once
/// \file
/// Log events: everything worth showing the user, with the thread it came from.

#include "platform/types.h"

#include <string>

namespace midebug {

enum TGDBEvent : uint8_t { etUnknown = 0, etError = 1, etConsole = 2, etOds = 3, etInternal = 4 };

struct TGDBLogEvent {
  TGDBEvent Event = etUnknown;
  std::string Data;
  /// The debugger's thread number; -1 when the event belongs to no thread.
  Integer ThreadId = -1;
};

TGDBLogEvent CreateGDBLogEvent(TGDBEvent Event, const std::string& Data, Integer ThreadId);
TGDBLogEvent CreateUnknownLogEvent(const std::string& Data);
TGDBLogEvent CreateErrorLogEvent(const std::string& Data);
TGDBLogEvent CreateConsoleLogEvent(const std::string& Data);
TGDBLogEvent CreateOdsLogEvent(const std::string& Data);
TGDBLogEvent CreateInternalLogEvent(const std::string& Data);

} // namespace midebug
