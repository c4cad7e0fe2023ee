// Log, event and message masks: against the handset's own masks, and byte for byte on the wire.
#include "frame/diag_ftm.h"
#include "frame/resource_manager.h"
#include "kral/log.h"
#include "tests/support/handset_connection.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using Ids = std::vector<uint16_t>;

class Masks : public HandsetTest {
 protected:
  void SetUp() override {
    HandsetTest::SetUp();
    KRAL_StartLogging(handle(), folder_.Path("log").c_str());  // lines with arguments want it
  }

  uint8_t Add(uint8_t equipment_id, const Ids& codes) {
    return KRAL_DIAG_AddExtendedLogCodes(handle(), equipment_id, codes.data(), static_cast<uint16_t>(codes.size()));
  }
  uint8_t Clear(uint8_t equipment_id, const Ids& codes) {
    return KRAL_DIAG_ClearExtendedLogCodes(handle(), equipment_id, codes.data(), static_cast<uint16_t>(codes.size()));
  }
  uint8_t SetEvents(const Ids& ids, uint8_t state) {
    return KRAL_DIAG_SetEventMaskBits(handle(), ids.data(), static_cast<uint16_t>(ids.size()), state);
  }
  uint8_t Load(uint32_t table, std::string_view text) {
    return KRAL_LoadNameTable(handle(), table, folder_.Add("table", text).c_str());
  }
  bool collecting() { return Kral_ResourceManager::GetPhone(handle())->sorter().collecting(); }
  // The requests since the last call, as hex.
  std::vector<std::string> Requests() {
    std::vector<std::string> texts;
    for (const auto& request : handset().requests()) texts.push_back(handset::HexText(request));
    handset().ClearTrace();
    return texts;
  }

  test::TempFolder folder_;
};

// --- Logs -----------------------------------------------------------------------------------------------------------

TEST_F(Masks, CodesJoinAndLeaveTheOthers) {
  EXPECT_EQ(KRAL_DIAG_AddExtendedLogCode(handle(), 1, 0x1005), 1);
  EXPECT_TRUE(collecting());
  EXPECT_EQ(Add(1, {0x1000, 0x1007, 0x1008, 0x13E8}), 1) << "the last one is the last item";
  EXPECT_EQ(Add(4, {0x4001}), 1);
  EXPECT_EQ(handset().logs().logs(), (Ids{0x1000, 0x1005, 0x1007, 0x1008, 0x13E8, 0x4001}));
  EXPECT_EQ(Clear(1, {0x1007, 0x1009}), 1);
  EXPECT_EQ(KRAL_DIAG_ClearExtendedLogCode(handle(), 1, 0x1000), 1);
  EXPECT_EQ(handset().logs().logs(), (Ids{0x1005, 0x1008, 0x13E8, 0x4001}));
  EXPECT_EQ(KRAL_DIAG_SetExtendedLogCode(handle(), 1, 0x1010, 1001), 1);
  EXPECT_EQ(handset().logs().logs(), (Ids{0x1010, 0x4001})) << "the others of the equipment id go";
  EXPECT_EQ(KRAL_DIAG_ClearAllLogCodes(handle(), 1), 1);
  EXPECT_EQ(handset().logs().logs(), (Ids{0x4001}));

  std::array<uint32_t, KRAL_EQUIPMENT_IDS> ranges{};
  EXPECT_EQ(KRAL_DIAG_GetLogRanges(handle(), ranges.data()), 1);
  EXPECT_EQ(ranges[1], 1001u);
  std::array<uint8_t, 138> mask{};
  uint16_t size = 137;
  uint32_t bits = 0;
  EXPECT_EQ(KRAL_DIAG_GetLogMask(handle(), 4, &bits, &size, mask.data()), 0) << "no room";
  size = mask.size();
  EXPECT_EQ(KRAL_DIAG_GetLogMask(handle(), 4, &bits, &size, mask.data()), 1);
  EXPECT_EQ(bits, 1104u);
  EXPECT_EQ(size, 138);
  EXPECT_EQ(mask[0], 0x02);
}

