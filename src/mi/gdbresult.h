#pragma once
/// \file
/// What the debugger's replies are decoded into, and the fixed register name
/// tables of the register views.

#include <array>
#include <string_view>

namespace midebug {

// Register name tables. The register views show these registers, in this
// order; a register-write command names a register by its position here. The
// names are compared with the debugger's own register names exactly.

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

} // namespace midebug
