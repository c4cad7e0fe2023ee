// Backups of a handset, their way back, and comparisons: what goes over the wire, what became of each item, and what
// happens when the handset refuses, answers late or goes away.
#include "kral/nv.h"
#include "kral/nv_tool.h"
#include "tests/support/pkv_fixture.h"
#include "tests/support/test.h"
#include "tests/support/version_numbers.h"

namespace kral {
namespace {

using handset::Bytes;
using handset::NvStatus;
using PkvBackup = test::PkvTest;
using test::kItems;
using test::kRfFile;
using test::Result;

TEST_F(PkvBackup, RestoredToABlankHandsetItIsTheSameAgain) {
  Configure(2);
  Furnish();
  handset().nv().Set(7, Bytes{1, 2, 3}, 1);
  handset().nv().Set(8, Bytes{4}, 1);
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u) << ErrorText();
  EXPECT_EQ(Counts(), "25 98 0 0 0 0");
  EXPECT_EQ(g_results["3"], Result(KRAL_PKV_DONE, 0));
  EXPECT_EQ(g_results["4"], Result(KRAL_PKV_SKIPPED, 5));
  EXPECT_TRUE(HasLine(KRAL_LOG_C_HIGH_LEVEL_START, "KRAL_NV_BackupNVFromMobile"));
  const pkv::PkvSet first = Read();
  EXPECT_EQ(first.items.size(), 22u);
  EXPECT_EQ(first.properties.version, "VARN " + test::VersionNumbers());
  EXPECT_EQ(first.properties.values[0].first, "ESN");

  MakeBlank();
  EXPECT_EQ(Run(KRAL_PKV_Verify), KRAL_PKV_STATUS_DIFFERENT);
  EXPECT_EQ(Counts(), "1 0 0 24 0 0");  // the serial number is every handset's own
  ASSERT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << ErrorText();
  EXPECT_EQ(Counts(), "24 1 0 0 0 0");
  EXPECT_EQ(g_results["0"], Result(KRAL_PKV_SKIPPED, 7));
  EXPECT_EQ(handset().nv().Value(8, 1), Bytes([] {
              Bytes data(128);
              data[0] = 4;
              return data;
            }()));
  EXPECT_EQ(handset().efs().Mode(kRfFile).value_or(0) & 0xF000u, 0xE000u);
  EXPECT_EQ(Run(KRAL_PKV_Verify), 0u);
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV, "again.pkv"), 0u);
  const pkv::PkvSet again = Read("again.pkv");
  EXPECT_EQ(again.items, first.items);
  EXPECT_EQ(again.files, first.files);
}

TEST_F(PkvBackup, EveryRefusalIsTheItemsOwn) {
  Furnish();
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u);
  MakeBlank();
  for (uint16_t id = 0; id < kItems; id += 6) handset().nv().SetStatus(id, NvStatus::kFailed);
  handset().nv().SetReadOnly(9);
  handset().nv().SetReadOnly(15);
  const uint16_t kMayBeReadOnly[] = {15};
  KRAL_DIAG_NV_WRITE_BatchQueue_SetRO_List(handle(), kMayBeReadOnly, 1);
  handset().efs().AddDirectory("/nv/items/empty");  // in the way
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), KRAL_PKV_STATUS_NOT_WRITTEN);
  EXPECT_EQ(Counts(), "10 1 12 0 0 0");
  EXPECT_EQ(g_results["3"], Result(KRAL_PKV_DONE, 0));
  EXPECT_EQ(g_results["6"], Result(KRAL_PKV_REFUSED, 4));
  EXPECT_EQ(g_results["9"], Result(KRAL_PKV_REFUSED, 7));
  EXPECT_EQ(g_results["15"], Result(KRAL_PKV_SKIPPED, 7));
  EXPECT_EQ(g_results["/nv/items/empty"], Result(KRAL_PKV_REFUSED, 21));
  EXPECT_EQ(g_results["/nv/reg_files/conf/below/plain"].first, KRAL_PKV_DONE);
}

