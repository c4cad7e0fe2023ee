// Every way in which a function of the handset's files, items or backups fails leaves a record that is right.
#include <gtest/gtest.h>

#include "kral/error.h"
#include "kral/nv_tool.h"
#include "kral/pkv.h"
#include "tests/support/efs_fixture.h"
#include "tests/support/temp_folder.h"

namespace kral {
namespace {

using handset::Bytes;
using handset::When;

class StorageFailure : public test::EfsTest {
 protected:
  struct Row {
    const char* what;
    std::function<void()> setup;
    std::function<uint8_t()> call;
    const char* function;
    uint32_t code;
    uint32_t status_kind;
    uint32_t status;
    std::string text;  // part of the sentence
  };

  void Check(const Row& row) {
    SCOPED_TRACE(row.what);
    handset().faults().Clear();
    ShortenTimeOuts(40);
    if (row.setup) row.setup();
    EXPECT_EQ(row.call(), 0);
    KRAL_ERROR error{};
    EXPECT_EQ(KRAL_GetLastError(handle(), &error), 1);
    EXPECT_STREQ(error.function, row.function);
    EXPECT_EQ(error.code, row.code) << error.text;
    EXPECT_EQ(error.status_kind, row.status_kind) << error.text;
    EXPECT_EQ(error.status, row.status) << error.text;
    EXPECT_NE(std::string(error.text).find(row.text), std::string::npos) << error.text;
  }
  // A file of this machine, and the system said why.
  void CheckSystemError(const Row& row) {
    Check(row);
    KRAL_ERROR error{};
    KRAL_GetLastError(handle(), &error);
    EXPECT_NE(error.system_error, 0u) << row.what;
  }
  std::function<void()> Answer(uint16_t command, const char* reply) {
    return [this, command, reply] {
      handset().OnSubsystem(19, command, {},
                            [reply](handset::ByteView, handset::Wire& wire) { wire.Send(handset::FromHex(reply)); });
    };
  }
  uint8_t Put(const char* path, size_t size = 100) {
    return KRAL_EfsWriteMem(handle(), data_.data(), static_cast<uint32_t>(size), path);
  }
  uint8_t Get(const char* path, uint32_t room = 2000) {
    Bytes back(room);
    return KRAL_EfsReadMem(handle(), path, back.data(), &room);
  }

