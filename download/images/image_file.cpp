// Opens image files and tells what is in them.
#include "download/images/image_file.h"

#include <algorithm>
#include <vector>

#include "download/images/phone_image_binary.h"
#include "download/images/phone_image_dpaged.h"
#include "download/images/text_source.h"
#include "download/link/download_failure.h"

namespace kral::images {
namespace {

// Address space only, which a 32-bit process has to spare; what is not written takes no memory.
constexpr uint32_t kMaximumKib = 128 * 1024;
constexpr uint32_t kCountedPiece = 64 * 1024;

// One that cannot be mapped may still be read as text.
bool BeginsAsHex(const PhoneImageBinary& opened, const std::string& path) try {
  char first = 0;
  if (opened.GetTotalSize() != 0) {
    opened.Read(0, &first, 1, 0);
  } else if (TextFile file; opened.too_large() && file.OpenForReading(path)) {
    file.Read({&first, 1});
  }
  return first == ':';
} catch (const PhoneImageException&) {
  return false;
}

uint32_t CountPayload(const PhoneImage& image, uint32_t region) {
  std::vector<uint8_t> piece(kCountedPiece);
  const uint32_t base = image.GetBaseAddress(region);
  const uint32_t size = image.GetSize(region);
  uint32_t payload = 0;
  for (uint32_t done = 0; done < size;) {
    const uint32_t count = std::min(kCountedPiece, size - done);
    image.Read(base + done, piece.data(), count, region);
    const auto read = std::span(piece).first(count);
    payload += count - static_cast<uint32_t>(std::ranges::count(read, kErased));
    done += count;
  }
  return payload;
}

}  // namespace

uint32_t ImageFile::Open(const std::string& path, uint32_t format) {
  format_ = format;
  if (format == KRAL_IMAGE_FORMAT_HEX) return OpenHex(path);
  if (format == KRAL_IMAGE_FORMAT_BINARY || format == KRAL_IMAGE_FORMAT_BY_CONTENT) return OpenBinary(path);
  Fail(Failure(KRAL_ERROR_ARGUMENT, "there is no image format %u", format));
  return KRAL_STREAM_BAD_ARGUMENT;
}

void ImageFile::KeepInMemory() {
  if (format_ == KRAL_IMAGE_FORMAT_BINARY) static_cast<PhoneImageBinary&>(*image_).KeepInMemory();
}

uint32_t ImageFile::OpenBinary(const std::string& path) {
  auto binary = std::make_unique<PhoneImageBinary>();
  const bool opened = binary->Open(path);
  if (format_ == KRAL_IMAGE_FORMAT_BY_CONTENT) {
    format_ = BeginsAsHex(*binary, path) ? KRAL_IMAGE_FORMAT_HEX : KRAL_IMAGE_FORMAT_BINARY;
    if (format_ == KRAL_IMAGE_FORMAT_HEX) return OpenHex(path);
  }
  if (!opened) {
    Fail(binary->too_large() ? FileFailure(path, "has 4 GiB or more, or more than this process can map")
                             : download::NotOpened(path));
    return binary->too_large() ? KRAL_STREAM_FILE_TOO_LARGE : KRAL_STREAM_FILE_NOT_OPENED;
  }
  image_ = std::move(binary);
  return KRAL_STREAM_WRITTEN;
}

uint32_t ImageFile::OpenHex(const std::string& path) {
  TextFile file;
  if (!file.OpenForReading(path)) {
    Fail(download::NotOpened(path));
    return KRAL_STREAM_FILE_NOT_OPENED;
  }
  decoder_ = std::make_unique<HexPhoneImageDecoder>();
  try {
    image_ = std::make_unique<PhoneImageDPaged>(kMaximumKib, decoder_.get());
  } catch (const PhoneImageException&) {  // a process that has no address space left
    Fail(Failure(KRAL_ERROR_INTERNAL, "there is no address space for an image of %u KiB", kMaximumKib));
    return KRAL_STREAM_FILE_NOT_DECODED;
  }
  if (!decoder_->Decode(*image_, file)) {
    Fail(NotDecoded(path, decoder_->fault()));
    return KRAL_STREAM_FILE_NOT_DECODED;
  }
  loss_ = decoder_->loss();
  if (loss_.bytes != 0) {
    Fail(DataLost(path, loss_));
    return KRAL_STREAM_DATA_LOST;
  }
  // A file whose base no record tells has the last address for it.
  if (image_->GetSize(0) == 0 || !PassesTheEnd(image_->GetBaseAddress(0), image_->GetSize(0))) {
    return KRAL_STREAM_WRITTEN;
  }
  Fail(FileFailure(path, "goes on past address 0xFFFFFFFF"));
  return KRAL_STREAM_PAST_END;
}

uint32_t ImageFile::RefuseSecondRegion(const std::string& path) const {
  if (!has_second_region()) return KRAL_STREAM_WRITTEN;
  Fail(FileFailure(path, "has a second region at 0x08000000, which would be left out"));
  return KRAL_STREAM_BAD_IMAGE;
}

Failure NotDecoded(const std::string& file, const HexFault& fault) {
  if (fault.line == 0) return FileFailure(file, "holds no Intel HEX record");
  const auto line = static_cast<unsigned long long>(fault.line);
  return Failure(KRAL_ERROR_BAD_FILE, "line %llu of the file %.120s %s", line, file.c_str(), fault.what)
      .Line(static_cast<uint32_t>(fault.line));
}

const char* WhatLoses(const HexLoss& loss) {
  return loss.replaces ? "holds other data for addresses that have some" : "holds data that have no place in the image";
}

Failure DataLost(const std::string& file, const HexLoss& loss) {
  return Failure(KRAL_ERROR_BAD_FILE, "line %llu of the file %.120s %s", static_cast<unsigned long long>(loss.line),
                 file.c_str(), WhatLoses(loss))
      .Line(static_cast<uint32_t>(loss.line));
}

void LogLoss(DataLogFileHandler& log, const std::string& file, const HexLoss& loss) {
  log.WriteLine(kLogErr, "%s: line %llu %s, %llu bytes are lost in all", file.c_str(),
                static_cast<unsigned long long>(loss.line), WhatLoses(loss),
                static_cast<unsigned long long>(loss.bytes));
}

bool PassesTheEnd(uint32_t base, uint64_t size) {
  return uint64_t{base} + size > uint64_t{1} << 32;
}

std::unique_ptr<PhoneImage> MakeMemoryImage(std::span<const uint8_t> bytes, uint32_t address) {
  const auto size = static_cast<uint32_t>(bytes.size());
  try {
    auto image = std::make_unique<PhoneImageDPaged>(size / 1024 + 1, nullptr);
    image->SetBaseAddress(address, 0);
    if (size != 0) image->Write(address, bytes.data(), size, 0);
    return image;
  } catch (const PhoneImageException&) {
    Fail(Failure(KRAL_ERROR_INTERNAL, "there is no memory for a copy of %u bytes", size));
    return nullptr;
  }
}

uint32_t GetImageInfo(const std::string& path, uint32_t format, KRAL_IMAGE_INFO& info, HexLoss* loss) try {
  ImageFile file;
  const uint32_t result = file.Open(path, format);
  if (loss != nullptr) *loss = file.loss();
  if (result != KRAL_STREAM_WRITTEN) return result;
  KRAL_IMAGE_INFO found{};
  found.format = file.format();
  found.start_address = file.image().GetStartAddress();
  for (uint32_t region = 0; region < file.regions(); ++region) {
    found.size[region] = file.image().GetSize(region);
    if (found.size[region] == 0) continue;
    found.base[region] = file.image().GetBaseAddress(region);
    found.payload += CountPayload(file.image(), region);
  }
  info = found;
  return KRAL_STREAM_WRITTEN;
} catch (const PhoneImageException& exception) {
  Fail(FileFailure(path, "became shorter while it was read").Offset(exception.address()));
  return KRAL_STREAM_FILE_NOT_READ;
}

uint32_t FindHexLoss(const std::string& path, HexLoss& loss) {
  ImageFile file;
  const uint32_t result = file.Open(path, KRAL_IMAGE_FORMAT_HEX);
  loss = file.loss();
  return result == KRAL_STREAM_DATA_LOST || result == KRAL_STREAM_PAST_END ? KRAL_STREAM_WRITTEN : result;
}

}  // namespace kral::images
