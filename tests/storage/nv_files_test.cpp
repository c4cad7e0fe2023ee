// The NV tool's files: source files, PKV files, filters and reports.
#include "storage/nv/nv_filter.h"
#include "storage/nv/nv_report_cells.h"
#include "storage/pkv/pkv_set.h"
#include "tests/support/nv_fixture.h"
#include "tests/support/test.h"

namespace kral {
namespace {

using NvFiles = test::NvToolTest;
using handset::NvStatus;
using test::kTwoBytes;

// --- Source files ----------------------------------------------------------------------------------------------------

TEST_F(NvFiles, SourceFileIsWrittenByTheLetter) {
  ASSERT_EQ(Load(Item(1, "a &lt;b&gt; &quot;c&quot; &amp; d") + "<NvEfsItem fullpathname='/nv/x&amp;y' name='file'>" +
                 kTwoBytes + "</NvEfsItem>"),
            0u);
  ASSERT_EQ(Set(1, "255,0"), 0u);
  ASSERT_EQ(KRAL_NV_SetNVValueStringByEfsFilename(handle(), "/nv/x&y", "1,2"), 0u);
  ASSERT_EQ(LoadSource("<NvEfsItem fullpathname='/nv/z' name='raw' mapping='byteStream' encoding='hex' index='0'>0a0B"
                       "</NvEfsItem><PRLItem nam='1f'>AA BB</PRLItem>"),
            0u);
  EXPECT_EQ(Source(),
            "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
            "<NvSource xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
            "xsi:noNamespaceSchemaLocation=\"..\\Schema\\NvSource.xsd\">\n"
            "<NvItem id=\"1\" subscriptionid=\"0\" name=\"a &lt;b&gt; &quot;c&quot; &amp; d\" mapping=\"direct\" "
            "encoding=\"dec\" index=\"0\">255,0</NvItem>\n"
            "<NvEfsItem fullpathname=\"/nv/x&amp;y\" name=\"file\" mapping=\"direct\" encoding=\"dec\" index=\"0\">1,2"
            "</NvEfsItem>\n"
            "<NvEfsItem fullpathname=\"/nv/z\" name=\"raw\" mapping=\"byteStream\" encoding=\"hex\" index=\"0\">0A 0B"
            "</NvEfsItem>\n"
            "<PRLItem nam=\"1f\">AA BB</PRLItem>\n"
            "</NvSource>");
}

TEST_F(NvFiles, SourceItemsThatCannotBeTakenLeaveTheOthers) {
  ASSERT_EQ(Load(Item(1) + Item(2) + Item(3)), 0u);
  const auto item = [](const char* attributes, const char* value) {
    return "<NvItem " + std::string(attributes) + ">" + value + "</NvItem>";
  };
  EXPECT_EQ(LoadSource(item("id='1' mapping='direct' encoding='dec'", "1,256") +
                       item("id='2' mapping='direct' encoding='dec' index='1'", "1,2") +
                       item("id='4' mapping='direct' encoding='dec'", "1") +
                       item("id='3' mapping='byteStream' encoding='hex'", "0") +
                       item("id='2' mapping='byteStream' encoding='hex'", "01") +
                       item("id='3' mapping='byteStream' encoding='hex'", "01 02 00 00") +
                       item("id='5' mapping='byteStream' encoding='hex' name='new'", "09")),
            21u);
  EXPECT_EQ(Value(1), "error 10");
  EXPECT_EQ(Value(2), "error 10");
  EXPECT_EQ(Value(3), "1,2") << "the data field may come whole";
  EXPECT_EQ(Value(4), "error 9");
  EXPECT_EQ(Value(5).substr(0, 4), "9,0,");
  EXPECT_NE(ErrorText().find("NV ID 1: 256 is out of the range of b"), std::string::npos);

  for (const std::string& bad :
       {item("", "1"), item("id='1' mapping='direct' encoding='hex'", "1"), item("id='1'", "1"),
        item("id='1' mapping='other' encoding='dec'", "1"), item("id='70000' mapping='direct' encoding='dec'", "1"),
        item("id='1' mapping='direct' encoding='dec' index='256'", "1"), std::string("<PRLItem>AA</PRLItem>"),
        std::string("<Nv/>"), std::string("<NvEfsItem mapping='direct' encoding='dec'>1</NvEfsItem>")}) {
    EXPECT_EQ(LoadSource(item("id='3' mapping='direct' encoding='dec'", "9,9") + bad), 5u) << bad;
    EXPECT_EQ(Value(3), "1,2") << bad;
  }
  EXPECT_EQ(KRAL_NV_LoadNVsFromSource(handle(), folder_.Add("x.xml", "<NvSource>").c_str()), 2u);
  EXPECT_EQ(KRAL_NV_LoadNVsFromSource(handle(), Path("nowhere").c_str()), 2u);
  EXPECT_EQ(KRAL_NV_LoadNVsFromSource(handle(), folder_.Add("x.xml", "<NvDefinition/>").c_str()), 5u);
  EXPECT_EQ(KRAL_NV_WriteNVsToSource(handle(), Path("no/such/folder.xml").c_str()), 14u);
  KRAL_NV_ClearNVValues(handle());
  EXPECT_EQ(KRAL_NV_WriteNVsToSource(handle(), folder_.Add("kept.xml", "kept").c_str()), 10u);
  EXPECT_EQ(folder_.Content("kept.xml"), "kept");
}

// --- PKV files -------------------------------------------------------------------------------------------------------

TEST_F(NvFiles, PkvItemsWithoutDefinitionAreGenericAndBadOnesAreTold) {
  handset().nv().MakeArray(30, 3);
  ASSERT_EQ(Load("<NvItem id='30' maxIndex='2'>" + kTwoBytes + "</NvItem>" + Item(1) +
                 "<NvItem id='2' compressed='1'>" + kTwoBytes + "</NvItem>"),
            0u);
  for (const uint16_t index : {0, 2}) ASSERT_EQ(Set(30, "3,4", index), 0u);
  ASSERT_EQ(Set(1, "1,2"), 0u);
  ASSERT_EQ(Set(2, "1,2"), 0u);
  const auto pkv = Pkv();
  EXPECT_EQ(KRAL_NV_ClearNVDefinition(handle()), 0u);
  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), pkv.c_str()), 0u);
  EXPECT_EQ(Value(30, 2).substr(0, 6), "3,4,0,");
  EXPECT_EQ(Value(30, 1), "error 10");
  // The same by way of a source file, where the highest index comes last.
  Source();
  EXPECT_EQ(KRAL_NV_ClearNVDefinition(handle()), 0u);
  EXPECT_EQ(KRAL_NV_LoadNVsFromSource(handle(), Path("out.xml").c_str()), 0u) << ErrorText();
  EXPECT_EQ(Value(30, 0).substr(0, 6) + Value(30, 2).substr(0, 6), "3,4,0,3,4,0,");
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u) << ErrorText();
  EXPECT_EQ(HexText(ByteView(*handset().nv().Element(30, 2)).first(3)), "03 04 00");

  // Another definition, which the values do not satisfy.
  const std::string others = Item(30) + "<NvItem id='1' compressed='1'>" + kTwoBytes + "</NvItem>";
  ASSERT_EQ(Load(others), 0u) << "generic definitions come from no file";
  ASSERT_EQ(Load(others), 13u);
  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), pkv.c_str()), 20u);
  EXPECT_EQ(Value(1), "error 10");
  EXPECT_EQ(Value(30), "error 10") << "an array there, and none here";
  EXPECT_NE(ErrorText().find("NV ID 30 with index 2 has no place"), std::string::npos);

  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), Path("nowhere").c_str()), 7u);
  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), folder_.Add("text", "no compound document").c_str()), 7u);
  EXPECT_EQ(KRAL_NV_WriteNVsToPKV(handle(), Path("no/such/folder.pkv").c_str()), 7u);
  KRAL_NV_ClearNVValues(handle());
  EXPECT_EQ(KRAL_NV_WriteNVsToPKV(handle(), Path("empty.pkv").c_str()), 10u);
}

