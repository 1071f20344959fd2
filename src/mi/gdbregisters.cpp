#include "mi/gdbregisters.h"

#include <algorithm>
#include <cstddef>
#include <stdexcept>
#include <string>

namespace midebug {

const std::array<std::string_view, 16> IA32Registers = {
    "eax", "ebx", "ecx", "edx", "esi", "edi", "ebp", "esp",
    "eip", "eflags", "cs", "ss", "ds", "es", "gs", "fs",
};

const std::array<std::string_view, 24> AMD64Registers = {
    "rax", "rbx", "rcx", "rdx", "rsi", "rdi", "r8", "r9", "r10", "r11", "r12", "r13",
    "r14", "r15", "rbp", "rsp", "rip", "rflags", "cs", "ss", "ds", "es", "gs", "fs",
};

const std::array<std::string_view, 24> winAMD64Registers = {
    "rax", "rbx", "rcx", "rdx", "rsi", "rdi", "r8", "r9", "r10", "r11", "r12", "r13",
    "r14", "r15", "rbp", "rsp", "rip", "eflags", "cs", "ss", "ds", "es", "gs", "fs",
};

const std::array<std::string_view, 17> ARM32Registers = {
    "r0", "r1", "r2", "r3", "r4", "r5", "r6", "r7", "r8",
    "r9", "r10", "r11", "r12", "sp", "lr", "pc", "cpsr",
};

const std::array<std::string_view, 34> ARM64Registers = {
    "x0",  "x1",  "x2",  "x3",  "x4",  "x5",  "x6",  "x7",  "x8",  "x9",  "x10", "x11",
    "x12", "x13", "x14", "x15", "x16", "x17", "x18", "x19", "x20", "x21", "x22", "x23",
    "x24", "x25", "x26", "x27", "x28", "fp",  "lr",  "sp",  "pc",  "cpsr",
};

const std::array<std::string_view, 16> AMD64FPURegisters = {
    "st0",   "st1",   "st2",   "st3",   "st4",   "st5",   "st6",   "st7",
    "fctrl", "fstat", "ftag",  "fiseg", "fioff", "foseg", "fooff", "fop",
};

const std::array<std::string_view, 16> macAMD64FPURegisters = {
    "stmm0", "stmm1", "stmm2", "stmm3", "stmm4", "stmm5", "stmm6", "stmm7",
    "fctrl", "fstat", "ftag",  "fiseg", "fioff", "foseg", "fooff", "fop",
};

const std::array<std::string_view, 17> AMD64XMMRegisters = {
    "xmm0", "xmm1", "xmm2",  "xmm3",  "xmm4",  "xmm5",  "xmm6",  "xmm7",  "xmm8",
    "xmm9", "xmm10", "xmm11", "xmm12", "xmm13", "xmm14", "xmm15", "mxcsr",
};

namespace {

// Platform names that change the register names of an AMD64 target.
constexpr std::string_view PlatformWin64 = "Win64";
constexpr std::string_view PlatformOSX64 = "OSX64";

/// The other name of the x86-64 flags register. GDB calls it eflags on
/// every platform, LLDB rflags except on Windows; without the alias the flags
/// entry would show register 0 (rax) under GDB on Linux.
std::string_view FlagsRegisterAlias(std::string_view Name) {
  if (Name == "rflags")
    return "eflags";
  if (Name == "eflags")
    return "rflags";
  return {};
}

} // namespace

std::string_view TRegisterTable::At(Integer Id) const {
  if (Id < 0 || static_cast<std::size_t>(Id) >= Registers.size())
    throw std::out_of_range("register id " + std::to_string(Id) + " is outside " + std::string(Name) + " (" +
                            std::to_string(Registers.size()) + " entries)");
  return Registers[static_cast<std::size_t>(Id)];
}

TRegisterTable GeneralRegisterTable(TGDBCPU CPU, std::string_view Platform) {
  switch (CPU) {
  case gcIA32:
    return {"IA32Registers", IA32Registers};
  case gcARM32:
    return {"ARM32Registers", ARM32Registers};
  case gcARM64:
    return {"ARM64Registers", ARM64Registers};
  case gcAMD64:
    if (Platform == PlatformWin64)
      return {"winAMD64Registers", winAMD64Registers};
    return {"AMD64Registers", AMD64Registers};
  }
  return {"no register table", {}};
}

TRegisterTable FPURegisterTable(std::string_view Platform) {
  if (Platform == PlatformOSX64)
    return {"macAMD64FPURegisters", macAMD64FPURegisters};
  return {"AMD64FPURegisters", AMD64FPURegisters};
}

TRegisterTable XMMRegisterTable() { return {"AMD64XMMRegisters", AMD64XMMRegisters}; }

TIntegerArray MapRegisterIds(const TStringArray& Table, const TStringArray& DebuggerNames) {
  // Debuggers list the registers mostly in table order with others between
  // them: try the place after the last match first, then search from the
  // start for any other order.
  TIntegerArray Ids(Table.size(), 0);
  std::size_t Cursor = 0;
  for (std::size_t Entry = 0; Entry < Table.size(); ++Entry) {
    if (Cursor < DebuggerNames.size() && DebuggerNames[Cursor] == Table[Entry]) {
      Ids[Entry] = static_cast<Integer>(Cursor);
      ++Cursor;
      continue;
    }
    auto Found = std::find(DebuggerNames.begin(), DebuggerNames.end(), Table[Entry]);
    if (Found == DebuggerNames.end()) {
      const std::string_view Alias = FlagsRegisterAlias(Table[Entry]);
      if (!Alias.empty())
        Found = std::find(DebuggerNames.begin(), DebuggerNames.end(), Alias);
    }
    if (Found == DebuggerNames.end())
      continue;
    const auto Position = static_cast<std::size_t>(Found - DebuggerNames.begin());
    Ids[Entry] = static_cast<Integer>(Position);
    Cursor = Position + 1;
  }
  return Ids;
}

} // namespace midebug
