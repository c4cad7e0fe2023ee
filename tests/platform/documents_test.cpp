// Compound documents and XML: what is written is read again, and hostile input is refused.
#include "platform/compound_file.h"
#include "platform/xml_document.h"
#include "tests/support/test.h"

namespace kral {
namespace {

CompoundStorage ExampleTree() {
  CompoundStorage root;
  CompoundStorage& phone = root.OpenOrAddStorage("Default_Phone_Configuration");
  phone.OpenOrAddStream("NV_ITEM_ARRAY").bytes.assign(136 * 100, 0x5A);
  phone.OpenOrAddStream("Empty");
  CompoundStorage& numbered = phone.OpenOrAddStorage("NV_NUMBERED_ITEMS");
  numbered.OpenOrAddStorage("00000453").OpenOrAddStream("00000001").bytes = {1, 2, 3};
  numbered.OpenOrAddStorage("00000454");  // a storage without entries stays a storage
  root.OpenOrAddStream("File_Version").bytes = {6, 0, 0, 0, 1, 0, 0, 0};
  return root;
}

TEST(CompoundFile, WhatIsWrittenIsReadAgain) {
  std::vector<uint8_t> file;
  ASSERT_EQ(SerializeCompoundFile(ExampleTree(), file), "");
  CompoundStorage root;
  ASSERT_EQ(ParseCompoundFile(file, root), "");

  const CompoundStorage* phone = root.FindStorage("Default_Phone_Configuration");
  ASSERT_NE(phone, nullptr);
  const CompoundStream* items = phone->FindStream("NV_ITEM_ARRAY");
  ASSERT_NE(items, nullptr);
  EXPECT_EQ(items->bytes, std::vector<uint8_t>(136 * 100, 0x5A));
  ASSERT_NE(phone->FindStream("Empty"), nullptr);
  EXPECT_TRUE(phone->FindStream("Empty")->bytes.empty());
  const CompoundStorage* numbered = phone->FindStorage("NV_NUMBERED_ITEMS");
  ASSERT_NE(numbered, nullptr);
  ASSERT_NE(numbered->FindStorage("00000453"), nullptr);
  EXPECT_EQ(numbered->FindStorage("00000453")->FindStream("00000001")->bytes, (std::vector<uint8_t>{1, 2, 3}));
  ASSERT_NE(numbered->FindStorage("00000454"), nullptr);
  EXPECT_EQ(root.FindStream("File_Version")->bytes.size(), 8u);
}

TEST(CompoundFile, TruncatedAndForeignFilesAreRefusedAndTheTreeStaysAsItWas) {
  std::vector<uint8_t> file;
  ASSERT_EQ(SerializeCompoundFile(ExampleTree(), file), "");
  for (const size_t size : {size_t{0}, size_t{7}, size_t{100}, size_t{512}}) {
    CompoundStorage root;
    root.OpenOrAddStream("kept");
    EXPECT_NE(ParseCompoundFile({file.data(), size}, root), "") << size;
    EXPECT_NE(root.FindStream("kept"), nullptr) << size;
  }
  const std::string text = "this is no compound document at all, and never was one";
  CompoundStorage root;
  EXPECT_NE(ParseCompoundFile({reinterpret_cast<const uint8_t*>(text.data()), text.size()}, root), "");
}

// A document made by hand: storages "00000000", "00000001" ... in the root, each the right sibling of the one before.
class HandmadeDocument {
 public:
  static constexpr size_t kDirectory = 512;
  static constexpr size_t kEntry = 128;
  static constexpr size_t kPerSector = 512 / 4;

  explicit HandmadeDocument(uint32_t storages) {
    const uint32_t directory_sectors = (storages + 1 + 3) / 4;
    while (tables_ * kPerSector < directory_sectors + tables_ + Lists()) ++tables_;
    bytes.resize(512 * (1 + directory_sectors + tables_ + Lists()));
    const uint8_t magic[] = {0xD0, 0xCF, 0x11, 0xE0, 0xA1, 0xB1, 0x1A, 0xE1};
    std::ranges::copy(magic, bytes.begin());
    bytes[30] = 9;
    Put(60, kEnd);
    Put(68, Lists() == 0 ? kEnd : directory_sectors + tables_);
    for (uint32_t i = 0; i < 109; ++i) Put(76 + 4 * i, i < tables_ ? directory_sectors + i : kFree);
    for (uint32_t i = 0; i < Lists() * kPerSector; ++i) {
      const bool last = i % kPerSector == kPerSector - 1;
      const uint32_t listed = 109 + i - i / kPerSector;
      const uint32_t next = (i + 1) / kPerSector < Lists() ? directory_sectors + tables_ + (i + 1) / kPerSector : kEnd;
      Put(512 * (1 + directory_sectors + tables_) + 4 * i, last               ? next
                                                           : listed < tables_ ? directory_sectors + listed
                                                                              : kFree);
    }
    table_at = 512 * (1 + directory_sectors);
    for (uint32_t i = 0; i < tables_ * kPerSector; ++i)
      Put(table_at + 4 * i, i + 1 < directory_sectors ? i + 1 : i + 1 == directory_sectors ? kEnd : kFree);
    AddEntry(0, "Root Entry", 5, kFree, storages > 0 ? 1 : kFree);
    for (uint32_t i = 1; i <= storages; ++i)
      AddEntry(i, std::to_string(100000000 + i - 1).substr(1), 1, i < storages ? i + 1 : kFree, kFree);
  }

