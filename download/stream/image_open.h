// Opening and closing an image on the handset, and the limits of writing it.
#ifndef KRAL_DOWNLOAD_STREAM_IMAGE_OPEN_H
#define KRAL_DOWNLOAD_STREAM_IMAGE_OPEN_H

#include <cstdint>
#include <span>

#include "base/failure.h"
#include "download/images/phone_image.h"
#include "download/link/download_connection.h"

namespace kral::stream {

Failure HeaderTooLong(uint32_t size);

struct WriteLimits {
  uint32_t block_size = 0;
  uint32_t window = 0;
};

class CImageOpen {
 public:
  CImageOpen(download::DownloadConnection& connection, uint32_t time_out_ms)
      : connection_(connection), time_out_ms_(time_out_ms) {}
  virtual ~CImageOpen() = default;

  // The two that no opener has a use for.
  virtual bool Open(uint32_t, uint32_t) { return false; }
  virtual bool Prepare() { return false; }

  // `header` may be null. The limits are those asked for, as far as they can be had.
  virtual bool OpenMulti(uint8_t, const images::PhoneImage*, const WriteLimits&, WriteLimits&) { return false; }
  virtual bool Close();

 protected:
  static WriteLimits Limited(const WriteLimits& requested);
  Reply Exchange(std::span<const uint8_t> request, uint8_t expected_code);

  download::DownloadConnection& connection_;
  const uint32_t time_out_ms_;
};

class CImageOpenFramed final : public CImageOpen {
 public:
  using CImageOpen::CImageOpen;
  bool OpenMulti(uint8_t type, const images::PhoneImage* header, const WriteLimits& requested,
                 WriteLimits& limits) override;
};

// For a programmer that takes one image and wants neither an opening nor a closing packet.
class CImageOpenNOR final : public CImageOpen {
 public:
  using CImageOpen::CImageOpen;
  bool OpenMulti(uint8_t type, const images::PhoneImage* header, const WriteLimits& requested,
                 WriteLimits& limits) override;
  bool Close() override { return true; }
};

}  // namespace kral::stream

#endif