TEST_F(PkvBackup, AHandsetWithoutBatchesTakesItemsOneByOne) {
  Furnish();
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u);
  MakeBlank();
  handset().faults().Add(handset::Refuse(19), When::Always().Of("4B 30 00"));
  handset().ClearTrace();
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << ErrorText();
  EXPECT_EQ(RequestsOf({75, 48}), 1u);
  EXPECT_EQ(RequestsOf({39}), kItems / 3u);
}

TEST_F(PkvBackup, ElementsGoToTheElementsOfArrays) {
  handset().nv().MakeArray(5, 3);
  pkv::PkvSet set;
  for (uint16_t index = 0; index < 4; ++index)
    set.items.push_back({.id = 5, .index = index, .data = {uint8_t(index + 1)}});
  set.items.push_back({.id = 5, .index = 0x101, .data = {0xEE}});
  set.items.push_back({.id = 5, .index = 1, .subscription = 1, .data = {9}});
  ASSERT_TRUE(pkv::WritePkv(folder_.Path("phone.pkv"), set).done());
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), KRAL_PKV_STATUS_NOT_WRITTEN);
  EXPECT_EQ(g_results["5"], Result(KRAL_PKV_DONE, 0));
  EXPECT_EQ(g_results["5[2]"], Result(KRAL_PKV_DONE, 0));
  EXPECT_EQ(g_results["5[3]"], Result(KRAL_PKV_REFUSED, 6));  // the array has three
  EXPECT_EQ(g_results["5[257]"], Result(KRAL_PKV_REFUSED, 0xFFFF));
  EXPECT_EQ(handset().nv().Element(5, 1).value_or(Bytes{0})[0], 2) << "not written by an index cut to a byte";
  EXPECT_EQ(g_results["5[1]/1"], Result(KRAL_PKV_SKIPPED, 0));
  EXPECT_EQ(handset().nv().Element(5, 2).value_or(Bytes{0})[0], 3);
  EXPECT_EQ(Run(KRAL_PKV_Verify), KRAL_PKV_STATUS_DIFFERENT);
  EXPECT_EQ(g_results["5[1]"], Result(KRAL_PKV_DONE, 0));
  EXPECT_EQ(g_results["5[257]"], Result(KRAL_PKV_REFUSED, 0xFFFF));
  EXPECT_EQ(g_results["5[1]/1"], Result(KRAL_PKV_SKIPPED, 0)) << "not compared with the element of subscription 0";
}

TEST_F(PkvBackup, DefinitionsNameElementsAndItemsBeyondTheRange) {
  const std::string definitions = folder_.Add(
      "definitions.xml",
      "<NvDefinition version='1.0'><NvItem id='5' name='array' maxIndex='2'><DataType><Member name='v' typeid='word8' "
      "num_of_element='127'/></DataType></NvItem><NvItem id='30000' name='beyond'><DataType><Member name='v' "
      "typeid='word8' num_of_element='128'/></DataType></NvItem></NvDefinition>");
  ASSERT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), definitions.c_str()), 0u) << ErrorText();
  handset().nv().MakeArray(5, 3);
  handset().nv().SetElement(5, 0, Bytes{1});  // alone it looks like a plain item
  handset().nv().Set(30000, Bytes{3});
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u) << ErrorText();
  EXPECT_EQ(g_results["5"], Result(KRAL_PKV_DONE, 0));
  EXPECT_EQ(g_results["5[2]"], Result(KRAL_PKV_SKIPPED, 5));
  EXPECT_EQ(g_results["30000"], Result(KRAL_PKV_DONE, 0));
  handset().nv().SetElement(5, 0, Bytes{9});
  ASSERT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << ErrorText();
  EXPECT_EQ(handset().nv().Element(5, 0).value_or(Bytes{0})[0], 1);
  EXPECT_EQ(Read().properties.values.back(), std::pair(std::string("Arrays"), std::string("5")));
}

