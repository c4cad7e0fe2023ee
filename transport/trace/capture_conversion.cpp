// Reads the one and writes the other, in pieces.
#include "transport/trace/capture_conversion.h"

#include <utility>
#include <vector>

#include "base/wire_codes.h"
#include "transport/collection/capture_format.h"
#include "transport/collection/capture_writer.h"
#include "transport/engine/bounded_queue.h"
#include "transport/trace/pcapng_blocks.h"
#include "transport/trace/pcapng_format.h"
#include "transport/trace/pcapng_reader.h"

namespace kral {
namespace {

using Outcome = CaptureReader::Outcome;

constexpr size_t kPiece = size_t{256} << 10;
constexpr uint32_t kFlags = pcapng::flags::kInbound | static_cast<uint32_t>(kFcsSize) << pcapng::flags::kFcsLengthShift;

bool FitsCapture(const PcapngRecord& record) {
  const bool sent = (record.flags & pcapng::flags::kDirection) == pcapng::flags::kOutbound;
  return record.link_type == pcapng::interface::kFrames && !sent &&
         record.data.size() >= capture_record::kShortestPacket && record.data.size() <= kMaximumPacket &&
         IsAsynchronousCode(record.data.front());
}

// Reads records to the end of the file; each is appended to the bytes that are written, or skipped.
template <class Record, class Reader, class Append>
Conversion Convert(Reader reader, std::vector<uint8_t> bytes, const ConversionSink& write, Append append) {
  Conversion conversion;
  Record record;
  Outcome outcome = Outcome::kRecord;
  while ((outcome = reader.Next(record)) == Outcome::kRecord) {
    if (append(bytes, record)) {
      ++conversion.packets;
    } else {
      ++conversion.skipped;
    }
    if (bytes.size() < kPiece) continue;
    if (!write(std::exchange(bytes, {}))) return {.end = Conversion::End::kNotWritten};
  }
  if (outcome == Outcome::kForeign) return {.end = Conversion::End::kForeign};
  conversion.cut = outcome == Outcome::kCut;
  if (!write(bytes)) conversion.end = Conversion::End::kNotWritten;
  return conversion;
}

}  // namespace

Conversion CaptureToPcapng(CaptureSource source, std::string_view application, const ConversionSink& write) {
  std::vector<uint8_t> head;
  pcapng::AppendSection(head, application);
  pcapng::AppendInterface(head, pcapng::interface::kFrames, {"capture", "what a handset sent unasked"});
  const auto append = [](std::vector<uint8_t>& bytes, const CaptureRecord& record) {
    pcapng::AppendPacket(
        bytes,
        {.interface = 0, .microseconds = record.microseconds, .flags = kFlags, .comment = {}, .data = record.packet});
    return true;
  };
  return Convert<CaptureRecord>(CaptureReader(std::move(source)), std::move(head), write, append);
}

Conversion PcapngToCapture(CaptureSource source, const ConversionSink& write) {
  const auto begin = CaptureHead();
  TimeSteps steps;
  const auto append = [&steps](std::vector<uint8_t>& bytes, const PcapngRecord& record) {
    if (!FitsCapture(record)) return false;
    steps.Add(record.microseconds);
    const auto head = CaptureRecordHead(record.microseconds, record.data.size());
    bytes.insert(bytes.end(), head.begin(), head.end());
    bytes.insert(bytes.end(), record.data.begin(), record.data.end());
    return true;
  };
  auto conversion = Convert<PcapngRecord>(PcapngReader(std::move(source)), {begin.begin(), begin.end()}, write, append);
  conversion.mark = steps.mark();
  return conversion;
}

}  // namespace kral
