// Builds and sends one stream write.
#ifndef KRAL_DOWNLOAD_STREAM_IMAGE_WRITE_CMD_H
#define KRAL_DOWNLOAD_STREAM_IMAGE_WRITE_CMD_H

#include <cstdint>
#include <span>

#include "download/link/download_connection.h"

namespace kral::stream {

class CImageWriteCmd {
 public:
  virtual ~CImageWriteCmd() = default;
  // `packet` is room for the header, kWriteHeaderSize bytes that are written to, and the data behind it.
  virtual bool Send(uint32_t address, std::span<uint8_t> packet) = 0;
};

class CImageWriteCmdFramed final : public CImageWriteCmd {
 public:
  // The most data of one write that can go out in one frame; less when some of it has to be escaped.
  static constexpr uint32_t kMostFramedData = 16376;

  CImageWriteCmdFramed(download::DownloadConnection& connection, uint32_t time_out_ms)
      : connection_(connection), time_out_ms_(time_out_ms) {}

  bool Send(uint32_t address, std::span<uint8_t> packet) override;

  // How much of the data, from its beginning, one frame takes.
  static uint32_t FittingSize(uint32_t address, std::span<const uint8_t> data);

 private:
  download::DownloadConnection& connection_;
  const uint32_t time_out_ms_;
};

}  // namespace kral::stream

#endif
