// A handset for tests of whole backups: what it is furnished with, what a job came to, and what became of each item.
#ifndef KRAL_TESTS_SUPPORT_PKV_FIXTURE_H
#define KRAL_TESTS_SUPPORT_PKV_FIXTURE_H

#include "kral/pkv.h"
#include "platform/compound_file.h"
#include "storage/pkv/pkv_set.h"
#include "tests/support/efs_fixture.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral::test {

inline constexpr const char* kRfFile = "/nv/item_files/rfnv/00020203";
inline constexpr uint16_t kItems = 60;  // of the range that is backed up

class PkvTest : public EfsTest {
 protected:
  void SetUp() override {
    EfsTest::SetUp();
    Configure();
  }
  void TearDown() override {
    g_stop_at = 0;
    EfsTest::TearDown();
  }

  void Configure(uint16_t subscriptions = 1) {
    ASSERT_EQ(KRAL_PKV_ConfigureBackup(handle(), 0, kItems - 1, subscriptions), 1);
    ASSERT_EQ(KRAL_PKV_ConfigureCallBack(handle(), OnItem), 1);
    g_results.clear();
  }

  // Every third item has a value; the files are an item, an empty item, and one that is no item, in a folder below.
  void Furnish() {
    for (uint16_t id = 0; id < kItems; id += 3) handset().nv().Set(id, RandomBytes(128, id));
    handset().efs().AddItemFile(kRfFile, RandomBytes(300));
    handset().efs().AddItemFile("/nv/items/empty", {});
    handset().efs().AddFile("/nv/reg_files/conf/below/plain", RandomBytes(2000));
  }
  static constexpr uint32_t kValues = kItems / 3 + 3;

  // A handset as it comes from the line: only what every handset has.
  void MakeBlank() {
    for (uint16_t id = 1; id < kItems; ++id) {
      handset().nv().Erase(id);
      handset().nv().Erase(id, 1);
    }
    for (const char* path : {kRfFile, "/nv/items/empty", "/nv/reg_files/conf/below/plain"}) Remove(path);
  }
  void Remove(const char* path) { KRAL_EfsDelete(handle(), path, nullptr); }

  using Job = uint8_t(KRAL_CALL*)(KRAL_HANDLE handle, const char* file, uint32_t* status);
  // The status; the result must be in step with it.
  uint32_t Run(Job job, const char* name = "phone.pkv") {
    g_results.clear();
    uint32_t status = 0xAAAAAAAA;
    const uint8_t result = job(handle(), folder_.Path(name).c_str(), &status);
    EXPECT_EQ(result, status == 0 ? 1 : 0);
    return status;
  }
  pkv::PkvSet Read(const char* name = "phone.pkv") {
    pkv::PkvSet set;
    const pkv::PkvOutcome outcome = pkv::ReadPkv(folder_.Path(name), set);
    EXPECT_TRUE(outcome.done()) << outcome.text;
    return set;
  }
  // "done skipped refused different not-read-back not-reached"
  std::string Counts() {
    KRAL_PKV_COUNTS counts{};
    EXPECT_EQ(KRAL_PKV_GetCounts(handle(), &counts), 1);
    const uint32_t all[] = {counts.done,      counts.skipped,       counts.refused,
                            counts.different, counts.not_read_back, counts.not_reached};
    std::string text;
    uint32_t sum = 0;
    for (const uint32_t count : all) {
      text += (text.empty() ? "" : " ") + std::to_string(count);
      sum += count;
    }
    EXPECT_EQ(sum, counts.total);
    return text;
  }
  size_t RequestsOf(const handset::Bytes& prefix) {
    const auto requests = handset().requests();
    return static_cast<size_t>(std::ranges::count_if(requests, [&](const handset::Bytes& request) {
      return request.size() >= prefix.size() && std::equal(prefix.begin(), prefix.end(), request.begin());
    }));
  }

  // Result and status by "id", "id[index]" or path.
  static inline std::map<std::string, std::pair<uint32_t, uint32_t>> g_results;
  static inline uint32_t g_stop_at = 0;

  static uint8_t KRAL_CALL OnItem(const KRAL_PKV_ITEM* item, const char* path, uint32_t done, uint32_t total,
                                  KRAL_HANDLE) {
    std::string name = path != nullptr ? path : std::to_string(item->id);
    if (item->index != 0) name += "[" + std::to_string(item->index) + "]";
    if (item->subscription != 0) name += "/" + std::to_string(item->subscription);
    EXPECT_TRUE(g_results.emplace(name, std::pair(item->result, item->status)).second) << name << " reported twice";
    EXPECT_EQ(done, g_results.size());
    EXPECT_LE(done, total);
    return done == g_stop_at ? 0 : 1;
  }

  TempFolder folder_;
};

using Result = std::pair<uint32_t, uint32_t>;

}  // namespace kral::test

#endif
