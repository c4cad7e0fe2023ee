// Whole images into the flash of the virtual handset, through every kind of trouble with the acknowledgements. What
// always holds: flash equals the image, or the call has failed.
#include <cstring>

#include "download/images/phone_image_raw.h"
#include "download/stream/download_agent.h"
#include "download/stream/image_write_cmd.h"
#include "download/stream/write_image.h"
#include "tests/support/download_fixture.h"
#include "tests/support/failures.h"
#include "tests/support/hex_files.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::ProgrammerSettings;
using test::DownloadTest;

constexpr uint8_t kWrite = 0x07;

class StreamWrite : public DownloadTest {
 protected:
  void ExpectInFlash(const std::vector<uint8_t>& bytes, uint32_t address = 0) {
    EXPECT_TRUE(handset().flash().Load(address, bytes.size()) == bytes) << "flash differs from the image";
  }
};

// What a failed call reports as acknowledged was so when it failed, whatever comes until it returns.
TEST(DownloadAgent, AcknowledgesNothingAfterAFailure) {
  stream::DownloadAgent agent;
  agent.Start(2);
  agent.Enqueue({0, 20, 0});
  ASSERT_TRUE(agent.Carve(10) && agent.Carve(10));
  ASSERT_TRUE(agent.Acknowledge(0));
  agent.Fail({});
  EXPECT_FALSE(agent.Acknowledge(10));
  EXPECT_EQ(agent.bytes_acknowledged(), 10u);
}

TEST_F(StreamWrite, ImageIsInFlashAndTheWindowIsKept) {
  ProgrammerSettings settings;
  settings.window = 4;
  settings.acknowledge_delay_ms = 20;
  StartProgrammer(settings);
  const auto bytes = RandomBytes(30 * 1024 + 17);
  handset().flash().Fill(0x1000, {bytes.data(), 100});  // what was there before
  ASSERT_EQ(WriteMem(bytes, 0x1000, KRAL_STREAM_MULTI_IMAGE, {1, 2, 3}), KRAL_STREAM_WRITTEN) << LogText();
  ExpectInFlash(bytes, 0x1000);
  const auto images = handset().programmer().images();
  ASSERT_EQ(images.size(), 1u);
  EXPECT_EQ(images[0].type, 7);
  EXPECT_EQ(images[0].header, (handset::Bytes{1, 2, 3}));
  EXPECT_TRUE(images[0].closed);
  EXPECT_EQ(images[0].bytes, bytes.size()) << "nothing was sent twice";
  EXPECT_EQ(handset().programmer().most_ahead(), 2u) << "three on their way: one less than announced";
}

TEST_F(StreamWrite, LargestBlocksFitTheirFramesWhateverTheBytes) {
  ProgrammerSettings settings;
  settings.block_size = 70000;
  StartProgrammer(settings);
  EXPECT_EQ(block_size_, 70000u);
  auto bytes = std::vector<uint8_t>(40000, 0x7E);
  const auto random = RandomBytes(40000);
  bytes.insert(bytes.end(), random.begin(), random.end());
  bytes.resize(120000, 0);
  ASSERT_EQ(WriteMem(bytes), KRAL_STREAM_WRITTEN) << ErrorText();
  ExpectInFlash(bytes);
}

// What frames take of blocks that are full of escapes is less than was read for them.
TEST_F(StreamWrite, EachByteOfAnImageIsReadOnce) {
  class Counting final : public images::PhoneImageRaw {
   public:
    void Read(uint32_t address, void* buffer, uint32_t count, uint32_t) const override {
      std::memcpy(buffer, buffer_ + address, count);
      read += count;
    }
    mutable uint64_t read = 0;
  };
  ProgrammerSettings settings;
  settings.block_size = 16376;
  StartProgrammer(settings);
  std::vector<uint8_t> bytes(100000, 0x7E);
  const auto random = RandomBytes(100000);
  bytes.insert(bytes.end(), random.begin(), random.end());
  Counting image;
  ASSERT_TRUE(image.SetData(bytes.data(), static_cast<uint32_t>(bytes.size())));
  const auto phone = Kral_ResourceManager::GetPhone(handle());
  download::DownloadConnection connection(*phone);
  const stream::WriteLimits limits{block_size_, window_};
  EXPECT_EQ(stream::CWriteNORImageFramed(connection).Write(image, 0, nullptr, limits), stream::WriteOutcome::kDone)
      << LogText();
  EXPECT_EQ(image.read, image.GetSize(0));
  ExpectInFlash(bytes);
}

