// The NV tool and the handset: sets, single items, subscriptions, arrays, and what goes wrong.
#include "base/deflate.h"
#include "kral/pkv.h"
#include "storage/nv/nv_definitions.h"
#include "storage/pkv/pkv_set.h"
#include "tests/support/nv_fixture.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using handset::NvStatus;
using NvTool = test::NvToolTest;
using test::kTwoBytes;

// --- The handset -----------------------------------------------------------------------------------------------------

// Every kind of item goes to the handset and comes back, and again through both kinds of files.
TEST_F(NvTool, EveryKindOfItemSurvivesEveryWay) {
  ASSERT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), test::ExampleDefinitions().c_str()), 0u);
  handset().nv().MakeArray(3101, 4);
  std::string zeros;
  for (int i = 0; i < 255; ++i) zeros += "0,";
  const struct {
    uint16_t id;
    uint16_t array_index;
    std::string value;
  } kValues[] = {{10, 0, "1,513"},        {114, 0, "-70000"},      {162, 0, "18446744073709551615"},
                 {453, 0, "1"},           {3101, 0, "-300,-4"},    {3101, 3, "300,4"},
                 {3200, 0, "4,10,0,0,1"}, {3201, 0, "1,9750,-12"}, {3300, 0, zeros + "7"},
                 {20001, 0, "2,-1,2"},    {20002, 0, "-77"}};
  for (const auto& value : kValues) {
    ASSERT_EQ(Set(value.id, value.value.c_str(), value.array_index), 0u) << value.id << ErrorText();
  }
  const char* const name = "/nv/item_files/modem/mmode/operator_name";
  ASSERT_EQ(KRAL_NV_SetNVValueStringByEfsFilename(handle(), name, "1,75,114"), 0u);

  ASSERT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u) << ErrorText();
  EXPECT_EQ(HexText(ByteView(*handset().nv().Value(10)).first(4)), "01 01 02 00");
  EXPECT_EQ(HexText(ByteView(*handset().nv().Element(3101, 3)).first(4)), "2C 01 04 00");
  EXPECT_EQ(HexText(*handset().efs().File(name)), "01 4B 72");
  EXPECT_EQ(HexText(*handset().efs().File("/nv/item_files/rfnv/00020002")), "B3 FF");
  EXPECT_EQ(Decompress(*handset().nv().Value(3300), 512)->size(), 512u);
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "DIAG_NV_WRITE_F NV Id:453 Status:0"));

  const std::string pkv = Pkv();
  pkv::PkvSet signed_set;
  ASSERT_TRUE(pkv::ReadPkv(pkv, signed_set).done());
  ASSERT_EQ(signed_set.properties.values.size(), 6u);
  EXPECT_EQ(signed_set.properties.values.back(), std::pair(std::string("Arrays"), std::string("3100,3101")));
  EXPECT_EQ(signed_set.properties.values[0].first, "ESN");
  EXPECT_EQ(signed_set.properties.version, pkv::PkvVersionText());
  const std::string source = Source();
  const auto expect_values = [&](const char* from) {
    SCOPED_TRACE(from);
    for (const auto& value : kValues) EXPECT_EQ(Value(value.id, value.array_index), value.value) << value.id;
    EXPECT_EQ(FileValue(name), "1,75,114");
    EXPECT_EQ(Value(71), "error 10");
    KRAL_NV_ClearNVValues(handle());
  };
  KRAL_NV_ClearNVValues(handle());
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 0u) << ErrorText();
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "DIAG_NV_READ_F NV Id:453 Status:0"));
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "DIAG_NV_READ_F NV Id:71 Status:5"));
  expect_values("handset");
  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), pkv.c_str()), 0u) << ErrorText();
  expect_values("PKV file");
  EXPECT_EQ(KRAL_NV_LoadNVsFromSource(handle(), Path("out.xml").c_str()), 0u) << ErrorText();
  EXPECT_EQ(Source(), source);
  expect_values("source file");
}

