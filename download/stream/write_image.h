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

namespace kral::stream {

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
  WriteOutcome Write(const images::PhoneImage& image, uint8_t type, const images::PhoneImage* header,
                     const WriteLimits& requested);

 protected:
  CWriteImage(download::DownloadConnection& connection, std::unique_ptr<CImageOpen> opener);

 private:
  WriteOutcome Stream(const images::PhoneImage& image, uint32_t size, const WriteLimits& limits);
  bool WriteLoop(const images::PhoneImage& image, const WriteLimits& limits, CImageWriteRsp& replies);
  WriteOutcome Failed(WriteOutcome outcome, const char* text);

  download::DownloadConnection& connection_;
  const uint32_t time_out_ms_;
  const std::unique_ptr<CImageOpen> opener_;
};

class CWriteImageFramed final : public CWriteImage {
 public:
  explicit CWriteImageFramed(download::DownloadConnection& connection);
};

class CWriteNORImageFramed final : public CWriteImage {
 public:
  explicit CWriteNORImageFramed(download::DownloadConnection& connection);
};

}  // namespace kral::stream

#endif