TEST_F(Masks, SettingAndRetrievingLooksSoOnTheWire) {
  handset().logs().SetItems(1, 20);
  EXPECT_EQ(KRAL_DIAG_SetExtendedLogCode(handle(), 1, 0x100D, 20), 1);
  EXPECT_TRUE(HasLine(512, "KRAL_DIAG_SetExtendedLogCode( iEquipmentID = 1, iLogCode = 0x100D, iLastItem = 20 )"));
  EXPECT_TRUE(HasLine(2,
                      "KRAL_DIAG_SetExtendedLogMask( iOperation = 0x3, piOperationData[0] = 0x1, "
                      "iOperationDataSize=11)"));
  EXPECT_EQ(Requests(), (std::vector<std::string>{"73 00 00 00 03 00 00 00 01 00 00 00 14 00 00 00 00 20 00"}));

  EXPECT_EQ(KRAL_DIAG_AddExtendedLogCode(handle(), 1, 0x1013), 1);
  EXPECT_TRUE(HasLine(512, "KRAL_DIAG_AddExtendedLogCode( iEquipmentID = 1, iLogCode = 0x1013 )"));
  EXPECT_TRUE(HasLine(2, "DIAG_ModifyExtendedLogCodes( iEquipmentID = 1,iLogCodeListSize = 1, bActivateLogs = 1)"));
  EXPECT_TRUE(HasLine(4, "DIAG_ModifyExtendedLogCodes() -- modifying log code 0x1013, bActivateLogs = 1"));
  EXPECT_EQ(Requests(), (std::vector<std::string>{"73 00 00 00 01 00 00 00", "73 00 00 00 04 00 00 00 01 00 00 00",
                                                  "73 00 00 00 03 00 00 00 01 00 00 00 14 00 00 00 00 20 08"}));
}

TEST_F(Masks, NothingIsSentForWhatIsSoAlready) {
  EXPECT_EQ(Add(1, {0x1001, 0x1002}), 1);
  EXPECT_EQ(Requests().size(), 3u);
  KRAL_DIAG_SetPhoneLoggingState(handle(), 0);
  EXPECT_EQ(Add(1, {0x1002, 0x1001}), 1);
  EXPECT_EQ(Requests().size(), 2u) << "no mask is set";
  EXPECT_TRUE(collecting()) << "collection is on all the same";
  EXPECT_EQ(Clear(1, {0x1003}), 1);
  EXPECT_EQ(Requests().size(), 2u);
  EXPECT_EQ(Add(1, {0x1001, 0x1003}), 1);
  EXPECT_EQ(Requests().size(), 3u) << "one of two is new";
}

TEST_F(Masks, RefusedCodeFailsTheWholeListWithNothingSent) {
  ASSERT_EQ(Load(KRAL_TABLE_ALLOWED_LOGS, "0x1001\n0x1002\n"), 1);
  EXPECT_EQ(Add(1, {0x1001, 0x1003, 0x1004}), 0);
  EXPECT_TRUE(HasLine(16, "DIAG_ModifyExtendedLogCodes()--log code 0x1003 is not allowed"));
  EXPECT_TRUE(HasLine(16, "DIAG_ModifyExtendedLogCodes()--log code 0x1004 is not allowed"));
  EXPECT_EQ(Clear(1, {0x1003}), 0);
  EXPECT_EQ(KRAL_DIAG_SetExtendedLogCode(handle(), 1, 0x1003, 1001), 0);
  EXPECT_TRUE(HasLine(16, "KRAL_DIAG_SetExtendedLogCode()--log code 0x1003 is not allowed"));
  ASSERT_EQ(Load(KRAL_TABLE_ALLOWED_EVENTS, "7"), 1);
  EXPECT_EQ(SetEvents({7, 8}, 1), 0);
  EXPECT_TRUE(HasLine(16, "KRAL_DIAG_SetEventMaskBits()--event ID 0x8 is not allowed"));
  EXPECT_TRUE(Requests().empty());
  EXPECT_FALSE(collecting());
  EXPECT_EQ(Add(1, {0x1001, 0x1002}), 1);
  EXPECT_EQ(KRAL_LoadNameTable(handle(), KRAL_TABLE_ALLOWED_LOGS, nullptr), 1);
  EXPECT_EQ(Add(1, {0x1003}), 1) << "without a list everything is allowed";
}

