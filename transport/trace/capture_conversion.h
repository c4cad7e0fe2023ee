// Capture files and pcapng files, one made of the other.
#ifndef KRAL_TRANSPORT_TRACE_CAPTURE_CONVERSION_H
#define KRAL_TRANSPORT_TRACE_CAPTURE_CONVERSION_H

#include <cstdint>
#include <functional>
#include <span>
#include <string_view>

#include "transport/collection/capture_reader.h"

namespace kral {

struct Conversion {
  enum class End : uint8_t { kDone, kForeign, kNotWritten };

  End end = End::kDone;
  uint64_t packets = 0;
  uint64_t skipped = 0;  // those that a capture cannot hold
  bool cut = false;      // it was read up to its last whole packet
  uint32_t mark = 0;     // of a capture: what its head says of the times, capture_head::kStepsBack
};

using ConversionSink = std::function<bool(std::span<const uint8_t> bytes)>;  // false: no more is taken

Conversion CaptureToPcapng(CaptureSource source, std::string_view application, const ConversionSink& write);
// Writes no mark: only the end tells it. Takes what a handset sends unasked: received frames of link type 147, their
// FCS included.
Conversion PcapngToCapture(CaptureSource source, const ConversionSink& write);

}  // namespace kral

#endif
