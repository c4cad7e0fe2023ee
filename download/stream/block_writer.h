// The writer's side of the pipeline: takes blocks from the agent, reads them from the image, sends them.
#ifndef KRAL_DOWNLOAD_STREAM_BLOCK_WRITER_H
#define KRAL_DOWNLOAD_STREAM_BLOCK_WRITER_H

#include <cstdint>
#include <optional>
#include <span>
#include <vector>

#include "download/images/phone_image.h"
#include "download/link/download_connection.h"
#include "download/stream/download_agent.h"
#include "download/stream/image_write_cmd.h"

namespace kral::stream {

class BlockWriter {
 public:
  // Everything is borrowed for the length of one image.
  BlockWriter(download::DownloadConnection& connection, DownloadAgent& agent, const images::PhoneImage& image,
              CImageWriteCmd& command, uint32_t block_size, uint32_t time_out_ms);

  // Until the agent has nothing left, `total` bytes. False when the pipeline broke.
  bool Run(uint32_t total);

 private:
  enum class Turn { kTake, kSendAgain, kNothing, kGiveUp };

  Turn AwaitTurn(uint32_t total);
  // Each holds its block.
  std::optional<CDownloadBlock> Take();
  std::optional<CDownloadBlock> Carve();
  std::optional<CDownloadBlock> Load(std::optional<CDownloadBlock> block);
  // Reads of the block what is not held yet, and gives its bytes.
  std::span<const uint8_t> Hold(const CDownloadBlock& block);
  bool Send(const CDownloadBlock& block);

  download::DownloadConnection& connection_;
  DownloadAgent& agent_;
  const images::PhoneImage& image_;
  CImageWriteCmd& command_;
  const uint32_t time_out_ms_;
  const uint32_t most_data_;
  // What has been read of the image and not sent: a frame may take less than was read for it. `held_begin_` is its
  // place in the buffer, with room for a header in front.
  std::vector<uint8_t> buffer_;
  CDownloadBlock held_{};
  size_t held_begin_ = 0;
  uint32_t time_outs_in_a_row_ = 0;
  uint32_t acknowledged_ = 0;
};

}  // namespace kral::stream

#endif