TEST_F(Masks, CodesOutsideTheirEquipmentIdAreRefused) {
  const struct {
    uint8_t equipment_id;
    uint16_t code;
  } cases[] = {{1, 0x0FFF}, {1, 0x13E9}, {0, 80}, {2, 0x2000}, {16, 0}, {255, 0xFFFF}};
  for (const auto& c : cases) {
    EXPECT_EQ(KRAL_DIAG_AddExtendedLogCode(handle(), c.equipment_id, c.code), 0) << c.code;
    EXPECT_EQ(KRAL_DIAG_ClearExtendedLogCode(handle(), c.equipment_id, c.code), 0) << c.code;
  }
  EXPECT_EQ(KRAL_DIAG_SetExtendedLogCode(handle(), 1, 0x1014, 20), 0);
  EXPECT_EQ(KRAL_DIAG_SetExtendedLogCode(handle(), 1, 0x0014, 20), 0);
  EXPECT_EQ(KRAL_DIAG_ClearAllLogCodes(handle(), 16), 0);
  for (const auto& request : Requests()) EXPECT_FALSE(request.starts_with("73 00 00 00 03")) << request;
  EXPECT_EQ(handset().logs().changes(), 0u);
}

TEST_F(Masks, MasksBeyond512BytesKeepTheirLength) {
  handset().logs().SetItems(0, 6001);
  EXPECT_EQ(Add(0, {4095, 4096, 6000}), 1);
  EXPECT_EQ(Add(0, {5}), 1);
  EXPECT_EQ(handset().logs().logs(), (Ids{5, 4095, 4096, 6000}));
  EXPECT_EQ(KRAL_DIAG_ClearAllLogCodes(handle(), 0), 1);
  EXPECT_TRUE(handset().logs().logs().empty());
}

std::string Ranges(const std::string& of_equipment_1) {
  std::string text = "73 00 00 00 01 00 00 00 00 00 00 00 00 00 00 00 " + of_equipment_1;
  for (int i = 2; i < 16; ++i) text += " 00 00 00 00";
  return text;
}

// A mask whose reply always has the same length.
std::string Area(std::string reply) {
  for (int i = 2; i < 512; ++i) reply += " 00";
  return reply;
}