TEST_F(NvFiles, PkvFilesWithPathsThatFitNowhereAreLeftOut) {
  pkv::PkvSet set;
  const std::string longest(200, 'p');
  for (const std::string& path : {std::string("/nv/b\nt"), std::string("/nv/\xC3\xA4"), longest + "p"}) {
    set.files.push_back({path, 0xE1B6, FromHex("01")});
  }
  set.files.push_back({longest, 0xE1B6, FromHex("02")});
  const std::string pkv = Path("paths.pkv");
  ASSERT_TRUE(pkv::WritePkv(pkv, set).done());
  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), pkv.c_str()), 20u);
  uint32_t files = 0;
  KRAL_NV_GetNumOfNVEfsDefinition(handle(), &files);
  EXPECT_EQ(files, 1u);
  EXPECT_EQ(FileValue(longest.c_str()), "2");
  // One element that cannot be does not take the others of its array with it.
  pkv::PkvSet array;
  for (const uint16_t index : {0, 1, 257}) array.items.push_back({300, index, 0, 0, {7, 7}});
  ASSERT_TRUE(pkv::WritePkv(pkv, array).done());
  EXPECT_EQ(KRAL_NV_LoadNVsFromPKV(handle(), pkv.c_str()), 20u);
  EXPECT_EQ(Value(300, 1).substr(0, 4), "7,7,");
}

