// Every way in which a function of the handset's files, items or backups fails leaves a record that is right.
#include "kral/nv_tool.h"
#include "kral/pkv.h"
#include "tests/support/efs_fixture.h"
#include "tests/support/failures.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::Bytes;

class StorageFailure : public test::EfsTest {
 protected:
  void ExpectFailures(const std::vector<test::FailureRow>& rows) {
    test::ExpectFailures(handle(), rows, [this] {
      handset().faults().Clear();
      ShortenTimeOuts(150);
    });
  }

  void Strike(handset::Fault fault, const When& when = When::Always()) { handset().faults().Add(fault, when); }
  // One reply for every request of the EFS2 command from now on.
  void Answer(uint16_t command, const char* reply) {
    handset().OnSubsystem(19, command, {},
                          [reply](handset::ByteView, handset::Wire& wire) { wire.Send(handset::FromHex(reply)); });
  }
  uint8_t Put(const char* path, size_t size = 100) {
    return KRAL_EfsWriteMem(handle(), data_.data(), static_cast<uint32_t>(size), path);
  }
  uint8_t Get(const char* path, uint32_t room = 2000) {
    Bytes back(room);
    return KRAL_EfsReadMem(handle(), path, back.data(), &room);
  }
  uint8_t Stat(const char* path) {
    uint32_t error = 0;
    return KRAL_EFS2_DIAG_STAT(handle(), path, &error, nullptr, nullptr, nullptr, nullptr, nullptr, nullptr);
  }

  test::TempFolder folder_;
  const Bytes data_ = RandomBytes(2000);
};