TEST_F(StreamWrite, ImagesEndWhereTheAddressesEnd) {
  StartProgrammer();
  const auto bytes = RandomBytes(300);
  EXPECT_EQ(WriteMem(bytes, 0xFFFFFFFF - 298), KRAL_STREAM_PAST_END) << "its last byte would be written to 0";
  EXPECT_EQ(WriteMem(bytes, 0xFFFFFFFF - 299), KRAL_STREAM_WRITTEN) << ErrorText();
  ExpectInFlash(bytes, 0xFFFFFFFF - 299);
}

TEST(StreamWriteSize, IsBoundByTheFrame) {
  const auto fitting = [](const std::vector<uint8_t>& bytes, uint32_t address = 0) {
    return stream::CImageWriteCmdFramed::FittingSize(address, bytes);
  };
  EXPECT_EQ(fitting(std::vector<uint8_t>(20000, 0)), 16376u);
  EXPECT_EQ(fitting(std::vector<uint8_t>(16375, 0)), 16375u);
  EXPECT_EQ(fitting(std::vector<uint8_t>(20000, 0x7D)), 8188u);
  EXPECT_EQ(fitting(std::vector<uint8_t>(20000, 0), 0x7E7D7E7D), 16372u);
  std::vector<uint8_t> one(16376, 0);
  one[16375] = 0x7E;
  EXPECT_EQ(fitting(one), 16375u);
  EXPECT_EQ(fitting({}), 0u);
}

// One fault at each acknowledgement of an image of eight blocks, in a window of four.
TEST_F(StreamWrite, FaultMatrix) {
  struct Row {
    const char* what;
    std::function<void(handset::FaultPlan&, uint64_t nth)> add;
  };
  const auto strike = [](handset::Fault fault) {
    return [fault](handset::FaultPlan& plan, uint64_t nth) { plan.Add(fault, When::Nth(nth).Of("08")); };
  };
  const Row rows[] = {
      {"lost", strike(handset::Lose())},
      {"doubled", strike(handset::Duplicate())},
      {"late and out of order", strike(handset::Delay(8))},
      {"later than the time-out", strike(handset::Delay(40))},
      {"damaged", strike(handset::Corrupt())},
      {"in pieces", strike(handset::Split(2, 1))},
      {"together with the next", strike(handset::Merge())},
      {"behind noise", strike(handset::LeadingNoise(9))},
      {"all of them twice",
       [](handset::FaultPlan& plan, uint64_t) { plan.Add(handset::Duplicate(), When::Always().Of("08")); }},
      {"two in a row lost",
       [](handset::FaultPlan& plan, uint64_t nth) {
         for (const uint64_t n : {nth, nth + 1}) plan.Add(handset::Lose(), When::Nth(n).Of("08"));
       }},
  };
  AcknowledgeWithin(25);
  ProgrammerSettings settings;
  settings.window = 5;
  settings.block_size = 512;
  StartProgrammer(settings);
  for (const Row& row : rows) {
    for (uint64_t nth = 1; nth <= 8; ++nth) {
      const auto bytes = RandomBytes(8 * 512 - 100, static_cast<uint32_t>(nth));
      row.add(handset().faults(), nth);
      EXPECT_EQ(WriteMem(bytes), KRAL_STREAM_WRITTEN) << row.what << ' ' << nth << '\n' << ErrorText();
      ExpectInFlash(bytes);
      EXPECT_TRUE(handset().programmer().images().back().closed) << row.what << ' ' << nth;
      handset().faults().Clear();
      ClearLog();
    }
  }
}

