// Capture files: what the writer keeps when the disk does not, what the reader makes of damaged files, and the paces of
// a playback.
#include "base/little_endian.h"
#include "platform/folder.h"
#include "tests/support/disk.h"
#include "tests/support/engine_bundle.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"
#include "transport/collection/capture_blocks.h"
#include "transport/collection/capture_format.h"
#include "transport/collection/capture_player.h"
#include "transport/collection/capture_reader.h"
#include "transport/collection/capture_seek.h"
#include "transport/collection/capture_series.h"
#include "transport/collection/capture_writer.h"

namespace kral {
namespace {

using Outcome = CaptureReader::Outcome;

using test::Disk;

CaptureSource SourceOf(Packet bytes) {
  return [bytes = std::move(bytes), at = size_t{0}](std::span<uint8_t> buffer) mutable {
    const size_t count = std::min(buffer.size(), bytes.size() - at);
    std::copy_n(bytes.begin() + static_cast<std::ptrdiff_t>(at), count, buffer.begin());
    at += count;
    return count;
  };
}

struct Reading {
  std::vector<Packet> packets;
  Outcome end;
};

Reading ReadAll(const Packet& bytes) {
  CaptureReader reader(SourceOf(bytes));
  Reading reading;
  CaptureRecord record;
  while ((reading.end = reader.Next(record)) == Outcome::kRecord) reading.packets.push_back(record.packet);
  EXPECT_EQ(reader.Next(record), reading.end) << "it goes on giving that";
  return reading;
}

Packet Capture(const std::vector<Packet>& packets, CaptureLayout layout = {}) {
  Disk disk;
  CaptureWriter writer(NullLog());
  EXPECT_TRUE(writer.Start(disk.Opener(), nullptr, layout));
  for (const Packet& packet : packets) writer.Append(packet);
  EXPECT_TRUE(writer.Stop());
  return disk.content();
}

const std::vector<Packet> kPackets = {{16, 1}, Packet(4096, 121), {96, 0, 0, 1, 2}};

TEST(CaptureFile, HoldsWhatWasAppended) {
  const auto before = std::chrono::system_clock::now().time_since_epoch();
  Packet odd(4097, 16);
  const Packet file = Capture({kPackets[0], Packet{16}, odd, kPackets[1], kPackets[2]});
  const Reading reading = ReadAll(file);
  EXPECT_EQ(reading.packets, kPackets) << "packets of a size that is none are left out";
  EXPECT_EQ(reading.end, Outcome::kEnd);

  const Packet head = {'K', 'R', 'A', 'L', 'C', 'A', 'P', 0x1A, 1, 0, 16, 0, 0, 0, 0, 0};
  EXPECT_EQ(Packet(file.begin(), file.begin() + 16), head);
  EXPECT_EQ(Packet(file.begin() + 24, file.begin() + 30), (Packet{2, 0, 0xFD, 0xFF, 16, 1}));
  const auto stamp = *LoadLe<uint64_t>(file, 16);
  const auto first = static_cast<uint64_t>(std::chrono::duration_cast<std::chrono::microseconds>(before).count());
  EXPECT_GE(stamp, first);
  EXPECT_LT(stamp, first + 60'000'000);
}

TEST(CaptureFile, CutFileIsReadUpToItsLastWholePacket) {
  const Packet file = Capture({{16, 1}, {16, 2, 3}});
  ASSERT_EQ(file.size(), 16u + 14u + 15u);
  for (size_t size = 0; size <= file.size(); ++size) {
    const Reading reading = ReadAll(Packet(file.begin(), file.begin() + static_cast<std::ptrdiff_t>(size)));
    EXPECT_EQ(reading.packets.size(), size == 45 ? 2u : size >= 30 ? 1u : 0u) << size;
    const bool whole = size == 16 || size == 30 || size == 45;
    EXPECT_EQ(reading.end, size < 16 ? Outcome::kForeign : whole ? Outcome::kEnd : Outcome::kCut) << size;
  }
}

TEST(CaptureFile, DamageEndsTheReadingAndForeignFilesAreRefused) {
  const Packet file = Capture({{16, 1}, {16, 2}});
  const struct {
    const char* name;
    size_t offset;
    Packet bytes;
    size_t packets;
    Outcome end;
  } cases[] = {
      {"magic", 3, {'X'}, 0, Outcome::kForeign},
      {"later version", 8, {3}, 0, Outcome::kForeign},
      {"head too short", 10, {15}, 0, Outcome::kForeign},
      {"head beyond the end", 10, {0, 1}, 0, Outcome::kCut},
      {"longer head", 10, {30}, 1, Outcome::kEnd},
      {"length", 38, {3}, 1, Outcome::kCut},
      {"complement", 40, {0}, 1, Outcome::kCut},
      {"length of no packet", 38, {1, 0, 0xFE, 0xFF}, 1, Outcome::kCut},
      {"length beyond every packet", 38, {1, 0x10, 0xFE, 0xEF}, 1, Outcome::kCut},
      {"zeros behind a crash", 30, Packet(14, 0), 1, Outcome::kCut},
  };
  for (const auto& c : cases) {
    Packet damaged = file;
    std::ranges::copy(c.bytes, damaged.begin() + static_cast<std::ptrdiff_t>(c.offset));
    const Reading reading = ReadAll(damaged);
    EXPECT_EQ(reading.packets.size(), c.packets) << c.name;
    EXPECT_EQ(reading.end, c.end) << c.name;
  }
  EXPECT_FALSE(OpenCaptureSource("/nonexistent/capture"));
  CaptureReader failing([whole = SourceOf(file), calls = 0](std::span<uint8_t> buffer) mutable {
    return ++calls <= 4 ? whole(buffer) : std::nullopt;  // the head, nothing of it left, and a record
  });
  CaptureRecord first;
  EXPECT_EQ(failing.Next(first), Outcome::kRecord);
  EXPECT_EQ(failing.Next(first), Outcome::kCut) << "a disk that fails between two records is no end of the file";
  CaptureRecord record;
  EXPECT_EQ(CaptureReader({}).Next(record), Outcome::kForeign);
}

TEST(CaptureFile, FullDiskIsCountedAndLoggedOnce) {
  test::LogLines log;
  Disk disk(16 + 14 + 5);
  CaptureWriter writer(*log.log());
  ASSERT_TRUE(writer.Start(disk.Opener(), nullptr));
  writer.Append(kPackets[0]);
  ASSERT_TRUE(Eventually([&] { return writer.written() == 1; }));
  log.Take();
  for (int i = 0; i < 3; ++i) {
    writer.Append(kPackets[0]);
    ASSERT_TRUE(Eventually([&] { return writer.lost() == static_cast<uint64_t>(i) + 1; }));
  }
  EXPECT_EQ(log.Take(),
            test::LogLines::Lines{"16 Capture file: packets are lost, the file cannot be written any more"});
  EXPECT_FALSE(writer.Stop()) << "not everything is in the file";
  EXPECT_EQ(ReadAll(disk.content()).packets.size(), 1u);
  EXPECT_EQ(writer.written(), 1u);

  Disk full(3);
  EXPECT_FALSE(writer.Start(full.Opener(), nullptr)) << "not even the head";
  Disk good;
  ASSERT_TRUE(writer.Start(good.Opener(), nullptr));
  writer.Append(kPackets[0]);
  EXPECT_TRUE(writer.Stop()) << "the next capture is judged by itself";
  writer.Append(kPackets[0]);
  EXPECT_EQ(ReadAll(good.content()).packets.size(), 1u) << "what comes after the end is left out";
}

TEST(CaptureFile, SlowDiskCostsPacketsAndHoldsNobodyUp) {
  test::LogLines log;
  Disk disk;
  CaptureWriter writer(*log.log(), 100);
  ASSERT_TRUE(writer.Start(disk.Opener(), nullptr));
  disk.Hold(true);
  writer.Append(kPackets[0]);
  ASSERT_TRUE(Eventually([&] { return disk.writes() == 2; })) << "the writer is in the disk's hands";
  for (int i = 0; i < 10; ++i) writer.Append(kPackets[0]);
  EXPECT_EQ(writer.lost(), 3u) << "seven records of 14 bytes have room";
  EXPECT_EQ(log.Take(), test::LogLines::Lines{"16 Capture file: packets are lost, the disk is too slow"});
  EXPECT_EQ(writer.pending(), 8u) << "the one in the disk's hands, too";
  for (int i = 0; i < 2; ++i) {
    EXPECT_FALSE(writer.Stop(1)) << "the wait has an end";
    EXPECT_EQ(writer.state(), CaptureState::kEnding);
    EXPECT_EQ(log.Take(), test::LogLines::Lines{"16 Capture file: 8 packets still wait for the disk"});
    EXPECT_FALSE(writer.Start(disk.Opener(), nullptr));
  }
  EXPECT_EQ(disk.opened(), 1) << "the file that is written still is not emptied";
  disk.Hold(false);
  EXPECT_FALSE(writer.Stop(5000)) << "three are lost";
  EXPECT_EQ(writer.state(), CaptureState::kNone);
  EXPECT_EQ(writer.pending(), 0u);
  EXPECT_EQ(ReadAll(disk.content()).packets.size(), 8u);
  Disk next;
  EXPECT_TRUE(writer.Start(next.Opener(), nullptr)) << "and the next capture may begin";
}

TEST(CaptureFile, RecordsInFrontOfTheOneThatTheDiskCutAreNoLoss) {
  Disk disk(16 + 3 * 14 + 5);
  CaptureWriter writer(NullLog());
  ASSERT_TRUE(writer.Start(disk.Opener(), nullptr));
  disk.Hold(true);
  writer.Append(kPackets[0]);
  ASSERT_TRUE(Eventually([&] { return disk.writes() == 2; }));
  for (int i = 0; i < 5; ++i) writer.Append(kPackets[0]);
  disk.Hold(false);
  EXPECT_FALSE(writer.Stop(5000));
  EXPECT_EQ(writer.written(), 3u);
  EXPECT_EQ(writer.lost(), 3u);
  EXPECT_EQ(ReadAll(disk.content()).packets.size(), 3u);
}

TEST(CaptureFile, IsWrittenByOneAloneAndNeverUnderAPlayback) {
  const test::TempFolder folder;
  const std::string path = folder.Path("capture");
  CaptureWriter first(NullLog());
  CaptureWriter second(NullLog());
  const auto open = [&path] { return OpenCaptureFile(path); };
  ASSERT_TRUE(first.Start(open, nullptr));
  first.Append(kPackets[0]);
  EXPECT_FALSE(second.Start(open, nullptr)) << "half of each would be lost";
  EXPECT_FALSE(OpenCaptureSource(path)) << "it has no end yet";
  EXPECT_TRUE(first.Stop());
  EXPECT_EQ(std::filesystem::file_size(path), 30u) << "as large as the first one has made it";
  std::vector<CaptureSource> players = {OpenCaptureSource(path), OpenCaptureSource(path)};
  EXPECT_TRUE(players[0] && players[1]) << "any number may play it";
  EXPECT_FALSE(second.Start(open, nullptr));
  EXPECT_EQ(std::filesystem::file_size(path), 30u);
  players.clear();
  EXPECT_TRUE(second.Start(open, nullptr));
}

// --- Times ----------------------------------------------------------------------------------------------------------

class CaptureTimes : public testing::Test {
 protected:
  // Packets whose content looks like records, a second apart or some of them at once.
  Packet Make(size_t packets, bool noise = false) {
    std::mt19937 random(7);
    const auto head = CaptureHead();
    Packet file(head.begin(), head.end());
    uint64_t time = 1000;
    for (size_t i = 0; i < packets; ++i) {
      time += random() % 3 == 0 ? 0 : random() % 2000;
      Packet packet(2 + random() % 900, 16);
      if (noise) std::ranges::generate(packet, [&random] { return static_cast<uint8_t>(random()); });
      if (random() % 2 == 0) {
        const auto lure = CaptureRecordHead(random(), 2 + random() % 300);
        for (size_t at = 0; at + lure.size() <= packet.size(); at += lure.size()) {
          std::ranges::copy(lure, packet.begin() + static_cast<std::ptrdiff_t>(at));
        }
      }
      times_.push_back(time);
      offsets_.push_back(file.size());
      const auto record = CaptureRecordHead(time, packet.size());
      file.insert(file.end(), record.begin(), record.end());
      file.insert(file.end(), packet.begin(), packet.end());
    }
    return file;
  }
  uint64_t Find(const Packet& file, uint64_t time) {
    const CaptureBytes bytes = [&](uint64_t offset, std::span<uint8_t> buffer) -> std::optional<size_t> {
      ++reads_;
      const size_t at = std::min<size_t>(offset, file.size());
      const size_t count = std::min(buffer.size(), file.size() - at);
      std::copy_n(file.begin() + static_cast<std::ptrdiff_t>(at), count, buffer.begin());
      return count;
    };
    return FindCaptureTime(bytes, capture_head::kSize, file.size(), time);
  }
  uint64_t Expected(const Packet& file, uint64_t time) {
    const auto found = std::ranges::lower_bound(times_, time);
    return found == times_.end() ? file.size() : offsets_[static_cast<size_t>(found - times_.begin())];
  }

