// The NV tool's definitions and values: what the files may say, how values turn into numbers and back.
#include "base/deflate.h"
#include "storage/nv/nv_data_type.h"
#include "storage/nv/nv_value.h"
#include "tests/support/nv_fixture.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using nv::NvDataType;
using nv::NvForm;
using nv::NvMember;

class NvDefinition : public test::NvToolTest {};

// --- Values ----------------------------------------------------------------------------------------------------------

TEST(NvDataTypeTest, NumbersTurnIntoBytesAndBackWithinTheirRanges) {
  const NvDataType words("", {{std::nullopt, {{"w", 1, false, 2}, {"s", 2, true, 1}, {"d", 4, false, 1}}}}, false);
  const NvDataType wide("", {{std::nullopt, {{"u", 8, false, 1}, {"s", 8, true, 1}}}}, false);
  const NvDataType open("", {{std::nullopt, {{"n", 1, false, 1}, {"v", 2, true, 3}}}}, true);
  const NvDataType forms("", {{4, {{"k", 1, false, 1}, {"a", 1, false, 2}}}, {std::nullopt, {{"k", 1, false, 1}}}},
                         false);
  const NvDataType minus("", {{255, {{"k", 1, true, 1}, {"a", 1, false, 1}}}}, false);
  const struct {
    const NvDataType* type;
    const char* text;
    const char* bytes;  // null: refused
    const char* again;  // null: as `text`
  } kRows[] = {
      {&words, "0,255,-32768,4294967295", "00 FF 00 80 FF FF FF FF", nullptr},
      {&words, " 1 2\n, -1 ,\t3 ", "01 02 FF FF 03 00 00 00", "1,2,-1,3"},
      {&words, "0,256,0,0", nullptr, nullptr},
      {&words, "0,-1,0,0", nullptr, nullptr},
      {&words, "0,0,32768,0", nullptr, nullptr},
      {&words, "0,0,-32769,0", nullptr, nullptr},
      {&words, "0,0,0,4294967296", nullptr, nullptr},
      {&words, "0,0,0", nullptr, nullptr},
      {&words, "0,0,0,0,0", nullptr, nullptr},
      {&words, "0,0,0,0,", nullptr, nullptr},
      {&words, "0,,0,0", nullptr, nullptr},
      {&words, "0x1,0,0,0", nullptr, nullptr},
      {&words, "", nullptr, nullptr},
      {&wide, "18446744073709551615,-9223372036854775808", "FF FF FF FF FF FF FF FF 00 00 00 00 00 00 00 80", nullptr},
      {&wide, "18446744073709551616,0", nullptr, nullptr},
      {&wide, "0,9223372036854775808", nullptr, nullptr},
      {&open, "7", "07", nullptr},
      {&open, "7,1,-2", "07 01 00 FE FF", nullptr},
      {&open, "7,1,2,3,4", nullptr, nullptr},
      {&open, "", nullptr, nullptr},
      {&forms, "4,1,2", "04 01 02", nullptr},
      {&forms, "4", nullptr, nullptr},
      {&forms, "9", "09", nullptr},
      {&forms, "9,1", nullptr, nullptr},
      {&forms, "", nullptr, nullptr},
      {&minus, "-1,7", "FF 07", nullptr},
      {&minus, "1,7", nullptr, nullptr},
  };
  for (const auto& row : kRows) {
    SCOPED_TRACE(row.text);
    std::string problem;
    const auto bytes = row.type->FromText(row.text, problem);
    ASSERT_EQ(bytes.has_value(), row.bytes != nullptr) << problem;
    EXPECT_EQ(problem.empty(), bytes.has_value());
    if (!bytes) continue;
    EXPECT_EQ(nv::ToHex(*bytes), row.bytes);
    EXPECT_TRUE(row.type->Holds(*bytes));
    EXPECT_EQ(row.type->ToText(*bytes), row.again != nullptr ? row.again : row.text);
  }
  EXPECT_FALSE(open.Holds(std::array<uint8_t, 2>{7, 1})) << "half a word";
  EXPECT_FALSE(open.Holds({}));
  EXPECT_FALSE(forms.Cut(std::array<uint8_t, 2>{4, 1}));
  EXPECT_EQ(nv::ToHex(*forms.Cut(std::array<uint8_t, 5>{4, 1, 2, 3, 4})), "04 01 02");
}