TEST_F(StreamWrite, LossesAtRandomEndWithTheImageInFlash) {
  AcknowledgeWithin(15);
  ProgrammerSettings settings;
  settings.window = 9;
  settings.block_size = 256;
  StartProgrammer(settings);
  handset().faults().Add(handset::Lose(), When::Chance(0.2).Of("08"));
  handset().faults().Add(handset::Delay(3), When::Chance(0.2).Of("08"));
  handset().faults().Add(handset::Duplicate(), When::Chance(0.1).Of("08"));
  const auto bytes = RandomBytes(200 * 256);
  ASSERT_EQ(WriteMem(bytes), KRAL_STREAM_WRITTEN) << ErrorText();
  ExpectInFlash(bytes);
}

TEST_F(StreamWrite, AHandsetThatDiesOnTheWayEndsTheCallInTime) {
  AcknowledgeWithin(10);
  StartProgrammer();
  handset().faults().Add(handset::Lose(), When::From(5).Of("08"));
  EXPECT_EQ(WriteMem(RandomBytes(20 * 1024)), KRAL_STREAM_WRITE_FAILED);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "failed during image write\n"));
  handset().faults().Clear();
  handset().faults().Add(handset::HangUp(), When::Nth(3).Of("08"));
  EXPECT_EQ(WriteMem(RandomBytes(20 * 1024)), KRAL_STREAM_WRITE_FAILED);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "WriteHDLCNoRead failed with status 3\n")) << ErrorText();
  EXPECT_EQ(ReapParkedThreads(), 0u) << "a thread is left behind";
}

TEST_F(StreamWrite, AStormOfForeignAcknowledgementsChangesNothing) {
  StartProgrammer();
  std::atomic<bool> stop = false;
  std::thread storm([&] {
    // Where a sleep is none, the cable must still not hold more than a 32-bit process can.
    for (int sent = 0; sent < 20'000 && !stop; ++sent) {
      handset().SendPacket(handset::FromHex("08 44 33 22 11"));
      std::this_thread::sleep_for(std::chrono::microseconds(200));
    }
  });
  const auto bytes = RandomBytes(64 * 1024);
  const uint32_t result = WriteMem(bytes, 0, KRAL_STREAM_NOR);
  stop = true;
  storm.join();
  EXPECT_EQ(result, KRAL_STREAM_WRITTEN) << ErrorText();
  ExpectInFlash(bytes);
}

struct Reports {
  std::vector<uint32_t> acknowledged;
  uint32_t total = 0;
  KRAL_HANDLE abort_at_first = 0;
};

void KRAL_CALL OnProgress(KRAL_HANDLE, uint32_t acknowledged, uint32_t total, uintptr_t value) {
  auto& reports = *reinterpret_cast<Reports*>(value);
  reports.acknowledged.push_back(acknowledged);
  reports.total = total;
  if (reports.abort_at_first != 0 && acknowledged != 0) KRAL_AbortDownload(reports.abort_at_first);
}

TEST_F(StreamWrite, ProgressRisesFromNothingToEverythingAndAnAbortEndsIt) {
  StartProgrammer();
  Reports reports;
  ASSERT_EQ(KRAL_ConfigureDownloadCallBack(handle(), OnProgress, reinterpret_cast<uintptr_t>(&reports)), 1);
  const auto bytes = RandomBytes(16 * 1024);
  ASSERT_EQ(WriteMem(bytes), KRAL_STREAM_WRITTEN) << LogText();
  EXPECT_EQ(reports.total, bytes.size());
  EXPECT_EQ(reports.acknowledged.front(), 0u);
  EXPECT_EQ(reports.acknowledged.back(), bytes.size());
  EXPECT_TRUE(std::ranges::is_sorted(reports.acknowledged));

  reports.abort_at_first = handle();
  EXPECT_EQ(WriteMem(bytes), KRAL_DOWNLOAD_ABORTED);
  reports.abort_at_first = 0;

  // From another thread, while the handset is silent.
  AcknowledgeWithin(2000);
  handset().faults().Add(handset::Lose(), When::Always().Of("08"));
  std::thread aborter([this, before = CountPackets(kWrite)] {
    while (CountPackets(kWrite) == before) std::this_thread::sleep_for(std::chrono::milliseconds(1));
    KRAL_AbortDownload(handle());
  });
  EXPECT_EQ(WriteMem(bytes), KRAL_DOWNLOAD_ABORTED);
  aborter.join();
  KRAL_ConfigureDownloadCallBack(handle(), nullptr, 0);
}