// Each answer to the request for ranges is followed, where there is one, by the answer to that for the mask.
TEST_F(Masks, AnswersThatCannotBeTrustedChangeNothing) {
  const std::string good = Ranges("09 00 00 00");
  const struct {
    const char* name;
    std::string ranges;
    std::string mask;  // empty: is not asked for
    const char* set;   // the mask that is written, or null
  } cases[] = {
      {"ranges refused", "14 73", "", nullptr},
      {"ranges too short", "73 00 00 00 01 00 00 00 09 00 00 00", "", nullptr},
      {"ranges without end", Ranges("FF FF FF FF"), "", nullptr},
      {"ranges whose rounding wraps", Ranges("F9 FF FF FF"), "", nullptr},
      {"mask refused", good, "15 73", nullptr},
      {"mask too short", good, "73 00 00 00 04 00 00 00 01 00 00 00 09 00 00 00 81", nullptr},
      {"mask of another length", good, "73 00 00 00 04 00 00 00 01 00 00 00 0A 00 00 00 81 01", nullptr},
      {"mask of another equipment id", good, "73 00 00 00 04 00 00 00 02 00 00 00 09 00 00 00 81 01", "02 00"},
      {"longer mask of another one", good, "73 00 00 00 04 00 00 00 02 00 00 00 11 00 00 00 81 01 01", "02 00"},
      {"mask that fits nothing", good, "73 00 00 00 04 00 00 00 02 00 00 00 11 00 00 00 81 01", nullptr},
      {"mask", good, "73 00 00 00 04 00 00 00 01 00 00 00 09 00 00 00 81 01", "83 01"},
      {"mask behind a status", good, "73 00 00 00 04 00 00 00 00 00 00 00 01 00 00 00 09 00 00 00 81 01", "83 01"},
      {"status of a refusal", good, "73 00 00 00 04 00 00 00 02 00 00 00 01 00 00 00 09 00 00 00 81 01", nullptr},
      {"a byte too many, zeros at its end", Ranges("40 00 00 00"),
       "73 00 00 00 04 00 00 00 01 00 00 00 40 00 00 00 81 00 00 00 00 00 00 00 00", nullptr},
      {"mask bytes that look like a header", Ranges("40 00 00 00"),
       "73 00 00 00 04 00 00 00 01 00 00 00 40 00 00 00 21 00 00 00 00 00 00 00 01", nullptr},
      {"mask in an area of 512 bytes", good, Area("73 00 00 00 04 00 00 00 01 00 00 00 09 00 00 00 81 01"), nullptr},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    handset().Expect("73 00 00 00 01 00 00 00").Reply(c.ranges);
    if (!c.mask.empty()) handset().Expect("73 00 00 00 04 00 00 00 01 00 00 00").Reply(c.mask);
    if (c.set != nullptr) {
      handset().Expect(std::string("73 00 00 00 03 00 00 00 01 00 00 00 09 00 00 00 ") + c.set).Reply("73");
    }
    EXPECT_EQ(KRAL_DIAG_AddExtendedLogCode(handle(), 1, 0x1001), c.set != nullptr ? 1 : 0);
    EXPECT_EQ(handset().script().Problems(), "");
  }
  EXPECT_EQ(CountLines(16, "DIAG_ModifyExtendedLogCodes() -- failed to get log range"), 4u);
  EXPECT_EQ(CountLines(16, "DIAG_ModifyExtendedLogCodes: Error fetching current log mask"), 2u);

  handset().Expect("73 00 00 00 01 00 00 00").Reply(good);
  handset()
      .Expect("73 00 00 00 04 00 00 00 01 00 00 00")
      .Reply("73 00 00 00 04 00 00 00 01 00 00 00 09 00 00 00 81 01");
  handset()
      .Expect("73 00 00 00 03 00 00 00 01 00 00 00 09 00 00 00 83 01")
      .Reply("73 00 00 00 03 00 00 00 02 00 00 00 01 00 00 00 09 00 00 00 83 01");
  EXPECT_EQ(KRAL_DIAG_AddExtendedLogCode(handle(), 1, 0x1001), 0) << "the mask is refused by a status";

  uint32_t bits = 7;
  std::array<uint8_t, 16> mask{};
  uint16_t size = mask.size();
  handset().Expect("73 00 00 00 01 00 00 00").Reply(good);
  handset()
      .Expect("73 00 00 00 04 00 00 00 01 00 00 00")
      .Reply("73 00 00 00 04 00 00 00 02 00 00 00 09 00 00 00 81 01");
  EXPECT_EQ(KRAL_DIAG_GetLogMask(handle(), 1, &bits, &size, mask.data()), 0) << "another's mask is not an empty one";
  EXPECT_EQ(bits, 7u);
  EXPECT_EQ(KRAL_DIAG_SetExtendedLogCode(handle(), 0, 5, 32625), 0);
  EXPECT_TRUE(HasLine(16, "KRAL_DIAG_SetExtendedLogCode()--a mask of 32625 items does not fit into a request"));
}

TEST_F(Masks, ClearingAllWithoutRangesSendsAMaskWithoutItems) {
  handset().Expect("73 00 00 00 01 00 00 00").Reply("13 73");
  handset().Expect("73 00 00 00 03 00 00 00 01 00 00 00 00 00 00 00").Reply("73");
  EXPECT_EQ(KRAL_DIAG_ClearAllLogCodes(handle(), 1), 1);
  EXPECT_TRUE(HasLine(16, "KRAL_DIAG_AddExtendedLogCodes() -- failed to get log range"));
}

