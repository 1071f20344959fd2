#include "mi/gdbresult.h"

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

} // namespace midebug
