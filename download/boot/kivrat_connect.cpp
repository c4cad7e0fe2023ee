// The hello exchange of the boot transfer, with the reading of the chip identity.
#include <algorithm>
#include <array>

#include "download/boot/kivrat.h"
#include "download/boot/kivrat_packet.h"

namespace kral::kivrat {
namespace {

using Hello = std::array<uint8_t, kHelloSize>;

constexpr const char* kReadFailed = "Failed to read the Port buffer\n";

class Greeter {
 public:
  Greeter(Diag_FTM& phone, const Stop& stop) : phone_(phone), port_(phone) {
    port_.SetReadTimeOut(phone.state<Settings>().read_time_out_ms);
    port_.SetStop(stop);
  }

  bool Connect(uint32_t& version, std::optional<uint32_t>* identity) {
    Hello hello{};
    if (!AwaitFirstHello(hello)) return false;
    const uint32_t told_version = Field(hello, kVersionAt);
    std::optional<uint32_t> told_identity;
    bool in_command_mode = false;
    if (identity != nullptr) {
      if (!ReadIdentity(hello, told_identity)) return false;
      // Nothing to read ends the exchange where it is, without the way back to image transfer: required.
      in_command_mode = !told_identity;
      if (!in_command_mode && !(SwitchToImageTransfer() && ReadHello(hello) == Heard::kHello)) return false;
    }
    if (!in_command_mode && !Respond(hello, Field(hello, kModeAt))) return false;
    version = told_version;
    if (identity != nullptr) *identity = told_identity;
    port_.Keep();
    return true;
  }

 private:
  enum class Heard { kHello, kNothing, kOther };

  // The line of the log, and what callers are told.
  bool Fail(const char* text, const Failure& failure) {
    phone_.log().WriteLine(kLogErr, "%s", text);
    return kral::Fail(failure);
  }
  bool ReadWhole(std::span<uint8_t> packet, const char* what) {
    const size_t count = port_.Read(packet);
    return count == packet.size() || Fail(kReadFailed, port_.NotRead(what, count, packet.size()));
  }

  // Silence, and a port that is not there (yet), are all that the retries are for.
  bool AwaitFirstHello(Hello& hello) {
    for (uint32_t retries = phone_.state<Settings>().hello_retries;; --retries) {
      const Heard heard = port_.Open() ? ReadHello(hello) : Heard::kNothing;
      if (heard == Heard::kHello) return true;
      if (!phone_.port_borrowed()) Fail("Failed KivratInit()", port_.NotOpened());
      if (heard == Heard::kOther || retries == 0 || port_.stopped()) return false;
      if (port_.gone()) port_.GiveBack();  // it may come back as another device
      port_.Pause(phone_.state<Settings>().retry_delay_ms);
    }
  }

  Heard ReadHello(Hello& hello) {
    const size_t count = port_.Read(hello);
    if (count != hello.size()) {
      Fail(kReadFailed, port_.NotRead("the hello of the boot loader", count, hello.size()));
      return count == 0 ? Heard::kNothing : Heard::kOther;
    }
    if (!IsPacket(hello, kHello)) {
      Fail("The packet recieved from the device is not a HELLO_REQ", OtherPacket(hello, "a hello"));
      return Heard::kOther;
    }
    phone_.log().WriteLine(kLogRet, "Kivrat Hello recieved from the device\n");
    return Heard::kHello;
  }

  // The hello comes back as it was, but for command, status and mode.
  bool Respond(Hello hello, uint32_t mode) {
    StoreLe<uint32_t>(hello, kCommandAt, kHelloResponse);
    StoreLe<uint32_t>(hello, kStatusAt, 0);
    StoreLe<uint32_t>(hello, kModeAt, mode);
    if (!port_.Write(hello)) {
      return Fail("Failed to write to the KIVRAT_HELLO_RSP from the host to the Device",
                  port_.NotWritten("the answer to the hello"));
    }
    phone_.log().WriteLine(kLogRet, "Kivrat Hello Response sent to the device\n");
    return true;
  }

  bool ReadIdentity(const Hello& hello, std::optional<uint32_t>& identity) {
    if (!Respond(hello, kModeCommand)) return false;
    std::array<uint8_t, kHeaderSize> ready{};
    const bool read = ReadWhole(ready, "the readiness for commands");
    if (!read || !IsPacket(ready, kCommandReady)) {
      if (read) kral::Fail(OtherPacket(ready, "its readiness for commands"));
      phone_.log().WriteLine(kLogErr, "%s", "The command mode is not ready \r \n");
      return false;
    }

    if (!WritePacket(port_, kExecute, kReadChipIdentity)) {
      return Fail("Failed to write the Kivrat command execute", port_.NotWritten("the request for the chip identity"));
    }
    phone_.log().WriteLine(kLogRet, "Kivrat command execute sent to the device\n");
    std::array<uint8_t, kExecuteResponseSize> response{};
    if (!ReadWhole(response, "the response to the request for the chip identity")) return false;
    if (!IsPacket(response, kExecuteResponse)) {
      return Fail("The packet received from the device is not an execute response",
                  OtherPacket(response, "an execute response"));
    }
    const size_t length = Field(response, kDataLengthAt);
    if (length == 0) return true;

    if (!WritePacket(port_, kExecuteData, kReadChipIdentity)) {
      return Fail("Failed to write the Kivrat execute data", port_.NotWritten("the request for the identity's data"));
    }
    // One read, whatever length was told: that tells only how much is worth waiting for.
    std::array<uint8_t, kMostIdentityData> data{};
    const size_t enough = std::clamp(length, kIdentityAt + sizeof(uint32_t), data.size());
    const auto told = std::span(data).first(port_.Read(data, enough));
    identity = LoadLe<uint32_t>(told, kIdentityAt);
    if (!identity) return Fail(kReadFailed, port_.NotRead("the chip identity", told.size(), enough));
    phone_.log().WriteLine(kLogRet, "BXC ID read from PBL: %d \r \n", static_cast<int>(*identity));
    if (length > data.size()) PassOver(length - data.size());
    return true;
  }

  // What is left of the identity's data would stand in front of the hello, also when it is still on its way.
  void PassOver(size_t rest) {
    Clock& clock = phone_.clock();
    const uint32_t start = clock.TickMs();
    std::array<uint8_t, 1024> waste{};
    while (rest > 0 && clock.TickMs() - start < phone_.state<Settings>().read_time_out_ms) {
      const auto piece = std::span(waste).first(std::min(rest, waste.size()));
      if (port_.Read(piece) != piece.size()) return;
      rest -= piece.size();
    }
    port_.Purge();
  }

  bool SwitchToImageTransfer() {
    if (!WritePacket(port_, kSwitchMode, kModeImageTransfer)) {
      return Fail("Failed to write the Kivrat switch mode", port_.NotWritten("the switch to the image transfer"));
    }
    phone_.log().WriteLine(kLogRet, "Kivrat swtich mode sent to the device\n");
    return true;
  }

  Diag_FTM& phone_;
  RawPort port_;
};

}  // namespace

bool Connect(Diag_FTM& phone, uint32_t& version, std::optional<uint32_t>* identity, const Stop& stop) {
  return Greeter(phone, stop).Connect(version, identity);
}

}  // namespace kral::kivrat
