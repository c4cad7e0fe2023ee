// Intel HEX files to binary files and back.
#include <algorithm>
#include <cstdio>
#include <memory>
#include <vector>

#include "download/images/hex_phone_image_decoder.h"
#include "download/images/image_file.h"
#include "download/images/text_source.h"
#include "platform/file_util.h"

namespace kral::images {
namespace {

constexpr uint32_t kWrittenPiece = 64 * 1024;
// Offsets in a HEX file count from the base, of which the file has the upper half only.
constexpr uint32_t kBaseUnit = 0x10000;

// The text of an encoder on its way to a file that is replaced in one step.
class AtomicTextSink final : public TextSink {
 public:
  bool Open(const std::string& path) { return Good(file_.Open(path)); }
  bool Write(std::string_view text) override {
    pending_ += text;
    return pending_.size() < kWrittenPiece || Flush();
  }
  bool Commit() { return Flush() && Good(file_.Commit()); }
  const std::error_code& error() const { return error_; }

 private:
  bool Good(const std::error_code& error) {
    if (error) error_ = error;
    return !error;
  }
  bool Flush() {
    const auto error = file_.Write({reinterpret_cast<const uint8_t*>(pending_.data()), pending_.size()});
    pending_.clear();
    return Good(error);
  }

  AtomicFile file_;
  std::error_code error_;
  std::string pending_;
};

// A binary image with another base: a mapped file always begins at 0.
class MovedImage final : public PhoneImage {
 public:
  MovedImage(PhoneImage& image, uint32_t base) : image_(image), base_(base) {}

  void Clear() override { image_.Clear(); }
  uint32_t GetBaseAddress(uint32_t) const override { return base_; }
  uint32_t GetTotalSize() const override { return image_.GetTotalSize(); }
  uint32_t GetSize(uint32_t region) const override { return region == 0 ? image_.GetSize(0) : 0; }
  uint32_t GetLastAddress(uint32_t region) const override { return base_ + image_.GetLastAddress(region); }
  uint32_t GetStartAddress() const override { return image_.GetStartAddress(); }
  uint8_t* GetPointer(uint32_t offset) override { return image_.GetPointer(offset); }
  void Read(uint32_t address, void* buffer, uint32_t count, uint32_t region) const override {
    try {
      image_.Read(address - base_, buffer, count, region);
    } catch (const PhoneImageException&) {
      read_failed_ = true;  // of which an encoder keeps no more than that it failed
      throw;
    }
  }
  void SetBaseAddress(uint32_t value, uint32_t) override { base_ = value; }
  void SetSize(uint32_t value, uint32_t region) override { image_.SetSize(value, region); }
  void SetStartAddress(uint32_t value) override { image_.SetStartAddress(value); }
  void Write(uint32_t address, const void* data, uint32_t count, uint32_t region) override {
    image_.Write(address - base_, data, count, region);
  }

  bool read_failed() const { return read_failed_; }

 private:
  PhoneImage& image_;
  uint32_t base_;
  mutable bool read_failed_ = false;
};

uint32_t NotWritten(const std::string& output, const std::error_code& error) {
  Fail(FileFailure(output, "cannot be written").System(error));
  return KRAL_HEX_NOT_WRITTEN;
}

// By whatever name.
bool IsInputToo(const std::string& input, const std::string& output) {
  const std::unique_ptr<std::FILE, bool (*)(std::FILE*)> reading(OpenToRead(input), CloseStream);
  if (reading == nullptr || !IsInUse(output)) return false;
  Fail(Failure(KRAL_ERROR_ARGUMENT, "the output %.150s would replace a file that is being read or written",
               output.c_str()));
  return true;
}

}  // namespace

uint32_t HexToBinary(const std::string& input, const std::string& output, uint32_t& base) {
  if (IsInputToo(input, output)) return KRAL_STREAM_BAD_ARGUMENT;
  ImageFile hex;
  const uint32_t result = hex.Open(input, KRAL_IMAGE_FORMAT_HEX);
  if (result != KRAL_STREAM_WRITTEN) return result;
  if (const uint32_t refused = hex.RefuseSecondRegion(input)) return refused;
  AtomicFile file;
  if (const auto error = file.Open(output)) return NotWritten(output, error);
  const uint32_t size = hex.image().GetSize(0);
  const uint32_t first = hex.image().GetBaseAddress(0);
  std::vector<uint8_t> piece(kWrittenPiece);
  for (uint32_t done = 0; done < size;) {
    const uint32_t count = std::min(kWrittenPiece, size - done);
    hex.image().Read(first + done, piece.data(), count, 0);
    if (const auto error = file.Write(std::span(piece).first(count))) return NotWritten(output, error);
    done += count;
  }
  if (const auto error = file.Commit()) return NotWritten(output, error);
  base = first;
  return KRAL_STREAM_WRITTEN;
}

uint32_t BinaryToHex(const std::string& input, const std::string& output, uint32_t base) {
  if (base % kBaseUnit != 0) {
    Fail(Failure(KRAL_ERROR_ARGUMENT, "the base 0x%08X is no multiple of 0x10000", base));
    return KRAL_STREAM_BAD_ARGUMENT;
  }
  if (IsInputToo(input, output)) return KRAL_STREAM_BAD_ARGUMENT;
  ImageFile binary;
  const uint32_t result = binary.Open(input, KRAL_IMAGE_FORMAT_BINARY);
  if (result != KRAL_STREAM_WRITTEN) return result;
  if (PassesTheEnd(base, binary.image().GetSize(0))) {
    Fail(Failure(KRAL_ERROR_ARGUMENT, "%u bytes from 0x%08X on go past address 0xFFFFFFFF", binary.image().GetSize(0),
                 base));
    return KRAL_STREAM_PAST_END;
  }
  MovedImage image(binary.image(), base);
  HexPhoneImageDecoder encoder(false, false, true);
  AtomicTextSink file;
  if (file.Open(output) && encoder.Encode(image, file) && file.Commit()) return KRAL_STREAM_WRITTEN;
  if (!image.read_failed()) return NotWritten(output, file.error());
  Fail(FileFailure(input, "became shorter while it was read"));
  return KRAL_STREAM_FILE_NOT_READ;
}

}  // namespace kral::images
