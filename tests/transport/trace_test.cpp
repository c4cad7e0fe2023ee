// Traces: what is made of the bytes of a port, and what is lost of them where the disk is slow or full.
#include "tests/support/disk.h"
#include "tests/support/log_lines.h"
#include "tests/support/pcapng_reading.h"
#include "tests/support/plain_codec.h"
#include "tests/support/test.h"
#include "transport/trace/trace_writer.h"

namespace kral {
namespace {

using test::Bytes;
using test::Disk;
using test::PcapngReading;
using test::PlainFrame;
using test::WithFcs;

constexpr auto kIn = PortDirection::kReceived;
constexpr auto kOut = PortDirection::kSent;

Bytes operator+(Bytes a, const Bytes& b) {
  a.insert(a.end(), b.begin(), b.end());
  return a;
}

// A packet of the file in a line: "sent 2F 12 34 (comment)", "bytes" in front of what is in no frame.
std::string Line(const test::PcapngPacket& packet) {
  std::string line = packet.interface == 0 ? "" : "bytes ";
  line += packet.sent() ? "sent" : "received";
  const size_t fcs = (packet.flags >> 5) & 0xF;
  const bool good = (packet.flags & 1U << 24) == 0;
  if (fcs != 0 && good) {
    EXPECT_EQ(WithFcs({packet.data.begin(), packet.data.end() - 2}), packet.data);
  }
  for (size_t i = 0; i + fcs < packet.data.size() && i < 6; ++i) {
    constexpr char kDigits[] = "0123456789ABCDEF";
    line += std::string(" ") + kDigits[packet.data[i] >> 4] + kDigits[packet.data[i] & 15];
  }
  if (packet.data.size() - fcs > 6) line += "...";
  return line + (packet.comment.empty() ? "" : " (" + packet.comment + ")");
}

std::vector<std::string> LinesOf(const PcapngReading& reading) {
  std::vector<std::string> lines;
  for (const auto& packet : reading.packets) lines.push_back(Line(packet));
  return lines;
}

class Trace : public testing::Test {
 protected:
  void Begin(Disk& disk, size_t room = BatchWriter::kDefaultRoom) {
    writer_ = std::make_unique<TraceWriter>(*log_.log(), room);
    ASSERT_TRUE(writer_->Start({"test", "COM7", "a port"}, disk.Opener(), nullptr));
  }
  void Receive(const Bytes& bytes) { writer_->OnBytes(kIn, PortContent::kFrames, bytes); }
  void Send(const Bytes& bytes) { writer_->OnBytes(kOut, PortContent::kFrames, bytes); }