TEST(NvDataTypeTest, HexTextsAreStrict) {
  for (const char* good : {"0AFF", "0a ff", " 0A,\tFF\n"}) EXPECT_EQ(nv::ToHex(*nv::FromHex(good)), "0A FF") << good;
  for (const char* bad : {"0", "0 A", "0G", "0x0A", "0AF"}) EXPECT_FALSE(nv::FromHex(bad)) << bad;
  EXPECT_EQ(nv::FromHex("")->size(), 0u);
}

TEST(NvCompression, StreamsEndWhereTheySay) {
  std::vector<uint8_t> plain(5000, 7);
  auto stream = Compress(plain);
  EXPECT_LT(stream.size(), 128u);
  auto padded = stream;
  padded.resize(128);
  EXPECT_EQ(Decompress(padded, 5000), plain);
  EXPECT_FALSE(Decompress(padded, 4999)) << "more than it may hold";
  stream.pop_back();
  EXPECT_FALSE(Decompress(stream, 5000)) << "cut";
  padded[4] ^= 0x55;
  EXPECT_FALSE(Decompress(padded, 5000)) << "damaged";
  EXPECT_FALSE(Decompress({}, 5000));
}

// --- Definition files ------------------------------------------------------------------------------------------------

TEST_F(NvDefinition, ExampleHasItemsOfEveryKind) {
  ASSERT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), test::ExampleDefinitions().c_str()), 0u) << ErrorText();
  uint32_t numbered = 0, files = 0, length = 0;
  EXPECT_EQ(KRAL_NV_GetNumOfNVDefinition(handle(), &numbered), 0u);
  EXPECT_EQ(KRAL_NV_GetNumOfNVEfsDefinition(handle(), &files), 0u);
  EXPECT_EQ(numbered, 24u);
  EXPECT_EQ(files, 5u);
  std::array<char, 512> text{};
  const auto size = static_cast<uint32_t>(text.size());
  EXPECT_EQ(KRAL_NV_GetNVDefinitionByIndex(handle(), 8, text.data(), size), 0u);
  EXPECT_STREQ(text.data(),
               "<NvItem id=\"453\" name=\"FTM_MODE\"><DataType><Member name=\"enabled\" typeid=\"word8\"/>"
               "</DataType></NvItem>");
  EXPECT_EQ(KRAL_NV_GetNVDefinitionByIndexStringLength(handle(), 8, &length), 0u);
  EXPECT_EQ(length, std::string(text.data()).size() + 1);
  EXPECT_EQ(KRAL_NV_GetNVDefinitionByIndex(handle(), 8, text.data(), length - 1), 12u);
  EXPECT_EQ(KRAL_NV_GetNVDefinitionByIndex(handle(), 29, text.data(), size), 8u);
  EXPECT_EQ(KRAL_NV_GetNVDefinitionFieldNames(handle(), 28, text.data(), size), 0u);
  EXPECT_STREQ(text.data(), "limit") << "indexes of files stand behind those of numbered items";
  EXPECT_EQ(KRAL_NV_GetNVDefinitionFieldNames(handle(), 17, text.data(), size), 0u);
  EXPECT_EQ(std::string(text.data()).substr(0, 47), "band,point[0].level,point[0].offset,point[1].le") << "nested";
  EXPECT_EQ(KRAL_NV_GetNVDataTypeDefinition(handle(), "Address", text.data(), size), 0u);
  EXPECT_NE(std::string(text.data()).find("<DataType name=\"Address\" variantType=\"6\"><Member name=\"version\""),
            std::string::npos);
  EXPECT_EQ(KRAL_NV_GetNVDataTypeDefinition(handle(), "Nothing", text.data(), size), 9u);
  EXPECT_EQ(KRAL_NV_GetNVDefinitionByEfsFilename(handle(), "/nv/item_files/rfnv/00020002", text.data(), size), 0u);
  EXPECT_EQ(KRAL_NV_GetNVEfsFilenames(handle(), text.data(), size), 0u);
  EXPECT_EQ(std::string(text.data()).substr(0, 41), "/nv/item_files/modem/mmode/operator_name\n");
  EXPECT_EQ(Set(20002, "-5"), 0u) << "RF NV items have an id too";
  EXPECT_EQ(FileValue("/nv/item_files/rfnv/00020002"), "-5");

  // Loaded again, everything is redefined.
  EXPECT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), test::ExampleDefinitions().c_str()), 13u);
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "Duplicate NV Defintion:NV ID 453 Redefined"));
  EXPECT_EQ(Value(20002), "error 10");
  EXPECT_EQ(KRAL_NV_ClearNVDefinition(handle()), 0u);
  EXPECT_EQ(Value(453), "error 9");
}

