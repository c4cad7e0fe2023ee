// The image transfer of the boot transfer: the file goes out as the target asks for it, then the target is told that
// all is done.
#include <algorithm>
#include <vector>

#include "download/boot/kivrat.h"
#include "download/boot/kivrat_packet.h"
#include "download/link/download_failure.h"
#include "platform/file_util.h"

namespace kral::kivrat {
namespace {

// A target that asks for nothing so often in a row will ask for nothing else.
constexpr uint32_t kMostRequestsForNothing = 100;

class Server {
 public:
  Server(Diag_FTM& phone, const Programmer& programmer, const Progress& progress, const Stop& stop)
      : phone_(phone),
        programmer_(programmer),
        progress_(progress),
        port_(phone),
        packet_(kPacketBuffer),
        piece_(kPacketBuffer) {
    port_.SetReadTimeOut(phone.state<Settings>().read_time_out_ms);
    port_.SetStop(stop);
  }

  bool Run() {
    if (!port_.Open()) return Fail("Failed KivratInit()", port_.NotOpened());
    if (progress_ && !progress_(0, programmer_.size)) return Abort();
    return ServeRequests() && Finish();
  }

 private:
  // The line of the log, and what callers are told.
  bool Fail(const char* text, const Failure& failure) {
    phone_.log().WriteLine(kLogErr, "%s", text);
    return kral::Fail(failure);
  }
  bool Abort() {
    phone_.log().WriteLine(kLogErr, "Kivrat: the transfer was aborted");
    download::Aborted();
    return false;
  }
  bool RefuseLength(uint32_t length) {
    phone_.log().WriteLine(kLogErr, "Kivrat: a packet of %u bytes", length);
    return kral::Fail(Failure(KRAL_ERROR_LINK, "the boot loader sent a packet of %u bytes, as it says", length));
  }

  bool ServeRequests() {
    for (;;) {
      std::span<const uint8_t> packet;
      if (!ReadPacket(packet)) {
        phone_.log().WriteLine(kLogErr, "%s", "Failed to read the command from the opened port \r \n");
        return false;
      }
      const uint32_t command = Field(packet, kCommandAt);
      if (command == kEndOfTransfer) {
        phone_.log().WriteLine(kLogRet, "Kivrat: the target ends the transfer, status %u", Field(packet, kEndStatusAt));
        return true;
      }
      if (command != kReadData) {
        phone_.log().WriteLine(kLogErr, "Recieved %d instead of KIVRAT_END_TRANSFER (command -> %d) \r\n",
                               static_cast<int>(command), static_cast<int>(kEndOfTransfer));
        return kral::Fail(OtherPacket(packet, "a request or the end of the transfer"));
      }
      if (!Serve(packet)) return false;
    }
  }

  // Header first, then as much as it tells.
  bool ReadPacket(std::span<const uint8_t>& packet) {
    const auto header = std::span(packet_).first(kHeaderSize);
    if (!ReadWhole(header, "the next request of the boot loader")) return false;
    const size_t length = Field(header, kLengthAt);
    if (length < kHeaderSize || length > packet_.size()) return RefuseLength(Field(header, kLengthAt));
    packet = std::span(packet_).first(length);
    return ReadWhole(std::span(packet_).subspan(kHeaderSize, length - kHeaderSize), "a request of the boot loader");
  }

  bool ReadWhole(std::span<uint8_t> bytes, const char* what) {
    const size_t count = port_.Read(bytes);
    return count == bytes.size() || kral::Fail(port_.NotRead(what, count, bytes.size()));
  }

  // The next bytes of the file, whatever offset the target names: it asks for consecutive pieces, and those that do
  // not are served in order all the same.
  bool Serve(std::span<const uint8_t> request) {
    const size_t length = Field(request, kReadLengthAt);
    if (request.size() < kReadDataSize || length > piece_.size()) {
      phone_.log().WriteLine(kLogErr, "Kivrat: a request for %u bytes", Field(request, kReadLengthAt));
      return kral::Fail(Failure(KRAL_ERROR_LINK, "the boot loader asks for %u bytes at once in %zu bytes",
                                Field(request, kReadLengthAt), request.size()));
    }
    if (length == 0) return ServeNothing();
    requests_for_nothing_ = 0;
    size_t count = 0;
    const auto error = programmer_.read(served_, std::span(piece_).first(length), count);
    if (error || count == 0) {
      phone_.log().WriteLine(kLogErr, "Kivrat: the file has no more than %llu bytes, %u are asked for at %u",
                             static_cast<unsigned long long>(served_), Field(request, kReadLengthAt),
                             Field(request, kReadOffsetAt));
      const auto served = static_cast<unsigned long long>(served_);
      Failure failure(KRAL_ERROR_BAD_FILE, "the flash programmer ends after %llu bytes, and the boot loader wants more",
                      served);
      return kral::Fail(failure.System(error).Offset(served_));
    }
    if (!port_.Write(std::span(piece_).first(count))) {
      return Fail("Failed to send the command from the host to the device \r \n",
                  port_.NotWritten("a piece of the flash programmer").Offset(served_));
    }
    served_ += count;
    return GoesOn();
  }