// Whatever is defined when it is restored.
TEST_F(PkvBackup, WhatIsAnArrayIsInTheFile) {
  handset().nv().MakeArray(5, 3);
  pkv::PkvSet set;
  set.items.push_back({.id = 5, .data = {2, 7}});  // as a plain item: element 2
  set.properties.values = {{"Arrays", "x,5,70000,,"}};
  ASSERT_TRUE(pkv::WritePkv(folder_.Path("phone.pkv"), set).done());
  ASSERT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << ErrorText();
  const Bytes element = handset().nv().Element(5, 0).value_or(Bytes{0, 0});
  EXPECT_EQ(Bytes(element.begin(), element.begin() + 2), (Bytes{2, 7}));
}

// A plain request for an array names the element in its first byte, in both directions.
TEST_F(PkvBackup, AnArrayThatNobodyDefinedLosesNothing) {
  handset().nv().MakeArray(5, 3);
  for (uint8_t index = 0; index < 3; ++index) handset().nv().SetElement(5, index, Bytes{uint8_t(index + 1), 0xAA});
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u) << ErrorText();
  handset().nv().SetElement(5, 0, Bytes{9});
  ASSERT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << ErrorText();
  EXPECT_EQ(Run(KRAL_PKV_Verify), 0u);
  for (uint8_t index = 0; index < 3; ++index) EXPECT_EQ(handset().nv().Element(5, index)->front(), index + 1);

  const std::string definition =
      "<NvDefinition version='1.0'><NvItem id='5' maxIndex='2'><DataType><Member typeid='word8'/></DataType></NvItem>"
      "</NvDefinition>";
  ASSERT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), folder_.Add("array.xml", definition).c_str()), 0u);
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), KRAL_PKV_STATUS_NOT_WRITTEN);
  EXPECT_EQ(g_results["5"], Result(KRAL_PKV_REFUSED, 0xFFFF)) << "now it would be taken for an element";
  EXPECT_EQ(Run(KRAL_PKV_Verify), KRAL_PKV_STATUS_DIFFERENT);
}

TEST_F(PkvBackup, ARefusedItemMakesItIncomplete) {
  Furnish();
  handset().nv().SetStatus(6, NvStatus::kFailed);
  handset().nv().SetStatus(9, NvStatus::kBadItem);
  EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV), KRAL_PKV_STATUS_INCOMPLETE);
  EXPECT_EQ(g_results["6"], Result(KRAL_PKV_REFUSED, 4));
  EXPECT_EQ(g_results["9"], Result(KRAL_PKV_SKIPPED, 6));
  EXPECT_EQ(Read().items.size(), kValues - 5);
}

// --- Trouble on the line --------------------------------------------------------------------------------------------

