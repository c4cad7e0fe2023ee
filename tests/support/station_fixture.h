// A station whose sockets have virtual handsets on them, with files for a whole job.
#ifndef KRAL_TESTS_SUPPORT_STATION_FIXTURE_H
#define KRAL_TESTS_SUPPORT_STATION_FIXTURE_H

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

#include "download/boot/kivrat.h"
#include "download/link/download_settings.h"
#include "frame/diag_ftm.h"
#include "handset/loaders/software_image.h"
#include "kral/kral.h"
#include "storage/pkv/pkv_set.h"
#include "tests/support/handset_ports.h"
#include "tests/support/temp_folder.h"

namespace kral::test {

class StationTest : public testing::Test {
 protected:
  static constexpr char kProgrammerHex[] =
      ":020000040002F8\n"
      ":10000000000102030405060708090A0B0C0D0E0F78\n"
      ":0400000500020000F5\n"
      ":00000001FF\n";

  void TearDown() override {
    if (job_ != 0) {
      EXPECT_EQ(KRAL_VENTRIMS_Free(job_), 1);
    }
  }

  // A handset on a port of its own, with that number for its serial number.
  handset::VirtualHandset& AddSocket(uint16_t port) {
    handset::VirtualHandset& handset = ports_.Add(port);
    handset.nv().Set(handset::kSerialNumberItem, handset::ByteWriter().U32(port).Take());
    handset.KeepTrace(false);
    return handset;
  }
  uint32_t AddToJob(uint16_t port) {
    uint32_t number = UINT32_MAX;
    EXPECT_EQ(KRAL_VENTRIMS_AddPort(job_, port, &number), 1) << Error().text;
    // Waits that only a handset without its programmer, or boot loader, has to sit out.
    Phone(number).state<download::Settings>().handshake_limit_ms = 1000;
    Phone(number).state<download::Settings>().hello_tries = 2;
    Phone(number).state<download::Settings>().hello_retry_delay_ms = 1;
    Phone(number).state<kivrat::Settings>().settle_ms = 0;
    return number;
  }
  Diag_FTM& Phone(uint32_t number) {
    KRAL_HANDLE handle = 0;
    KRAL_VENTRIMS_GetHandle(job_, number, &handle);
    return *Kral_ResourceManager::GetPhone(handle);
  }

  void SetOptions(uint32_t flags, uint32_t retries = 0, uint32_t return_ms = 30000, uint32_t at_once = 0) {
    KRAL_VENTRIMS_OPTIONS options{};
    options.size = sizeof options;
    ASSERT_EQ(KRAL_VENTRIMS_GetOptions(job_, &options), 1);
    options.flags = flags;
    options.retries = retries;
    options.return_ms = return_ms;
    options.at_once = at_once;
    ASSERT_EQ(KRAL_VENTRIMS_SetOptions(job_, &options), 1) << Error().text;
  }
  uint8_t AddImage(const std::string& file, uint8_t type = 5) {
    return KRAL_VENTRIMS_AddImage(job_, file.c_str(), KRAL_IMAGE_FORMAT_BY_CONTENT, type, nullptr,
                                  KRAL_STREAM_MULTI_IMAGE);
  }

  void RunToEnd() {
    ASSERT_EQ(KRAL_VENTRIMS_Start(job_), 1) << Error().text;
    ASSERT_EQ(KRAL_VENTRIMS_Wait(job_, 120000), 1);
  }
  KRAL_VENTRIMS_RESULT Result(uint32_t number) {
    KRAL_VENTRIMS_RESULT result{};
    result.size = sizeof result;
    EXPECT_EQ(KRAL_VENTRIMS_GetResult(job_, number, &result), 1) << Error().text;
    return result;
  }
  KRAL_VENTRIMS_PROGRESS Progress(uint32_t number) {
    KRAL_VENTRIMS_PROGRESS progress{};
    progress.size = sizeof progress;
    EXPECT_EQ(KRAL_VENTRIMS_GetProgress(job_, number, &progress), 1) << Error().text;
    return progress;
  }
  KRAL_VENTRIMS_STATE State() {
    KRAL_VENTRIMS_STATE state{};
    state.size = sizeof state;
    EXPECT_EQ(KRAL_VENTRIMS_GetState(job_, &state), 1) << Error().text;
    return state;
  }
  KRAL_ERROR Error() {
    KRAL_ERROR error{};
    KRAL_GetLastError(job_, &error);
    return error;
  }

  std::string AddBytes(const std::string& name, const handset::Bytes& bytes) {
    return folder_.Add(name, std::string(bytes.begin(), bytes.end()));
  }
  static handset::Bytes Pattern(size_t size) {
    handset::Bytes bytes(size);
    for (size_t i = 0; i < size; ++i) bytes[i] = static_cast<uint8_t>(i * 7 + i / 256);
    return bytes;
  }
  std::string AddBackup() {
    pkv::PkvSet set;
    for (uint16_t id = 10; id < 40; ++id) {
      pkv::PkvNvItem item{.id = id};
      item.data[0] = static_cast<uint8_t>(id);
      set.items.push_back(item);
    }
    const std::string path = folder_.Path("phone.pkv");
    EXPECT_TRUE(pkv::WritePkv(path, set, nullptr, pkv::PkvWriter::kStorageClasses).done());
    return path;
  }

  HandsetPorts ports_;
  TempFolder folder_;
  KRAL_VENTRIMS_JOB job_ = KRAL_VENTRIMS_Create();
};

}  // namespace kral::test

#endif