class StreamFiles : public StreamWrite {
 protected:
  uint8_t Write(const std::string& file, uint32_t result, uint32_t format = KRAL_IMAGE_FORMAT_BY_CONTENT,
                uint8_t method = KRAL_STREAM_MULTI_IMAGE, uint32_t block_size = 1000, const char* header = nullptr) {
    uint32_t told = UINT32_MAX;
    const uint8_t written =
        KRAL_STREAM_WriteImageFile(handle(), file.c_str(), format, 5, header, method, block_size, 4, &told);
    EXPECT_EQ(told, result);
    return written;
  }

  test::TempFolder folder_;
};

TEST_F(StreamFiles, MayBeOfBothFormats) {
  const auto bytes = RandomBytes(5000);
  const auto binary = folder_.Add("image.bin", std::string(bytes.begin(), bytes.end()));
  const auto hex = folder_.Path("image.hex");
  uint32_t base = 0x30000;
  ASSERT_EQ(KRAL_HEX_Convert(binary.c_str(), hex.c_str(), KRAL_HEX_FROM_BINARY, &base, nullptr), 1);
  const auto header = folder_.Add("header", "head");
  StartProgrammer();
  EXPECT_EQ(Write(binary, KRAL_STREAM_WRITTEN, 0, 0, 1000, header.c_str()), 1) << LogText();
  ExpectInFlash(bytes, 0);
  EXPECT_EQ(handset().programmer().images().back().header, (handset::Bytes{'h', 'e', 'a', 'd'}));
  EXPECT_EQ(Write(hex, KRAL_STREAM_WRITTEN), 1) << LogText();
  ExpectInFlash(bytes, 0x30000);
}