// One fault at every packet: the work is done all the same, with the right values, or fails and says so.
TEST_F(PkvBackup, NoFaultOfTheLineSpoilsABackupOrARestore) {
  const struct {
    const char* name;
    Fault fault;
  } kRows[] = {
      {"lose", handset::Lose()},
      {"after the next request", handset::AfterNextRequest()},
      {"duplicate", handset::Duplicate()},
      {"corrupt", handset::Corrupt()},
      {"wrong code", handset::WrongCode(0x55)},
      {"ignore", handset::Ignore()},
  };
  ASSERT_EQ(KRAL_PKV_ConfigureBackup(handle(), 0, 11, 1), 1);
  for (uint16_t id = 1; id < 12; ++id) handset().nv().Set(id, RandomBytes(128, id));
  handset().efs().AddItemFile(kRfFile, RandomBytes(300));
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV, "good.pkv"), 0u);
  const pkv::PkvSet good = Read("good.pkv");
  ShortenTimeOuts(120);
  for (const auto& row : kRows) {
    for (uint64_t packet : {1u, 2u, 8u, 14u}) {
      SCOPED_TRACE(testing::Message() << row.name << " at packet " << packet);
      handset().faults().Add(row.fault, When::Nth(packet).Of("26"));
      handset().faults().Add(row.fault, When::Nth(packet).Of("7C"));
      EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u) << ErrorText();
      handset().faults().Clear();
      EXPECT_EQ(Read().items, good.items);
      EXPECT_EQ(Read().properties.values, good.properties.values);

      for (uint16_t id = 1; id < 12; ++id) handset().nv().Erase(id);
      handset().faults().Add(row.fault, When::Nth(packet % 2 + 1).Of("4B 30"));
      handset().faults().Add(row.fault, When::Nth(packet).Of("26"));
      handset().faults().Add(row.fault, When::Nth(1).Of("4B 13 26"));
      EXPECT_EQ(Run(KRAL_RestoreNVFromPKV, "good.pkv"), 0u) << ErrorText();
      handset().faults().Clear();
      EXPECT_EQ(Counts(), "12 1 0 0 0 0");
      ClearLog();
    }
  }
}

TEST_F(PkvBackup, ARefusalThatComesAgainIsNotTheNextRequests) {
  Furnish();
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u);
  const pkv::PkvSet good = Read();
  // The second one is in front of the status of the first folder, and of the next item.
  for (const char* const request : {"7C", "26 03 00"}) {
    SCOPED_TRACE(request);
    handset().faults().Add(handset::Refuse(19), When::Nth(1).Of(request));
    handset().faults().Add(handset::Repeat(), When::Nth(1).Of(request));
    const bool is_item = std::string(request) != "7C";
    EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV), is_item ? KRAL_PKV_STATUS_INCOMPLETE : 0u) << ErrorText();
    handset().faults().Clear();
    EXPECT_EQ(Read().items.size() + (is_item ? 1 : 0), good.items.size());
    EXPECT_EQ(Read().files, good.files);
  }
  EXPECT_EQ(g_results["3"].first, KRAL_PKV_REFUSED);
  EXPECT_NE(g_results["4"].first, KRAL_PKV_REFUSED);
}

TEST_F(PkvBackup, ALostRequestForAFolderIsMadeAgain) {
  Furnish();
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u);
  MakeBlank();
  ShortenTimeOuts(250);
  const std::string folder = "nv/reg_files/conf/below";
  ASSERT_EQ(KRAL_EfsRmDir(handle(), folder.c_str(), nullptr), 1);
  const std::string request = "4B 13 09 00 FF 01 " + handset::HexText(Bytes(folder.begin(), folder.end()));
  handset().faults().Add(handset::Ignore(), When::Nth(1).Of(request));
  handset().ClearTrace();
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << ErrorText();
  EXPECT_EQ(RequestsOf(handset::FromHex(request)), 2u);
  EXPECT_EQ(handset().efs().File(folder + "/plain"), RandomBytes(2000));
}

TEST_F(PkvBackup, AnUnpluggedCableLeavesTheOldFileAndTellsWhatWasReached) {
  Furnish();
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV, "good.pkv"), 0u);
  ShortenTimeOuts(250);
  folder_.Add("phone.pkv", "precious");
  handset().faults().Add(handset::HangUp(), When::Nth(30).Of("26"));
  EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV), KRAL_PKV_STATUS_LOST);
  EXPECT_EQ(folder_.Content("phone.pkv"), "precious");
  EXPECT_EQ(Counts(), "10 18 0 0 0 35");
  EXPECT_EQ(std::distance(std::filesystem::directory_iterator(std::filesystem::path(folder_.Path("x")).parent_path()),
                          std::filesystem::directory_iterator()),
            2);

  // In the read-back of the second packet's third item: these nine are written.
  handset().PlugIn();
  handset().faults().Clear();
  MakeBlank();
  handset().faults().Add(handset::HangUp(), When::Nth(9 + 3).Of("26"));
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV, "good.pkv"), KRAL_PKV_STATUS_LOST);
  EXPECT_EQ(Counts(), "10 1 0 0 7 5");
  EXPECT_EQ(g_results.size(), kValues);
  EXPECT_EQ(g_results["51"].first, KRAL_PKV_NOT_READ_BACK);
  EXPECT_EQ(g_results["54"].first, KRAL_PKV_NOT_REACHED);
  EXPECT_TRUE(handset().nv().Value(51).has_value());
  EXPECT_FALSE(handset().nv().Value(54).has_value());
  EXPECT_EQ(Run(KRAL_PKV_Verify, "good.pkv"), KRAL_PKV_STATUS_LOST);
  EXPECT_EQ(Counts(), "0 0 0 0 0 23");
  handset().PlugIn();
}

