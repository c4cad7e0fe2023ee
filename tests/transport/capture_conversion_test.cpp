// Captures made into pcapng files and back: whole, cut, and written by others.
#include "transport/trace/capture_conversion.h"
#include "base/little_endian.h"
#include "tests/support/pcapng_reading.h"
#include "tests/support/test.h"
#include "transport/collection/capture_writer.h"
#include "transport/engine/bounded_queue.h"
#include "transport/trace/pcapng_blocks.h"

namespace kral {
namespace {

using Bytes = std::vector<uint8_t>;
using End = Conversion::End;

CaptureSource CaptureOf(Bytes bytes) {
  return [bytes = std::move(bytes), at = size_t{0}](std::span<uint8_t> buffer) mutable {
    const size_t count = std::min(buffer.size(), bytes.size() - at);
    std::copy_n(bytes.begin() + static_cast<std::ptrdiff_t>(at), count, buffer.begin());
    at += count;
    return std::optional(count);
  };
}

struct Converted {
  Conversion conversion;
  Bytes bytes;
};

ConversionSink Into(Bytes& bytes) {
  return [&bytes](std::span<const uint8_t> more) {
    bytes.insert(bytes.end(), more.begin(), more.end());
    return true;
  };
}

Converted Export(const Bytes& capture) {
  Converted result;
  result.conversion = CaptureToPcapng(CaptureOf(capture), "test", Into(result.bytes));
  return result;
}

Converted Import(const Bytes& pcapng) {
  Converted result;
  result.conversion = PcapngToCapture(CaptureOf(pcapng), Into(result.bytes));
  return result;
}

void Append(Bytes& bytes, std::span<const uint8_t> more) {
  bytes.insert(bytes.end(), more.begin(), more.end());
}

Bytes CaptureOf(const std::vector<std::pair<uint64_t, Bytes>>& packets) {
  Bytes file;
  Append(file, CaptureHead());
  for (const auto& [time, packet] : packets) {
    Append(file, CaptureRecordHead(time, packet.size()));
    Append(file, packet);
  }
  return file;
}

const std::vector<std::pair<uint64_t, Bytes>> kTimedPackets = {
    {1'700'000'000'000'001, {16, 1}}, {1'700'000'000'000'000, Bytes(4096, 121)}, {UINT64_MAX, {96, 0, 0, 1, 2}}};

TEST(CaptureConversion, GoesThereAndBack) {
  const Bytes capture = CaptureOf(kTimedPackets);
  const auto exported = Export(capture);
  EXPECT_EQ(exported.conversion.packets, 3u);
  EXPECT_FALSE(exported.conversion.cut);
  const test::PcapngReading reading(exported.bytes);
  EXPECT_TRUE(reading.whole);
  ASSERT_EQ(reading.packets.size(), kTimedPackets.size());
  for (size_t i = 0; i < kTimedPackets.size(); ++i) {
    EXPECT_EQ(reading.packets[i].microseconds, kTimedPackets[i].first);
    EXPECT_EQ(reading.packets[i].data, kTimedPackets[i].second);
    EXPECT_FALSE(reading.packets[i].sent());
  }
  const auto imported = Import(exported.bytes);
  EXPECT_EQ(imported.bytes, capture);
  EXPECT_EQ(imported.conversion.packets, 3u);
  EXPECT_EQ(imported.conversion.skipped, 0u);
}

TEST(CaptureConversion, CutFilesGiveTheirWholePacketsAndSaySo) {
  const Bytes capture = CaptureOf({{1, {16, 1}}, {2, {16, 2, 3}}});
  const Bytes pcapng = Export(capture).bytes;
  for (size_t size = 0; size < capture.size(); ++size) {
    const auto exported = Export({capture.begin(), capture.begin() + static_cast<std::ptrdiff_t>(size)});
    EXPECT_EQ(exported.conversion.end, size < 16 ? End::kForeign : End::kDone) << size;
    EXPECT_EQ(exported.conversion.packets, size >= 30 ? 1u : 0u) << size;
    EXPECT_EQ(exported.conversion.cut, size > 16 && size != 30) << size;
  }
  const size_t packet = 32 + 4 + 8 + 4;  // a packet of up to 4 bytes
  const size_t begin = pcapng.size() - 2 * packet;
  size_t whole = 0;
  for (size_t size = 0; size < pcapng.size(); ++size) {
    const auto imported = Import({pcapng.begin(), pcapng.begin() + static_cast<std::ptrdiff_t>(size)});
    EXPECT_EQ(imported.conversion.packets, size >= begin + packet ? 1u : 0u) << size;
    if (imported.conversion.end == End::kDone && !imported.conversion.cut) ++whole;
  }
  EXPECT_EQ(whole, 3u) << "behind the section, its interface and the first packet it may have ended";
}

TEST(CaptureConversion, TakesWhatOthersHaveWritten) {
  const auto file = [](std::initializer_list<Bytes> blocks) {
    Bytes all;
    for (const Bytes& block : blocks) Append(all, block);
    return all;
  };
  const auto block = [](uint32_t type, const Bytes& body) {
    Bytes bytes(8);
    StoreLe<uint32_t>(bytes, 0, type);
    StoreLe<uint32_t>(bytes, 4, static_cast<uint32_t>(body.size()) + 12);
    Append(bytes, body);
    bytes.insert(bytes.end(), bytes.begin() + 4, bytes.begin() + 8);
    return bytes;
  };
  Bytes section;
  pcapng::AppendSection(section, "");
  const auto interface = [&](uint16_t link, std::optional<uint8_t> resolution) {
    Bytes body = {static_cast<uint8_t>(link), 0, 0, 0, 0, 0, 0, 0};
    if (resolution) Append(body, Bytes{9, 0, 1, 0, *resolution, 0, 0, 0, 0, 0, 0, 0});
    return block(1, body);
  };
  const auto packet = [](uint32_t number, uint64_t time, uint32_t flags, const Bytes& data) {
    Bytes bytes;
    pcapng::AppendPacket(bytes, {number, time, flags, "a comment", data});
    return bytes;
  };
  const Bytes log = {16, 1, 2};
  Bytes big_endian = section;
  std::reverse(big_endian.begin() + 8, big_endian.begin() + 12);
  Bytes crooked = packet(0, 1, 1, log);
  crooked[crooked.size() - 4] ^= 4;
  Bytes liar = packet(0, 1, 1, log);
  StoreLe<uint32_t>(liar, 8 + 12, 5000);
  const struct {
    const char* name;
    Bytes file;
    End end;
    std::vector<uint64_t> times;
    uint64_t skipped;
    bool cut;
  } cases[] = {
      {"no resolution", file({section, interface(147, {}), packet(0, 7, 1, log)}), {}, {7}, 0, false},
      {"nanoseconds", file({section, interface(147, 9), packet(0, 7999, 1, log)}), {}, {7}, 0, false},
      {"seconds", file({section, interface(147, 0), packet(0, 7, 1, log)}), {}, {7000000}, 0, false},
      {"halves", file({section, interface(147, 0x81), packet(0, 7, 1, log)}), {}, {3500000}, 0, false},
      {"tiny parts",
       file({section, interface(147, 0x80 | 63), packet(0, 3ull << 62, 1, log)}),
       {},
       {1500000},
       0,
       false},
      {"no units at all", file({section, interface(147, 0xFF), packet(0, 7, 1, log)}), {}, {0}, 0, false},
      {"no direction", file({section, interface(147, {}), packet(0, 7, 0, log)}), {}, {7}, 0, false},
      {"others",
       file({section, interface(1, {}), interface(147, {}), packet(0, 1, 1, log), packet(1, 2, 2, log),
             packet(1, 3, 1, {47, 1, 2}), packet(1, 4, 1, {16}), packet(1, 5, 1, Bytes(4097, 16)),
             packet(1, 6, 1, log)}),
       {},
       {6},
       5,
       false},
      {"unknown blocks",
       file({section, block(0xBAD, {1, 2, 3, 4}), interface(147, {}), block(3, Bytes(8)), packet(0, 7, 1, log),
             block(5, Bytes(12))}),
       {},
       {7},
       0,
       false},
      {"two sections",
       file({section, interface(147, {}), packet(0, 1, 1, log), section, interface(148, {}), interface(147, {}),
             packet(1, 2, 1, log)}),
       {},
       {1, 2},
       0,
       false},
      {"no interface", file({section, packet(0, 1, 1, log)}), {}, {}, 0, true},
      {"lengths differ", file({section, interface(147, {}), packet(0, 1, 1, log), crooked}), {}, {1}, 0, true},
      {"length lies", file({section, interface(147, {}), packet(0, 1, 1, log), liar}), {}, {1}, 0, true},
      {"endless block", file({section, {6, 0, 0, 0, 0xFC, 0xFF, 0xFF, 0xFF}}), {}, {}, 0, true},
      {"other byte order", big_endian, End::kForeign, {}, 0, false},
      {"no section", interface(147, {}), End::kForeign, {}, 0, false},
      {"a capture", CaptureOf(kTimedPackets), End::kForeign, {}, 0, false},
  };
  for (const auto& each : cases) {
    SCOPED_TRACE(each.name);
    const auto imported = Import(each.file);
    EXPECT_EQ(imported.conversion.end, each.end);
    if (each.end != End::kDone) continue;
    EXPECT_EQ(imported.conversion.skipped, each.skipped);
    EXPECT_EQ(imported.conversion.cut, each.cut);
    std::vector<std::pair<uint64_t, Bytes>> packets;
    for (const uint64_t time : each.times) packets.emplace_back(time, log);
    EXPECT_EQ(imported.bytes, CaptureOf(packets));
  }
}

TEST(CaptureConversion, FullDiskEndsIt) {
  const auto full = [](std::span<const uint8_t>) { return false; };
  EXPECT_EQ(CaptureToPcapng(CaptureOf(CaptureOf(kTimedPackets)), "", full).end, End::kNotWritten);
  EXPECT_EQ(PcapngToCapture(CaptureOf(Export(CaptureOf(kTimedPackets)).bytes), full).end, End::kNotWritten);
}

}  // namespace
}  // namespace kral
