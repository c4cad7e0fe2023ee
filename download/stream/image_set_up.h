// What is sent between the hello and the images: security mode and partition table.
#ifndef KRAL_DOWNLOAD_STREAM_IMAGE_SET_UP_H
#define KRAL_DOWNLOAD_STREAM_IMAGE_SET_UP_H

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "download/link/download_connection.h"

namespace kral::stream {

class CImageSecMode {
 public:
  CImageSecMode(download::DownloadConnection& connection, uint32_t time_out_ms)
      : connection_(connection), time_out_ms_(time_out_ms) {}
  bool Send(uint8_t mode);

 private:
  download::DownloadConnection& connection_;
  const uint32_t time_out_ms_;
};

// Of at most 512 bytes; what is wrong with the file is logged and noted.
bool ReadPartitionTable(DataLogFileHandler& log, const std::string& file, std::vector<uint8_t>& table);

class CImagePartition {
 public:
  CImagePartition(download::DownloadConnection& connection, uint32_t time_out_ms)
      : connection_(connection), time_out_ms_(time_out_ms) {}
  // `status` is set when the handset answered.
  bool Send(std::span<const uint8_t> table, bool override_table, std::optional<uint8_t>& status);

 private:
  download::DownloadConnection& connection_;
  const uint32_t time_out_ms_;
};

}  // namespace kral::stream

#endif
