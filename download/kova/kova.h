// The KOVA download protocol: the handset's loader, which takes a flash programmer into memory and starts it.
#ifndef KRAL_DOWNLOAD_KOVA_KOVA_H
#define KRAL_DOWNLOAD_KOVA_KOVA_H

#include <cstdint>
#include <span>
#include <string>

#include "download/images/hex_phone_image_decoder.h"
#include "download/images/phone_image_dpaged.h"
#include "download/link/download_connection.h"

namespace kral::kova {

// One request each. At most kMostWriteData bytes.
bool Write32(download::DownloadConnection& connection, uint32_t address, std::span<const uint8_t> data);
bool Go(download::DownloadConnection& connection, uint32_t address);
bool Nop(download::DownloadConnection& connection);
bool Reset(download::DownloadConnection& connection);
bool SoftwareVersion(download::DownloadConnection& connection, uint8_t& version);

// The bytes that a write carries when the caller's packets have so many.
uint32_t ChunkSize(uint32_t maximum_packet);

// A flash programmer as an Intel HEX file has it. Once open it can be loaded into many handsets at the same time.
class ProgrammerFile {
 public:
  // Gives KRAL_KOVA_FILE_..., ..._DATA_LOST or 0, with the failure noted. May throw what images throw.
  uint32_t Open(const std::string& path);
  const std::string& path() const { return path_; }
  const images::PhoneImage& image() const { return image_; }
  const images::HexLoss& loss() const { return decoder_.loss(); }

 private:
  static constexpr uint32_t kMaximumKib = 500;

  std::string path_;
  images::HexPhoneImageDecoder decoder_{true, true, true};
  images::PhoneImageDPaged image_{kMaximumKib, &decoder_};
};

// Gives KRAL_KOVA_... or KRAL_DOWNLOAD_ABORTED.
uint32_t LoadFlashProgrammer(download::DownloadConnection& connection, const ProgrammerFile& programmer,
                             uint32_t maximum_packet);

}  // namespace kral::kova

#endif
