// A connected handset and an NV tool for tests: definitions from a text, values as texts, a folder for files.
#ifndef KRAL_TESTS_SUPPORT_NV_FIXTURE_H
#define KRAL_TESTS_SUPPORT_NV_FIXTURE_H

#include "kral/kral.h"
#include "tests/support/handset_connection.h"
#include "tests/support/temp_folder.h"
#include "tests/support/test.h"

namespace kral::test {

// Items of every kind; the file that users are shown.
inline std::string ExampleDefinitions() {
  return KRAL_EXAMPLES "/nv_definitions.xml";
}

inline const std::string kTwoBytes =
    "<DataType><Member name='a' typeid='word8'/><Member name='b' typeid='word8'/></DataType>";

class NvToolTest : public HandsetTest {
 protected:
  void SetUp() override {
    HandsetTest::SetUp();
    KRAL_SetReceiveMode(handle(), 1);
  }

  uint32_t Load(std::string_view items) {
    const auto file = folder_.Add("definitions.xml", "<NvDefinition>" + std::string(items) + "</NvDefinition>");
    return KRAL_NV_LoadNVDefinitionFile(handle(), file.c_str());
  }
  uint32_t LoadSource(std::string_view items) {
    const auto file = folder_.Add("source.xml", "<NvSource>" + std::string(items) + "</NvSource>");
    return KRAL_NV_LoadNVsFromSource(handle(), file.c_str());
  }
  // The value as decimal numbers, or "error N".
  std::string Value(uint16_t id, uint16_t array_index = 0) {
    uint32_t length = 0;
    const uint32_t error = KRAL_NV_GetNVValueStringByNVIDStringLength(handle(), id, array_index, &length);
    if (error != 0) return "error " + std::to_string(error);
    std::string text(length, '\0');
    EXPECT_EQ(KRAL_NV_GetNVValueStringByNVID(handle(), id, array_index, text.data(), length), 0u);
    text.pop_back();
    return text;
  }
  std::string FileValue(const char* path) {
    std::vector<char> text(300000);
    const auto size = static_cast<uint32_t>(text.size());
    const uint32_t error = KRAL_NV_GetNVValueStringByEfsFilename(handle(), path, text.data(), size);
    return error != 0 ? "error " + std::to_string(error) : text.data();
  }
  uint32_t Set(uint16_t id, const char* text, uint16_t array_index = 0) {
    return KRAL_NV_SetNVValueStringByNVID(handle(), id, array_index, text);
  }
  static std::string Item(int id, const char* name = "") {
    return "<NvItem id='" + std::to_string(id) + "' name='" + name + "'>" + kTwoBytes + "</NvItem>";
  }
  std::string Pkv(const std::string& name = "phone.pkv") {
    const std::string path = Path(name);
    EXPECT_EQ(KRAL_NV_WriteNVsToPKV(handle(), path.c_str()), 0u) << ErrorText();
    return path;
  }
  std::string Source() {
    EXPECT_EQ(KRAL_NV_WriteNVsToSource(handle(), Path("out.xml").c_str()), 0u) << ErrorText();
    return folder_.Content("out.xml");
  }
  size_t CountRequests(std::string_view prefix) {
    const auto requests = handset().requests();
    return static_cast<size_t>(std::ranges::count_if(
        requests, [&](const handset::Bytes& request) { return HexText(request).starts_with(prefix); }));
  }

  std::string Path(const std::string& name) const { return folder_.Path(name); }

  TempFolder folder_;
};

}  // namespace kral::test

#endif
