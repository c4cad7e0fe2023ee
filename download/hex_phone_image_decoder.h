// Intel HEX files: into an image and out of it.
#ifndef KRAL_DOWNLOAD_HEX_PHONE_IMAGE_DECODER_H
#define KRAL_DOWNLOAD_HEX_PHONE_IMAGE_DECODER_H

#include <cstdint>
#include <string>
#include <string_view>

#include "download/phone_image_decoder.h"

namespace kral {

class HexWriter;

class HexPhoneImageDecoder final : public PhoneImageDecoder {
 public:
  HexPhoneImageDecoder() = default;
  HexPhoneImageDecoder(bool start_address_present, bool start_is_linear, bool linear_addressing)
      : start_address_present_(start_address_present),
        start_is_linear_(start_is_linear),
        linear_addressing_(linear_addressing) {}

  bool Decode(PhoneImage& image, TextSource& file) override;
  // Uses the flags that the last Decode or the constructor set.
  bool Encode(PhoneImage& image, TextSink& file) override;

  bool start_address_present() const { return start_address_present_; }
  bool start_is_linear() const { return start_is_linear_; }
  bool linear_addressing() const { return linear_addressing_; }

 private:
  struct Cursor {
    uint32_t extended_base;
    uint32_t region;
    bool at_end;  // the last record was the end-of-file record
  };

  void FindBase(PhoneImage& image, LineReader& lines);
  bool LoadData(PhoneImage& image, LineReader& lines);
  bool LoadRecord(PhoneImage& image, const LineReader::Line& line, Cursor& cursor);
  void EncodeRegion(PhoneImage& image, uint32_t region, HexWriter& writer) const;

  bool start_address_present_ = false;
  bool start_is_linear_ = false;    // set by a type 05 record
  bool linear_addressing_ = false;  // a type 04 or 05 record was seen
};

}  // namespace kral

#endif