// --- Filters ---------------------------------------------------------------------------------------------------------

TEST_F(NvFiles, FiltersAddUpAndLimitWhatMoves) {
  ASSERT_EQ(Load(Item(1, "GSM_A") + Item(2, "LTE_A") + Item(3, "LTE_B") + Item(40, "W") +
                 "<NvEfsItem fullpathname='/nv/gsm'>" + kTwoBytes + "</NvEfsItem>"),
            0u);
  for (const uint16_t id : {1, 2, 3, 40}) handset().nv().Set(id, FromHex("01 01"));
  const auto filter = [&](const char* keys) {
    return folder_.Add("filter.xml", "<NvFilter>" + std::string(keys) + "</NvFilter>");
  };
  EXPECT_EQ(KRAL_NV_LoadReadFilter(handle(), filter("<NV>2</NV>").c_str()), 0u);
  EXPECT_TRUE(HasLine(KRAL_LOG_NV_MANAGER_DEBUG, "NV ID 2:WILL_READ"));
  EXPECT_TRUE(HasLine(KRAL_LOG_NV_MANAGER_DEBUG, "NV ID 1:WILL_NOT_READ"));
  EXPECT_TRUE(HasLine(KRAL_LOG_NV_MANAGER_DEBUG, "/nv/gsm:WILL_WRITE"));
  EXPECT_EQ(KRAL_NV_LoadReadFilter(handle(), filter("<NV_RANGE>39-41, 50</NV_RANGE>"
                                                    "<NV_NAME_SUBSTRING_LIST>GSM, gsm</NV_NAME_SUBSTRING_LIST>")
                                                 .c_str()),
            0u);
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 0u);
  EXPECT_EQ(Value(1) + Value(2) + Value(40), "1,11,11,1");
  EXPECT_EQ(Value(3), "error 10");
  EXPECT_EQ(KRAL_NV_CreateNVFilter(handle(), Path("with.xml").c_str()), 0u);
  EXPECT_EQ(KRAL_NV_CreateComplementNVFilter(handle(), Path("without.xml").c_str()), 0u);
  EXPECT_NE(folder_.Content("with.xml").find("<NvFilter>\n  <NV>1</NV>\n  <NV>2</NV>\n  <NV>40</NV>\n</NvFilter>"),
            std::string::npos);
  EXPECT_NE(folder_.Content("without.xml").find("<NV>3</NV>\n  <NV_NAME_SUBSTRING_LIST>/nv/gsm<"), std::string::npos);

  ASSERT_EQ(KRAL_NV_ClearReadFilters(handle()), 0u);
  ASSERT_EQ(KRAL_NV_LoadReadFilter(handle(), Path("without.xml").c_str()), 0u);
  KRAL_NV_ClearNVValues(handle());
  EXPECT_EQ(KRAL_NV_LoadNVsFromMobile(handle()), 0u);
  EXPECT_EQ(Value(3), "1,1");
  EXPECT_EQ(Value(1), "error 10");

  ASSERT_EQ(Set(1, "9,9"), 0u);
  ASSERT_EQ(Set(3, "9,9"), 0u);
  EXPECT_EQ(KRAL_NV_LoadWriteFilter(handle(), filter("<NV>1</NV>").c_str()), 0u);
  EXPECT_EQ(KRAL_NV_WriteNVsToMobile(handle()), 0u);
  EXPECT_EQ(handset().nv().Value(1)->front(), 9);
  EXPECT_EQ(handset().nv().Value(3)->front(), 1);
  EXPECT_EQ(Source().find("id=\"3\""), std::string::npos);
  EXPECT_EQ(KRAL_NV_ClearWriteFilters(handle()), 0u);
  EXPECT_NE(Source().find("id=\"3\""), std::string::npos);

  for (const char* bad : {"", "<NV>x</NV>", "<NV>65536</NV>", "<NV_RANGE>5-4</NV_RANGE>", "<NV_RANGE>5-</NV_RANGE>",
                          "<NV_OTHER>1</NV_OTHER>", "<NV_RANGE>1-2-3</NV_RANGE>"}) {
    EXPECT_EQ(KRAL_NV_LoadReadFilter(handle(), filter(bad).c_str()), 19u) << bad;
  }
  EXPECT_EQ(KRAL_NV_LoadWriteFilter(handle(), Path("nowhere").c_str()), 19u);
  EXPECT_EQ(KRAL_NV_CreateNVFilter(handle(), Path("no/such/folder").c_str()), 19u);
}

