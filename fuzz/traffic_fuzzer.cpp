// Anything that passes over a port, as a trace of it: the file has a block for every frame and for everything else, and
// they can be read again.
//
// Each part of the input is a piece of the traffic: bit 0 its direction, bit 1 that it is no frames, bits 4..6 its
// kind.
#include <cstddef>
#include <cstdint>
#include <vector>

#include "base/little_endian.h"
#include "fuzz/support.h"
#include "tests/support/plain_codec.h"
#include "transport/trace/pcapng_format.h"
#include "transport/trace/pcapng_reader.h"
#include "transport/trace/trace_writer.h"

namespace {

using namespace kral;
using fuzz::Bytes;
using fuzz::ByteView;
using fuzz::Require;

struct Record {
  TrafficRecord::Kind kind;
  PortDirection direction;
  Bytes bytes;
};

TrafficPiece PieceOf(const fuzz::Part& part, uint64_t microseconds) {
  TrafficPiece piece;
  const auto kind = static_cast<TrafficPiece::Kind>(part.control >> 4 & 7);
  if (kind <= TrafficPiece::Kind::kEarlier) piece.kind = kind;
  piece.direction = (part.control & 1) != 0 ? PortDirection::kSent : PortDirection::kReceived;
  piece.content = (part.control & 2) != 0 ? PortContent::kBytes : PortContent::kFrames;
  piece.microseconds = microseconds;
  if (piece.kind == TrafficPiece::Kind::kBytes) {
    piece.bytes = part.bytes;
  } else {
    piece.count = LoadLe<uint16_t>(part.bytes).value_or(0);
    piece.of = LoadLe<uint16_t>(part.bytes, 2).value_or(0);
  }
  return piece;
}

void CheckRecord(const TrafficRecord& record) {
  if (record.kind == TrafficRecord::Kind::kNoise) Require(!record.bytes.empty());
  if (record.kind != TrafficRecord::Kind::kFrame) return;
  Require(record.bytes.size() >= 3);
  const size_t payload = record.bytes.size() - 2;
  Require(test::PlainFcs(record.bytes.data(), payload * 8 & 0xFFFF) == LoadLe<uint16_t>(record.bytes, payload));
}

void CheckFile(const Bytes& file, const std::vector<Record>& records) {
  PcapngReader reader(fuzz::SourceOf(file));
  PcapngRecord read;
  for (const Record& record : records) {
    Require(reader.Next(read) == PcapngReader::Outcome::kRecord && read.data == record.bytes);
    const bool is_frame = record.kind == TrafficRecord::Kind::kFrame || record.kind == TrafficRecord::Kind::kBadFrame;
    Require(read.link_type == (is_frame ? pcapng::interface::kFrames : pcapng::interface::kBytes));
    Require((read.flags & pcapng::flags::kDirection) ==
            (record.direction == PortDirection::kSent ? pcapng::flags::kOutbound : pcapng::flags::kInbound));
    Require(((read.flags & pcapng::flags::kBadFcs) != 0) == (record.kind == TrafficRecord::Kind::kBadFrame));
  }
  Require(reader.Next(read) == PcapngReader::Outcome::kEnd);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::vector<Record> records;
  TrafficSplitter splitter([&records](const TrafficRecord& record) {
    CheckRecord(record);
    records.push_back({record.kind, record.direction, {record.bytes.begin(), record.bytes.end()}});
  });
  Bytes pieces;
  uint64_t microseconds = 1'000'000;
  fuzz::Parts parts({data, size});
  while (const auto part = parts.Next()) {
    const TrafficPiece piece = PieceOf(*part, ++microseconds);
    splitter.Take(piece);
    const auto head = piece.Head();
    pieces.insert(pieces.end(), head.begin(), head.end());
    pieces.insert(pieces.end(), piece.bytes.begin(), piece.bytes.end());
  }
  splitter.Finish(++microseconds);

  Bytes file;
  const TraceFile::Write write = [&file](ByteView bytes) {
    file.insert(file.end(), bytes.begin(), bytes.end());
    return bytes.size();
  };
  TraceFile trace;
  Require(trace.Begin({"fuzz", "COM1", "a port"}, write));
  trace.Take(pieces, write);
  trace.End(microseconds, 0, write);
  const auto outcome = trace.TakeOutcome();
  Require(outcome.frames + outcome.others == records.size() && outcome.unwritten == 0 && outcome.bad <= outcome.frames);
  CheckFile(file, records);
  return 0;
}
