// The KOVA download protocol: the handset's loader, which takes a flash programmer into memory and starts it.
#ifndef KRAL_DOWNLOAD_KOVA_KOVA_H
#define KRAL_DOWNLOAD_KOVA_KOVA_H

#include <cstdint>
#include <span>
#include <string>

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

// Gives KRAL_KOVA_... or KRAL_DOWNLOAD_ABORTED.
uint32_t LoadFlashProgrammer(download::DownloadConnection& connection, const std::string& file,
                             uint32_t maximum_packet);

}  // namespace kral::kova

#endif