TEST(NvFilterTest, PassesWhatOneOfManyEntriesHolds) {
  XmlElement root;
  root.name = "NvFilter";
  const auto add = [&root](const char* name, const char* text) {
    XmlElement& key = root.children.emplace_back();
    key.name = name;
    key.text = text;
  };
  add("NV_RANGE", "30-35,10-20,12-14,21-22,65535,15-24");
  add("NV_NAME_SUBSTRING_LIST", "ab,abc,b/c,/x,aba,/nv/long");
  nv::NvFilter filter;
  std::string problem;
  ASSERT_EQ(filter.Read(root, problem), nv::NvError::kNone) << problem;
  const std::tuple<uint16_t, const char*, bool> kItems[] = {
      {9, "", false},    {10, "", true},        {24, "", true},          {25, "", false},  {29, "a", false},
      {35, "", true},    {65534, "", false},    {65535, "", true},       {1, "xab", true}, {1, "a/b/c", true},
      {1, "a/b", false}, {1, "/nv/lon", false}, {1, "/nv/longer", true}, {1, "b/x", true}, {1, "zz", false}};
  for (const auto& [id, name, passes] : kItems) {
    nv::NvItem item;
    item.id = id;
    item.name = name;
    EXPECT_EQ(filter.Passes(item), passes) << id << " " << name;
  }
  for (int i = 0; i < 1 << 18; ++i) add("NV", "1");
  EXPECT_EQ(filter.Read(root, problem), nv::NvError::kCannotOpenFilter);
}

// --- Reports ---------------------------------------------------------------------------------------------------------

TEST(NvReportCells, DifferingBytesAreMarkedAndEqualLinesFolded) {
  std::vector<uint8_t> first(70, 0x11), second(68, 0x11);
  second[17] = 0x22;
  const nv::ReportSide one{true, first, {}}, two{true, second, {}}, none;
  EXPECT_EQ(nv::ReportDifference(one, two), "3 of 70 bytes, from 0x11 on; 70 bytes to 68");
  EXPECT_EQ(nv::ReportDifference(one, one), "");
  const std::string line = "11 11 11 11 11 11 11 11 11 11 11 11 11 11 11 11";
  EXPECT_EQ(nv::ReportCell(two, one), "<div><i>0000</i> " + line + "</div><div><i>0010</i> 11 <mark>22</mark>" +
                                          line.substr(5) + "</div><div><i>0020</i> " + line +
                                          "</div><details><summary>20 equal bytes</summary><div><i>0030</i> " + line +
                                          "</div><div><i>0040</i> 11 11 11 11</div></details>");
  const std::string marked = nv::ReportCell(one, two);
  EXPECT_NE(marked.find("<i>0040</i> 11 11 11 11 <mark>11</mark> <mark>11</mark>"), std::string::npos) << marked;
  EXPECT_EQ(nv::ReportCell(none, one), "");
  const std::string alone = nv::ReportCell(one, none);
  EXPECT_EQ(alone.find("mark"), std::string::npos);
  EXPECT_NE(alone.find("<summary>54 more bytes</summary>"), std::string::npos) << alone;
}