TEST_F(PkvBackup, ValuesThatAreNotKeptAreFound) {
  pkv::PkvSet set;
  for (uint16_t id = 1; id <= 3; ++id) set.items.push_back({.id = id, .data = {1}});
  ASSERT_TRUE(pkv::WritePkv(folder_.Path("phone.pkv"), set).done());
  handset().On(38, handset::Length::AtLeast(3), [](handset::ByteView request, handset::Wire& wire) {
    handset::ByteWriter reply;  // item 1 as written, item 2 otherwise, item 3 cannot be read
    reply.Raw(request.first(3)).U8(request[1] == 2 ? 0xFF : 1).Raw(Bytes(127)).U16(request[1] == 3 ? 4 : 0);
    wire.Send(reply.Take());
  });
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV), KRAL_PKV_STATUS_NOT_WRITTEN);
  EXPECT_EQ(g_results["1"], Result(KRAL_PKV_DONE, 0));
  EXPECT_EQ(g_results["2"], Result(KRAL_PKV_DIFFERENT, 0));
  EXPECT_EQ(g_results["3"], Result(KRAL_PKV_NOT_READ_BACK, 4));
}

// --- The caller -----------------------------------------------------------------------------------------------------

TEST_F(PkvBackup, TheCallbackEndsEachOfThem) {
  Furnish();
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u);
  const std::string before = folder_.Content("phone.pkv");
  g_stop_at = 4;
  for (const Job job : {KRAL_BackupNVFromMobileToPKV, KRAL_RestoreNVFromPKV, KRAL_PKV_Verify}) {
    EXPECT_EQ(Run(job), KRAL_PKV_STATUS_STOPPED);
    EXPECT_EQ(g_results.size(), 4u);
    // A restore's packet of nine is counted to its end.
    EXPECT_EQ(Counts(), job == KRAL_BackupNVFromMobileToPKV ? "2 2 0 0 0 59"
                        : job == KRAL_RestoreNVFromPKV      ? "8 1 0 0 0 14"
                                                            : "4 0 0 0 0 19");
  }
  EXPECT_EQ(folder_.Content("phone.pkv"), before);
}