TEST_F(NvTool, ItemFilesOfTheHandsetGetGenericDefinitions) {
  ASSERT_EQ(Load("<NvEfsItem fullpathname='/nv/item_files/conf/known' name='KNOWN'>" + kTwoBytes + "</NvEfsItem>"), 0u);
  handset().efs().AddFile("/nv/item_files/conf/known", FromHex("01 02"));
  handset().efs().AddItemFile("/nv/item_files/conf/deep/er/item", FromHex("0A 0B 0C"));
  handset().efs().AddItemFile("/nv/item_files/rfnv/00020005", FromHex("DD"));
  handset().efs().AddItemFile("/nv/item_files/conf/b\x01t", FromHex("EE"));
  handset().efs().AddItemFile("/elsewhere/item", FromHex("EE"));
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 0u) << ErrorText();
  uint32_t files = 0;
  KRAL_NV_GetNumOfNVEfsDefinition(handle(), &files);
  EXPECT_EQ(files, 3u);
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "Created generic definition for item file path: nv/item_files/conf/deep/er/item"));
  EXPECT_EQ(FileValue("/nv/item_files/conf/known"), "1,2");
  EXPECT_EQ(FileValue("nv/item_files/conf/deep/er/item"), "10,11,12");
  EXPECT_EQ(Value(20005), "221") << "an RF NV item, read outside factory test mode";
  // Its size may change.
  handset().efs().AddItemFile("/nv/item_files/rfnv/00020006", FromHex("01 02 03"));
  handset().mode().SetState(handset::ModeState::kFactoryTest);
  uint16_t status = 9;
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 20006, &status), 0u);
  EXPECT_EQ(status, 0);
  EXPECT_EQ(Value(20006), "1,2,3");
  EXPECT_GE(CountRequests("4B 0B 24 00 00 00 26 4E"), 1u) << "in factory test mode, by its dispatcher";
}

TEST_F(NvTool, AFileIsOneItemHoweverItsPathIsSpelled) {
  constexpr const char* kPath = "/nv/item_files/conf/known";
  ASSERT_EQ(Load("<NvEfsItem fullpathname='" + std::string(kPath) + "' name='KNOWN'>" + kTwoBytes + "</NvEfsItem>" +
                 "<NvEfsItem fullpathname='nv/bare'>" + kTwoBytes + "</NvEfsItem>"),
            0u);
  handset().efs().AddItemFile(kPath, FromHex("01 02"));  // handsets list it without the slash
  const std::string backup = Path("backup.pkv");
  ASSERT_EQ(KRAL_PKV_ConfigureBackup(handle(), 0, 0, 1), 1);
  ASSERT_EQ(KRAL_BackupNVFromMobileToPKV(handle(), backup.c_str(), nullptr), 1) << ErrorText();
  ASSERT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), backup.c_str()), 0u) << ErrorText();
  EXPECT_EQ(FileValue(kPath), "1,2");
  EXPECT_EQ(FileValue("nv/item_files/conf/known"), "1,2");
  ASSERT_EQ(KRAL_NV_SetNVValueStringByEfsFilename(handle(), "nv//item_files/conf/known", "3,4"), 0u);
  const std::string filter =
      folder_.Add("filter.xml",
                  "<NvFilter><NV_NAME_SUBSTRING_LIST>/nv/item_files,/nv/bare</NV_NAME_SUBSTRING_LIST>"
                  "</NvFilter>");
  ASSERT_EQ(KRAL_NV_LoadWriteFilter(handle(), filter.c_str()), 0u);
  EXPECT_TRUE(HasLine(KRAL_LOG_NV_MANAGER_DEBUG, "nv/bare:WILL_WRITE"));
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u) << ErrorText();
  EXPECT_EQ(HexText(*handset().efs().File(kPath)), "03 04");
  EXPECT_EQ(nv::RfIdOfPath("nv/item_files/rfnv/00020001"), 20001);

  pkv::PkvSet set;
  set.files = {{"nv/x", 0xE1B6, FromHex("01")}, {"nv/y", 0xE1B6, FromHex("02")}};
  ASSERT_TRUE(pkv::WritePkv(Path("first.pkv"), set).done());
  for (pkv::PkvEfsFile& file : set.files) file.path = "/" + file.path;
  ASSERT_TRUE(pkv::WritePkv(Path("second.pkv"), set).done());
  ASSERT_EQ(KRAL_NV_PKV_Diff(handle(), Path("first.pkv").c_str(), Path("second.pkv").c_str(), Path("page").c_str()),
            0u);
  EXPECT_NE(
      folder_.Content("page").find("0 items differ, 0 are only in the first, 0 only in the second, 2 are the same"),
      std::string::npos);
}

