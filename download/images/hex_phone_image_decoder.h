// Intel HEX files: into an image and out of it.
#ifndef KRAL_DOWNLOAD_IMAGES_HEX_PHONE_IMAGE_DECODER_H
#define KRAL_DOWNLOAD_IMAGES_HEX_PHONE_IMAGE_DECODER_H

#include <cstdint>
#include <map>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "download/images/phone_image_decoder.h"

namespace kral::images {

class HexWriter;

// Data of a file that its image does not hold: dropped by the reader, behind the end of their region, or replaced by
// other data for the same address.
struct HexLoss {
  uint64_t bytes = 0;
  uint64_t line = 0;      // the first that loses some, from 1: its own, or those that it replaces
  bool replaces = false;  // that line does
};

// Why a Decode failed, and at which line.
struct HexFault {
  const char* what = "";  // "holds ...", said of the line
  uint64_t line = 0;      // 0 for a file without any
};

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

  // What the last Decode lost. The reader takes no offence at it; whoever uses the image should.
  const HexLoss& loss() const { return loss_; }
  // Of the last Decode that failed.
  const HexFault& fault() const { return fault_; }

 private:
  struct Cursor {
    uint32_t extended_base;
    uint32_t region;
    bool at_end;  // the last record was the end-of-file record
  };
  // A record that was written behind the end of its region, which later ones may move.
  struct Beyond {
    uint64_t end;  // from the region's base
    uint32_t length;
    uint32_t region;
    uint64_t line;
  };

  void FindBase(PhoneImage& image, LineReader& lines);
  bool LoadData(PhoneImage& image, LineReader& lines);
  bool LoadRecord(PhoneImage& image, const LineReader::Line& line, Cursor& cursor);
  bool LoadBytes(PhoneImage& image, const LineReader::Line& line, const Cursor& cursor);
  uint64_t CountReplaced(const PhoneImage& image, uint32_t region, uint32_t address, std::span<const uint8_t> data);
  void Lose(uint64_t bytes, uint64_t line, bool replaces = false);
  void LoseBeyond(PhoneImage& image);
  void EncodeRegion(PhoneImage& image, uint32_t region, HexWriter& writer) const;

  bool start_address_present_ = false;
  bool start_is_linear_ = false;    // set by a type 05 record
  bool linear_addressing_ = false;  // a type 04 or 05 record was seen
  HexLoss loss_;
  HexFault fault_;
  std::vector<Beyond> beyond_;
  std::map<uint64_t, uint64_t> written_[2];  // begin and end, from the region's base; none touches another
};

}  // namespace kral::images

#endif
