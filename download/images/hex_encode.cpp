// An image out as Intel HEX.
#include <algorithm>
#include <array>
#include <span>

#include "download/images/hex_format.h"
#include "download/images/hex_phone_image_decoder.h"

namespace kral::images {
namespace {

constexpr uint32_t kChunk = 16;
constexpr size_t kFlushSize = 0x10000;

// How far a chunk may lie above the extended base. Segments could reach 64 KiB; the shorter limit is intended.
constexpr uint32_t kSegmentReach = 0x800;
constexpr uint32_t kLinearReach = 0xFFF0;

enum RecordType : uint8_t {
  kData = 0,
  kEndOfFile = 1,
  kExtendedSegment = 2,
  kStartSegment = 3,
  kExtendedLinear = 4,
  kStartLinear = 5
};

bool HasSecondRegion(PhoneImage& image) {
  try {
    return image.GetSize(1) != 0;
  } catch (const PhoneImageException&) {
    return false;  // kinds with one region refuse the question
  }
}

}  // namespace

// Collects records and passes them on in large pieces.
class HexWriter {
 public:
  explicit HexWriter(TextSink& sink) : sink_(sink) { text_.reserve(kFlushSize + hex::kMostCharacters); }

  void Record(RecordType type, uint16_t offset, std::span<const uint8_t> data) {
    sum_ = 0;
    text_ += ':';
    Byte(static_cast<uint8_t>(data.size()));
    Byte(static_cast<uint8_t>(offset >> 8));
    Byte(static_cast<uint8_t>(offset));
    Byte(type);
    for (const uint8_t byte : data) Byte(byte);
    Byte(static_cast<uint8_t>(-sum_));
    text_ += '\n';
    if (text_.size() >= kFlushSize) Flush();
  }

  void Record16(RecordType type, uint16_t value) {
    Record(type, 0, std::array{static_cast<uint8_t>(value >> 8), static_cast<uint8_t>(value)});
  }

  void Record32(RecordType type, uint32_t value) {
    Record(type, 0,
           std::array{static_cast<uint8_t>(value >> 24), static_cast<uint8_t>(value >> 16),
                      static_cast<uint8_t>(value >> 8), static_cast<uint8_t>(value)});
  }

  // False when any piece of the text was refused.
  bool Finish() {
    Flush();
    return good_;
  }

 private:
  void Byte(uint8_t value) {
    constexpr char kDigits[] = "0123456789ABCDEF";
    text_ += kDigits[value >> 4];
    text_ += kDigits[value & 15];
    sum_ = static_cast<uint8_t>(sum_ + value);
  }

  void Flush() {
    good_ = good_ && sink_.Write(text_);
    text_.clear();
  }

  TextSink& sink_;
  std::string text_;
  uint8_t sum_ = 0;
  bool good_ = true;
};

bool HexPhoneImageDecoder::Encode(PhoneImage& image, TextSink& file) try {
  HexWriter writer(file);
  EncodeRegion(image, 0, writer);
  if (HasSecondRegion(image)) EncodeRegion(image, 1, writer);
  if (start_address_present_) {
    const bool linear = linear_addressing_ && start_is_linear_;
    writer.Record32(linear ? kStartLinear : kStartSegment, image.GetStartAddress());
  }
  writer.Record(kEndOfFile, 0, {});
  return writer.Finish();
} catch (const PhoneImageException&) {
  return false;
}

void HexPhoneImageDecoder::EncodeRegion(PhoneImage& image, uint32_t region, HexWriter& writer) const {
  const auto write_base = [this, &writer](uint32_t base) {
    if (linear_addressing_) {
      writer.Record16(kExtendedLinear, static_cast<uint16_t>(base >> 16));
    } else {
      writer.Record16(kExtendedSegment, static_cast<uint16_t>(base >> 4));
    }
  };
  const uint32_t base = image.GetBaseAddress(region);
  const uint32_t size = image.GetSize(region);
  const uint32_t reach = linear_addressing_ ? kLinearReach : kSegmentReach;
  const uint32_t base_mask = linear_addressing_ ? 0xFFFF0000 : 0xFFFF0;

  write_base(base);
  // The base as it is, not as the record can express it: the offsets below are meant against this value.
  uint32_t extended_base = base;
  bool gap = false;
  std::array<uint8_t, kChunk> bytes;
  for (uint32_t done = 0; done < size;) {
    const uint32_t address = base + done;
    const uint32_t length = std::min(kChunk, size - done);
    const std::span chunk = std::span(bytes).first(length);
    image.Read(address, chunk.data(), length, region);
    done += length;
    if (done < size && std::ranges::all_of(chunk, [](uint8_t byte) { return byte == 0xFF; })) {
      gap = true;
      continue;
    }
    if (gap || address - extended_base > reach) {
      extended_base = address & base_mask;
      write_base(extended_base);
      gap = false;
    }
    writer.Record(kData, static_cast<uint16_t>(address - extended_base), chunk);
  }
}

}  // namespace kral::images