TEST_F(NvTool, FilesKeepTheKindAndModeThatWereSeen) {
  const std::tuple<const char*, uint32_t> kFiles[] = {{"/nv/item_files/conf/plain", 0x8180},
                                                      {"/nv/item_files/conf/item", 0xE1A4}};
  const auto add = [&] {
    handset().efs().AddFile("/nv/item_files/conf/plain", FromHex("01"), 0600);
    handset().efs().AddItemFile("/nv/item_files/conf/item", FromHex("02"));
  };
  const auto expect_modes_after_writing = [&](const char* from) {
    SCOPED_TRACE(from);
    for (const auto& [path, mode] : kFiles) KRAL_EfsDelete(handle(), path, nullptr);
    EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u) << ErrorText();
    for (const auto& [path, mode] : kFiles) EXPECT_EQ(handset().efs().Mode(path), mode) << path;
  };
  add();
  ASSERT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 0u) << ErrorText();
  const auto pkv = Pkv();
  pkv::PkvSet set;
  ASSERT_TRUE(pkv::ReadPkv(pkv, set).done());
  ASSERT_EQ(set.files.size(), 2u);
  for (const pkv::PkvEfsFile& file : set.files)
    EXPECT_EQ(file.mode, file.bytes[0] == 1 ? 0x8180u : 0xE1A4u) << file.path;
  expect_modes_after_writing("handset");
  KRAL_NV_ClearNVDefinition(handle());
  ASSERT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), pkv.c_str()), 0u) << ErrorText();
  expect_modes_after_writing("PKV file");

  // An item file that outgrows its requests.
  KRAL_NV_ClearNVDefinition(handle());
  add();
  ASSERT_EQ(Load("<NvEfsItem fullpathname='/nv/item_files/conf/item'><DataType><Member typeid='word8' "
                 "num_of_element='2000'/></DataType></NvEfsItem>"),
            0u);
  std::string value = "1";
  for (int i = 1; i < 2000; ++i) value += ",1";
  ASSERT_EQ(KRAL_NV_SetNVValueStringByEfsFilename(handle(), "/nv/item_files/conf/item", value.c_str()), 0u);
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u) << ErrorText();
  EXPECT_EQ(handset().efs().Mode("/nv/item_files/conf/item"), 0x81A4u);
}

TEST_F(NvTool, SingleItemsTellTheHandsetsStatus) {
  ASSERT_EQ(Load(Item(1) + Item(2) + Item(3)), 0u);
  handset().nv().SetReadOnly(2);
  handset().nv().SetStatus(3, NvStatus::kFailed);
  uint16_t status = 9;
  EXPECT_EQ(KRAL_NV_WriteNVItemToMobileByNVID(handle(), 1, &status), 10u);
  for (const uint16_t id : {1, 2, 3}) ASSERT_EQ(Set(id, "7,8"), 0u);
  EXPECT_EQ(KRAL_NV_WriteNVItemToMobileByNVID(handle(), 1, &status), 0u);
  EXPECT_EQ(status, 0);
  EXPECT_EQ(KRAL_NV_WriteNVItemToMobileByIndex(handle(), 1, &status), 11u);
  EXPECT_EQ(status, 7);
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 2, &status), 12u);
  EXPECT_EQ(status, 5);
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 3, nullptr), 12u);
  EXPECT_EQ(Value(3), "error 10") << "a value that cannot be read is not the handset's";
  EXPECT_EQ(KRAL_NV_WriteNVItemToMobileByIndex(handle(), 3, &status), 8u);
  EXPECT_EQ(KRAL_NV_WriteNVItemToMobileByNVID(handle(), 4, &status), 9u);
  // Items that nobody defined.
  handset().nv().Set(4, FromHex("2A"));
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 4, &status), 0u);
  EXPECT_EQ(Value(4).substr(0, 5), "42,0,");
  EXPECT_TRUE(HasLine(KRAL_LOG_RET, "NV ID 4 definition not found. Created a definition with byte array of 128"));
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 5, &status), 12u);
  EXPECT_EQ(Value(5), "error 9");
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByEfsFilename(handle(), "/nv/none"), 22u);
  EXPECT_EQ(KRAL_NV_WriteNVItemToMobileByEfsFilename(handle(), "/nv/none"), 9u);
  handset().efs().AddItemFile("/nv/one", FromHex("05"));
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByEfsFilename(handle(), "/nv/one"), 0u);
  EXPECT_EQ(FileValue("/nv/one"), "5");
  handset().efs().SetTotalBlocks(0);
  ASSERT_EQ(KRAL_NV_SetNVValueStringByEfsFilename(handle(), "/nv/one", "6"), 0u);
  handset().faults().Add(handset::Refuse(24), handset::When::Always().Of("4B 13 26"));
  EXPECT_EQ(KRAL_NV_WriteNVItemToMobileByEfsFilename(handle(), "/nv/one"), 23u);
}

