// A binary file as an image: mapped read-only, and copied into memory as a whole only where many are to read it.
#ifndef KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_BINARY_H
#define KRAL_DOWNLOAD_IMAGES_PHONE_IMAGE_BINARY_H

#include <cstdint>
#include <memory>
#include <string>

#include "download/images/phone_image.h"
#include "platform/file_mapping.h"

namespace kral::images {

// Region 0 only: any other throws "Read Failure". The image begins at address 0.
class PhoneImageBinary final : public PhoneImage {
 public:
  using PhoneImage::PhoneImage;

  // False when the file cannot be mapped (missing, empty, unreadable), and for one that is too large: more bytes than
  // 32 bits can count, or than there is address space for.
  bool Open(const std::string& path);
  bool too_large() const { return too_large_; }
  uint32_t last_error() const { return file_.last_error(); }  // of the system

  // Reads the file at once, and lets go of it. One that is too large to be kept, or for which there is no memory, stays
  // a mapped one. Throws where the file has become shorter.
  void KeepInMemory();

  void Clear() override;  // throws "Write Failure", as Write does
  uint32_t GetBaseAddress(uint32_t region) const override;
  uint32_t GetTotalSize() const override;
  uint32_t GetSize(uint32_t region) const override;
  uint32_t GetLastAddress(uint32_t region) const override;
  uint32_t GetStartAddress() const override;
  uint8_t* GetPointer(uint32_t offset) override;  // read-only memory
  void Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const override;
  void SetBaseAddress(uint32_t value, uint32_t region) override;
  void SetSize(uint32_t value, uint32_t region) override;
  void SetStartAddress(uint32_t value) override;
  void Write(uint32_t address, const void* data, uint32_t count, uint32_t region) override;

 private:
  const uint8_t* bytes() const { return kept_ ? kept_.get() : file_.view(); }

  CMapFileToMemory file_;
  std::unique_ptr<uint8_t[]> kept_;  // in place of the file
  uint32_t total_ = 0;
  uint32_t base_ = 0;
  uint32_t size_ = 0;
  uint32_t start_ = 0;
  bool too_large_ = false;
};

}  // namespace kral::images

#endif
