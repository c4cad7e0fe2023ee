// What the download protocols need of a connection: framed exchanges with a leading flag, writes without a reply, and
// the caller's progress and abort.
#ifndef KRAL_DOWNLOAD_LINK_DOWNLOAD_CONNECTION_H
#define KRAL_DOWNLOAD_LINK_DOWNLOAD_CONNECTION_H

#include <algorithm>
#include <cstdint>
#include <memory>
#include <span>
#include <vector>

#include "download/link/download_settings.h"
#include "frame/diag_ftm.h"

namespace kral::download {

// For the length of one operation, under the phone object's request lock.
class DownloadConnection {
 public:
  explicit DownloadConnection(Diag_FTM& phone) : phone_(phone) {}

  // One request and its reply, whose bytes last until the next.
  Reply Exchange(std::span<const uint8_t> request, uint8_t expected_code, uint32_t time_out_ms);

  // Replies to these come up in responses().
  Reply WriteHDLCNoRead(std::span<const uint8_t> request, uint32_t time_out_ms);

  // Waits for a further reply to the request of the last exchange.
  Reply AwaitReply(uint8_t expected_code, uint32_t time_out_ms);
  // Where the device has gone: takes the one that is there now, if there is one.
  void TakeWhoIsThere() { phone_.IsPortOpen(); }
  // What has come and is coming in at this moment answers nothing that is still to be sent.
  void ForgetReplies() { phone_.transport().ForgetReplies(); }

  uint32_t time_out_ms() const { return phone_.TimeOut(kTimeOutDefaultCommand); }
  uint32_t acknowledge_ms() const { return std::min(time_out_ms(), phone_.state<Settings>().acknowledge_limit_ms); }
  DataLogFileHandler& log() { return phone_.log(); }
  PacketQueue& responses() { return phone_.responses(); }
  Clock& clock() { return phone_.clock(); }
  // Keeps log and queues for a thread that may outlive the operation.
  std::shared_ptr<void> KeepParts() { return phone_.KeepParts(); }

  // --- The caller ---
  void BeginWork();  // forgets an abort that came before
  bool aborted() const { return phone_.state<Settings>().abort; }
  bool Pause(uint32_t milliseconds);  // false when an abort ended it
  // Tells the caller, on the caller's own thread. Nothing for a figure that was told already.
  void Report(uint32_t done, uint32_t total);

 private:
  static Reply ServerHasNoFramer();

  Diag_FTM& phone_;
  std::vector<uint8_t> room_;  // of the last reply
  bool reported_ = false;
  uint32_t last_report_ = 0;
};

}  // namespace kral::download

#endif
