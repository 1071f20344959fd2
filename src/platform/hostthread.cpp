#include "platform/hostthread.h"

#include <chrono>
#include <pthread.h>
#include <thread>

namespace midebug {

void SetCurrentThreadName(const std::string& Name) {
  constexpr size_t MaxNameBytes = 15;
  pthread_setname_np(pthread_self(), Name.substr(0, MaxNameBytes).c_str());
}

void YieldAndSleep(int Milliseconds) {
  std::this_thread::yield();
  std::this_thread::sleep_for(std::chrono::milliseconds(Milliseconds));
}

} // namespace midebug