  HandmadeDocument& Put(size_t at, uint32_t value) {
    for (size_t i = 0; i < 4; ++i) bytes[at + i] = static_cast<uint8_t>(value >> (8 * i));
    return *this;
  }
  // Makes a stream of an entry, and the file so long that a large one may lie in it.
  HandmadeDocument& MakeStream(size_t entry, size_t file_size = 0) {
    bytes[entry + 66] = 2;
    bytes.resize(std::max(bytes.size(), file_size));
    return *this;
  }

  static constexpr uint32_t kEnd = 0xFFFFFFFE;
  static constexpr uint32_t kFree = 0xFFFFFFFF;
  std::vector<uint8_t> bytes;
  size_t table_at = 0;

 private:
  uint32_t Lists() const { return tables_ <= 109 ? 0 : (tables_ - 109 + 126) / 127; }

  void AddEntry(uint32_t number, const std::string& name, uint8_t type, uint32_t right, uint32_t child) {
    const size_t at = kDirectory + kEntry * number;
    for (size_t i = 0; i < name.size(); ++i) bytes[at + 2 * i] = static_cast<uint8_t>(name[i]);
    bytes[at + 64] = static_cast<uint8_t>(2 * name.size() + 2);
    bytes[at + 66] = type;
    Put(at + 68, kFree);
    Put(at + 72, right);
    Put(at + 76, child);
  }