TEST_F(NvDefinition, DictionaryServesFilesThatAreLoadedLater) {
  const auto dictionary = folder_.Add(
      "dictionary.xml",
      "<NvDataTypeDictionary><DataType name='Pair'><Member name='a' typeid='word8'/><Member name='b' typeid='word16'/>"
      "</DataType></NvDataTypeDictionary>");
  EXPECT_EQ(Load("<NvItem id='7' typeid='Pair'/>"), 6u);
  EXPECT_EQ(KRAL_NV_LoadNVDataTypeDictinary(handle(), dictionary.c_str()), 0u);
  EXPECT_EQ(Load("<NvItem id='7' typeid='Pair'/>"), 0u);
  EXPECT_EQ(Set(7, "1,513"), 0u);
  std::array<uint8_t, 3> bytes{};
  uint32_t size = 2;
  EXPECT_EQ(KRAL_NV_GetNVValueByteStreamByNVID(handle(), 7, 0, bytes.data(), &size), 12u);
  EXPECT_EQ(size, 3u);
  EXPECT_EQ(KRAL_NV_GetNVValueByteStreamByIndex(handle(), 0, 0, bytes.data(), &size), 0u);
  EXPECT_EQ(nv::ToHex(bytes), "01 01 02");
}

TEST_F(NvDefinition, ContradictionsAreRefusedAndChangeNothing) {
  ASSERT_EQ(Load("<NvItem id='1' name='kept'><DataType><Member typeid='word8'/></DataType></NvItem>"), 0u);
  ASSERT_EQ(Set(1, "5"), 0u);
  const std::string byte = "<DataType><Member typeid='word8'/></DataType>";
  // Types of types of types: each level holds the one before 256 times.
  std::string tower = "<DataType name='t0'><Member typeid='word8'/></DataType>";
  for (int i = 1; i < 9; ++i) {
    tower += "<DataType name='t" + std::to_string(i) + "'><Member typeid='t" + std::to_string(i - 1) +
             "' num_of_element='256'/></DataType>";
  }
  const std::string kBad[] = {
      "<NvItem id='2'><DataType><Member typeid='word24'/></DataType></NvItem>",
      "<NvItem id='2' typeid='Nothing'/>",
      "<NvItem id='2'/>",
      "<NvItem id='2'><DataType/></NvItem>",
      "<NvItem>" + byte + "</NvItem>",
      "<NvItem id='65536'>" + byte + "</NvItem>",
      "<NvItem id='-1'>" + byte + "</NvItem>",
      "<NvItem id='2' maxIndex='256'>" + byte + "</NvItem>",
      "<NvItem id='2' compressed='maybe'>" + byte + "</NvItem>",
      "<NvItem id='2'><Member typeid='word8'/></NvItem>",
      "<NvItem id='2'><DataType><Member typeid='word8' num_of_element='129'/></DataType></NvItem>",
      "<NvItem id='2' maxIndex='1'><DataType><Member typeid='word8' num_of_element='128'/></DataType></NvItem>",
      "<NvItem id='2'><DataType><Member typeid='word8' num_of_element='0'/></DataType></NvItem>",
      "<NvItem id='2'><DataType><Member typeid='word64' num_of_element='99999999999'/></DataType></NvItem>",
      "<NvEfsItem>" + byte + "</NvEfsItem>",
      "<NvEfsItem fullpathname='/a' maxIndex='2'>" + byte + "</NvEfsItem>",
      "<DataType name='A'><Member typeid='A'/></DataType>",
      "<DataType name='word8'><Member typeid='word8'/></DataType>",
      "<DataType><Member typeid='word8'/></DataType>",
      "<DataType name='A' variantType='1'><Member typeid='word8'/></DataType>"
      "<DataType name='A' variantType='1'><Member typeid='word8'/></DataType>",
      "<DataType name='A' variantType='1'><Member typeid='word8'/></DataType>"
      "<DataType name='A' variantType='2'><Member typeid='word16'/></DataType>",
      "<DataType name='A' variantType='1'><Member typeid='word8'/></DataType>"
      "<DataType name='A' variantType='2'><Member typeid='word8' signed='1'/></DataType>",
      "<DataType name='A' variantType='1'><Member typeid='word8'/></DataType><NvItem id='2' typeid='A'/>"
      "<DataType name='A' variantType='2'><Member typeid='word8'/></DataType>",
      "<DataType name='A' variantType='256'><Member typeid='word8'/></DataType>",
      "<DataType name='A' variantType='1'><Member typeid='word8'/></DataType>"
      "<DataType name='B'><Member typeid='A'/></DataType>",
      tower,
      "<DataType name='A'><Member name='x' typeid='word8'/></DataType>"
      "<DataType name='B'><Member name='" +
          std::string(254, 'n') + "' typeid='A'/></DataType>",
      "<NvSomething/>",
  };
  for (const std::string& bad : kBad) {
    EXPECT_EQ(Load("<NvItem id='1' name='lost'>" + byte + "</NvItem>" + bad), 6u) << bad;
    EXPECT_EQ(Value(1), "5") << bad;
  }
  EXPECT_NE(ErrorText().find("Unsupported NV dataType. Should be word8, word16, word32, or word64: word24"),
            std::string::npos);
  const std::string kMalformed[] = {"", "<NvDefinition>",
                                    "<!DOCTYPE a [<!ENTITY b \"c\">]><NvDefinition>&b;</NvDefinition>",
                                    "<!DOCTYPE a [<!ENTITY b SYSTEM \"file:///etc/passwd\">]><NvDefinition/>"};
  for (const std::string& malformed : kMalformed) {
    EXPECT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), folder_.Add("bad.xml", malformed).c_str()), 4u) << malformed;
  }
  EXPECT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), Path("nowhere.xml").c_str()), 4u);
  EXPECT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), nullptr), 4u);
  EXPECT_EQ(KRAL_NV_LoadNVDataTypeDictinary(handle(), test::ExampleDefinitions().c_str()), 6u) << "another root";
}

