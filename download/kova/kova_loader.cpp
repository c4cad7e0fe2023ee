// Loads a flash programmer from an Intel HEX file and starts it.
#include <algorithm>
#include <vector>

#include "download/images/image_file.h"
#include "download/kova/kova.h"
#include "download/kova/kova_format.h"
#include "download/link/download_failure.h"
#include "kral/download.h"

namespace kral::kova {
namespace {

// From the start address on, not from the base: the programmer's entry point is its lowest address. Required.
bool SendImage(download::DownloadConnection& connection, const images::PhoneImage& image, uint32_t chunk_size) {
  const uint32_t start = image.GetStartAddress();
  const uint32_t size = image.GetSize(0);
  std::vector<uint8_t> chunk(chunk_size);
  for (uint32_t sent = 0; sent < size && !connection.aborted();) {
    connection.Report(sent, size);
    const uint32_t count = std::min(chunk_size, size - sent);
    if (count == 0) return Fail(Failure(KRAL_ERROR_ARGUMENT, "packets of that size carry no data"));
    try {
      image.Read(start + sent, chunk.data(), count, 0);
    } catch (const images::PhoneImageException&) {
      return Fail(Failure(KRAL_ERROR_BAD_FILE, "the flash programmer has nothing at its start address 0x%08X", start));
    }
    if (!Write32(connection, start + sent, std::span(chunk).first(count))) return false;
    sent += count;
  }
  if (!connection.aborted()) connection.Report(size, size);
  return true;
}

}  // namespace

uint32_t ChunkSize(uint32_t maximum_packet) {
  return maximum_packet < kAmplePacket ? maximum_packet / 2 : kMostWriteData;
}

uint32_t ProgrammerFile::Open(const std::string& path) {
  path_ = path;
  images::TextFile text;
  if (!text.OpenForReading(path)) {
    Fail(download::NotOpened(path));
    return KRAL_KOVA_FILE_NOT_OPENED;
  }
  if (!decoder_.Decode(image_, text)) {
    Fail(images::NotDecoded(path, decoder_.fault()));
    return KRAL_KOVA_FILE_NOT_DECODED;
  }
  if (decoder_.loss().bytes == 0) return KRAL_KOVA_LOADED;
  Fail(images::DataLost(path, decoder_.loss()));
  return KRAL_KOVA_DATA_LOST;
}

uint32_t LoadFlashProgrammer(download::DownloadConnection& connection, const ProgrammerFile& programmer,
                             uint32_t maximum_packet) {
  auto& log = connection.log();
  const images::PhoneImage& image = programmer.image();
  const bool sent = SendImage(connection, image, ChunkSize(maximum_packet));
  if (connection.aborted()) return download::Aborted();
  if (!sent) {
    log.WriteLine(kLogErr, "image load failed");
    return KRAL_KOVA_WRITE_FAILED;
  }
  log.WriteLine(kLogRet, "Flash programmer %s loaded, sending GO", programmer.path().c_str());
  if (!Go(connection, image.GetStartAddress())) {
    log.WriteLine(kLogErr, "GO failed");
    return KRAL_KOVA_GO_FAILED;
  }
  log.WriteLine(kLogRet, "GO succeeded");
  return KRAL_KOVA_LOADED;
}

}  // namespace kral::kova