  uint32_t tables_ = 1;
};

// Writers are free to chain all siblings: a reader that goes one call deeper for each would use up the stack.
TEST(CompoundFile, SiblingsMayBeAChainOfAnyLength) {
  constexpr uint32_t kSiblings = 120000;
  CompoundStorage root;
  ASSERT_EQ(ParseCompoundFile(HandmadeDocument(kSiblings).bytes, root), "");
  EXPECT_EQ(root.storages.size(), kSiblings);
  EXPECT_EQ(root.storages.back().name, "00119999");
  EXPECT_EQ(ParseCompoundFile(HandmadeDocument(kCompoundEntryLimit + 1).bytes, root), "too many entries");
}

TEST(CompoundFile, NamesComeFromUtf16) {
  HandmadeDocument document(1);
  constexpr size_t kName = HandmadeDocument::kDirectory + HandmadeDocument::kEntry;
  document.Put(kName, 0xDCF1D83D);  // U+1F4F1
  document.Put(kName + 4, 0x20AC00E9);
  CompoundStorage root;
  ASSERT_EQ(ParseCompoundFile(document.bytes, root), "");
  EXPECT_EQ(root.storages.front().name,
            "\xF0\x9F\x93\xB1\xC3\xA9\xE2\x82\xAC"
            "0000");
}

TEST(CompoundFile, EachDamageIsNamed) {
  const std::string circle = "its sectors run in circles or lead out of the file";
  const std::string directory = "its directory runs in circles or leads out of the file";
  constexpr size_t kThird = HandmadeDocument::kDirectory + 3 * HandmadeDocument::kEntry;
  constexpr size_t kType = 64;  // behind the length of the name
  struct Damage {
    std::string what;
    std::function<void(HandmadeDocument&)> inflict;
    std::string problem;
  };
  const Damage damages[] = {
      {"sector size", [](auto& d) { d.bytes[30] = 10; }, "sectors of an unknown size"},
      {"directory outside", [](auto& d) { d.Put(48, 999); }, circle},
      {"directory of circles", [](auto& d) { d.Put(d.table_at, 0); }, circle},
      {"table outside", [](auto& d) { d.Put(76, 99); }, circle},
      {"one table again and again",
       [](auto& d) {
         for (size_t i = 0; i < 20; ++i) d.Put(76 + 4 * i, 1);
       },
       circle},
      {"list of circles", [](auto& d) { d.Put(68, 1).Put(d.table_at + 508, 1); }, circle},
      {"no root", [](auto& d) { d.bytes[d.kDirectory + 66] = 1; }, "no directory"},
      {"sibling of its own", [](auto& d) { d.Put(kThird + 68, 3); }, directory},
      {"sibling outside", [](auto& d) { d.Put(kThird + 72, 4); }, directory},
      {"child is a parent", [](auto& d) { d.Put(kThird + 76, 1); }, directory},
      {"odd name", [](auto& d) { d.Put(kThird + kType, 0x010011); }, "an entry has a damaged name"},
      {"no name", [](auto& d) { d.Put(kThird + kType, 0x010002); }, "an entry has a damaged name"},
      {"name too long", [](auto& d) { d.Put(kThird + kType, 0x010042); }, "an entry has a damaged name"},
      {"half a pair", [](auto& d) { d.Put(kThird, 0x0030D83D); }, "an entry has a damaged name"},
      {"unknown kind", [](auto& d) { d.bytes[kThird + 66] = 7; }, "entry 00000002 is neither storage nor stream"},
      {"short stream nowhere", [](auto& d) { d.MakeStream(kThird).Put(kThird + 120, 5); }, circle},
      {"stream in the directory", [](auto& d) { d.MakeStream(kThird, 8192).Put(kThird + 120, 4096); }, circle},
      {"stream of no sectors",
       [](auto& d) { d.MakeStream(kThird, 8192).Put(kThird + 116, d.kEnd).Put(kThird + 120, 4096); },
       "stream 00000002 is cut short"},
      {"stream longer than the file", [](auto& d) { d.MakeStream(kThird).Put(kThird + 120, 0x7FFFFFFF); },
       "stream 00000002 is cut short"},
  };
  for (const Damage& damage : damages) {
    HandmadeDocument document(3);
    damage.inflict(document);
    CompoundStorage root;
    root.OpenOrAddStream("kept");
    EXPECT_EQ(ParseCompoundFile(document.bytes, root), damage.problem) << damage.what;
    EXPECT_NE(root.FindStream("kept"), nullptr) << damage.what;
  }
}

TEST(CompoundFile, FlippedBytesNeverDoHarm) {
  std::vector<uint8_t> file;
  ASSERT_EQ(SerializeCompoundFile(ExampleTree(), file), "");
  int refused = 0;
  for (size_t at = 0; at < file.size(); at += 37) {
    std::vector<uint8_t> damaged = file;
    damaged[at] ^= 0xFF;
    CompoundStorage root;
    refused += ParseCompoundFile(damaged, root).empty() ? 0 : 1;
  }
  EXPECT_GT(refused, 0);  // the header at least
}

XmlResult Parse(const std::string& text, XmlElement& root) {
  std::string problem;
  const XmlResult result = ParseXml({reinterpret_cast<const uint8_t*>(text.data()), text.size()}, root, problem);
  EXPECT_EQ(result == XmlResult::kOk, problem.empty()) << problem;
  return result;
}

TEST(Xml, ElementsAttributesAndTextComeAsWritten) {
  XmlElement root;
  ASSERT_EQ(Parse("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<NvSource a='1'>\n"
                  "  <NvItem id=\"453\" name=\"FTM &amp; more\">1,2,<![CDATA[3]]></NvItem><!-- aside -->\n"
                  "  <Empty/>\n</NvSource>",
                  root),
            XmlResult::kOk);
  EXPECT_EQ(root.name, "NvSource");
  ASSERT_EQ(root.children.size(), 2u);
  const XmlElement* item = root.Child("NvItem");
  ASSERT_NE(item, nullptr);
  ASSERT_NE(item->Attribute("name"), nullptr);
  EXPECT_EQ(*item->Attribute("name"), "FTM & more");
  EXPECT_EQ(item->Attribute("absent"), nullptr);
  EXPECT_EQ(item->text, "1,2,3");
  EXPECT_NE(root.Child("Empty"), nullptr);
}

TEST(Xml, HostileDocumentsAreRefused) {
  std::string deep;
  for (int i = 0; i < 100; ++i) deep += "<a>";
  for (int i = 0; i < 100; ++i) deep += "</a>";
  std::string many = "<a";  // a parser of attributes alone takes half a minute for these
  for (int i = 0; i < 40000; ++i) many += " a" + std::to_string(i) + "='>'";
  many += "/>";
  std::string wide = "\xFF\xFE";
  for (const char character : many) wide += {character, '\0'};
  const std::string documents[] = {
      many,
      wide,
      "<!-- > --><?a > ?><a><![CDATA[<a]]><a v='" + std::string(kXmlTagLimit, 'x') + "'/></a>",
      "",
      "no xml",
      "<a><b></a>",
      "<a>",
      "<a/><b/>",
      "<!DOCTYPE a [<!ENTITY x \"xxxxxxxxxx\"><!ENTITY y \"&x;&x;&x;\">]><a>&y;</a>",
      "<!DOCTYPE a SYSTEM \"file:///etc/hostname\"><a/>",
      deep,
  };
  for (const std::string& document : documents) {
    XmlElement root;
    root.name = "kept";
    EXPECT_EQ(Parse(document, root), XmlResult::kMalformed) << document.substr(0, 60);
    EXPECT_EQ(root.name, "kept");
  }
}

TEST(Xml, EscapedTextSurvivesTheParser) {
  const std::string raw = "a<b>&\"c'";
  XmlElement root;
  ASSERT_EQ(Parse("<t v=\"" + EscapeXml(raw) + "\">" + EscapeXml(raw) + "</t>", root), XmlResult::kOk);
  EXPECT_EQ(root.text, raw);
  EXPECT_EQ(*root.Attribute("v"), raw);
}

}  // namespace
}  // namespace kral
