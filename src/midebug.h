#pragma once
/// \file
/// The boundary an IDE includes: the process manager that creates and
/// attaches debugged processes, the interfaces and records they are driven
/// through, the IDE's service registry (remote profiles), the delivery
/// of events on the IDE's main thread, and the console services a host
/// program such as the console debugger needs.

#include "kernel/ideservices.h"
#include "platform/hostconsole.h"
#include "platform/mainthread.h"
#include "process/gdbinterfaces.h"
#include "process/gdbprocessmanager.h"
#include "process/programarguments.h"
