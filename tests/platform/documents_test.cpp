// Compound documents and XML: what is written is read again, and hostile input is refused.
#include <gtest/gtest.h>

#include <string>

#include "platform/compound_file.h"
#include "platform/xml_document.h"

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
  const std::string documents[] = {
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