TEST_F(NvDefinition, WhatIsToldOfAnEmptyFileCanBeLoaded) {
  ASSERT_EQ(LoadSource("<NvEfsItem fullpathname='/a' mapping='byteStream' encoding='hex' index='0'></NvEfsItem>"), 0u);
  EXPECT_EQ(FileValue("/a"), "");
  std::array<char, 256> text{};
  ASSERT_EQ(KRAL_NV_GetNVDefinitionByEfsFilename(handle(), "/a", text.data(), text.size()), 0u);
  EXPECT_EQ(Load(text.data()), 0u) << text.data();
  EXPECT_EQ(KRAL_NV_SetNVValueStringByEfsFilename(handle(), "/a", ""), 0u);
}

TEST_F(NvDefinition, TheLastDefinitionOfAnItemHolds) {
  const std::string byte = "<DataType><Member typeid='word8'/></DataType></NvItem>";
  EXPECT_EQ(Load("<NvItem id='1' name='first'>" + byte + "<NvItem id='1' name='last'>" + byte), 13u);
  std::array<char, 256> text{};
  ASSERT_EQ(KRAL_NV_GetNVDefinitionByIndex(handle(), 0, text.data(), text.size()), 0u);
  EXPECT_NE(std::string(text.data()).find("last"), std::string::npos);
}

