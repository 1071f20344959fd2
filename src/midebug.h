#pragma once
/// \file
/// The public face of the midebug library: code outside it includes only this.

#include "kernel/gdbkernel.h"
#include "kernel/gdblogevent.h"
#include "kernel/lldbkernel.h"
#include "kernel/raclient.h"
#include "mi/gdbcommand.h"
#include "mi/gdboutput.h"
#include "mi/gdbresult.h"
#include "platform/hostfiles.h"
#include "platform/hostprocess.h"
#include "platform/hostthread.h"
#include "platform/textencoding.h"
#include "platform/types.h"
#include "process/gdbinterfaces.h"