TEST_F(NvTool, SubscriptionsUseTheRequestsThatNameThem) {
  ASSERT_EQ(Load(Item(20)), 0u);
  handset().nv().Set(20, FromHex("01 01"), 0);
  handset().nv().Set(20, FromHex("02 02"), 1);
  KRAL_NV_SetTargetSupportMultiSIM(handle(), 1);
  KRAL_NV_SetCurrentSubscriptionIndex(handle(), 1);
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 0u);
  EXPECT_EQ(Value(20), "2,2");
  ASSERT_EQ(Set(20, "3,3"), 0u);
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u);
  EXPECT_EQ(handset().nv().Value(20, 1)->front(), 3);
  EXPECT_EQ(handset().nv().Value(20, 0)->front(), 1);
  EXPECT_EQ(CountRequests("27"), 0u);
  const auto pkv = Pkv();
  KRAL_NV_ClearNVDefinition(handle());
  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), pkv.c_str()), 0u);
  EXPECT_EQ(Value(20).substr(0, 6), "3,3,0,");
  EXPECT_NE(Source().find("<NvItem id=\"20\" subscriptionid=\"1\" name=\"\" mapping=\"byteStream\" encoding=\"hex\" "
                          "index=\"0\">03 03 00"),
            std::string::npos);
}

TEST_F(NvTool, ArraysHaveGapsAndNoOtherSubscription) {
  ASSERT_EQ(Load("<NvItem id='30' maxIndex='2'>" + kTwoBytes + "</NvItem>"), 0u);
  handset().nv().MakeArray(30, 3);
  uint16_t status = 9;
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 30, &status), 12u);
  EXPECT_EQ(status, 5) << "no element has a value";
  ASSERT_EQ(Set(30, "3,4", 1), 0u);
  EXPECT_EQ(KRAL_NV_WriteNVItemToMobileByNVID(handle(), 30, &status), 0u);
  KRAL_NV_ClearNVValues(handle());
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 30, &status), 0u);
  EXPECT_EQ(Value(30, 0) + " " + Value(30, 1), "error 10 3,4");

  KRAL_NV_SetTargetSupportMultiSIM(handle(), 1);
  KRAL_NV_SetCurrentSubscriptionIndex(handle(), 1);
  const size_t requests = handset().requests().size();
  ASSERT_EQ(Set(30, "5,6", 1), 0u);
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 11u);
  EXPECT_NE(ErrorText().find("NV ID 30: elements of arrays can be written for subscription 0 only"), std::string::npos);
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 30, &status), 12u);
  EXPECT_EQ(status, 5);
  EXPECT_EQ(handset().requests().size(), requests);
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 0u);
  EXPECT_EQ(Value(30, 1), "error 10");
  EXPECT_EQ(handset().nv().Element(30, 1)->front(), 3);
}

TEST_F(NvTool, APkvFileTellsWhatIsAnArray) {
  handset().nv().MakeArray(5, 3);
  pkv::PkvSet set;
  set.items.push_back({.id = 5, .data = {2, 7}});  // as a plain item: element 2
  set.properties.values = {{"Arrays", "5"}};
  ASSERT_TRUE(pkv::WritePkv(Path("phone.pkv"), set).done());
  ASSERT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), Path("phone.pkv").c_str()), 0u) << ErrorText();
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u);
  EXPECT_EQ(handset().nv().Element(5, 0)->front(), 2);
  EXPECT_FALSE(handset().nv().Element(5, 2));
  ASSERT_EQ(Load(Item(5)), 0u);
  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), Path("phone.pkv").c_str()), 20u) << "defined as a plain item";
}

