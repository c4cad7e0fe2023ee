// A connection as a phone object holds it, without the phone object.
#ifndef KRAL_TESTS_SUPPORT_ENGINE_BUNDLE_H
#define KRAL_TESTS_SUPPORT_ENGINE_BUNDLE_H

#include "tests/support/log_lines.h"
#include "tests/support/test.h"
#include "transport/collection/kral_event_listener.h"
#include "transport/engine/kral_events.h"
#include "transport/engine/kral_thread_interface.h"

namespace kral::test {

struct EngineBundle : std::enable_shared_from_this<EngineBundle> {
  static std::shared_ptr<EngineBundle> Make(DeviceOpener opener = {}, Clock& clock = SystemClock(),
                                            uint32_t log_flags = 0xFFFFFFFF) {
    auto bundle = std::make_shared<EngineBundle>(std::move(opener), clock, log_flags);
    bundle->dispatcher.RegisterListener(&bundle->sorter, nullptr, bundle);
    bundle->transport.Attach(&bundle->dispatcher, &bundle->responses, &bundle->sorter);
    return bundle;
  }

  EngineBundle(DeviceOpener opener, Clock& clock, uint32_t log_flags)
      : log(log_flags), transport(*log.log(), clock, std::move(opener)) {}

  bool OpenDevice() { return transport.Open(7, {}, shared_from_this()); }
  bool OpenUser(const UserTransport& user) { return transport.Open(7, user, shared_from_this()); }
  bool Shut() {
    const bool stopped = transport.StopThread();
    return dispatcher.Stop() && stopped;
  }

  // First, so that it goes last: when it has gone, every thread of the bundle has been joined or parked.
  std::shared_ptr<bool> presence = std::make_shared<bool>();
  LogLines log;
  PacketQueue responses;
  PacketQueue asynchronous;
  BoundedQueue<EventRecord> events;
  CKralEventListener sorter{responses, asynchronous, events, *log.log()};
  CKralEvents dispatcher;
  CKralThreadInterface transport;
};

template <class Condition>
bool Eventually(Condition condition, std::chrono::milliseconds limit = std::chrono::seconds(60)) {
  const auto deadline = std::chrono::steady_clock::now() + limit;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(1));
  }
  return true;
}

// Ends the threads with the test, whatever its outcome. On a busy machine that takes longer than a stop may wait: what
// the threads use of the test must not go before they have.
class EngineGuard {
 public:
  explicit EngineGuard(std::shared_ptr<EngineBundle> bundle) : bundle_(std::move(bundle)) {}
  ~EngineGuard() {
    EXPECT_TRUE(Eventually([this] { return bundle_->Shut(); }, std::chrono::seconds(60)));
  }
  EngineGuard(const EngineGuard&) = delete;
  EngineGuard& operator=(const EngineGuard&) = delete;
  EngineBundle* operator->() const { return bundle_.get(); }

 private:
  std::shared_ptr<EngineBundle> bundle_;
};

}  // namespace kral::test

namespace kral {

using test::EngineBundle;
using test::EngineGuard;
using test::Eventually;

}  // namespace kral

#endif