// --- Events and messages --------------------------------------------------------------------------------------------

TEST_F(Masks, EventsAreSwitchedOneByOneAndAllTogether) {
  EXPECT_EQ(KRAL_DIAG_SetEventMaskBit(handle(), 3000, 1), 1);
  EXPECT_TRUE(HasLine(512, "KRAL_DIAG_SetEventMaskBit( iMaskID = 3000, bMaskState = 1 )"));
  EXPECT_TRUE(HasLine(2,
                      "KRAL_DIAG_EventReportControl( iMaskID_ListSize = 1, bMaskState = 1, bSetAllBitsOn = 0, "
                      "bSetAllBitsOff = 0)"));
  EXPECT_TRUE(HasLine(4, "DIAG_EVENT_MASK_GET_F() -- NUM_BITS = 3001, Mask Size (bytes)= 376"));
  EXPECT_TRUE(HasLine(4, "KRAL_DIAG_SetEventMaskBits() -- adding event code 3000"));
  EXPECT_EQ(SetEvents({0, 8, 256}, 1), 1);
  EXPECT_EQ(handset().logs().events(), (Ids{0, 8, 256, 3000}));
  EXPECT_EQ(SetEvents({8, 9}, 2), 1) << "only 1 sets";
  EXPECT_EQ(handset().logs().events(), (Ids{0, 256, 3000}));
  EXPECT_EQ(SetEvents({1, 3001}, 1), 0) << "the handset has no such event";
  EXPECT_EQ(handset().logs().events(), (Ids{0, 256, 3000}));
  std::array<uint8_t, 376> mask{};
  uint16_t size = mask.size();
  uint16_t bits = 0;
  EXPECT_EQ(KRAL_DIAG_GetEventMask(handle(), &bits, &size, mask.data()), 1);
  EXPECT_EQ(bits, 3001);
  EXPECT_EQ(mask[32], 0x01);
  EXPECT_EQ(KRAL_DIAG_SetEntireEventMaskState(handle(), 1), 1);
  EXPECT_EQ(handset().logs().events().size(), 3001u);
  KRAL_DIAG_SetPhoneLoggingState(handle(), 0);
  EXPECT_EQ(KRAL_DIAG_SetEntireEventMaskState(handle(), 0), 1);
  EXPECT_TRUE(handset().logs().events().empty());
  EXPECT_TRUE(collecting()) << "also when events were switched off";
}

TEST_F(Masks, EventMaskOnTheWire) {
  const struct {
    const char* name;
    const char* mask;  // the answer
    const char* set;   // the request that follows, or null
    const char* answer;
    uint8_t result;
  } cases[] = {
      {"set", "81 00 00 00 0A 00 80 01", "82 00 00 00 0A 00 84 01", "82 00", 1},
      {"bits divide by 8", "81 00 00 00 08 00 80", "82 00 00 00 08 00 84", "82 00", 1},
      {"set fails", "81 00 00 00 08 00 80", "82 00 00 00 08 00 84", "82 03", 0},
      {"set without error code", "81 00 00 00 08 00 80", "82 00 00 00 08 00 84", "82", 0},
      {"get fails", "81 05 00 00 08 00 80", nullptr, nullptr, 0},
      {"no bits", "81 00 00 00 08", nullptr, nullptr, 0},
      {"mask too short", "81 00 00 00 0A 00 80", nullptr, nullptr, 0},
      {"refused", "13 81", nullptr, nullptr, 0},
  };
  for (const auto& c : cases) {
    SCOPED_TRACE(c.name);
    handset().Expect("81 00 00 00").Reply(c.mask);
    if (c.set != nullptr) handset().Expect(c.set).Reply(c.answer);
    EXPECT_EQ(KRAL_DIAG_SetEventMaskBit(handle(), 2, 1), c.result);
    EXPECT_EQ(handset().script().Problems(), "");
  }
  EXPECT_TRUE(HasLine(16, "DIAG_EVENT_MASK_SET_F() -- Error code 3 fails"));
  EXPECT_TRUE(HasLine(16, "DIAG_EVENT_MASK_GET_F() -- Error code 5 fails"));
  EXPECT_EQ(CountLines(16, "DIAG_SetEventMaskBits() -- failed to get event mask"), 4u);
}

