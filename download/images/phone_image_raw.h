// Small images copied from a caller's memory: headers, tables, blobs.
#ifndef KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_RAW_H
#define KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_RAW_H

#include <cstdint>

#include "download/images/phone_image.h"

namespace kral::images {

// What both raw kinds share. They begin at address 0, ignore what is set or written, and count the terminating zero
// as part of their length.
class PhoneImageRaw : public PhoneImage {
 public:
  using PhoneImage::PhoneImage;

  // Copies the bytes and a zero behind them. False for null data.
  bool SetData(const void* data, uint32_t length);

  void Clear() override {}
  uint32_t GetBaseAddress(uint32_t) const override { return 0; }
  uint32_t GetTotalSize() const override { return length_; }
  uint32_t GetSize(uint32_t) const override { return length_; }
  uint32_t GetLastAddress(uint32_t) const override { return 0; }
  uint32_t GetStartAddress() const override { return 0; }
  uint8_t* GetPointer(uint32_t offset) override;
  void SetBaseAddress(uint32_t, uint32_t) override {}
  void SetSize(uint32_t, uint32_t) override {}
  void SetStartAddress(uint32_t) override {}
  void Write(uint32_t, const void*, uint32_t, uint32_t) override {}

 protected:
  uint8_t* buffer_ = nullptr;  // a block of the image
  uint32_t length_ = 0;
};

// Always sent whole: Read gives the first bytes, whatever the address.
class PhoneImageRawBinary final : public PhoneImageRaw {
 public:
  using PhoneImageRaw::PhoneImageRaw;
  void Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const override;
};

// Honours the address; region 0 only.
class PhoneImageRawBuffer final : public PhoneImageRaw {
 public:
  using PhoneImageRaw::PhoneImageRaw;
  void Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const override;
};

}  // namespace kral::images

#endif