TEST_F(StreamFiles, EveryFailureHasItsResultAndSaysWhy) {
  constexpr uint8_t kOther = 13;  // the code of no reply here
  StartProgrammer();
  const auto image = folder_.Add("image.bin", std::string(3000, 'x'));
  const auto missing = folder_.Path("missing");
  const auto long_header = folder_.Add("header", std::string(513, 'h'));
  const auto dropped = folder_.Add("dropped.hex", test::kDroppedHex);
  const auto two = folder_.Add("two.hex", test::kTwoRegionsHex);
  const auto empty = folder_.Add("empty", "");
  const auto other_table = folder_.Add("table2", "\x01NAME2");
  const std::vector<uint8_t> bytes(300);
  const auto write_bytes = [&](const uint8_t* data, uint32_t address) {
    return KRAL_STREAM_WriteImageMem(handle(), data, 300, address, 5, nullptr, 0, 0, 1000, 4, nullptr);
  };
  const auto write_with_header = [&](const std::string& header, uint32_t result) {
    return [&, header, result] { return Write(image, result, 0, 0, 1000, header.c_str()); };
  };
  const auto write = [&](uint32_t result) { return [&, result] { return Write(image, result); }; };
  const auto other = [&](const When& when, uint32_t result) {
    return [&, when, result] { return Struck(handset::WrongCode(kOther), when, write(result)); };
  };
  const auto table = [&](const std::string& file) {
    return [this, file] { return KRAL_STREAM_PARTITION_TABLE(handle(), file.c_str(), 0, nullptr); };
  };
  const auto hello = [&](uint32_t variant) { return KRAL_STREAM_HELLO(handle(), variant, nullptr, nullptr); };
  const auto security = [&] { return KRAL_STREAM_SECURITY_MODE(handle(), 1); };
  EXPECT_EQ(table(folder_.Add("table1", "\x01NAME1"))(), 1);
  const std::string file = "KRAL_STREAM_WriteImageFile";
  const std::string in_table = "KRAL_STREAM_PARTITION_TABLE";
  test::ExpectFailures(
      handle(),
      {{file + " ARGUMENT", "no file name",
        [&] { return KRAL_STREAM_WriteImageFile(handle(), nullptr, 0, 0, nullptr, 0, 1, 1, nullptr); }},
       {file + " BAD_FILE", "missing cannot be opened", [&] { return Write(missing, KRAL_STREAM_FILE_NOT_OPENED); }},
       {file + " BAD_FILE", "empty", [&] { return Write(empty, KRAL_STREAM_FILE_NOT_OPENED); }},
       {file + " BAD_FILE line 1", "",
        [&] { return Write(image, KRAL_STREAM_FILE_NOT_DECODED, KRAL_IMAGE_FORMAT_HEX); }},
       {file + " ARGUMENT", "format 9", [&] { return Write(image, KRAL_STREAM_BAD_ARGUMENT, 9); }},
       {file + " ARGUMENT", "method 9", [&] { return Write(image, KRAL_STREAM_BAD_ARGUMENT, 0, 9); }},
       {file + " ARGUMENT", "blocks of 0 bytes", [&] { return Write(image, KRAL_STREAM_BAD_ARGUMENT, 0, 0, 0); }},
       {file + " BAD_FILE", "missing", write_with_header(missing, KRAL_STREAM_FILE_NOT_OPENED)},
       {file + " ARGUMENT", "513 bytes", write_with_header(long_header, KRAL_STREAM_OPEN_FAILED)},
       {file + " BAD_FILE line 1", "line 1", [&] { return Write(dropped, KRAL_STREAM_DATA_LOST); }},
       {file + " BAD_FILE", "second region", [&] { return Write(two, KRAL_STREAM_BAD_IMAGE); }},
       {"KRAL_STREAM_WriteImageMem ARGUMENT", "no bytes", [&] { return write_bytes(nullptr, 0); }},
       {"KRAL_STREAM_WriteImageMem ARGUMENT", "513 bytes",
        [&] { return WriteMem(bytes, 0, 0, std::vector<uint8_t>(513)) == KRAL_STREAM_WRITTEN; }},
       {"KRAL_STREAM_WriteImageMem ARGUMENT", "past address 0xFFFFFFFF",
        [&] { return write_bytes(bytes.data(), 0xFFFFFF00); }},
       {in_table + " ARGUMENT", "no file name",
        [&] { return KRAL_STREAM_PARTITION_TABLE(handle(), nullptr, 0, nullptr); }},
       {in_table + " BAD_FILE", "missing cannot be opened", table(missing)},
       {in_table + " BAD_FILE", "more than the 512 bytes", table(long_header)},
       {"KRAL_STREAM_HELLO ARGUMENT", "variant 2", [&] { return hello(2); }}});
  EXPECT_EQ(handset().programmer().images().size(), 0u) << "no image was begun";
  test::ExpectFailures(
      handle(),
      {{file + " NO_ANSWER", "command 27", [&] { return Silent(When::Nth(1), write(KRAL_STREAM_OPEN_FAILED)); }},
       {file + " LINK REPLY 13", "command 27", other(When::Nth(1), KRAL_STREAM_OPEN_FAILED)},
       {file + " LINK REPLY 13 offset 0", "instead of an acknowledgement",
        other(When::Nth(1).Of("08"), KRAL_STREAM_WRITE_FAILED)},
       {file + " LOST offset 1000", "1000 of 3000 bytes",
        [&] { return Silent(When::From(2).Of("08"), write(KRAL_STREAM_WRITE_FAILED)); }},
       {file + " NO_ANSWER", "command 21",
        [&] { return Silent(When::Nth(1).Of("16"), write(KRAL_STREAM_CLOSE_FAILED)); }},
       {file + " ABORTED", "aborted", [&] { return Aborted(write(KRAL_DOWNLOAD_ABORTED)); }},
       {"KRAL_STREAM_SECURITY_MODE NO_ANSWER", "command 23", [&] { return Silent(When::Nth(1), security); }},
       {in_table + " REFUSED LOADER 1", "differs", table(other_table)},
       {"KRAL_STREAM_HELLO NO_ANSWER", "command 1", [&] { return Silent(When::Always(), [&] { return hello(1); }); }}});
  handset().programmer().Set({.open_status = 3});
  test::ExpectFailures(handle(), {{file + " REFUSED LOADER 3", "type 5", write(KRAL_STREAM_OPEN_FAILED)}});
}

}  // namespace
}  // namespace kral
