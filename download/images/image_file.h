// Image files as callers name them: opened in the right kind of image, looked at, converted.
#ifndef KRAL_DOWNLOAD_IMAGES_IMAGE_FILE_H
#define KRAL_DOWNLOAD_IMAGES_IMAGE_FILE_H

#include <cstdint>
#include <memory>
#include <span>
#include <string>

#include "base/failure.h"
#include "base/text_log.h"
#include "download/images/hex_phone_image_decoder.h"
#include "download/images/phone_image.h"
#include "kral/download.h"

namespace kral::images {

// An image with the decoder that it needs. What does not give 0 here has noted its failure.
class ImageFile {
 public:
  // Gives KRAL_STREAM_FILE_..., ..._DATA_LOST, ..._PAST_END, ..._BAD_ARGUMENT or 0. The format may be found by content.
  uint32_t Open(const std::string& path, uint32_t format);
  // For many readers: see PhoneImageBinary. A HEX file is in memory in any case.
  void KeepInMemory();

  PhoneImage& image() { return *image_; }
  const PhoneImage& image() const { return *image_; }
  uint32_t format() const { return format_; }
  uint32_t regions() const { return format_ == KRAL_IMAGE_FORMAT_HEX ? KRAL_IMAGE_REGIONS : 1; }
  // Whether there are bytes that a download, or a binary file, would leave out.
  bool has_second_region() const { return regions() > 1 && image_->GetSize(1) != 0; }
  // KRAL_STREAM_BAD_IMAGE, or 0.
  uint32_t RefuseSecondRegion(const std::string& path) const;
  const HexLoss& loss() const { return loss_; }  // of a HEX file that could be decoded

 private:
  uint32_t OpenHex(const std::string& path);
  uint32_t OpenBinary(const std::string& path);  // or what is found to be HEX

  uint32_t format_ = KRAL_IMAGE_FORMAT_BY_CONTENT;
  HexLoss loss_;
  std::unique_ptr<HexPhoneImageDecoder> decoder_;
  std::unique_ptr<PhoneImage> image_;  // borrows the decoder
};

// Of a decoder that has just failed; of data that were just lost.
Failure NotDecoded(const std::string& file, const HexFault& fault);
const char* WhatLoses(const HexLoss& loss);  // "holds ...", said of its line
Failure DataLost(const std::string& file, const HexLoss& loss);
void LogLoss(DataLogFileHandler& log, const std::string& file, const HexLoss& loss);

// Whether so many bytes from there on do not fit into 32 bits of addresses: they would go on at 0.
bool PassesTheEnd(uint32_t base, uint64_t size);

// An image of exactly these bytes; null when there is no room for a copy.
std::unique_ptr<PhoneImage> MakeMemoryImage(std::span<const uint8_t> bytes, uint32_t address);

uint32_t GetImageInfo(const std::string& path, uint32_t format, KRAL_IMAGE_INFO& info, HexLoss* loss = nullptr);
// Without an opinion on it: 0 for every file that can be decoded.
uint32_t FindHexLoss(const std::string& path, HexLoss& loss);
uint32_t HexToBinary(const std::string& input, const std::string& output, uint32_t& base);
uint32_t BinaryToHex(const std::string& input, const std::string& output, uint32_t base);

}  // namespace kral::images

#endif
