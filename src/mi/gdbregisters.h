#pragma once
/// \file
/// The fixed register name tables of the register views, the choice of table
/// for a CPU and platform, and the mapping of a table onto the debugger's own
/// register numbers. The views show these registers in this order, and a
/// register-write command names a register by its position here. The names
/// are compared with the debugger's own register names exactly.

#include "mi/gdbcommand.h"
#include "platform/types.h"

#include <array>
#include <span>
#include <string_view>

namespace midebug {

extern const std::array<std::string_view, 16> IA32Registers;
extern const std::array<std::string_view, 24> AMD64Registers;
/// As AMD64Registers, but Windows debuggers call the flags register eflags.
extern const std::array<std::string_view, 24> winAMD64Registers;
extern const std::array<std::string_view, 17> ARM32Registers;
extern const std::array<std::string_view, 34> ARM64Registers;
extern const std::array<std::string_view, 16> AMD64FPURegisters;
/// As AMD64FPURegisters, but the macOS debugger calls the x87 stack stmm0 to
/// stmm7.
extern const std::array<std::string_view, 16> macAMD64FPURegisters;
extern const std::array<std::string_view, 17> AMD64XMMRegisters;

/// One of the tables above, with the name it goes by in error messages.
struct TRegisterTable {
  std::string_view Name;
  std::span<const std::string_view> Registers;

  /// Entry Id. An id outside the table is the caller's error: throws
  /// std::out_of_range naming the table and the id rather than read past
  /// its end.
  std::string_view At(Integer Id) const;
  TStringArray Copy() const { return TStringArray(Registers.begin(), Registers.end()); }
};

/// The general registers shown for CPU. Only the plain "Win64" platform's
/// debugger says eflags on AMD64; "Win64x" targets are debugged by an LLDB
/// that says rflags.
TRegisterTable GeneralRegisterTable(TGDBCPU CPU, std::string_view Platform);
/// The x87 registers of AMD64; "OSX64" names the stack stmm0 to stmm7.
TRegisterTable FPURegisterTable(std::string_view Platform);
TRegisterTable XMMRegisterTable();

/// The debugger's register number of each entry of Table, found by name in
/// DebuggerNames (the debugger's names in its numbering); 0 for a name the
/// debugger did not list.
TIntegerArray MapRegisterIds(const TStringArray& Table, const TStringArray& DebuggerNames);

} // namespace midebug