TEST_F(StorageFailure, OfFilesNamesTheFile) {
  const KRAL_HANDLE h = handle();
  handset().efs().AddFile("/f", data_);
  handset().efs().AddFile("/locked", Bytes{1}, 0444);
  handset().efs().AddItemFile("/i", Bytes{1, 2});
  handset().efs().AddDirectory("/d");
  const std::string missing = folder_.Path("missing");
  const std::string nowhere = folder_.Path("no/such/folder");
  const std::string local = folder_.Add("local", "12345");
  const std::string large = folder_.Add("large", std::string(1025, 'x'));
  const std::string long_path(300, 'p');
  uint32_t error = 0;
  char target[2];
  const auto room_for = [&](uint32_t blocks) { handset().efs().SetTotalBlocks(blocks); };
  const auto packets = [&](uint16_t read, uint16_t write) { KRAL_SetEfsReadAndWritePacketSize(h, read, write); };
  const auto link = [&] { return KRAL_EfsReadLink(h, "/l", &error, target, 2); };
  const auto information = [&] { return KRAL_EFS2_DIAG_EXTENDED_INFO(h, 5, &error, nullptr, nullptr, nullptr, 0); };
  const auto list = [&] { return KRAL_EfsDirectory(h, "/nope", 255, nullptr, nullptr); };
  const auto get_item = [&](const char* path) { return KRAL_Efs2GetItem(h, missing.c_str(), path, 4); };
  const auto put_item = [&](const std::string& file) { return KRAL_Efs2PutItem(h, file.c_str(), "/i"); };
  const auto short_status = [&] { handset().Expect("4B 13 0F 00 2F 66 00").Reply("4B 13 0F 00 00"); };
  ExpectFailures({
      {"KRAL_EfsReadMem REFUSED EFS 2", "no such file /nope", [&] { return Get("/nope"); }},
      {"KRAL_EfsMkDir REFUSED EFS 2", "/a/b", [&] { return KRAL_EfsMkDir(h, "/a/b", &error); }},
      {"KRAL_EfsWriteMem REFUSED EFS 13", "no permission for /locked", [&] { return Put("/locked"); }},
      {"KRAL_EfsDirectory REFUSED EFS 2", "no such file /nope", list},
      {"KRAL_EFS2_GetGroupInfo REFUSED EFS 2", "/nope", [&] { return KRAL_EFS2_GetGroupInfo(h, "/nope", nullptr); }},
      {"KRAL_Efs2GetItem REFUSED EFS 2", "no such file /nope", [&] { return get_item("/nope"); }},
      {"KRAL_EfsWriteMem REFUSED EFS 28", "no room on the handset", [&] { return room_for(8), Put("/x", 2000); }},
      {"KRAL_EfsWriteMem NO_ANSWER", "75/19/19", [&] { return room_for(9999), Strike(handset::Ignore()), Put("/x"); }},
      {"KRAL_EfsDelete REFUSED REFUSAL 19", "75/19/8",
       [&] { return Strike(handset::Refuse(19)), KRAL_EfsDelete(h, "/f", &error); }},
      {"KRAL_EFS2_SyncWithWait REFUSED REFUSAL 24", "operating mode",
       [&] { return Strike(handset::Refuse(24)), KRAL_EFS2_SyncWithWait(h, "/", 10); }},
      {"KRAL_EFS2_SyncWithWait NO_ANSWER", "in sync",
       [&] { return handset().efs().SetSyncPolls(1000), KRAL_EFS2_SyncWithWait(h, "/", 10); }},
      {"KRAL_EfsDelete ARGUMENT", "too long", [&] { return KRAL_EfsDelete(h, long_path.c_str(), &error); }},
      {"KRAL_EfsPutItemFromMem ARGUMENT", "1024", [&] { return KRAL_EfsPutItemFromMem(h, "/i", data_.data(), 1025); }},
      {"KRAL_Efs2PutItem ARGUMENT", large, [&] { return put_item(large); }},
      {"KRAL_EfsWriteMem ARGUMENT", "buffer", [&] { return KRAL_EfsWriteMem(h, nullptr, 1, "/x"); }},
      {"KRAL_EfsReadMem ARGUMENT", "/f needs more than the 10", [&] { return Get("/f", 10); }},
      {"KRAL_EfsReadMem ARGUMENT", "packet size of 20", [&] { return packets(20, 12), Get("/f"); }},
      {"KRAL_EfsWriteMem ARGUMENT", "packet size of 12", [&] { return Put("/x"); }},
      {"KRAL_EFS2_DIAG_STAT LINK", "too short", [&] { return packets(536, 524), short_status(), Stat("/f"); }},
      {"KRAL_EfsReadLink LINK", "without an end", [&] { return Answer(7, "4B 13 07 00 00000000 2F 61"), link(); }},
      {"KRAL_EfsReadLink ARGUMENT", "/l", [&] { return Answer(7, "4B 13 07 00 00000000 2F 61 00"), link(); }},
      {"KRAL_EFS2_DIAG_EXTENDED_INFO LINK", "unknown type",
       [&] { return Answer(29, "4B 13 1D 00 00000000 02000000 07000000"), information(); }},
      {"KRAL_Efs2GetItem LINK", "contradicts",
       [&] { return Answer(39, "4B 13 27 00 09000000 00000000 01 00 01"), get_item("/i"); }},
      {"KRAL_Efs2PutItem REFUSED EFS 28", "no room on the handset for /i",
       [&] { return Answer(38, "4B 13 26 00 01 00 1C000000"), put_item(local); }},
      {"KRAL_EfsMkDir REFUSED EFS 99", "error 99 for /d",
       [&] { return Answer(9, "4B 13 09 00 63000000"), KRAL_EfsMkDir(h, "/d", &error); }},
      {"KRAL_EfsWrite BAD_FILE", missing, [&] { return KRAL_EfsWrite(h, missing.c_str(), "/x"); }, true},
      {"KRAL_Efs2PutItem BAD_FILE", missing, [&] { return put_item(missing); }, true},
      {"KRAL_EfsRead BAD_FILE", nowhere, [&] { return KRAL_EfsRead(h, nowhere.c_str(), "/f"); }, true},
  });
  const auto abort = [](uintptr_t, uintptr_t, uint32_t, uint32_t, uint32_t, uint32_t, KRAL_HANDLE context) {
    KRAL_AbortEFS_Operation(context);
  };
  KRAL_ConfigureEfs2CallBacks(h, abort, nullptr);
  ExpectFailures({{"KRAL_EfsWriteMem ABORTED", "abort", [&] { return Put("/x", 2000); }},
                  {"KRAL_EfsReadMem ABORTED", "abort", [&] { return Get("/f"); }}});
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
  const auto refuse = [&](uint16_t item) { handset().nv().SetStatus(item, handset::NvStatus::kFailed); };
  const auto stop = [](const KRAL_PKV_ITEM*, const char*, uint32_t, uint32_t, KRAL_HANDLE context) -> uint8_t {
    test::ExpectFailures(context, {{"KRAL_PKV_Verify ARGUMENT RESULT 4294967295", "under way",
                                    [=] { return KRAL_PKV_Verify(context, "x", {}); }}});
    return 0;
  };
  const auto call_back = [&](KRAL_PKV_CALLBACK callback) { KRAL_PKV_ConfigureCallBack(h, callback); };
  const auto abort_when_asked = [&] {
    handset().On(124, {}, [h](handset::ByteView, handset::Wire&) { KRAL_AbortEFS_Operation(h); });
  };
  ASSERT_EQ(backup(), 1) << LogText();
  ExpectFailures({
      {"KRAL_BackupNVFromMobileToPKV BAD_FILE RESULT 7", nowhere,
       [&] { return KRAL_BackupNVFromMobileToPKV(h, nowhere.c_str(), &status); }, true},
      {"KRAL_RestoreNVFromPKV BAD_FILE RESULT 7", missing,
       [&] { return KRAL_RestoreNVFromPKV(h, missing.c_str(), &status); }},
      {"KRAL_PKV_Verify BAD_FILE RESULT 7", text, [&] { return KRAL_PKV_Verify(h, text.c_str(), &status); }},
      {"KRAL_PKV_ConfigureBackup ARGUMENT", "2 to 1", [&] { return KRAL_PKV_ConfigureBackup(h, 2, 1, 1); }},
      {"KRAL_BackupNVFromMobileToPKV REFUSED RESULT 12", "lacks 1 of 22", [&] { return refuse(3), backup(); }},
      {"KRAL_RestoreNVFromPKV REFUSED RESULT 23", "refused 1 of", [&] { return refuse(6), restore(); }},
      {"KRAL_PKV_Verify MISMATCH RESULT 256", "differ on the handset",
       [&] { return handset().nv().Set(9, Bytes(1, 1)), verify(); }},
      {"KRAL_PKV_Verify ABORTED RESULT 257", "not reached", [&] { return call_back(stop), verify(); }},
      {"KRAL_PKV_Verify NO_ANSWER", "no answer to command 38",
       [&] { return call_back(nullptr), Strike(handset::Ignore()), verify(); }},
      {"KRAL_PKV_Verify LOST RESULT 16", "stopped answering",
       [&] { return Strike(handset::Ignore(), When::From(5)), verify(); }},
      {"KRAL_BackupNVFromMobileToPKV LINK", "wrong check", [&] { return Strike(handset::Corrupt()), backup(); }},
      {"KRAL_BackupNVFromMobileToPKV ABORTED RESULT 257", "stopped by the caller",
       [&] { return abort_when_asked(), backup(); }},
  });
}

