// The far side of a port for tests of the engine: takes what the host writes, and gives what the test or its responder
// puts there. Reached as a serial device or as a caller's transport.
#ifndef KRAL_TESTS_SUPPORT_TEST_WIRE_H
#define KRAL_TESTS_SUPPORT_TEST_WIRE_H

#include <condition_variable>
#include <thread>

#include "tests/support/fake_device.h"
#include "tests/support/plain_codec.h"
#include "tests/support/test.h"
#include "transport/line/serial_port.h"

namespace kral::test {

class TestWire {
 public:
  using Responder = std::function<Bytes(const Bytes& written)>;  // what comes back for one write

  // --- The test's side ----------------------------------------------------------------------------------------------
  void OnWrite(Responder responder) {
    const std::lock_guard lock(mutex_);
    responder_ = std::move(responder);
  }
  // Each element is read at once, as one chunk.
  void ToHost(const Bytes& chunk) {
    const std::lock_guard lock(mutex_);
    if (!chunk.empty()) chunks_.push_back(chunk);
    changed_.notify_all();
  }
  std::vector<Bytes> Written() const {
    const std::lock_guard lock(mutex_);
    return written_;
  }
  // The receive function does not come back until it is let go.
  void HoldReceive(bool hold) {
    const std::lock_guard lock(mutex_);
    hold_ = hold;
    changed_.notify_all();
  }
  bool WaitUntilHeld() {
    std::unique_lock lock(mutex_);
    return changed_.wait_for(lock, std::chrono::seconds(5), [this] { return holding_; });
  }
  void FailWrites(bool fail) { fail_writes_ = fail; }
  void Vanish(bool vanished) {
    vanished_ = vanished;
    Wake();
  }
  uint64_t reads() const { return reads_; }
  std::thread::id last_reader() const { return last_reader_; }
  int opened() const { return opened_; }

  // --- The host's side ----------------------------------------------------------------------------------------------
  UserTransport AsUserTransport() {
    return {0x77, reinterpret_cast<uintptr_t>(this), &TestWire::UserSend, &TestWire::UserReceive, &TestWire::UserFlush};
  }
  DeviceOpener AsDevice() {
    return [this](int, DeviceResult&) {
      ++opened_;
      return std::make_unique<Device>(*this);
    };
  }

 private:
  class Device final : public FakeDevice {
   public:
    explicit Device(TestWire& wire) : wire_(wire) {}
    size_t Write(std::span<const uint8_t> bytes, uint32_t) override { return wire_.Write(bytes); }
    size_t Read(std::span<uint8_t> buffer) override { return wire_.Read(buffer); }
    bool HasInput() override { return wire_.HasInput(); }
    bool gone() const override { return wire_.vanished_; }
    bool WaitReadable(uint32_t milliseconds) override { return wire_.WaitReadable(milliseconds); }
    void Wake() override { wire_.Wake(); }
    void PurgeInput() override { wire_.Purge(); }

   private:
    TestWire& wire_;
  };

  size_t Write(std::span<const uint8_t> bytes) {
    if (fail_writes_ || vanished_) return 0;
    const Bytes written(bytes.begin(), bytes.end());
    Responder responder;
    {
      const std::lock_guard lock(mutex_);
      written_.push_back(written);
      responder = responder_;
    }
    if (responder) ToHost(responder(written));
    return bytes.size();
  }

  size_t Read(std::span<uint8_t> buffer) {
    ++reads_;
    last_reader_ = std::this_thread::get_id();
    std::unique_lock lock(mutex_);
    holding_ = hold_;
    changed_.notify_all();
    changed_.wait(lock, [this] { return !hold_; });
    holding_ = false;
    if (chunks_.empty() || vanished_) return 0;
    Bytes& chunk = chunks_.front();
    const size_t count = std::min(chunk.size(), buffer.size());
    std::copy_n(chunk.begin(), count, buffer.begin());
    chunk.erase(chunk.begin(), chunk.begin() + static_cast<std::ptrdiff_t>(count));
    if (chunk.empty()) chunks_.pop_front();
    return count;
  }

  bool WaitReadable(uint32_t milliseconds) {
    std::unique_lock lock(mutex_);
    changed_.wait_for(lock, std::chrono::milliseconds(milliseconds), [this] { return wake_ || !chunks_.empty(); });
    wake_ = false;
    return !chunks_.empty();
  }

  bool HasInput() {
    const std::lock_guard lock(mutex_);
    return !chunks_.empty();
  }

  void Wake() {
    const std::lock_guard lock(mutex_);
    wake_ = true;
    changed_.notify_all();
  }

  void Purge() {
    const std::lock_guard lock(mutex_);
    chunks_.clear();
  }

  static TestWire& Of(uintptr_t context) { return *reinterpret_cast<TestWire*>(context); }
  static uint32_t UserSend(uintptr_t context, uintptr_t, uint32_t count, const uint8_t* data, uint32_t* written) {
    *written = static_cast<uint32_t>(Of(context).Write({data, count}));
    return 0;
  }
  static uint32_t UserReceive(uintptr_t context, uintptr_t, uint32_t* count, uint8_t* buffer) {
    *count = static_cast<uint32_t>(Of(context).Read({buffer, *count}));
    return 0;
  }
  static uint32_t UserFlush(uintptr_t context, uintptr_t) {
    Of(context).Purge();
    return 0;
  }

  mutable std::mutex mutex_;
  std::condition_variable changed_;
  Responder responder_;
  std::vector<Bytes> written_;
  std::deque<Bytes> chunks_;
  bool hold_ = false;
  bool holding_ = false;
  bool wake_ = false;
  std::atomic<bool> fail_writes_{false};
  std::atomic<bool> vanished_{false};
  std::atomic<uint64_t> reads_{0};
  std::atomic<std::thread::id> last_reader_{};
  std::atomic<int> opened_{0};
};

}  // namespace kral::test

namespace kral {

using test::TestWire;

}  // namespace kral

#endif