TEST_F(NvDefinition, ValuesAreCheckedWhenTheyAreSet) {
  ASSERT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), test::ExampleDefinitions().c_str()), 0u);
  EXPECT_EQ(Value(69), "error 10");
  EXPECT_EQ(Value(7777), "error 9");
  EXPECT_EQ(Set(69, "-128"), 0u);
  EXPECT_EQ(Set(69, "-129"), 11u);
  EXPECT_EQ(Value(69), "-128");
  EXPECT_TRUE(HasLine(KRAL_LOG_ERR, "NV ID 69: -129 is out of the range of offset")) << ErrorText();
  const uint8_t bytes[] = {1, 2};
  EXPECT_EQ(KRAL_NV_SetNVValueByteStreamByNVID(handle(), 69, 0, bytes, 2), 11u);
  EXPECT_EQ(KRAL_NV_SetNVValueByteStreamByNVID(handle(), 69, 1, bytes, 1), 8u);
  EXPECT_EQ(KRAL_NV_SetNVValueByteStreamByIndex(handle(), 3, 0, bytes, 1), 0u);
  EXPECT_EQ(KRAL_NV_SetNVValueByteStreamByIndex(handle(), 3, 0, nullptr, 1), 11u);
  EXPECT_EQ(Value(69), "1");
  EXPECT_EQ(KRAL_NV_SetNVValueStringByIndex(handle(), 29, 0, "1"), 8u);
  EXPECT_EQ(Set(3101, "7,8", 3), 0u);
  EXPECT_EQ(Set(3101, "7,8", 4), 8u);
  EXPECT_EQ(Value(3101, 3), "7,8");
  EXPECT_EQ(Value(3101, 0), "error 10");
  EXPECT_EQ(Value(3101, 4), "error 8");
  EXPECT_EQ(KRAL_NV_SetNVValueStringByEfsFilename(handle(), "/nv/item_files/modem/mmode/operator_name", "1,65"), 0u);
  EXPECT_EQ(FileValue("/nv/item_files/modem/mmode/operator_name"), "1,65");
  EXPECT_EQ(FileValue("/nv/nothing"), "error 9");
  EXPECT_EQ(KRAL_NV_ClearNVValueByNVID(handle(), 3101), 0u);
  EXPECT_EQ(Value(3101, 3), "error 10");
  EXPECT_EQ(KRAL_NV_ClearNVValueByIndex(handle(), 3), 0u);
  EXPECT_EQ(Value(69), "error 10");
  EXPECT_EQ(KRAL_NV_ClearNVValues(handle()), 0u);
  EXPECT_EQ(FileValue("/nv/item_files/modem/mmode/operator_name"), "error 10");
}

TEST_F(NvDefinition, SubscriptionsHaveValuesOfTheirOwn) {
  ASSERT_EQ(KRAL_NV_LoadNVDefinitionFile(handle(), test::ExampleDefinitions().c_str()), 0u);
  EXPECT_EQ(KRAL_NV_SetCurrentSubscriptionIndex(handle(), 1), 8u);
  EXPECT_EQ(KRAL_NV_SetTargetSupportMultiSIM(handle(), 1), 0u);
  EXPECT_EQ(Set(453, "0"), 0u);
  EXPECT_EQ(KRAL_NV_SetCurrentSubscriptionIndex(handle(), 1), 0u);
  EXPECT_EQ(Value(453), "error 10");
  EXPECT_EQ(Set(453, "1"), 0u);
  EXPECT_EQ(Set(20002, "9"), 0u);
  EXPECT_EQ(KRAL_NV_SetTargetSupportMultiSIM(handle(), 0), 0u);
  uint16_t subscription = 9;
  EXPECT_EQ(KRAL_NV_GetCurrentSubscriptionIndex(handle(), &subscription), 0u);
  EXPECT_EQ(subscription, 0);
  EXPECT_EQ(Value(453), "0");
  EXPECT_EQ(Value(20002), "9") << "files are shared";
}

TEST_F(NvDefinition, ErrorTexts) {
  std::array<char, 128> text{};
  const auto give = [&](uint32_t code) {
    EXPECT_EQ(KRAL_NV_GetErrorText(0, code, text.data(), static_cast<uint32_t>(text.size())), 0u);
    return std::string(text.data());
  };
  EXPECT_EQ(give(0), "ERROR_FREE");
  EXPECT_EQ(give(13), "A NV Item has been defined by a previous load.  The NV item definition is overwritten");
  EXPECT_EQ(give(23), "Failed to write single RFNV or EFS item to mobile");
  EXPECT_EQ(give(24), "UNKNOWN");
  EXPECT_EQ(give(0xFFFFFFFF), "UNKNOWN");
  EXPECT_EQ(KRAL_NV_GetErrorText(0, 0, text.data(), 10), 12u);
}

}  // namespace
}  // namespace kral