TEST_F(NvFiles, ComparisonShowsWhatDiffers) {
  ASSERT_EQ(Load(Item(1, "SAME") + Item(2, "A&amp;B") + Item(3, "LEFT") + Item(4, "RIGHT")), 0u);
  for (const uint16_t id : {1, 2, 3}) Set(id, "1,2");
  const auto first = Pkv("first & only.pkv");
  KRAL_NV_ClearNVValueByNVID(handle(), 3);
  Set(2, "1,77");
  Set(4, "5,6");
  const auto second = Pkv("second.pkv");
  const auto page = Path("page.html");
  ASSERT_EQ(KRAL_NV_PKV_Diff(handle(), first.c_str(), second.c_str(), page.c_str()), 0u);
  const auto html = folder_.Content("page.html");
  for (const char* part : {
           "1 items differ, 1 are only in the first, 1 only in the second, 1 are the same.",
           "first &amp; only.pkv",
           "<tr class=\"changed\"><td>2</td><td>A&amp;B</td><td>0</td><td>0</td>"
           "<td class=\"value\"><div><i>a</i> 1</div><div><i>b</i> <mark>2</mark></div></td>"
           "<td class=\"value\"><div><i>a</i> 1</div><div><i>b</i> <mark>77</mark></div></td><td>b: 2 to 77</td></tr>",
           "<tr class=\"first\"><td>3</td><td>LEFT</td>",
           "<tr class=\"second\"><td>4</td><td>RIGHT</td>",
       }) {
    EXPECT_NE(html.find(part), std::string::npos) << part << "\n" << html;
  }
  EXPECT_LT(html.find("<td>2</td>"), html.find("<td>1</td>")) << "differences first";
  EXPECT_EQ(html.find("http"), std::string::npos) << "it needs nothing else";
  EXPECT_EQ(Value(2), "1,77");
  EXPECT_EQ(KRAL_NV_PKV_Diff(handle(), first.c_str(), Path("nowhere").c_str(), page.c_str()), 7u);
  EXPECT_EQ(KRAL_NV_PKV_Diff(handle(), first.c_str(), second.c_str(), Path("no/page.html").c_str()), 17u);
  const auto kept = folder_.Content("second.pkv");
  EXPECT_EQ(KRAL_NV_PKV_Diff(handle(), first.c_str(), second.c_str(), Path("./second.pkv").c_str()), 17u);
  KRAL_ERROR error{};
  ASSERT_EQ(KRAL_GetLastError(handle(), &error), 1);
  EXPECT_EQ(error.code, uint32_t{KRAL_ERROR_ARGUMENT}) << error.text;
  EXPECT_EQ(folder_.Content("second.pkv"), kept) << "what is compared is never replaced";

  ASSERT_EQ(KRAL_NV_GenerateQDF(handle(), Path("list.qdf").c_str()), 0u);
  EXPECT_EQ(folder_.Content("list.qdf"),
            "NV ID 1\tSAME\t0\t0\t1,2\nNV ID 2\tA&B\t0\t0\t1,77\nNV ID 4\tRIGHT\t0\t0\t5,6\n");
  EXPECT_EQ(KRAL_NV_GenerateQDF(handle(), Path("no/list").c_str()), 15u);
  KRAL_NV_ClearNVValues(handle());
  EXPECT_EQ(KRAL_NV_GenerateQDF(handle(), Path("list.qdf").c_str()), 10u);
  EXPECT_TRUE(folder_.Content("list.qdf").starts_with("NV ID 1")) << "an older list stays";
}

}  // namespace
}  // namespace kral