TEST_F(NvTool, HandsetThatRefusesHalfOfTheItemsGetsTheRest) {
  std::string items;
  for (int id = 100; id < 120; ++id) items += Item(id);
  ASSERT_EQ(Load(items), 0u);
  for (uint16_t id = 100; id < 120; ++id) {
    Set(id, "1,2");
    if (id % 2 != 0) handset().nv().SetReadOnly(id);
  }
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 11u);
  for (uint16_t id = 100; id < 120; ++id) EXPECT_EQ(handset().nv().Value(id).has_value(), id % 2 == 0) << id;
  EXPECT_EQ(CountLines(KRAL_LOG_ERR, "NV ID 101 was refused with status 7"), 1u);

  for (uint16_t id = 101; id < 120; id += 2) handset().nv().SetStatus(id, NvStatus::kFailed);
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 12u);
  EXPECT_EQ(Value(118), "1,2");
  EXPECT_EQ(Value(119), "error 10");
  handset().faults().Add(handset::Refuse(19), handset::When::Always().Of("4B 13"));
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 12u) << "a handset without files";
  EXPECT_EQ(Value(118), "1,2");
  handset().faults().Add(handset::Refuse(20), handset::When::Always().Of("27"));
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 11u) << "refused as requests, too";
}

TEST_F(NvTool, LostAnswersAreAskedForAgainAndAPulledCableEndsTheSet) {
  KRAL_ConfigureTimeOut(handle(), 0, 40);
  KRAL_ConfigureTimeOut(handle(), 1, 40);
  ASSERT_EQ(Load(Item(1) + Item(2) + Item(3)), 0u);
  for (const uint16_t id : {1, 2, 3}) Set(id, "4,5");
  handset().faults().Add(handset::Lose(), handset::When::Nth(2).Of("27"));
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u) << ErrorText();
  EXPECT_EQ(CountRequests("27"), 4u);
  // A late answer is not taken for the next item's.
  handset().faults().Add(handset::AfterNextRequest(), handset::When::Nth(1).Of("26"));
  handset().nv().Set(2, FromHex("06 06"));
  KRAL_NV_LoadNVsFromMobile(handle());
  EXPECT_EQ(Value(1) + " " + Value(2) + " " + Value(3), "4,5 6,6 4,5");
  handset().efs().AddItemFile("/nv/item_files/conf/item", FromHex("01"));
  handset().faults().Add(handset::Refuse(20), handset::When::Always().Of("4B 13 0C"));
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 12u) << "the files could not be listed";
  EXPECT_EQ(Value(3), "4,5");
  handset().faults().Clear();
  Set(2, "4,5");
  handset().faults().Add(handset::HangUp(), handset::When::Nth(2).Of("26"));
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 16u);
  uint16_t status = 9;
  EXPECT_EQ(KRAL_NV_ReadNVItemFromMobileByNVID(handle(), 2, &status), 16u);
  EXPECT_EQ(status, 9);
  EXPECT_EQ(Value(2), "4,5") << "what the handset could not be asked for stays";
}

// --- Callback --------------------------------------------------------------------------------------------------------

std::vector<std::string>& Calls() {
  static std::vector<std::string> calls;
  return calls;
}

void KRAL_CALL OnItem(uint32_t operation, uint32_t done, uint32_t total, const char* item, uint32_t status,
                      KRAL_HANDLE handle) {
  Calls().push_back(std::to_string(operation) + " " + std::to_string(done) + "/" + std::to_string(total) + " " + item +
                    " " + std::to_string(status));
  EXPECT_EQ(KRAL_NV_ClearNVDefinition(handle), 0xFFFFFFFFu) << "in the middle of a set";
  KRAL_ERROR error{};
  EXPECT_EQ(KRAL_GetLastError(handle, &error), 1);
  EXPECT_EQ(error.code, uint32_t{KRAL_ERROR_ARGUMENT}) << error.text;
}

TEST_F(NvTool, CallbackTellsEveryItem) {
  ASSERT_EQ(Load(Item(1) + Item(2) + "<NvEfsItem fullpathname='/f'>" + kTwoBytes + "</NvEfsItem>"), 0u);
  handset().nv().Set(1, FromHex("01"));
  handset().nv().SetStatus(2, NvStatus::kFailed);
  EXPECT_EQ(KRAL_NV_ConfigureCallBack(handle(), OnItem), 0u);
  Calls().clear();
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 12u);
  EXPECT_EQ(Calls(), (std::vector<std::string>{"1 1/3 NV ID 1 0", "1 2/3 NV ID 2 12", "1 3/3 /f 10"}));
  Calls().clear();
  Pkv();
  KRAL_NV_ConfigureCallBack(handle(), nullptr);
  Source();
  EXPECT_EQ(Calls(), (std::vector<std::string>{"4 1/1 NV ID 1 0"}));
}

}  // namespace
}  // namespace kral