TEST_F(PkvBackup, AnAbortEndsEachOfThemAlsoWhileFoldersAreListed) {
  Furnish();
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u);
  const std::string before = folder_.Content("phone.pkv");
  static int listed;
  listed = 0;
  KRAL_ConfigureEfs2CallBacks(handle(), nullptr, [](const KRAL_EFS_ENTRY*, KRAL_HANDLE handle) {
    if (++listed == 1) KRAL_AbortEFS_Operation(handle);
  });
  EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV), KRAL_PKV_STATUS_STOPPED);
  EXPECT_EQ(listed, 1);
  EXPECT_TRUE(g_results.empty());
  KRAL_ConfigureEfs2CallBacks(handle(), nullptr, nullptr);

  // In the midst of an item or a file, neither of which is called refused. A silent handset is not waited for: neither
  // with the request under way nor with the next ones, be it that a transfer begins just then.
  ShortenTimeOuts(3000);
  struct Row {
    Job job;
    const char* slow;
    const char* silent;
    const char* counts;
  };
  // Aborted by another thread as soon as a fault strikes.
  const auto run_aborted = [&](Job job) {
    const uint64_t struck = handset().faults().struck();
    std::chrono::steady_clock::time_point aborted;
    std::thread other([&] {
      for (int i = 0; i < 10000 && handset().faults().struck() == struck; ++i) {
        std::this_thread::sleep_for(std::chrono::milliseconds(1));
      }
      aborted = std::chrono::steady_clock::now();
      KRAL_AbortEFS_Operation(handle());
    });
    EXPECT_EQ(Run(job), KRAL_PKV_STATUS_STOPPED);
    other.join();
    EXPECT_LT(std::chrono::steady_clock::now() - aborted, std::chrono::milliseconds(1500));
  };
  constexpr const char* kStatusOfThePlainFile = "4B 13 0F 00 2F 6E 76 2F 72 65 67";
  for (const auto& [job, slow, silent, counts] : {
           Row{KRAL_BackupNVFromMobileToPKV, nullptr, "26 07 00", "3 4 0 0 0 56"},
           Row{KRAL_BackupNVFromMobileToPKV, nullptr, "4B 13 04 00", "21 40 0 0 0 2"},
           Row{KRAL_PKV_Verify, nullptr, "4B 13 02 00", "22 0 0 0 0 1"},
           Row{KRAL_PKV_Verify, kStatusOfThePlainFile, "4B 13 02 00", "22 0 0 0 0 1"},
           Row{KRAL_RestoreNVFromPKV, nullptr, "4B 13 09 00", "19 1 0 0 0 3"},
           Row{KRAL_RestoreNVFromPKV, nullptr, "4B 13 05 00", "21 1 0 0 0 1"},
       }) {
    SCOPED_TRACE(silent);
    if (slow != nullptr) handset().faults().Add(handset::Lag(30), When::Always().Of(slow));
    handset().faults().Add(handset::Ignore(), When::Always().Of(silent));
    run_aborted(job);
    EXPECT_EQ(Counts(), counts);
    EXPECT_EQ(folder_.Content("phone.pkv"), before);
    handset().faults().Clear();
  }
  ASSERT_EQ(Run(KRAL_RestoreNVFromPKV), 0u) << "the abort is forgotten";

  // The answer that was not waited for comes in front of the next one's.
  handset().faults().Add(handset::Lag(150), When::Nth(1).Of("4B 13 0F 00"));
  run_aborted(KRAL_BackupNVFromMobileToPKV);
  EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u);
  EXPECT_NE(folder_.Content("phone.pkv").find("ESN="), std::string::npos);
}

TEST_F(PkvBackup, WhatTheCallerHadUnderWayStays) {
  Furnish();
  static int calls;
  static int listed;
  calls = listed = 0;
  KRAL_ConfigureEfs2CallBacks(
      handle(), [](uintptr_t, uintptr_t, uint32_t, uint32_t, uint32_t, uint32_t, KRAL_HANDLE) { ++calls; },
      [](const KRAL_EFS_ENTRY*, KRAL_HANDLE) { ++listed; });
  KRAL_DIAG_NV_WRITE_SetBatchMode(handle(), 1);
  uint8_t data = 0x77;
  uint16_t status = 0;
  KRAL_DIAG_NV_WRITE_F(handle(), 1000, &data, 1, &status);
  ASSERT_EQ(Run(KRAL_BackupNVFromMobileToPKV), 0u);
  EXPECT_GT(listed, 3) << "the folders are listed, which takes its time";
  listed = 0;
  ASSERT_EQ(Run(KRAL_RestoreNVFromPKV), 0u);
  EXPECT_EQ(calls + listed, 0);

  // What another thread configures meanwhile is not undone at the end.
  static int later_calls;
  later_calls = 0;
  KRAL_PKV_ConfigureCallBack(
      handle(), [](const KRAL_PKV_ITEM*, const char*, uint32_t done, uint32_t, KRAL_HANDLE context) -> uint8_t {
        if (done == 1) {
          std::thread([context] {
            KRAL_ConfigureEfs2CallBacks(
                context,
                [](uintptr_t, uintptr_t, uint32_t, uint32_t, uint32_t, uint32_t, KRAL_HANDLE) { ++later_calls; },
                nullptr);
          }).join();
        }
        return 1;
      });
  ASSERT_EQ(Run(KRAL_PKV_Verify), 0u);
  EXPECT_EQ(later_calls, 0);
  EXPECT_EQ(KRAL_DIAG_NV_WRITE_FlushBatchQueue(handle(), nullptr, nullptr, nullptr), 1);
  EXPECT_TRUE(handset().nv().Value(1000).has_value());
  KRAL_EfsPutItemFromMem(handle(), "/nv/items/x", &data, 1);
  uint32_t size = 1;
  KRAL_EfsReadMem(handle(), "/nv/items/x", &data, &size);
  EXPECT_EQ(calls, 0);
  EXPECT_GT(later_calls, 0);
}