  bool ServeNothing() {
    if (++requests_for_nothing_ < kMostRequestsForNothing) return GoesOn();
    phone_.log().WriteLine(kLogErr, "Kivrat: a request for 0 bytes, and %u before it", requests_for_nothing_ - 1);
    return kral::Fail(
        Failure(KRAL_ERROR_LINK, "the boot loader asks for nothing, %u times in a row", requests_for_nothing_));
  }

  bool GoesOn() { return !progress_ || progress_(served_, std::max(served_, programmer_.size)) || Abort(); }

  bool Finish() {
    if (const uint32_t delay = phone_.state<Settings>().pre_done_delay_ms) {
      phone_.log().WriteLine(kLogRet, "Waiting %d ms before Kivrat Done", static_cast<int>(delay));
      port_.Pause(delay);
      if (port_.stopped()) return Abort();
    }
    if (!WritePacket(port_, kDone)) {
      phone_.log().WriteLine(kLogErr, "Failed to send the KIVRAT_DONE_REQ (command -> %d) as expected \r\n",
                             static_cast<int>(kDone));
      return kral::Fail(port_.NotWritten("the end of the transfer"));
    }
    const auto response = std::span(packet_).first(kDoneResponseSize);
    if (!ReadWhole(response, "the answer to the end of the transfer")) {
      phone_.log().WriteLine(kLogErr, "%s", "Failed to recieve the KIVRAT_DONE_RSP as expected \r\n");
      return false;
    }
    if (Field(response, kCommandAt) != kDoneResponse) {
      phone_.log().WriteLine(kLogErr, "Recieved %d instead of KIVRAT_DONE_RSP (command -> %d) \r\n",
                             static_cast<int>(Field(response, kCommandAt)), static_cast<int>(kDoneResponse));
      return kral::Fail(OtherPacket(response, "an answer to the end of the transfer"));
    }
    if (!IsPacket(response, kDoneResponse)) return RefuseLength(Field(response, kLengthAt));
    phone_.log().WriteLine(kLogRet, "Kivrat: image transfer status %u", Field(response, kDoneStatusAt));
    phone_.log().WriteLine(kLogRet, "Flash programmer successfully downloaded using Kivrat Protocol!\n");
    phone_.clock().SleepMs(phone_.state<Settings>().settle_ms);
    return true;
  }

  Diag_FTM& phone_;
  const Programmer& programmer_;
  const Progress& progress_;
  RawPort port_;
  uint64_t served_ = 0;
  uint32_t requests_for_nothing_ = 0;  // in a row
  std::vector<uint8_t> packet_;
  std::vector<uint8_t> piece_;
};

bool NoBootLoader(Diag_FTM& phone) {
  phone.log().WriteLine(kLogErr, "%s", "Failed KivratInit()");
  return kral::Fail(Failure(KRAL_ERROR_ARGUMENT, "no boot loader has been connected to"));
}

}  // namespace

bool DownloadFlashProgrammer(Diag_FTM& phone, const Programmer& programmer, const Progress& progress,
                             const Stop& stop) {
  return phone.port_borrowed() ? Server(phone, programmer, progress, stop).Run() : NoBootLoader(phone);
}

bool DownloadFlashProgrammer(Diag_FTM& phone, const std::string& file_name, const Progress& progress,
                             const Stop& stop) {
  if (!phone.port_borrowed()) return NoBootLoader(phone);
  FileReader file;
  if (const auto error = file.Open(file_name)) {
    phone.log().WriteLine(kLogErr, "Kivrat: the file %s cannot be opened: %s", file_name.c_str(),
                          error.message().c_str());
    // The target knows nothing of it and still waits: for a file of the right name.
    return kral::Fail(FileFailure(file_name, "cannot be opened").System(error));
  }
  // Pieces are asked for in order.
  const Programmer programmer{
      file.size(), [&file](uint64_t, std::span<uint8_t> room, size_t& count) { return file.Read(room, count); }};
  return DownloadFlashProgrammer(phone, programmer, progress, stop);
}

}  // namespace kral::kivrat