TEST_F(Masks, MessageCategoriesComeFromTheTable) {
  EXPECT_EQ(KRAL_ExtendedTextMessage_SetCategoryEnable(handle(), 9, 1), 1) << "without a table, any";
  ASSERT_EQ(Load(KRAL_TABLE_MESSAGE_CATEGORIES, "# radio\n21\tRF drivers\n5, Call processing\n"), 1);
  uint32_t count = 0;
  EXPECT_EQ(KRAL_ExtendedTextMessage_GetCategoryListSize(handle(), &count), 1);
  EXPECT_EQ(count, 2u);
  uint16_t id = 0;
  std::array<char, 6> name{};
  EXPECT_EQ(KRAL_ExtendedTextMessage_GetCategoryListItem(handle(), 1, &id, name.size(), name.data()), 1);
  EXPECT_EQ(id, 5);
  EXPECT_STREQ(name.data(), "Call ") << "cut at the room";
  EXPECT_EQ(KRAL_ExtendedTextMessage_GetCategoryListItem(handle(), 2, &id, name.size(), name.data()), 0);
  EXPECT_EQ(KRAL_ExtendedTextMessage_SetCategoryEnable(handle(), 21, 1), 1);
  EXPECT_EQ(KRAL_ExtendedTextMessage_SetCategoryEnable(handle(), 22, 1), 0);
  EXPECT_EQ(handset().logs().categories(), (Ids{9, 21}));
  EXPECT_EQ(KRAL_ExtendedTextMessage_SetCategoryEnable(handle(), 21, 0), 1);
  EXPECT_EQ(handset().logs().categories(), (Ids{9}));
}

TEST_F(Masks, TextsAreFoundAndAMistakeLeavesTheFormerTable) {
  ASSERT_EQ(Load(KRAL_TABLE_EVENT_TEXTS, "291 Band change\n"), 1);
  ASSERT_EQ(Load(KRAL_TABLE_LOG_NAMES, "0x1001 Paging\n"), 1);
  EXPECT_EQ(Load(KRAL_TABLE_EVENT_TEXTS, "1 ok\nseven dwarfs\n"), 0);
  EXPECT_TRUE(HasLine(16, "KRAL_LoadNameTable() -- " + folder_.Path("table") + ": line 2: no id from 0 to 65535"));
  EXPECT_EQ(KRAL_LoadNameTable(handle(), KRAL_TABLE_EVENT_TEXTS, "/nonexistent/table"), 0);
  EXPECT_EQ(KRAL_LoadNameTable(handle(), 5, nullptr), 0);
  std::array<char, 64> text{};
  EXPECT_EQ(KRAL_GetEventText(handle(), 291, text.size(), text.data()), 1);
  EXPECT_STREQ(text.data(), "Band change");
  EXPECT_EQ(KRAL_GetEventText(handle(), 1, text.size(), text.data()), 0);
  EXPECT_EQ(KRAL_GetLogCodeText(handle(), 0x1001, text.size(), text.data()), 1);
  EXPECT_STREQ(text.data(), "Paging");
}

// --- All of them ----------------------------------------------------------------------------------------------------

TEST_F(Masks, MissingArgumentsGiveZeroWithoutTraffic) {
  EXPECT_EQ(KRAL_DIAG_AddExtendedLogCodes(handle(), 0, nullptr, 1), 0);
  EXPECT_EQ(KRAL_DIAG_SetEventMaskBits(handle(), nullptr, 1, 1), 0);
  EXPECT_EQ(KRAL_DIAG_GetLogRanges(handle(), nullptr), 0);
  EXPECT_EQ(KRAL_DIAG_GetEventMask(handle(), nullptr, nullptr, nullptr), 0);
  EXPECT_EQ(handset().request_count(), 0u);
}

}  // namespace
}  // namespace kral
