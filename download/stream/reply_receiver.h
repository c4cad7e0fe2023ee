// What comes back while an image is written: frames to results, results to counts and events. The thread that takes
// the frames is CImageWriteRsp.
#ifndef KRAL_DOWNLOAD_STREAM_REPLY_RECEIVER_H
#define KRAL_DOWNLOAD_STREAM_REPLY_RECEIVER_H

#include <cstdint>
#include <span>

#include "base/event.h"
#include "base/text_log.h"
#include "download/stream/download_agent.h"

namespace kral::stream {

enum class WriteReply : uint32_t {
  kAcknowledged = 0,
  kBadCrc = 1,  // such frames end in the de-framer
  kParseFailure = 2,
  kBadLength = 3,
  kBadCode = 4,
  kComplete = 5,
  kBadSequence = 6,
};

// Which frames are looked at; a streaming download looks at all of them.
class CDevResponse {
 public:
  virtual ~CDevResponse() = default;
  virtual bool Accepts(std::span<const uint8_t> frame) const = 0;
};

class CStrmDownloadResponse final : public CDevResponse {
 public:
  bool Accepts(std::span<const uint8_t>) const override { return true; }
};

// Understands one kind of reply.
class WriteReplyParser {
 public:
  virtual ~WriteReplyParser() = default;
  virtual WriteReply ParseReply(std::span<const uint8_t> payload) = 0;
};

class CReplyRcvr {
 public:
  virtual ~CReplyRcvr() = default;
  virtual void OnFrame(std::span<const uint8_t> frame) = 0;  // FCS included
};

// Goes on after the final block: blocks in front of it may still have to be sent again.
class CReplyRcvrCont final : public CReplyRcvr {
 public:
  CReplyRcvrCont(WriteReplyParser& parser, DownloadAgent& agent, AutoResetEvent& finished, DataLogFileHandler& log)
      : parser_(parser), agent_(agent), finished_(finished), log_(log) {}
  void OnFrame(std::span<const uint8_t> frame) override;

 private:
  WriteReplyParser& parser_;
  DownloadAgent& agent_;
  AutoResetEvent& finished_;
  DataLogFileHandler& log_;
  CStrmDownloadResponse response_;
  bool done_ = false;
};

}  // namespace kral::stream

#endif
