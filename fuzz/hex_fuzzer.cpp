// Any text as Intel HEX. What was accepted, and starts where the writer's records can express it, must come out of the
// writer and in again as the same image.
#include <cstdint>
#include <cstring>
#include <string>
#include <vector>

#include "download/images/hex_phone_image_decoder.h"
#include "download/images/phone_image_dpaged.h"
#include "fuzz/support.h"

namespace {

using namespace kral;
using fuzz::Require;

constexpr uint32_t kMaximumKib = 256;

std::vector<uint8_t> BytesOf(images::PhoneImage& image) {
  std::vector<uint8_t> bytes(image.GetSize(0));
  image.Read(image.GetBaseAddress(0), bytes.data(), image.GetSize(0), 0);
  return bytes;
}

// From a base of 64 KiB, within what segment records reach, and on one side of the second region's base: the writer's
// record for that base would send the rest of the image there.
bool IsExpressible(images::PhoneImage& image, bool linear) {
  const uint32_t base = image.GetBaseAddress(0);
  const uint32_t size = image.GetSize(0);
  if (size == 0 || image.GetSize(1) != 0 || base % 0x10000 != 0) return false;
  if (!linear) return base < 0xC0000;
  return base + size <= 0x08000000 || (base > 0x08000000 && base <= 0xFFF00000);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  images::TextMemory file(std::string(data, data + size));
  images::HexPhoneImageDecoder decoder;
  images::PhoneImageDPaged image(kMaximumKib, &decoder);
  if (!decoder.Decode(image, file)) return 0;
  Require(image.GetSize(0) <= image.GetTotalSize());

  images::TextMemory encoded;
  if (!decoder.Encode(image, encoded) || !IsExpressible(image, decoder.linear_addressing())) return 0;
  images::HexPhoneImageDecoder again;
  images::PhoneImageDPaged copy(kMaximumKib, &again);
  Require(again.Decode(copy, encoded));
  // The size of the copy may differ: that of the first write counts from nowhere. Its bytes may not.
  copy.SetSize(image.GetSize(0), 0);
  if (copy.GetBaseAddress(0) == image.GetBaseAddress(0)) Require(BytesOf(copy) == BytesOf(image));
  Require(copy.GetStartAddress() == image.GetStartAddress());
  return 0;
}