  std::vector<uint64_t> times_;
  std::vector<uint64_t> offsets_;
  size_t reads_ = 0;
};

TEST_F(CaptureTimes, AreFoundWithoutReadingTheFile) {
  const Packet file = Make(20000);
  std::mt19937 random(8);
  for (int i = 0; i < 200; ++i) {
    const uint64_t time = i == 0 ? 0 : i == 1 ? UINT64_MAX : 900 + random() % (times_.back() + 200);
    reads_ = 0;
    EXPECT_EQ(Find(file, time), Expected(file, time)) << time;
    EXPECT_LT(reads_, times_.size() / 3) << "most of it is passed over";
  }
}

TEST_F(CaptureTimes, AreFoundInACutFileAndInADamagedOneUpToTheDamage) {
  Packet file = Make(20000);
  file.resize(file.size() - 3);
  EXPECT_EQ(Find(file, times_[19000]), Expected(file, times_[19000]));
  EXPECT_EQ(Find(file, UINT64_MAX), offsets_.back()) << "the record that is cut";
  std::fill(file.begin() + static_cast<std::ptrdiff_t>(offsets_[12000]), file.end(), uint8_t{0});
  EXPECT_EQ(Find(file, times_[11000]), Expected(file, times_[11000]));
  EXPECT_EQ(Find(file, UINT64_MAX), offsets_[12000]);
}

TEST_F(CaptureTimes, StretchOfAFileIsReadFromItsFirstPacketToItsLast) {
  const test::TempFolder folder;
  const Packet file = Make(5000);
  const std::string path = folder.Add("capture", {reinterpret_cast<const char*>(file.data()), file.size()});
  const uint64_t from = times_[4000];
  const uint64_t to = times_[4100];
  CaptureReader reader(OpenCaptureSourceAt(path, from), {from, to});
  CaptureRecord record;
  std::vector<uint64_t> read;
  while (reader.Next(record) == Outcome::kRecord) read.push_back(record.microseconds);
  const std::vector<uint64_t> wanted(std::ranges::lower_bound(times_, from), std::ranges::upper_bound(times_, to));
  EXPECT_EQ(read, wanted);
  EXPECT_EQ(reader.Next(record), Outcome::kEnd);
  CaptureReader foreign(OpenCaptureSourceAt(folder.Add("foreign", "no capture at all, but long enough"), 1));
  EXPECT_EQ(foreign.Next(record), Outcome::kForeign);
}

// What is in the packets, and how the times go.
struct TimedFile {
  const char* name;
  Packet (*content)(size_t i);
  uint64_t (*time)(size_t i);
  uint32_t mark;  // of the head: by how much times step back, or 0
};

constexpr size_t kSoughtPackets = 1500;
constexpr uint64_t kHour = 3'600'000'000;
constexpr uint64_t kNoon = 1'700'000'000'000'000;

uint64_t Growing(size_t i) {
  return kNoon + i * 10'000;
}
uint64_t SetBack(size_t i) {
  return i < kSoughtPackets / 2 ? Growing(i) : Growing(i) - kHour;
}

// Random bytes, with the head of an early record or block here and there. Blocks are seldom: a stream would shrink
// them.
Packet Lures(size_t i, bool blocks, size_t first, size_t step) {
  std::mt19937 random(static_cast<uint32_t>(i));
  Packet packet(4000);
  std::ranges::generate(packet, [&random] { return static_cast<uint8_t>(random()); });
  packet[0] = 16;
  Packet lure(capture_block::kSize);
  if (blocks) {
    std::ranges::copy(capture_block::kMark, lure.begin());
    StoreLe(std::span(lure), capture_block::kStreamSize, uint32_t{5000});
    StoreLe(std::span(lure), capture_block::kStreamSizeComplement, ~uint32_t{5000});
    StoreLe(std::span(lure), capture_block::kRecordsSize, uint32_t{5000});
    StoreLe(std::span(lure), capture_block::kMicroseconds, uint64_t{77});
  } else {
    const auto head = CaptureRecordHead(77, step - capture_record::kSize);
    lure.assign(head.begin(), head.end());
  }
  if (blocks && i % 10 != 5) return packet;
  for (size_t at = first; at + lure.size() <= packet.size(); at += step) {
    std::ranges::copy(lure, packet.begin() + static_cast<std::ptrdiff_t>(at));
  }
  return packet;
}

const TimedFile kTimedFiles[] = {
    {"as they came", [](size_t i) { return Packet(2 + i % 4000, 16); }, Growing, 1},
    {"chains of records in each", [](size_t i) { return Lures(i, false, 4, 36); }, Growing, 1},
    {"a chain of records through all", [](size_t i) { return Lures(i, false, 700, 4012); }, Growing, 1},
    {"heads of blocks in each", [](size_t i) { return Lures(i, true, 100, 4000); }, Growing, 1},
    {"the clock was set back", [](size_t) { return Packet(4000, 16); }, SetBack, 3'600'001},
    {"nothing is known of times", [](size_t) { return Packet(4000, 16); }, SetBack, 0},
    {"more than can be said", [](size_t) { return Packet(4000, 16); }, SetBack, UINT32_MAX},
};

TEST(CaptureStretches, HoldEveryPacketOfTheirTimeWhateverIsInTheFile) {
  const test::TempFolder folder;
  for (const auto& c : kTimedFiles) {
    for (const bool compressed : {false, true}) {
      const auto head = CaptureHead(compressed ? capture_head::kBlocks : capture_head::kRecords);
      Packet file(head.begin(), head.end());
      StoreLe(std::span(file), 12, c.mark);
      Packet records;
      for (size_t i = 0; i < kSoughtPackets; ++i) {
        const Packet packet = c.content(i);
        const auto record = CaptureRecordHead(c.time(i), packet.size());
        records.insert(records.end(), record.begin(), record.end());
        records.insert(records.end(), packet.begin(), packet.end());
        if (compressed && i % 30 != 29) continue;
        const Packet piece = compressed ? MakeCaptureBlock(records) : records;
        file.insert(file.end(), piece.begin(), piece.end());
        records.clear();
      }
      const std::string path = folder.Add("capture", {reinterpret_cast<const char*>(file.data()), file.size()});
      for (const uint64_t from : {uint64_t{1}, c.time(400), c.time(700), c.time(1000), c.time(1490), UINT64_MAX - 9}) {
        const uint64_t to = from + 100'000 < from ? UINT64_MAX : from + 100'000;
        size_t wanted = 0;
        for (size_t i = 0; i < kSoughtPackets; ++i) wanted += c.time(i) >= from && c.time(i) <= to ? 1 : 0;
        CaptureReader reader(OpenCaptureSourceAt(path, from), {from, to});
        CaptureRecord record;
        size_t read = 0;
        while (reader.Next(record) == Outcome::kRecord) ++read;
        EXPECT_EQ(read, wanted) << c.name << ", compressed " << compressed << ", " << from;
        EXPECT_EQ(reader.Next(record), Outcome::kEnd) << c.name << ", compressed " << compressed << ", " << from;
      }
    }
  }
}

// --- Compressed, and in several files --------------------------------------------------------------------------------

const CaptureLayout kCompressed{.compressed = true};

// Every cut of the file is read up to its last whole record, which is never one that was not written.
TEST(CompressedCapture, CutOrDamagedIsReadAsFarAsItIsWhole) {
  std::vector<Packet> packets;
  std::mt19937 random(9);
  for (size_t i = 0; i < 400; ++i) {
    packets.emplace_back(2 + random() % 2000, 16);
    for (auto& byte : packets.back()) byte = i % 2 == 0 ? static_cast<uint8_t>(random()) : byte;
    packets.back()[0] = 16;
  }
  const Packet file = Capture(packets, kCompressed);
  EXPECT_LT(file.size(), 300'000u);
  EXPECT_EQ(ReadAll(file).packets, packets);
  EXPECT_EQ(ReadAll(file).end, Outcome::kEnd);

  std::set<size_t> ends = {capture_head::kSize};
  while (const auto head = ReadCaptureBlockHead(std::span(file).subspan(*ends.rbegin()))) {
    ends.insert(*ends.rbegin() + capture_block::kSize + head->stream_size);
  }
  ASSERT_TRUE(ends.contains(file.size()));
  size_t growths = 0;
  size_t most = 0;
  for (size_t size = capture_head::kSize; size < file.size(); size += 1 + size % 997) {
    const Packet cut(file.begin(), file.begin() + static_cast<std::ptrdiff_t>(size));
    const Reading reading = ReadAll(cut);
    ASSERT_LE(reading.packets.size(), packets.size());
    ASSERT_TRUE(std::equal(reading.packets.begin(), reading.packets.end(), packets.begin())) << size;
    ASSERT_GE(reading.packets.size(), most) << "more of the file is never less of the packets";
    growths += reading.packets.size() > most ? 1 : 0;
    most = reading.packets.size();
    ASSERT_EQ(reading.end, ends.contains(size) ? Outcome::kEnd : Outcome::kCut) << size;
  }
  EXPECT_GT(growths, 100u) << "packets of a block that is cut are there";
  EXPECT_GT(most, packets.size() - 20);

  for (int i = 0; i < 300; ++i) {
    Packet damaged = file;
    damaged[capture_head::kSize + random() % (file.size() - capture_head::kSize)] ^= static_cast<uint8_t>(1 << i % 8);
    const Reading reading = ReadAll(damaged);
    if (reading.packets.size() == packets.size()) continue;  // the time in the head of a block
    ASSERT_EQ(reading.end, Outcome::kCut);
    ASSERT_TRUE(std::equal(reading.packets.begin(), reading.packets.end(), packets.begin()));
  }
}

TEST_F(CaptureTimes, AreFoundInACompressedFile) {
  const test::TempFolder folder;
  const Packet plain = Make(8000, true);
  Packet file(capture_head::kSize);
  std::ranges::copy(CaptureHead(capture_head::kBlocks), file.begin());
  for (size_t first = 0; first < offsets_.size(); first += 100) {
    const size_t end = first + 100 < offsets_.size() ? offsets_[first + 100] : plain.size();
    const auto block = MakeCaptureBlock(std::span(plain).subspan(offsets_[first], end - offsets_[first]));
    file.insert(file.end(), block.begin(), block.end());
  }
  const std::string path = folder.Add("capture", {reinterpret_cast<const char*>(file.data()), file.size()});
  for (const size_t at : {size_t{0}, size_t{1}, size_t{99}, size_t{100}, size_t{4321}, size_t{7999}}) {
    const uint64_t from = times_[at];
    CaptureReader reader(OpenCaptureSourceAt(path, from), {from, from + 50'000});
    CaptureRecord record;
    std::vector<uint64_t> read;
    while (reader.Next(record) == Outcome::kRecord) read.push_back(record.microseconds);
    EXPECT_EQ(reader.Next(record), Outcome::kEnd);
    const std::vector<uint64_t> wanted(std::ranges::lower_bound(times_, from),
                                       std::ranges::upper_bound(times_, from + 50'000));
    EXPECT_EQ(read, wanted) << at;
  }
  size_t bytes_read = 0;
  const CaptureBytes bytes = [&](uint64_t offset, std::span<uint8_t> buffer) -> std::optional<size_t> {
    const size_t begin = std::min<size_t>(offset, file.size());
    const size_t count = std::min(buffer.size(), file.size() - begin);
    std::copy_n(file.begin() + static_cast<std::ptrdiff_t>(begin), count, buffer.begin());
    bytes_read += count;
    return count;
  };
  EXPECT_GT(FindCaptureBlock(bytes, capture_head::kSize, file.size(), times_[7900]), file.size() / 10 * 9);
  EXPECT_LT(bytes_read, file.size() / 2);
}

TEST(CaptureSeriesTest, FilesEndBySizeAndTimeAndNothingIsMissing) {
  const struct {
    const char* name;
    CaptureLayout layout;
    uint64_t step;  // between packets
    size_t least_files;
  } cases[] = {
      {"size", {.file_bytes = 70'000}, 10, 14},
      {"time", {.file_seconds = 2}, 100'000, 50},
      {"compressed, size", {.compressed = true, .file_bytes = 200'000}, 10, 5},
      {"compressed, time", {.compressed = true, .file_seconds = 2}, 100'000, 50},
      {"both", {.file_bytes = 70'000, .file_seconds = 5}, 100'000, 20},
  };
  for (const auto& c : cases) {
    std::vector<Packet> files;
    const auto open = [&] {
      files.emplace_back();
      return CaptureSink([&files](std::span<const uint8_t> bytes) {
        files.back().insert(files.back().end(), bytes.begin(), bytes.end());
        return bytes.size();
      });
    };
    std::vector<Packet> packets;
    std::mt19937 random(11);
    CaptureWriter writer(NullLog());
    ASSERT_TRUE(writer.Start(open, nullptr, c.layout));
    for (size_t i = 0; i < 1000; ++i) {
      packets.emplace_back(2 + random() % 2000);
      for (auto& byte : packets.back()) byte = static_cast<uint8_t>(random());
      writer.Append(packets.back(), 1'000'000'000 + i * c.step);
    }
    ASSERT_TRUE(writer.Stop(10'000)) << c.name;
    EXPECT_EQ(writer.written(), packets.size()) << c.name;
    EXPECT_EQ(writer.pending(), 0u);
    EXPECT_GE(files.size(), c.least_files) << c.name;
    std::vector<Packet> read;
    for (const Packet& file : files) {
      EXPECT_LE(file.size(), c.layout.file_bytes != 0 ? c.layout.file_bytes : SIZE_MAX) << c.name;
      const Reading reading = ReadAll(file);
      EXPECT_EQ(reading.end, Outcome::kEnd) << c.name;
      EXPECT_FALSE(reading.packets.empty()) << c.name;
      read.insert(read.end(), reading.packets.begin(), reading.packets.end());
    }
    EXPECT_EQ(read, packets) << c.name;
  }
}

TEST(CaptureSeriesTest, FileEndsWhereTheClockIsSetBackAndItsHeadSaysByHowMuchTimesStepBack) {
  for (const bool compressed : {false, true}) {
    const test::TempFolder folder;
    CaptureWriter writer(NullLog());
    ASSERT_TRUE(writer.Start(CaptureSeries(folder.Path("night.cap"), 0), nullptr,
                             {.compressed = compressed, .file_seconds = 2}));
    for (const uint64_t time : {5'000'000, 5'500'000, 5'498'500, 5'600'000, 1'000'000, 1'900'000, 2'900'000, 3'000'000})
      writer.Append(kPackets[0], time);
    ASSERT_TRUE(writer.Stop(10'000));
    const struct {
      const char* name;
      std::vector<uint64_t> times;
      uint32_t mark;
    } files[] = {{"night-00001.cap", {5'000'000, 5'500'000, 5'498'500, 5'600'000}, 3},
                 {"night-00002.cap", {1'000'000, 1'900'000, 2'900'000}, 1},
                 {"night-00003.cap", {3'000'000}, 1}};
    for (const auto& file : files) {
      CaptureReader reader(OpenCaptureSource(folder.Path(file.name)));
      CaptureRecord record;
      std::vector<uint64_t> times;
      while (reader.Next(record) == Outcome::kRecord) times.push_back(record.microseconds);
      EXPECT_EQ(times, file.times) << file.name << compressed;
      const std::string content = folder.Content(file.name);
      EXPECT_EQ(LoadLe<uint32_t>(Packet(content.begin(), content.end()), 12), file.mark) << file.name << compressed;
    }
  }
}

TEST(CaptureSeriesTest, NextFileThatCannotBeOpenedIsCountedAsLoss) {
  for (const bool compressed : {false, true}) {
    Disk disk;
    const auto open = [&] { return disk.opened() == 0 ? disk.Opener()() : CaptureSink(); };
    CaptureWriter writer(NullLog());
    ASSERT_TRUE(writer.Start(open, nullptr, {.compressed = compressed, .file_seconds = 1}));
    for (uint64_t i = 0; i < 10; ++i) writer.Append(kPackets[0], i / 5 * 1'000'000 + 1);
    EXPECT_FALSE(writer.Stop(10'000));
    EXPECT_EQ(writer.written(), 5u);
    EXPECT_EQ(writer.lost(), 5u);
    EXPECT_EQ(ReadAll(disk.content()).packets.size(), 5u);
  }
}

TEST(CaptureSeriesTest, NamesAreNumberedAndOnlyTheLatestKept) {
  const test::TempFolder folder;
  folder.Add("night-00007.cap", "of a former capture");
  folder.Add("night-7.cap", "another's");
  folder.Add("night-00008.txt", "another's");
  const auto open = CaptureSeries(folder.Path("night.cap"), 2);
  const auto names = [&] {
    std::vector<FolderEntry> entries;
    EXPECT_FALSE(ListFolder(folder.Path(""), entries));
    std::string all;
    for (const auto& entry : entries) all += entry.name + " ";
    return all;
  };
  { const auto sink = open(); }
  EXPECT_EQ(names(), "night-00007.cap night-00008.cap night-00008.txt night-7.cap ");
  { const auto sink = open(); }
  EXPECT_EQ(names(), "night-00008.cap night-00008.txt night-00009.cap night-7.cap ");
  EXPECT_FALSE(CaptureSeries(folder.Path("none/night.cap"), 2)());
  folder.Add("night-99999.cap", "of five digits");
  { const auto sink = open(); }
  { const auto sink = open(); }
  EXPECT_EQ(names(), "night-00008.txt night-100000.cap night-100001.cap night-7.cap ");
  folder.Add("night-4294967295.cap", "the last number");
  EXPECT_FALSE(open()) << "none is written over";
}

TEST(CaptureSeriesTest, TwoCapturesOfOneNameTakeTheirNumbersInTurn) {
  const test::TempFolder folder;
  std::atomic<int> opened{0};
  const auto capture = [&] {
    const auto open = CaptureSeries(folder.Path("night.cap"), 0);
    std::vector<CaptureSink> files;
    for (int i = 0; i < 100; ++i) {
      files.push_back(open());
      opened += files.back() ? 1 : 0;
    }
  };
  std::thread other(capture);
  capture();
  other.join();
  EXPECT_EQ(opened, 200);
  EXPECT_TRUE(LookAt(folder.Path("night-00200.cap")).kind == LocalKind::kFile);
}

// --- Playback -------------------------------------------------------------------------------------------------------

class Playback : public testing::Test {
 protected:
  bool Play(const Packet& file, PlayPace pace) {
    return player_.Start(SourceOf(file), pace, bundle_->dispatcher, bundle_->sorter, nullptr);
  }
  bool Ends(PlayState state) {
    return Eventually([&] { return player_.state() != PlayState::kPlaying; }) && player_.state() == state;
  }

  EngineGuard bundle_{EngineBundle::Make({}, SystemClock(), 0)};
  CapturePlayer player_;
};

TEST_F(Playback, EndsAsTheFileDoes) {
  Packet file = Capture({{16, 1}, {75, 1}, {31, 1}, {146, 9}});
  StoreLe(std::span<uint8_t>(file), 16 + 2 * 14, uint64_t{0x123456789ABC});
  std::vector<std::pair<uint64_t, Packet>> seen;
  const auto see = [](uint64_t microseconds, uint32_t length, const uint8_t* bytes, uintptr_t value) {
    reinterpret_cast<decltype(seen)*>(value)->emplace_back(microseconds, Packet(bytes, bytes + length));
  };
  player_.SetCallback(see, reinterpret_cast<uintptr_t>(&seen));
  EXPECT_EQ(player_.state(), PlayState::kIdle);
  ASSERT_TRUE(Play(file, PlayPace::kForLogReader));
  EXPECT_TRUE(Ends(PlayState::kDone));
  EXPECT_EQ(player_.played(), 3u);
  EXPECT_EQ(player_.skipped(), 1u) << "no answer gets in";
  ASSERT_EQ(seen.size(), 3u);
  EXPECT_EQ(seen[1], std::pair(uint64_t{0x123456789ABC}, Packet{31, 1})) << "when it was collected";
  player_.SetCallback(nullptr, 0);
  EXPECT_EQ(bundle_->asynchronous.size(), 3u);
  EXPECT_EQ(bundle_->responses.size(), 0u);
  ASSERT_TRUE(Play(Packet(file.begin(), file.end() - 1), PlayPace::kAtOnce));
  EXPECT_TRUE(Ends(PlayState::kCut));
  EXPECT_EQ(player_.played(), 2u);
  ASSERT_TRUE(Play(Packet(100, 'x'), PlayPace::kAtOnce));
  EXPECT_TRUE(Ends(PlayState::kForeign));
  EXPECT_FALSE(player_.Start({}, PlayPace::kAtOnce, bundle_->dispatcher, bundle_->sorter, nullptr));
}

TEST_F(Playback, FailingCallbackCostsNoPacket) {
  player_.SetCallback([](uint64_t, uint32_t, const uint8_t*, uintptr_t) { throw 1; }, 0);
  ASSERT_TRUE(Play(Capture({{16, 1}, {31, 1}}), PlayPace::kAtOnce));
  EXPECT_TRUE(Ends(PlayState::kDone));
  EXPECT_EQ(bundle_->asynchronous.size(), 2u);
}

TEST_F(Playback, WaitsForItsReaderAndCanBeStopped) {
  const Packet file = Capture(std::vector<Packet>(5000, Packet{16, 1}));
  ASSERT_TRUE(Play(file, PlayPace::kForLogReader));
  EXPECT_FALSE(Play(file, PlayPace::kAtOnce)) << "one at a time";
  ASSERT_TRUE(Eventually([&] { return bundle_->asynchronous.size() == kQueueCapacity; }));
  EXPECT_TRUE(player_.Stop());
  EXPECT_EQ(player_.state(), PlayState::kStopped);
  EXPECT_EQ(bundle_->asynchronous.dropped(), 0u);
  ASSERT_TRUE(Play(file, PlayPace::kAtOnce));
  EXPECT_TRUE(Ends(PlayState::kDone));
  EXPECT_EQ(bundle_->asynchronous.dropped(), 5000u) << "like a handset, it waits for nobody";
}

TEST_F(Playback, ItsCallbackMayStopIt) {
  static CapturePlayer* player;
  player = &player_;
  static std::atomic<int> seen;
  seen = 0;
  const auto stop = [](uint64_t, uint32_t, const uint8_t*, uintptr_t) {
    ++seen;
    EXPECT_TRUE(player->Stop(60'000)) << "without a wait for itself";
  };
  player_.SetCallback(stop, 0);
  ASSERT_TRUE(Play(Capture(std::vector<Packet>(20, Packet{16, 1})), PlayPace::kForLogReader));
  EXPECT_TRUE(Ends(PlayState::kStopped));
  EXPECT_EQ(seen, 1);
  EXPECT_EQ(player_.played(), 0u) << "not even the one that was shown";
}

TEST_F(Playback, IsDoneOnceItsPacketsAreThroughAndCanBeFollowedAtOnce) {
  static std::atomic<bool> hold;
  hold = true;
  const auto held_up = [](uint32_t, const uint8_t*, uintptr_t) {
    while (hold) std::this_thread::sleep_for(std::chrono::milliseconds(1));
  };
  bundle_->sorter.SetRawPacketCallback(held_up, 0);
  const Packet file = Capture({{16, 1}, {16, 2}});
  ASSERT_TRUE(Play(file, PlayPace::kForLogReader));
  std::this_thread::sleep_for(std::chrono::milliseconds(250));
  EXPECT_EQ(player_.state(), PlayState::kPlaying) << "a callback holds them up";
  hold = false;
  EXPECT_TRUE(Ends(PlayState::kDone));
  EXPECT_EQ(bundle_->asynchronous.size(), 2u);
  for (int i = 0; i < 100; ++i) {
    ASSERT_TRUE(Play(file, PlayPace::kForLogReader)) << i;
    while (player_.state() == PlayState::kPlaying) std::this_thread::yield();
  }
  EXPECT_EQ(bundle_->asynchronous.size(), 202u);
  EXPECT_EQ(player_.played_in_all(), 202u);
}

TEST_F(Playback, KeepsTheTimeBetweenPackets) {
  Packet file = Capture({{16, 1}, {16, 2}, {16, 3}, {16, 4}});
  const auto stamp = [&file](size_t record, uint64_t microseconds) {
    StoreLe(std::span<uint8_t>(file), 16 + 14 * record, microseconds);
  };
  stamp(0, 1'000'000);
  stamp(1, 1'030'000);
  stamp(2, 500'000);              // the clock was set back
  stamp(3, 86'500'000'000 * 30);  // and put right
  const auto begin = std::chrono::steady_clock::now();
  ASSERT_TRUE(Play(file, PlayPace::kAsRecorded));
  EXPECT_TRUE(Ends(PlayState::kDone));
  const auto took = std::chrono::steady_clock::now() - begin;
  EXPECT_GE(took, std::chrono::milliseconds(30));
  EXPECT_LT(took, std::chrono::seconds(20));

  stamp(1, 600'000'000);
  ASSERT_TRUE(Play(file, PlayPace::kAsRecorded));
  ASSERT_TRUE(Eventually([&] { return player_.played() == 1; }));
  EXPECT_TRUE(player_.Stop()) << "also in the midst of a long gap";
}

}  // namespace
}  // namespace kral
