/* A program whose runtime tells its debugger of exceptions the way the
   notifier functions do: kind, object, name, address and a fallback address
   used when the address is zero. The Pascal notifier takes a length-prefixed
   name. */
#include <stdint.h>

struct error { int code; } oops = {7};

__attribute__((noinline)) void _CPPDbgExcNotify(int kind, void* object, const char* name, void* address,
                                                void* fallback) {
  __asm__ volatile("" : : "r"(kind), "r"(object), "r"(name), "r"(address), "r"(fallback) : "memory");
}

__attribute__((noinline)) void _DbgExcNotify(int kind, void* object, const char* name, void* address,
                                             void* fallback) {
  __asm__ volatile("" : : "r"(kind), "r"(object), "r"(name), "r"(address), "r"(fallback) : "memory");
}

int main(void) {
  _CPPDbgExcNotify(3, &oops, "ETooBig", 0, (void*)(uintptr_t)0x1234);
  _DbgExcNotify(5, &oops, "\x06" "EPasky", (void*)(uintptr_t)0x5678, 0);
  return 0;
}