TEST_F(StorageFailure, OfItemsIsWhatBecameOfTheRequest) {
  const KRAL_HANDLE h = handle();
  const std::string by_id = "KRAL_NV_ReadNVItemFromMobileByNVID";
  const std::string by_path = "KRAL_NV_ReadNVItemFromMobileByEfsFilename";
  const std::string byte = "<DataType><Member name='a' typeid='word8'/></DataType>";
  const std::string definitions = folder_.Add(
      "definitions.xml", "<NvDefinition><NvItem id='3'>" + byte + "</NvItem><NvItem id='4' maxIndex='2'>" + byte +
                             "</NvItem><NvEfsItem fullpathname='/nv/item_files/rfnv/00020002'>" + byte +
                             "</NvEfsItem><NvEfsItem fullpathname='/short'><DataType><Member name='a' typeid='word16'/>"
                             "</DataType></NvEfsItem></NvDefinition>");
  KRAL_ConfigureTimeOut(h, 1, 40);
  ASSERT_EQ(KRAL_NV_LoadNVDefinitionFile(h, definitions.c_str()), 0u);
  handset().efs().AddItemFile("/nv/item_files/rfnv/00020002", Bytes{1});
  handset().efs().AddItemFile("/short", Bytes{1});
  handset().nv().Set(3, Bytes{1});
  uint16_t status = 0;
  // The tool's functions give 0 for success.
  const auto read = [&](uint16_t id) { return KRAL_NV_ReadNVItemFromMobileByNVID(h, id, &status) == 0; };
  const auto read_file = [&](const char* path) { return KRAL_NV_ReadNVItemFromMobileByEfsFilename(h, path) == 0; };
  const auto on = [&](handset::Fault fault, const char* prefix) { Strike(fault, When::Always().Of(prefix)); };
  const auto read_with = [&](handset::Fault fault) { return [&, fault] { return on(fault, "26"), read(3); }; };
  const auto answer_another = [&] {
    handset().On(38, {}, [](handset::ByteView request, handset::Wire& wire) {
      Bytes reply(133);
      std::copy_n(request.begin(), 4, reply.begin());
      reply[131] = static_cast<uint8_t>(reply[3] + 1);
      wire.Send(reply);
    });
  };
  ExpectFailures({
      {"KRAL_NV_ClearNVValueByIndex ARGUMENT RESULT 8", "index 99",
       [&] { return KRAL_NV_ClearNVValueByIndex(h, 99) == 0; }},
      {"KRAL_NV_WriteNVItemToMobileByNVID ARGUMENT RESULT 10", "NV ID 3",
       [&] { return KRAL_NV_WriteNVItemToMobileByNVID(h, 3, &status) == 0; }},
      {"KRAL_NV_GetErrorText ARGUMENT RESULT 12", "no buffer",
       [&] { return KRAL_NV_GetErrorText(h, 8, nullptr, 0) == 0; }},
      {by_path + " LINK", "1 bytes", [&] { return read_file("/short"); }},
      {by_id + " NO_ANSWER", "no answer to command 38", read_with(handset::Ignore())},
      {by_id + " NO_ANSWER", "no answer to command 38", [&] { return on(handset::Ignore(), "26"), read(1); }},
      {by_id + " LINK", "wrong check", read_with(handset::Corrupt())},
      {by_id + " LINK REPLY 153", "153", read_with(handset::WrongCode(0x99))},
      {by_id + " REFUSED REFUSAL 20", "command 38", read_with(handset::Refuse(20))},
      {by_id + " NO_ANSWER", "no answer to command 38", [&] { return Strike(handset::Ignore()), read(3); }},
      {by_path + " NO_ANSWER", "command 75/19/15", [&] { return on(handset::Ignore(), "4B 13"), read_file("/nope"); }},
      {by_path + " REFUSED REFUSAL 24", "75/19", [&] { return on(handset::Refuse(24), "4B 13"), read_file("/nope"); }},
      {by_path + " REFUSED EFS 2", "no such file /nope", [&] { return read_file("/nope"); }},
      {by_id + " REFUSED NV 5", "NV item 1: the handset gives status 5", [&] { return read(1); }},
      // The dispatcher of RF NV items refuses outside factory test mode: that was got over.
      {"KRAL_NV_LoadNVsFromMobile REFUSED NV 4", "NV item 3",
       [&] {
         handset().nv().SetStatus(3, handset::NvStatus::kFailed);
         return KRAL_NV_LoadNVsFromMobile(h) == 0;
       }},
      {by_id + " REFUSED NV 1", "NV item 4", [&] { return answer_another(), read(4); }},
      {by_path + " REFUSED EFS 13", "no permission for /nope",
       [&] {
         return Answer(15, "4B 13 0F 00 0D000000 00000000 00000000 00000000 00000000 00000000 00000000"),
                read_file("/nope");
       }},
  });
  const std::string nowhere = folder_.Path("no folder/items.qdf");
  KRAL_NV_SetNVValueStringByNVID(h, 3, 0, "1");
  ExpectFailures({{"KRAL_NV_WriteNVsToSource BAD_FILE RESULT 14", nowhere,
                   [&] { return KRAL_NV_WriteNVsToSource(h, nowhere.c_str()) == 0; }, true}});
}

}  // namespace
}  // namespace kral
