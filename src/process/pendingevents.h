#pragma once
/// \file
/// Events raised on the output thread, stacked until a delivery on the IDE's
/// main thread tells them: one delivery empties the stack, so a burst of
/// events costs one trip to the main thread.

#include <mutex>
#include <stack>

namespace midebug {

/// One kind of pending event. FLock is a leaf lock, held for one push or pop.
template <class T>
class TPendingEvents {
public:
  /// Stacks Event. True when the caller is to queue the delivery that will
  /// empty the stack: Schedule asks for one and none is queued yet.
  bool Push(const T& Event, bool Schedule = true) {
    std::lock_guard Guard(FLock);
    FEvents.push(Event);
    if (!Schedule || FDeliveryQueued)
      return false;
    FDeliveryQueued = true;
    return true;
  }

  /// Stacks Event and, when Push says so, has Defer queue the delivery that
  /// tells Tell of the stack.
  template <class TDefer, class TTell>
  void Raise(const T& Event, TDefer&& Defer, TTell Tell, bool Schedule = true) {
    if (Push(Event, Schedule))
      Defer([this, Tell] { Deliver(Tell); });
  }

  /// The delivery: tells Tell every stacked event, newest first, until none
  /// is left. Events stacked meanwhile are told by the same delivery.
  template <class TTell>
  void Deliver(TTell&& Tell) {
    for (;;) {
      T Event;
      {
        std::lock_guard Guard(FLock);
        if (FEvents.empty()) {
          FDeliveryQueued = false;
          return;
        }
        Event = FEvents.top();
        FEvents.pop();
      }
      Tell(Event);
    }
  }

private:
  std::mutex FLock;
  std::stack<T> FEvents;
  bool FDeliveryQueued = false;
};

} // namespace midebug
