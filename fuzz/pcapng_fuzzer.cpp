// Anything as a pcapng file, made into a capture: what comes out is one, with as many packets as are told, and goes
// there and back.
#include <cstddef>
#include <cstdint>

#include "fuzz/support.h"
#include "transport/trace/capture_conversion.h"

namespace {

using namespace kral;
using fuzz::Bytes;
using fuzz::ByteView;
using fuzz::Require;
using fuzz::SourceOf;

ConversionSink Into(Bytes& bytes) {
  return [&bytes](std::span<const uint8_t> more) {
    bytes.insert(bytes.end(), more.begin(), more.end());
    return true;
  };
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  Bytes capture;
  const Conversion first = PcapngToCapture(SourceOf(ByteView(data, size)), Into(capture));
  if (first.end != Conversion::End::kDone) return 0;
  Bytes pcapng;
  const Conversion there = CaptureToPcapng(SourceOf(capture), "", Into(pcapng));
  Require(there.end == Conversion::End::kDone && !there.cut && there.packets == first.packets);
  Bytes again;
  const Conversion back = PcapngToCapture(SourceOf(pcapng), Into(again));
  Require(back.packets == first.packets && back.skipped == 0 && !back.cut && again == capture);
  return 0;
}
