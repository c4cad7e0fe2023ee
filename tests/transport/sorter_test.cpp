// The sorter: which packet goes where, what is logged of it, and the events of a report.
#include "base/hex_dump.h"
#include "tests/support/log_lines.h"
#include "tests/support/test.h"
#include "transport/collection/event_report.h"
#include "transport/collection/kral_event_listener.h"

namespace kral {
namespace {

struct Sorted {
  size_t responses, asynchronous, events;
  bool operator==(const Sorted&) const = default;
};
void PrintTo(const Sorted& s, std::ostream* out) {
  *out << s.responses << " responses, " << s.asynchronous << " asynchronous, " << s.events << " events";
}

class Sorter : public testing::Test {
 protected:
  Sorted Counts() const { return {responses_.size(), asynchronous_.size(), events_.size()}; }

  LogLines log_;
  PacketQueue responses_;
  PacketQueue asynchronous_;
  BoundedQueue<EventRecord> events_;
  CKralEventListener sorter_{responses_, asynchronous_, events_, *log_.log()};
};

// One event: id 5, truncated time stamp, no payload.
const Packet kReport = {96, 4, 0, 0x05, 0x80, 0xAA, 0xBB, 0xF1, 0xF2};

TEST_F(Sorter, FirstByteDecidesTheQueue) {
  struct Case {
    Packet packet;
    bool collecting;
    Sorted expected;
    const char* line;  // flag and text up to the dump
  };
  const Case cases[] = {
      {{0, 1, 2}, false, {1, 0, 0}, "1 SYNC REC--listener--(3 bytes): "},
      {{75, 1, 2}, true, {1, 0, 0}, "1 SYNC REC--listener--(3 bytes): "},
      {{16, 1, 2}, true, {0, 1, 0}, "8 ASYNC REC (3 bytes): "},
      {{16, 1, 2}, false, {0, 0, 0}, "8 ASYNC REC (3 bytes): "},
      {{31, 1}, true, {0, 1, 0}, "8 ASYNC REC (2 bytes): "},
      {{121, 1}, true, {0, 1, 0}, "8 ASYNC REC (2 bytes): "},
      {{146, 1}, true, {0, 1, 0}, "8 ASYNC REC (2 bytes): "},
      {kReport, true, {0, 1, 1}, "8 ASYNC REC (9 bytes): "},
      {kReport, false, {0, 0, 0}, "8 ASYNC REC (9 bytes): "},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE("first byte " + std::to_string(c.packet[0]) + (c.collecting ? ", collecting" : ""));
    responses_.Clear();
    asynchronous_.Clear();
    events_.Clear();
    log_.Take();
    sorter_.SetCollection(c.collecting);
    sorter_.OnPacket(c.packet);
    EXPECT_EQ(Counts(), c.expected);
    EXPECT_EQ(log_.Take().at(0), c.line + HexDump(c.packet));
  }
  EXPECT_EQ(sorter_.dropped_not_collecting(), 2u);
}

TEST_F(Sorter, TakesPacketsOf2To4096Bytes) {
  for (const size_t size : {size_t{0}, size_t{1}, size_t{4097}, size_t{40960}}) sorter_.OnPacket(Packet(size, 3));
  EXPECT_EQ(Counts(), (Sorted{0, 0, 0}));
  EXPECT_EQ(sorter_.dropped_by_size(), 4u);
  for (const size_t size : {size_t{2}, size_t{4096}}) sorter_.OnPacket(Packet(size, 3));
  EXPECT_EQ(Counts(), (Sorted{2, 0, 0}));
}

TEST_F(Sorter, ClaimedReportIsAResponseWhateverTheCollection) {
  class Claimer final : public EventHandler {
   public:
    bool Claims(std::span<const uint8_t> report) override { return report[3] == 5; }
  } claimer;
  sorter_.AddEventHandler(&claimer);
  log_.Take();
  sorter_.OnPacket(kReport);
  EXPECT_EQ(Counts(), (Sorted{1, 0, 0}));
  EXPECT_EQ(log_.Take().at(0), "1 ASYNC REC--listener--(9 bytes): " + HexDump(kReport));
  sorter_.RemoveEventHandler(&claimer);
  sorter_.SetCollection(true);
  sorter_.OnPacket(kReport);
  EXPECT_EQ(Counts(), (Sorted{1, 1, 1}));
}

TEST_F(Sorter, LogHandlersAreOfferedLogPackets) {
  class Collector final : public LogHandler {
   public:
    void OnLog(std::span<const uint8_t> packet) override { sizes.push_back(packet.size()); }
    std::vector<size_t> sizes;
  } collector;
  sorter_.AddLogHandler(&collector);
  sorter_.OnPacket(Packet{16, 1, 2});
  sorter_.OnPacket(Packet{31, 1});
  sorter_.RemoveLogHandler(&collector);
  sorter_.OnPacket(Packet{16, 1, 2});
  EXPECT_EQ(collector.sizes, std::vector<size_t>{3});
}

TEST_F(Sorter, EveryEventIsLoggedWithItsPayload) {
  sorter_.SetCollection(true);
  log_.Take();
  sorter_.OnPacket(Packet{96, 6, 0, 0x23, 0xC1, 0xAA, 0xBB, 0x11, 0x22, 0xF1, 0xF2});
  const auto lines = log_.Take();
  ASSERT_EQ(lines.size(), 3u);
  EXPECT_EQ(lines[1], "8 Event ID: 291, no text");
  EXPECT_EQ(lines[2], "8  Event payload data: 11 22 ");
}

TEST_F(Sorter, FailingCallbacksCostNoPacket) {
  static int calls;
  calls = 0;
  log_.log()->SetCallback([](uint32_t, const void*, uint32_t) { throw ++calls; }, 0);
  const auto packet = [](uint32_t, const uint8_t*, uintptr_t) { throw ++calls; };
  sorter_.SetRawPacketCallback(packet, 0);
  sorter_.SetCollectionCallbacks({packet, [](const KRAL_EVENT*, uintptr_t) { throw ++calls; }, 0});
  sorter_.SetCollection(true);
  sorter_.OnPacket(kReport);
  EXPECT_EQ(calls, 6) << "three callbacks, and three lines";
  EXPECT_EQ(Counts(), (Sorted{0, 1, 1}));
}

TEST_F(Sorter, UnreadEventsDropTheOldest) {
  sorter_.SetCollection(true);
  for (size_t i = 0; i < kQueueCapacity + 1; ++i) sorter_.OnPacket(Packet(kReport));
  EXPECT_EQ(events_.size(), kQueueCapacity);
  EXPECT_EQ(events_.dropped(), 1u);
  EXPECT_EQ(asynchronous_.dropped(), 1u);
}

// --- Event reports --------------------------------------------------------------------------------------------------

std::vector<Packet> RecordsOf(Packet events, int told = -1) {
  Packet packet = {96, 0, 0};
  const size_t length = told < 0 ? events.size() : static_cast<size_t>(told);
  packet[1] = static_cast<uint8_t>(length);
  packet[2] = static_cast<uint8_t>(length >> 8);
  packet.insert(packet.end(), events.begin(), events.end());
  packet.insert(packet.end(), {0xF1, 0xF2});
  std::vector<Packet> records;
  EventReportReader reader(packet);
  while (const auto event = reader.Next()) records.emplace_back(event->record.bytes.begin(), event->record.bytes.end());
  return records;
}

Packet Record(Packet head) {
  head.resize(EventRecord::kSize);
  return head;
}

TEST(EventReport, EveryFormByteForByte) {
  const Packet full = {1, 2, 3, 4, 5, 6, 7, 8};
  struct Case {
    const char* name;
    Packet event;
    Packet record;  // the rest is zero
  };
  const Case cases[] = {
      {"full time stamp", {0x34, 0x02, 1, 2, 3, 4, 5, 6, 7, 8}, {8, 1, 2, 3, 4, 5, 6, 7, 8, 0x34, 0x02, 0}},
      {"truncated time stamp", {0x34, 0x82, 1, 2}, {2, 1, 2, 0, 0, 0, 0, 0, 0, 0x34, 0x02, 0}},
      {"one byte, length stays 0", {0x01, 0xA0, 1, 2, 9}, {2, 1, 2, 0, 0, 0, 0, 0, 0, 1, 0, 0, 9}},
      {"two bytes, length stays 0", {0x01, 0xC0, 1, 2, 9, 8}, {2, 1, 2, 0, 0, 0, 0, 0, 0, 1, 0, 0, 9, 8}},
      {"counted payload", {0x01, 0xE0, 1, 2, 3, 7, 8, 9}, {2, 1, 2, 0, 0, 0, 0, 0, 0, 1, 0, 3, 7, 8, 9}},
      {"empty counted payload", {0x01, 0xE0, 1, 2, 0}, {2, 1, 2, 0, 0, 0, 0, 0, 0, 1, 0, 0}},
      {"bit 12 is nobody's", {0xFF, 0x9F, 1, 2}, {2, 1, 2, 0, 0, 0, 0, 0, 0, 0xFF, 0x0F, 0}},
  };
  for (const Case& c : cases) EXPECT_EQ(RecordsOf(c.event), std::vector<Packet>{Record(c.record)}) << c.name;
}

TEST(EventReport, LongestPayloadFits) {
  Packet event = {0x01, 0xE0, 1, 2, 255};
  event.resize(event.size() + 255, 0x5A);
  const auto records = RecordsOf(event);
  ASSERT_EQ(records.size(), 1u);
  EXPECT_EQ(records[0][EventRecord::kPayloadLength], 255);
  EXPECT_EQ(records[0][EventRecord::kPayload + 254], 0x5A);
}

TEST(EventReport, StopsAtTheFirstEventThatDoesNotFit) {
  const Packet good = {0x01, 0x80, 1, 2};
  const Packet counted = {0x02, 0xE0, 1, 2, 4, 7, 8, 9, 10};
  Packet both = good;
  both.insert(both.end(), counted.begin(), counted.end());
  for (size_t size = 0; size <= both.size(); ++size) {
    const size_t expected = size == both.size() ? 2u : size >= good.size() ? 1u : 0u;
    EXPECT_EQ(RecordsOf(Packet(both.begin(), both.begin() + static_cast<std::ptrdiff_t>(size))).size(), expected);
    EXPECT_EQ(RecordsOf(both, static_cast<int>(size)).size(), expected) << "told " << size;
  }
  EXPECT_EQ(RecordsOf(both, 0xFFFF).size(), 2u) << "told more than came: the FCS bytes are no event";
  const Packet too_short = {96, 9, 0, 1};
  EXPECT_FALSE(EventReportReader(too_short).Next());
}

}  // namespace
}  // namespace kral