TEST_F(PkvBackup, FilesAndArgumentsThatCannotBeUsedAreToldApart) {
  folder_.Add("text.pkv", "no compound document");
  CompoundStorage root;
  root.OpenOrAddStorage("Other");
  ASSERT_EQ(SaveCompoundFile(folder_.Path("other.pkv"), root), "");
  root.OpenOrAddStorage("NV_NUMBERED_ITEMS").OpenOrAddStorage("00000001").OpenOrAddStream("00000000").bytes = {1};
  ASSERT_EQ(SaveCompoundFile(folder_.Path("damaged.pkv"), root), "");
  handset().ClearTrace();
  for (const Job job : {KRAL_RestoreNVFromPKV, KRAL_PKV_Verify}) {
    EXPECT_EQ(Run(job, "none.pkv"), KRAL_PKV_STATUS_CANNOT_OPEN);
    EXPECT_EQ(Run(job, "text.pkv"), KRAL_PKV_STATUS_CANNOT_OPEN);
    EXPECT_EQ(Run(job, "other.pkv"), KRAL_PKV_STATUS_NO_STORAGE);
    EXPECT_EQ(Run(job, "damaged.pkv"), KRAL_PKV_STATUS_BAD_ITEM);
    EXPECT_EQ(job(handle(), nullptr, nullptr), 0);
  }
  EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV, "no folder/phone.pkv"), KRAL_PKV_STATUS_CANNOT_OPEN);
  uint32_t status = 0;
  EXPECT_EQ(KRAL_BackupNVFromMobileToPKV(handle(), "", &status), 0);
  EXPECT_EQ(status, KRAL_PKV_STATUS_CANNOT_OPEN);
  ASSERT_TRUE(pkv::WritePkv(folder_.Path("empty.pkv"), {}).done());
  EXPECT_EQ(Run(KRAL_RestoreNVFromPKV, "empty.pkv"), KRAL_PKV_STATUS_BAD_ITEM);
  EXPECT_TRUE(handset().requests().empty());
  handset().nv().SetStatus(0, NvStatus::kInactive);
  ASSERT_EQ(KRAL_PKV_ConfigureBackup(handle(), 0, 0, 1), 1);
  EXPECT_EQ(Run(KRAL_BackupNVFromMobileToPKV), KRAL_PKV_STATUS_NOTHING_READ);
  EXPECT_EQ(KRAL_PKV_ConfigureBackup(handle(), 2, 1, 1), 0);
  EXPECT_EQ(KRAL_PKV_ConfigureBackup(handle(), 0, 1, 0), 0);
  EXPECT_EQ(KRAL_PKV_ConfigureBackup(handle(), 0, 1, 17), 0);
}

}  // namespace
}  // namespace kral
