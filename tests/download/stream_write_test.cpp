// Whole images into the flash of the virtual handset, through every kind of trouble with the acknowledgements. What
// always holds: flash equals the image, or the call has failed.
#include <gtest/gtest.h>

#include <atomic>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "download/stream/image_write_cmd.h"
#include "tests/support/download_fixture.h"
#include "tests/support/hex_files.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

using handset::ProgrammerSettings;
using handset::When;
using test::DownloadTest;

constexpr uint8_t kWrite = 0x07;

class StreamWrite : public DownloadTest {
 protected:
  void ExpectInFlash(const std::vector<uint8_t>& bytes, uint32_t address = 0) {
    EXPECT_TRUE(handset().flash().Load(address, bytes.size()) == bytes) << "flash differs from the image";
  }
};

TEST_F(StreamWrite, ImageIsInFlashAndTheWindowIsKept) {
  ProgrammerSettings settings;
  settings.window = 4;
  settings.acknowledge_delay_ms = 5;
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

TEST_F(StreamWrite, ImagesEndWhereTheAddressesEnd) {
  StartProgrammer();
  const auto bytes = RandomBytes(300);
  EXPECT_EQ(WriteMem(bytes, 0xFFFFFFFF - 298), KRAL_STREAM_PAST_END) << "its last byte would be written to 0";
  EXPECT_EQ(handset().programmer().images().size(), 0u);
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
  EXPECT_TRUE(std::is_sorted(reports.acknowledged.begin(), reports.acknowledged.end()));

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

TEST_F(StreamWrite, FilesOfBothFormatsAndWhatIsWrongWithThem) {
  test::TempFolder folder;
  const auto bytes = RandomBytes(5000);
  const auto binary = folder.Add("image.bin", std::string(bytes.begin(), bytes.end()));
  const auto hex = folder.Path("image.hex");
  uint32_t base = 0x30000;
  ASSERT_EQ(KRAL_HEX_Convert(binary.c_str(), hex.c_str(), KRAL_HEX_FROM_BINARY, &base, nullptr), 1);
  const auto header = folder.Add("header", "head");
  StartProgrammer();
  const auto write = [&](const std::string& file, uint32_t format, const char* header_file = nullptr) {
    uint32_t result = UINT32_MAX;
    KRAL_STREAM_WriteImageFile(handle(), file.c_str(), format, 1, header_file, KRAL_STREAM_MULTI_IMAGE, block_size_,
                               window_, &result);
    return result;
  };
  EXPECT_EQ(write(binary, KRAL_IMAGE_FORMAT_BY_CONTENT, header.c_str()), KRAL_STREAM_WRITTEN) << LogText();
  ExpectInFlash(bytes, 0);
  EXPECT_EQ(handset().programmer().images().back().header, (handset::Bytes{'h', 'e', 'a', 'd'}));
  EXPECT_EQ(write(hex, KRAL_IMAGE_FORMAT_BY_CONTENT), KRAL_STREAM_WRITTEN) << LogText();
  ExpectInFlash(bytes, 0x30000);

  const size_t images = handset().programmer().images().size();
  const auto two = folder.Add("two.hex", test::kTwoRegionsHex);
  EXPECT_EQ(write(two, KRAL_IMAGE_FORMAT_HEX), KRAL_STREAM_BAD_IMAGE);
  EXPECT_EQ(write(folder.Add("dropped.hex", test::kDroppedHex), KRAL_IMAGE_FORMAT_HEX), KRAL_STREAM_DATA_LOST);
  EXPECT_NE(ErrorText().find("dropped.hex: line 1 holds data"), std::string::npos);
  EXPECT_EQ(write(binary, KRAL_IMAGE_FORMAT_HEX), KRAL_STREAM_FILE_NOT_DECODED);
  EXPECT_EQ(write(binary, 7), KRAL_STREAM_BAD_ARGUMENT);
  EXPECT_EQ(write(folder.Add("empty", ""), KRAL_IMAGE_FORMAT_BY_CONTENT), KRAL_STREAM_FILE_NOT_OPENED);
  EXPECT_EQ(write(binary, KRAL_IMAGE_FORMAT_BINARY, folder.Path("missing").c_str()), KRAL_STREAM_FILE_NOT_OPENED);
  EXPECT_EQ(write(binary, KRAL_IMAGE_FORMAT_BINARY, folder.Add("long", std::string(513, 'x')).c_str()),
            KRAL_STREAM_OPEN_FAILED);
  EXPECT_EQ(handset().programmer().images().size(), images) << "no image was begun";
}

}  // namespace
}  // namespace kral