  test::LogLines log_;
  std::unique_ptr<TraceWriter> writer_;
};

TEST_F(Trace, TellsFramesFromWhatIsNone) {
  const Bytes frame = PlainFrame({0x2F, 0x7E, 0x7D});
  Bytes bad = frame;
  bad[0] ^= 1;
  const struct {
    const char* name;
    std::function<void(TraceWriter&)> pass;
    std::vector<std::string> lines;
  } cases[] = {
      {"both directions",
       [&](auto& t) { t.OnBytes(kOut, {}, PlainFrame({1}, true)), t.OnBytes(kIn, {}, frame); },
       {"sent 01", "received 2F 7E 7D"}},
      {"torn and glued",
       [&](auto& t) {
         t.OnBytes(kIn, {}, {frame.data(), 2});
         t.OnBytes(kOut, {}, PlainFrame({2}));
         t.OnBytes(kIn, {}, Bytes(frame.begin() + 2, frame.end()) + Bytes{0x7E} + PlainFrame({3}));
       },
       {"sent 02", "received 2F 7E 7D", "received 03"}},
      {"bad FCS",
       [&](auto& t) { t.OnBytes(kIn, {}, bad + frame); },
       {"received 2E 7E 7D (bad frame: the FCS does not fit)", "received 2F 7E 7D"}},
      {"too short",
       [&](auto& t) {
         t.OnBytes(kIn, {}, Bytes{7, 8, 0x7E} + frame);
       },
       {"bytes received 07 08 (noise: too short for a frame)", "received 2F 7E 7D"}},
      {"zeros of a line that idles",
       [&](auto& t) { t.OnBytes(kIn, {}, Bytes(3)), t.OnBytes(kIn, {}, frame); },
       {"bytes received 00 00 00 (noise: zeros)", "received 2F 7E 7D"}},
      {"no end of it",
       [&](auto& t) { t.OnBytes(kIn, {}, Bytes(40000, 1)), t.OnBytes(kIn, {}, frame); },
       {"bytes received 01 01 01 01 01 01... (noise: too long for a frame)", "received 2F 7E 7D"}},
      {"sent without a frame",
       [&](auto& t) {
         t.OnBytes(kOut, {}, Bytes{'A', 'T'}), t.OnBytes(kOut, {}, frame);
       },
       {"bytes sent 41 54 (no frame)", "sent 2F 7E 7D"}},
      {"a content without frames",
       [&](auto& t) {
         t.OnBytes(kIn, {}, Bytes{9});
         t.OnBytes(kIn, PortContent::kBytes, Bytes{0x41, 0x7E});
         t.OnBytes(kIn, {}, frame);
       },
       {"bytes received 09 (an unfinished frame)", "bytes received 41 7E", "received 2F 7E 7D"}},
      {"given up, and opened again",
       [&](auto& t) {
         t.OnBytes(kIn, {}, Bytes{5});
         t.OnGivenUp();
         t.OnBytes(kIn, {}, frame + Bytes{6});
         t.OnOpened();
         t.OnBytes(kIn, {}, frame);
       },
       {"bytes received 05 (an unfinished frame)", "received 2F 7E 7D", "bytes received 06 (an unfinished frame)",
        "received 2F 7E 7D (the port was opened)"}},
      {"short write",
       [&](auto& t) { t.OnBytes(kOut, {}, frame), t.OnShortWrite(2, 9); },
       {"sent 2F 7E 7D", "bytes sent (of what was sent last only 2 of 9 bytes were written)"}},
      {"an end in the midst",
       [&](auto& t) { t.OnBytes(kIn, {}, Bytes{5}); },
       {"bytes received 05 (an unfinished frame)"}},
  };
  for (const auto& each : cases) {
    SCOPED_TRACE(each.name);
    Disk disk;
    Begin(disk);
    each.pass(*writer_);
    EXPECT_TRUE(writer_->Stop());
    const PcapngReading reading(disk.content());
    EXPECT_TRUE(reading.whole);
    EXPECT_EQ(LinesOf(reading), each.lines);
    // The latest traffic, kept, makes the same file.
    ASSERT_TRUE(writer_->KeepLatest(1 << 20));
    each.pass(*writer_);
    Disk saved;
    EXPECT_TRUE(writer_->Save({"test", "COM7", "a port"}, saved.Opener()));
    EXPECT_EQ(LinesOf(PcapngReading(saved.content())), each.lines);
    EXPECT_TRUE(writer_->Stop());
  }
}

TEST_F(Trace, FramesOfASlowDiskAreWrittenOrCountedWhateverTheReads) {
  std::mt19937 random(20);
  uint64_t lost = 0;
  for (int round = 0; round < 20; ++round) {
    Disk disk;
    Begin(disk, 2000);
    std::vector<Bytes> sent;
    Bytes line;
    for (int i = 0; i < 300; ++i) {
      sent.push_back({16, static_cast<uint8_t>(i), static_cast<uint8_t>(i >> 8), 0x7E});
      line = line + PlainFrame(sent.back(), i % 3 == 0);
    }
    for (size_t at = 0; at < line.size();) {
      disk.Hold(random() % 4 != 0);
      if (random() % 16 == 0) std::this_thread::sleep_for(std::chrono::milliseconds(1));
      const size_t count = std::min<size_t>(1 + random() % 40, line.size() - at);
      Receive({line.begin() + static_cast<std::ptrdiff_t>(at), line.begin() + static_cast<std::ptrdiff_t>(at + count)});
      at += count;
    }
    disk.Hold(false);
    writer_->Stop(5000);
    const auto counters = writer_->counters();
    EXPECT_EQ(counters.frames + counters.lost, sent.size()) << round;
    lost += counters.lost;
    EXPECT_EQ(counters.bad + counters.others, 0u) << "the rest of a lost frame is no noise";
    const PcapngReading reading(disk.content());
    EXPECT_EQ(reading.packets.size(), counters.frames);
    EXPECT_EQ(reading.statistics.at(0), std::pair(uint64_t{sent.size()}, counters.lost));
    size_t next = 0;
    for (const auto& packet : reading.packets) {
      const Bytes payload(packet.data.begin(), packet.data.end() - 2);
      const size_t number = payload.at(1) | static_cast<size_t>(payload.at(2)) << 8;
      if (number != next) {
        EXPECT_EQ(packet.comment, "frames are missing here: the disk is too slow") << number;
      }
      ASSERT_GE(number, next);
      next = number + 1;
    }
  }
  EXPECT_GT(lost, 0u) << "the disk was fast enough, and nothing was shown";
}

TEST_F(Trace, FullDiskCostsWhatIsBehindItAndNothingElse) {
  const Bytes frame = PlainFrame({16, 1});
  Disk whole;
  Begin(whole);
  Receive(frame);
  writer_->Stop();
  // The statistics at the end, 52 bytes for each interface, do not fit, and half a packet does.
  Disk disk(whole.content().size() - 2 * 52 + 30);
  Begin(disk);
  for (int i = 0; i < 4; ++i) Receive(frame);
  EXPECT_FALSE(writer_->Stop());
  EXPECT_EQ(writer_->counters().frames, 1u);
  EXPECT_EQ(writer_->counters().lost, 3u);
  const PcapngReading reading(disk.content());
  EXPECT_EQ(LinesOf(reading), std::vector<std::string>{"received 10 01"});
  EXPECT_FALSE(reading.whole);
  EXPECT_EQ(log_.Take().back(), "16 Trace file: frames are lost, the file cannot be written any more");
  Disk none(10);
  EXPECT_FALSE(writer_->Start({}, none.Opener(), nullptr)) << "not even the beginning";
}

TEST_F(Trace, KeepsTheLatestAndSaysThatItIsNotAll) {
  writer_ = std::make_unique<TraceWriter>(*log_.log());
  ASSERT_TRUE(writer_->KeepLatest(200));
  Bytes line;
  for (uint8_t i = 0; i < 50; ++i) line = line + PlainFrame({16, i});
  for (size_t at = 0; at < line.size(); at += 7) {
    Receive({line.begin() + static_cast<std::ptrdiff_t>(at),
             line.begin() + static_cast<std::ptrdiff_t>(std::min(at + 7, line.size()))});
  }
  for (int i = 0; i < 2; ++i) {
    Disk disk;
    EXPECT_TRUE(writer_->Save({"test", "COM7", "a port"}, disk.Opener())) << "it goes on being kept";
    const auto lines = LinesOf(PcapngReading(disk.content()));
    ASSERT_GE(lines.size(), 5u);
    EXPECT_LE(lines.size(), 10u);
    EXPECT_TRUE(lines.front().ends_with("(earlier traffic is not kept)")) << lines.front();
    EXPECT_EQ(lines.back(), "received 10 31");
    for (const auto& text : lines) EXPECT_TRUE(text.starts_with("received 10 ")) << text << " is no rest of a frame";
  }
  Disk disk;
  EXPECT_FALSE(writer_->Start({}, disk.Opener(), nullptr)) << "one at a time";
  EXPECT_EQ(disk.opened(), 0);
}

}  // namespace
}  // namespace kral
