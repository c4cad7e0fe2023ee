// Writes one image into flash: open, a pipeline of writes with the response thread beside it, close.
#ifndef KRAL_DOWNLOAD_STREAM_WRITE_IMAGE_H
#define KRAL_DOWNLOAD_STREAM_WRITE_IMAGE_H

#include <cstdint>
#include <memory>

#include "download/images/phone_image.h"
#include "download/link/download_connection.h"
#include "download/stream/image_open.h"
#include "download/stream/image_write_cmd.h"
#include "download/stream/image_write_rsp.h"

namespace kral {

enum class WriteOutcome : uint32_t {
  kDone,
  kNotOpened,
  kNoThread,
  kThreadNotStarted,
  kNotWritten,
  kNotCompleted,
  kThreadNotStopped,
  kNotClosed,
  kAborted,
};

class CWriteImage {
 public:
  virtual ~CWriteImage() = default;

  // Region 0 of the image. `header` may be null. Throws what the images throw.
  WriteOutcome Write(PhoneImage& image, uint8_t type, PhoneImage* header, const WriteLimits& requested);

 protected:
  CWriteImage(DownloadConnection& connection, std::unique_ptr<CImageOpen> opener);

 private:
  WriteOutcome Stream(PhoneImage& image, uint32_t size, const WriteLimits& limits);
  bool WriteLoop(PhoneImage& image, const WriteLimits& limits, CImageWriteRsp& replies);
  WriteOutcome Failed(WriteOutcome outcome, const char* text);

  DownloadConnection& connection_;
  const uint32_t time_out_ms_;
  const std::unique_ptr<CImageOpen> opener_;
};

class CWriteImageFramed final : public CWriteImage {
 public:
  explicit CWriteImageFramed(DownloadConnection& connection);
};

class CWriteNORImageFramed final : public CWriteImage {
 public:
  explicit CWriteNORImageFramed(DownloadConnection& connection);
};

}  // namespace kral

#endif
