// Capture files whose records are compressed, block by block.
#ifndef KRAL_TRANSPORT_COLLECTION_CAPTURE_BLOCKS_H
#define KRAL_TRANSPORT_COLLECTION_CAPTURE_BLOCKS_H

#include <cstdint>
#include <optional>
#include <span>
#include <vector>

#include "transport/collection/capture_reader.h"

namespace kral {

// At least one record, and at most capture_block::kMostRecords bytes of them, all whole.
std::vector<uint8_t> MakeCaptureBlock(std::span<const uint8_t> records);

struct CaptureBlockHead {
  uint32_t stream_size;
  uint32_t records_size;
  uint64_t microseconds;
};
// Nothing where no block begins.
std::optional<CaptureBlockHead> ReadCaptureBlockHead(std::span<const uint8_t> bytes);

// The records of the blocks that a source gives. Of a block whose end is missing those are given that are there; of one
// that is damaged none are.
CaptureSource UnpackCaptureBlocks(CaptureSource blocks);

}  // namespace kral

#endif
