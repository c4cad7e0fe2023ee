// A boot loader that says whatever it likes. The host answers in packets of its protocol only, gives away the file from
// its front and nothing behind its end, keeps the port on success of the hello exchange only, and always ends.
//
// Byte 0: bit 0 asks for the identity, bit 1 has the line give single bytes. Then what the target says: a byte with a
// count in its lower six bits, and so many bytes. Each is said in answer to a write of the host; with bit 6 while the
// host waits, with bit 7 together with the next.
#include <algorithm>
#include <array>
#include <cstdint>
#include <deque>
#include <memory>
#include <span>
#include <string>

#include "download/boot/kivrat.h"
#include "fuzz/support.h"
#include "tests/support/fake_clock.h"
#include "tests/support/fake_device.h"
#include "tests/support/temp_folder.h"

namespace {

using namespace kral;
using fuzz::Bytes;
using fuzz::Require;

constexpr size_t kFileSize = 5000;
constexpr uint8_t kLate = 0x40;
constexpr uint8_t kWithNext = 0x80;
constexpr uint8_t kDone[] = {5, 0, 0, 0, 8, 0, 0, 0};

class LyingLoader {
 public:
  LyingLoader(std::span<const uint8_t> says, bool single_bytes, test::FakeClock& clock)
      : says_(says), single_bytes_(single_bytes), clock_(clock) {}

  DeviceOpener AsDevice() {
    return [this](int, DeviceResult&) { return std::make_unique<Device>(*this); };
  }
  void Say() {
    for (bool more = true; more && !says_.empty();) {
      const size_t count = std::min<size_t>(says_[0] & 0x3F, says_.size() - 1);
      more = (says_[0] & kWithNext) != 0;
      line_.insert(line_.end(), says_.begin() + 1, says_.begin() + 1 + static_cast<std::ptrdiff_t>(count));
      says_ = says_.subspan(1 + count);
    }
  }
  // The writes since the last call, put together.
  Bytes TakeWritten() { return std::exchange(written_, {}); }

 private:
  class Device final : public test::FakeDevice {
   public:
    explicit Device(LyingLoader& loader) : loader_(loader) {}
    size_t Write(std::span<const uint8_t> bytes, uint32_t) override {
      loader_.written_.insert(loader_.written_.end(), bytes.begin(), bytes.end());
      loader_.Say();
      return bytes.size();
    }
    size_t Read(std::span<uint8_t> buffer) override {
      auto& line = loader_.line_;
      const size_t count = std::min({line.size(), buffer.size(), loader_.single_bytes_ ? size_t{1} : line.size()});
      std::copy_n(line.begin(), count, buffer.begin());
      line.erase(line.begin(), line.begin() + static_cast<std::ptrdiff_t>(count));
      return count;
    }
    size_t InputWaiting() override { return loader_.line_.size(); }
    bool WaitReadable(uint32_t milliseconds) override {
      if (loader_.line_.empty() && !loader_.says_.empty() && (loader_.says_[0] & kLate) != 0) loader_.Say();
      if (loader_.line_.empty()) loader_.clock_.Advance(std::max(milliseconds, 1u));
      return !loader_.line_.empty();
    }
    void PurgeInput() override { loader_.line_.clear(); }

   private:
    LyingLoader& loader_;
  };

  std::span<const uint8_t> says_;
  const bool single_bytes_;
  test::FakeClock& clock_;
  std::deque<uint8_t> line_;
  Bytes written_;
};

struct Programmer {
  Programmer() {
    uint32_t state = 1;
    for (char& c : content) c = static_cast<char>((state = state * 1664525 + 1013904223) >> 24);
    file = folder.Add("programmer", content);
  }

  test::TempFolder folder;
  std::string content = std::string(kFileSize, '\0');
  std::string file;
};

// Whole packets, one behind the other, as the host sends them before the image transfer.
void CheckPackets(std::span<const uint8_t> bytes) {
  while (!bytes.empty()) {
    Require(bytes.size() >= 12);
    const uint8_t command = bytes[0];
    Require(command == 2 || command == 12 || command == 13 || command == 15);
    const size_t length = command == 2 ? 48 : 12;
    Require(bytes.size() >= length);
    // A response echoes the length of a hello that was accepted.
    Require(bytes[4] == length && bytes[5] == 0 && bytes[6] == 0 && bytes[7] == 0);
    bytes = bytes.subspan(length);
  }
}

// The front of the file, and behind it at most the packet that ends the transfer.
void CheckServed(const Bytes& bytes, const std::string& content, bool done) {
  size_t served = bytes.size();
  const bool has_end = served >= sizeof(kDone) && std::equal(std::begin(kDone), std::end(kDone), bytes.end() - 8);
  if (has_end) served -= sizeof(kDone);
  Require(has_end || !done);
  Require(served <= content.size());
  Require(std::equal(bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(served), content.begin(),
                     [](uint8_t byte, char c) { return byte == static_cast<uint8_t>(c); }));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  static const Programmer programmer;
  if (size < 1) return 0;
  const bool ask_identity = (data[0] & 1) != 0;
  test::FakeClock clock;
  LyingLoader loader({data + 1, size - 1}, (data[0] & 2) != 0, clock);
  Diag_FTM phone(1, clock, loader.AsDevice());
  Require(phone.BorrowPort() != nullptr);
  loader.Say();
  uint32_t version = 0;
  std::optional<uint32_t> identity;
  const bool connected = kivrat::Connect(phone, version, ask_identity ? &identity : nullptr);
  Require(connected == phone.port_borrowed());
  Require(ask_identity || !identity);
  CheckPackets(loader.TakeWritten());
  if (!connected) return 0;

  uint64_t told = 0;
  const bool done = kivrat::DownloadFlashProgrammer(phone, programmer.file, [&told](uint64_t served, uint64_t total) {
    Require(served >= told && served <= total && total == kFileSize);
    told = served;
    return true;
  });
  Require(!phone.port_borrowed());
  CheckServed(loader.TakeWritten(), programmer.content, done);
  return 0;
}
