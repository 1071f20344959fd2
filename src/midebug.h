#pragma once
/// \file
/// The boundary an IDE includes: the process manager that creates and
/// attaches debugged processes, the interfaces and records they are driven
/// through with the register tables their values follow, the IDE's service
/// registry (remote profiles), the delivery of events on the IDE's main
/// thread, the console services a host program such as the console debugger
/// needs, and, for a host that speaks a protocol over its standard streams
/// or a port on the loopback address, those streams, that port and a
/// stand-in process that becomes the program in a terminal the host does not
/// own.

#include "kernel/ideservices.h"
#include "mi/gdbregisters.h"
#include "platform/hostconsole.h"
#include "platform/loopbackserver.h"
#include "platform/mainthread.h"
#include "platform/standardstreams.h"
#include "platform/standinprocess.h"
#include "process/gdbinterfaces.h"
#include "process/gdbprocessmanager.h"
#include "process/programarguments.h"