  test::TempFolder folder_;
  const Bytes data_ = RandomBytes(2000);
  static constexpr uint32_t kEfs = KRAL_ERROR_STATUS_EFS;
  static constexpr uint32_t kResult = KRAL_ERROR_STATUS_RESULT;
};

TEST_F(StorageFailure, OfFilesNamesTheFile) {
  const KRAL_HANDLE h = handle();
  handset().efs().AddFile("/f", data_);
  handset().efs().AddFile("/locked", Bytes{1}, 0444);
  handset().efs().AddItemFile("/i", Bytes{1, 2});
  const std::string missing = folder_.Path("missing");
  const std::string nowhere = folder_.Path("no/such/folder");
  const std::string local = folder_.Add("local", "12345");
  const std::string large = folder_.Add("large", std::string(1025, 'x'));
  const std::string long_path(300, 'p');
  uint32_t error = 0;
  char target[2];
  const auto silent = [&] { handset().faults().Add(handset::Ignore(), When::Always()); };

  const Row kRows[] = {
      {"read of none", {}, [&] { return Get("/nope"); }, "KRAL_EfsReadMem", 7, kEfs, 2, "no such file /nope"},
      {"no folder to make it in",
       {},
       [&] { return KRAL_EfsMkDir(h, "/a/b", &error); },
       "KRAL_EfsMkDir",
       7,
       kEfs,
       2,
       "/a/b"},
      {"no permission",
       {},
       [&] { return Put("/locked"); },
       "KRAL_EfsWriteMem",
       7,
       kEfs,
       13,
       "no permission for /locked"},
      {"list of none",
       {},
       [&] { return KRAL_EfsDirectory(h, "/nope", 255, nullptr, nullptr); },
       "KRAL_EfsDirectory",
       7,
       kEfs,
       2,
       "no such file /nope"},
      {"used space",
       {},
       [&] { return KRAL_EFS2_GetGroupInfo(h, "/nope", nullptr); },
       "KRAL_EFS2_GetGroupInfo",
       7,
       kEfs,
       2,
       "/nope"},
      {"item of none",
       {},
       [&] { return KRAL_Efs2GetItem(h, missing.c_str(), "/nope", 4); },
       "KRAL_Efs2GetItem",
       7,
       kEfs,
       2,
       "no such file /nope"},
      {"too large", {}, [&] { return Put("/x", 2000); }, "KRAL_EfsWriteMem", 7, kEfs, 28, "no room on the handset"},
      {"silence", silent, [&] { return Put("/x"); }, "KRAL_EfsWriteMem", 5, 0, 0, "75/19/19"},
      {"refused", [&] { handset().faults().Add(handset::Refuse(19), When::Always()); },
       [&] { return KRAL_EfsDelete(h, "/f", &error); }, "KRAL_EfsDelete", 7, KRAL_ERROR_STATUS_REFUSAL, 19, "75/19/8"},
      {"refused sync", [&] { handset().faults().Add(handset::Refuse(24), When::Always()); },
       [&] { return KRAL_EFS2_SyncWithWait(h, "/", 10); }, "KRAL_EFS2_SyncWithWait", 7, KRAL_ERROR_STATUS_REFUSAL, 24,
       "operating mode"},
      {"never in sync", [&] { handset().efs().SetSyncPolls(1000); }, [&] { return KRAL_EFS2_SyncWithWait(h, "/", 10); },
       "KRAL_EFS2_SyncWithWait", 5, 0, 0, "in sync"},
      {"long path",
       {},
       [&] { return KRAL_EfsDelete(h, long_path.c_str(), &error); },
       "KRAL_EfsDelete",
       2,
       0,
       0,
       "too long"},
      {"large item",
       {},
       [&] { return KRAL_EfsPutItemFromMem(h, "/i", data_.data(), 1025); },
       "KRAL_EfsPutItemFromMem",
       2,
       0,
       0,
       "1024"},
      {"large item file",
       {},
       [&] { return KRAL_Efs2PutItem(h, large.c_str(), "/i"); },
       "KRAL_Efs2PutItem",
       2,
       0,
       0,
       large},
      {"no buffer", {}, [&] { return KRAL_EfsWriteMem(h, nullptr, 1, "/x"); }, "KRAL_EfsWriteMem", 2, 0, 0, "buffer"},
      {"small buffer", {}, [&] { return Get("/f", 10); }, "KRAL_EfsReadMem", 2, 0, 0, "/f needs more than the 10"},
      {"packet size", [&] { KRAL_SetEfsReadAndWritePacketSize(h, 20, 12); }, [&] { return Get("/f"); },
       "KRAL_EfsReadMem", 2, 0, 0, "packet size of 20"},
      {"its writing", {}, [&] { return Put("/x"); }, "KRAL_EfsWriteMem", 2, 0, 0, "packet size of 12"},
      {"short status",
       [&] {
         KRAL_SetEfsReadAndWritePacketSize(h, 536, 524);
         handset().Expect("4B 13 0F 00 2F 66 00").Reply("4B 13 0F 00 00");
       },
       [&] { return KRAL_EFS2_DIAG_STAT(h, "/f", &error, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr); },
       "KRAL_EFS2_DIAG_STAT", 6, 0, 0, "too short"},
      {"link without end", Answer(7, "4B 13 07 00 00000000 2F 61"),
       [&] { return KRAL_EfsReadLink(h, "/l", &error, target, 2); }, "KRAL_EfsReadLink", 6, 0, 0, "without an end"},
      {"link without room", Answer(7, "4B 13 07 00 00000000 2F 61 00"),
       [&] { return KRAL_EfsReadLink(h, "/l", &error, target, 2); }, "KRAL_EfsReadLink", 2, 0, 0, "/l"},
      {"data type", Answer(29, "4B 13 1D 00 00000000 02000000 07000000"),
       [&] { return KRAL_EFS2_DIAG_EXTENDED_INFO(h, 5, &error, nullptr, nullptr, nullptr, 0); },
       "KRAL_EFS2_DIAG_EXTENDED_INFO", 6, 0, 0, "unknown type"},
      {"item of too many bytes", Answer(39, "4B 13 27 00 09000000 00000000 01 00 01"),
       [&] { return KRAL_Efs2GetItem(h, missing.c_str(), "/i", 4); }, "KRAL_Efs2GetItem", 6, 0, 0, "contradicts"},
      {"item refused", Answer(38, "4B 13 26 00 01 00 1C000000"),
       [&] { return KRAL_Efs2PutItem(h, local.c_str(), "/i"); }, "KRAL_Efs2PutItem", 7, kEfs, 28,
       "no room on the handset for /i"},
      {"unknown number", Answer(9, "4B 13 09 00 63000000"), [&] { return KRAL_EfsMkDir(h, "/d", &error); },
       "KRAL_EfsMkDir", 7, kEfs, 99, "error 99 for /d"},
  };
  handset().efs().AddDirectory("/d");
  for (const Row& row : kRows) {
    handset().efs().SetTotalBlocks(std::string_view(row.what) == "too large" ? 8 : 100000);
    Check(row);
  }

  const Row kLocal[] = {
      {"no local file",
       {},
       [&] { return KRAL_EfsWrite(h, missing.c_str(), "/x"); },
       "KRAL_EfsWrite",
       10,
       0,
       0,
       missing},
      {"no local item",
       {},
       [&] { return KRAL_Efs2PutItem(h, missing.c_str(), "/x"); },
       "KRAL_Efs2PutItem",
       10,
       0,
       0,
       missing},
      {"no folder for it",
       {},
       [&] { return KRAL_EfsRead(h, nowhere.c_str(), "/f"); },
       "KRAL_EfsRead",
       10,
       0,
       0,
       nowhere},
  };
  for (const Row& row : kLocal) CheckSystemError(row);

  KRAL_ConfigureEfs2CallBacks(
      h,
      [](uintptr_t, uintptr_t, uint32_t, uint32_t, uint32_t, uint32_t, KRAL_HANDLE context) {
        KRAL_AbortEFS_Operation(context);
      },
      nullptr);
  Check({"aborted put", {}, [&] { return Put("/x", 2000); }, "KRAL_EfsWriteMem", 130, 0, 0, "abort"});
  Check({"aborted get", {}, [&] { return Get("/f"); }, "KRAL_EfsReadMem", 130, 0, 0, "abort"});
}

TEST_F(StorageFailure, OfBackupsIsWhatTheJobCameTo) {
  const KRAL_HANDLE h = handle();
  ASSERT_EQ(KRAL_PKV_ConfigureBackup(h, 0, 20, 1), 1);
  for (uint16_t id = 0; id < 20; id += 3) handset().nv().Set(id, RandomBytes(128, id));
  handset().efs().AddItemFile("/nv/items/a", Bytes{1, 2, 3});
  const std::string file = folder_.Path("phone.pkv");
  const std::string missing = folder_.Path("missing.pkv");
  const std::string nowhere = folder_.Path("no folder/phone.pkv");
  const std::string text = folder_.Add("text.pkv", "no compound document");
  uint32_t status = 0;
  const auto backup = [&] { return KRAL_BackupNVFromMobileToPKV(h, file.c_str(), &status); };
  const auto restore = [&] { return KRAL_RestoreNVFromPKV(h, file.c_str(), &status); };
  const auto verify = [&] { return KRAL_PKV_Verify(h, file.c_str(), &status); };
  ASSERT_EQ(backup(), 1) << LogText();

  CheckSystemError({"nowhere",
                    {},
                    [&] { return KRAL_BackupNVFromMobileToPKV(h, nowhere.c_str(), &status); },
                    "KRAL_BackupNVFromMobileToPKV",
                    10,
                    kResult,
                    KRAL_PKV_STATUS_CANNOT_OPEN,
                    nowhere});
  const Row kRows[] = {
      {"missing",
       {},
       [&] { return KRAL_RestoreNVFromPKV(h, missing.c_str(), &status); },
       "KRAL_RestoreNVFromPKV",
       10,
       kResult,
       KRAL_PKV_STATUS_CANNOT_OPEN,
       missing},
      {"no PKV file",
       {},
       [&] { return KRAL_PKV_Verify(h, text.c_str(), &status); },
       "KRAL_PKV_Verify",
       10,
       kResult,
       KRAL_PKV_STATUS_CANNOT_OPEN,
       text},
      {"range",
       {},
       [&] { return KRAL_PKV_ConfigureBackup(h, 2, 1, 1); },
       "KRAL_PKV_ConfigureBackup",
       2,
       0,
       0,
       "2 to 1"},
      {"refused item", [&] { handset().nv().SetStatus(3, handset::NvStatus::kFailed); }, backup,
       "KRAL_BackupNVFromMobileToPKV", 7, kResult, KRAL_PKV_STATUS_INCOMPLETE, "lacks 1 of 22"},
      {"refused write", [&] { handset().nv().SetStatus(6, handset::NvStatus::kFailed); }, restore,
       "KRAL_RestoreNVFromPKV", 7, kResult, KRAL_PKV_STATUS_NOT_WRITTEN, "refused 1 of"},
      {"difference", [&] { handset().nv().Set(9, Bytes{1}); }, verify, "KRAL_PKV_Verify", 8, kResult,
       KRAL_PKV_STATUS_DIFFERENT, "differ on the handset"},
      {"stopped",
       [&] {
         KRAL_PKV_ConfigureCallBack(
             h, [](const KRAL_PKV_ITEM*, const char*, uint32_t, uint32_t, KRAL_HANDLE context) -> uint8_t {
               uint32_t inner = 0;
               EXPECT_EQ(KRAL_PKV_Verify(context, "x", &inner), 0);
               KRAL_ERROR error{};
               EXPECT_EQ(KRAL_GetLastError(context, &error), 1);
               EXPECT_EQ(error.code, uint32_t{KRAL_ERROR_ARGUMENT}) << error.text;
               return 0;
             });
       },
       verify, "KRAL_PKV_Verify", 130, kResult, KRAL_PKV_STATUS_STOPPED, "not reached"},
      {"silence from the start",
       [&] {
         KRAL_PKV_ConfigureCallBack(h, nullptr);
         handset().faults().Add(handset::Ignore(), When::Always());
       },
       verify, "KRAL_PKV_Verify", 5, 0, 0, "no answer to command 38"},
      {"silence on the way", [&] { handset().faults().Add(handset::Ignore(), When::From(5)); }, verify,
       "KRAL_PKV_Verify", 9, kResult, KRAL_PKV_STATUS_LOST, "stopped answering"},
      {"nothing but damage", [&] { handset().faults().Add(handset::Corrupt(), When::Always()); }, backup,
       "KRAL_BackupNVFromMobileToPKV", 6, 0, 0, "wrong check"},
      {"aborted while the handset is asked who it is",
       [&] { handset().On(124, {}, [h](handset::ByteView, handset::Wire&) { KRAL_AbortEFS_Operation(h); }); }, backup,
       "KRAL_BackupNVFromMobileToPKV", 130, kResult, KRAL_PKV_STATUS_STOPPED, "stopped by the caller"},
  };
  for (const Row& row : kRows) Check(row);
}

TEST_F(StorageFailure, OfItemsIsWhatBecameOfTheRequest) {
  const KRAL_HANDLE h = handle();
  constexpr uint32_t kNv = KRAL_ERROR_STATUS_NV;
  constexpr const char* kById = "KRAL_NV_ReadNVItemFromMobileByNVID";
  constexpr const char* kByPath = "KRAL_NV_ReadNVItemFromMobileByEfsFilename";
  KRAL_ConfigureTimeOut(h, 1, 40);
  const std::string definitions =
      folder_.Add("definitions.xml",
                  "<NvDefinition><NvItem id='3'><DataType><Member name='a' typeid='word8'/></DataType></NvItem>"
                  "<NvItem id='4' maxIndex='2'><DataType><Member name='a' typeid='word8'/></DataType></NvItem>"
                  "<NvEfsItem fullpathname='/nv/item_files/rfnv/00020002'>"
                  "<DataType><Member name='a' typeid='word8'/></DataType></NvEfsItem><NvEfsItem fullpathname='/short'>"
                  "<DataType><Member name='a' typeid='word16'/></DataType></NvEfsItem></NvDefinition>");
  ASSERT_EQ(KRAL_NV_LoadNVDefinitionFile(h, definitions.c_str()), 0u);
  handset().efs().AddItemFile("/nv/item_files/rfnv/00020002", Bytes{1});
  handset().nv().Set(3, Bytes{1});
  uint16_t status = 0;
  const auto on = [&](handset::Fault fault, const char* prefix) {
    return [this, fault, prefix] { handset().faults().Add(fault, When::Always().Of(prefix)); };
  };
  const auto read = [&](uint16_t id) {
    return [h, id, &status] { return uint8_t{KRAL_NV_ReadNVItemFromMobileByNVID(h, id, &status) == 0}; };
  };
  const auto read_file = [&] { return uint8_t{KRAL_NV_ReadNVItemFromMobileByEfsFilename(h, "/nope") == 0}; };
  const auto load = [&] { return uint8_t{KRAL_NV_LoadNVsFromMobile(h) == 0}; };

  const Row kRows[] = {
      {"index",
       {},
       [&] { return uint8_t{KRAL_NV_ClearNVValueByIndex(h, 99) == 0}; },
       "KRAL_NV_ClearNVValueByIndex",
       2,
       kResult,
       KRAL_NV_ERROR_INDEX_OUT_OF_BOUND,
       "index 99"},
      {"no value",
       {},
       [&] { return uint8_t{KRAL_NV_WriteNVItemToMobileByNVID(h, 3, &status) == 0}; },
       "KRAL_NV_WriteNVItemToMobileByNVID",
       2,
       kResult,
       KRAL_NV_ERROR_NO_VALUE,
       "NV ID 3"},
      {"no buffer",
       {},
       [&] { return uint8_t{KRAL_NV_GetErrorText(h, 8, nullptr, 0) == 0}; },
       "KRAL_NV_GetErrorText",
       2,
       kResult,
       KRAL_NV_ERROR_CANNOT_GET_VALUE,
       "no buffer"},
      {"bytes of no type", [&] { handset().efs().AddItemFile("/short", Bytes{1}); },
       [&] { return uint8_t{KRAL_NV_ReadNVItemFromMobileByEfsFilename(h, "/short") == 0}; }, kByPath, 6, 0, 0,
       "1 bytes"},
      {"silence", on(handset::Ignore(), "26"), read(3), kById, 5, 0, 0, "no answer to command 38"},
      {"undefined", on(handset::Ignore(), "26"), read(1), kById, 5, 0, 0, "no answer to command 38"},
      {"damage", on(handset::Corrupt(), "26"), read(3), kById, 6, 0, 0, "wrong check"},
      {"another reply", on(handset::WrongCode(0x99), "26"), read(3), kById, 6, KRAL_ERROR_STATUS_REPLY, 153, "153"},
      {"refused", on(handset::Refuse(20), "26"), read(3), kById, 7, KRAL_ERROR_STATUS_REFUSAL, 20, "command 38"},
      {"all silent", on(handset::Ignore(), ""), read(3), kById, 5, 0, 0, "no answer to command 38"},
      {"silence of files", on(handset::Ignore(), "4B 13"), read_file, kByPath, 5, 0, 0, "command 75/19/15"},
      {"refused file", on(handset::Refuse(24), "4B 13"), read_file, kByPath, 7, KRAL_ERROR_STATUS_REFUSAL, 24, "75/19"},
      {"missing file", {}, read_file, kByPath, 7, kEfs, 2, "no such file /nope"},
      {"never written", {}, read(1), kById, 7, kNv, 5, "NV item 1: the handset gives status 5"},
      // The dispatcher of RF NV items refuses outside factory test mode: that was got over.
      {"set", [&] { handset().nv().SetStatus(3, handset::NvStatus::kFailed); }, load, "KRAL_NV_LoadNVsFromMobile", 7,
       kNv, 4, "NV item 3"},
      {"array",
       [&] {
         handset().On(38, {}, [](handset::ByteView request, handset::Wire& wire) {
           Bytes reply(133);
           std::copy_n(request.begin(), 4, reply.begin());
           reply[131] = static_cast<uint8_t>(reply[3] + 1);
           wire.Send(reply);
         });
       },
       read(4), kById, 7, kNv, 1, "NV item 4"},
      {"permission", Answer(15, "4B 13 0F 00 0D000000 00000000 00000000 00000000 00000000 00000000 00000000"),
       read_file, kByPath, 7, kEfs, 13, "no permission for /nope"},
  };
  for (const Row& row : kRows) Check(row);
  const std::string nowhere = folder_.Path("no folder/items.qdf");
  KRAL_NV_SetNVValueStringByNVID(h, 3, 0, "1");
  CheckSystemError({"nowhere",
                    {},
                    [&] { return uint8_t{KRAL_NV_WriteNVsToSource(h, nowhere.c_str()) == 0}; },
                    "KRAL_NV_WriteNVsToSource",
                    10,
                    kResult,
                    KRAL_NV_ERROR_CANNOT_OPEN_SOURCE,
                    nowhere});
}

}  // namespace
}  // namespace kral
