// A machine whose COM ports have virtual handsets on them, or nothing. One at a time; at its end every handle is
// released.
#ifndef KRAL_TESTS_SUPPORT_HANDSET_PORTS_H
#define KRAL_TESTS_SUPPORT_HANDSET_PORTS_H

#include <atomic>
#include <functional>
#include <set>

#include "frame/resource_manager.h"
#include "handset/virtual_handset.h"
#include "kral/connection.h"
#include "tests/support/fake_device.h"
#include "tests/support/test.h"

namespace kral::test {

class HandsetPorts {
 public:
  HandsetPorts() {
    Kral_ResourceManager::SetDeviceOpener(
        [state = state_](int number, DeviceResult& result) { return Open(state, number, result); });
    Kral_ResourceManager::SetPortLister([state = state_](std::vector<uint16_t>& ports) {
      const std::lock_guard lock(state->mutex);
      ports = state->listed;
      return state->can_list;
    });
  }
  ~HandsetPorts() {
    KRAL_DisconnectAllServers();
    Kral_ResourceManager::SetDeviceOpener({});
    Kral_ResourceManager::SetPortLister({});
  }
  HandsetPorts(const HandsetPorts&) = delete;
  HandsetPorts& operator=(const HandsetPorts&) = delete;

  // A handset on the port; it is listed behind those that are already there.
  handset::VirtualHandset& Add(uint16_t port) {
    const std::lock_guard lock(state_->mutex);
    state_->listed.push_back(port);
    return *(state_->handsets[port] = std::make_shared<handset::VirtualHandset>());
  }
  // A port that is listed and cannot be opened.
  void AddDead(uint16_t port) {
    const std::lock_guard lock(state_->mutex);
    state_->listed.push_back(port);
  }
  void Remove(uint16_t port) {
    const std::lock_guard lock(state_->mutex);
    state_->handsets.erase(port);
  }
  // Another program has the port from now on.
  void Occupy(uint16_t port) {
    const std::lock_guard lock(state_->mutex);
    state_->open.insert(port);
  }
  // Called before a port is opened: who plugs in there comes back with the first try.
  void SetBeforeOpen(std::function<void(uint16_t port)> call) {
    const std::lock_guard lock(state_->mutex);
    state_->before_open = std::move(call);
  }
  // Devices are known to be gone only once they have been used, as real ones are.
  void TellLate() { state_->tells_late = true; }
  void SetCanList(bool can) {
    const std::lock_guard lock(state_->mutex);
    state_->can_list = can;
  }

  // Ports that were tried, in order, and those that are open.
  std::vector<uint16_t> opens() const {
    const std::lock_guard lock(state_->mutex);
    return state_->opens;
  }
  bool IsOpen(uint16_t port) const {
    const std::lock_guard lock(state_->mutex);
    return state_->open.count(port) != 0;
  }
  std::set<uint16_t> open() const {
    const std::lock_guard lock(state_->mutex);
    return state_->open;
  }

 private:
  struct State {
    std::mutex mutex;
    std::map<uint16_t, std::shared_ptr<handset::VirtualHandset>> handsets;
    std::vector<uint16_t> listed;
    bool can_list = true;
    std::vector<uint16_t> opens;
    std::set<uint16_t> open;
    std::function<void(uint16_t)> before_open;
    std::atomic<bool> tells_late = false;
  };

  class Device final : public FakeDevice {
   public:
    Device(std::shared_ptr<State> state, std::shared_ptr<handset::VirtualHandset> handset, uint16_t port)
        : state_(std::move(state)), handset_(std::move(handset)), appearance_(handset_->appearances()), port_(port) {}
    ~Device() override {
      const std::lock_guard lock(state_->mutex);
      state_->open.erase(port_);
    }
    size_t Write(std::span<const uint8_t> bytes, uint32_t) override {
      return !HasLost() && handset_->FromHost(bytes) ? bytes.size() : 0;
    }
    size_t Read(std::span<uint8_t> buffer) override { return HasLost() ? 0 : handset_->ToHost(buffer); }
    bool gone() const override { return state_->tells_late ? gone_.load() : IsElsewhere(); }
    // In slices: unlike a real one, the handset does not tell this of its going.
    bool WaitReadable(uint32_t milliseconds) override {
      const bool readable = handset_->WaitForOutput(std::min(milliseconds, 20u));
      return !HasLost() && readable;
    }
    void Wake() override { handset_->Wake(); }
    void PurgeInput() override { handset_->DropOutput(); }

   private:
    bool IsElsewhere() const { return handset_->vanished() || handset_->appearances() != appearance_; }
    bool HasLost() {
      gone_ = gone_ || (state_->tells_late && IsElsewhere());
      return gone_;
    }

    const std::shared_ptr<State> state_;
    const std::shared_ptr<handset::VirtualHandset> handset_;
    const uint32_t appearance_;
    const uint16_t port_;
    std::atomic<bool> gone_ = false;
  };

  static std::unique_ptr<SerialDevice> Open(const std::shared_ptr<State>& state, int number, DeviceResult& result) {
    const auto port = static_cast<uint16_t>(number);
    const std::lock_guard lock(state->mutex);
    if (state->before_open) state->before_open(port);
    state->opens.push_back(port);
    const auto found = state->handsets.find(port);
    if (found == state->handsets.end()) {
      result = {DeviceError::kNoSuchPort, 2, "no such port"};
      return nullptr;
    }
    if (!state->open.insert(port).second) {
      result = {DeviceError::kBusy, 16, "busy"};
      return nullptr;
    }
    return std::make_unique<Device>(state, found->second, port);
  }

  std::shared_ptr<State> state_ = std::make_shared<State>();
};

}  // namespace kral::test

#endif
