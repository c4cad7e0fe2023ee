// Reads and writes source files; what the values mean is left to the definitions.
#include "storage/nv/nv_source.h"

#include <array>
#include <charconv>
#include <utility>

#include "base/xml_attributes.h"
#include "platform/file_util.h"

namespace kral::nv {
namespace {

// Other tools read these files by the letter, schema location included.
constexpr std::string_view kHead =
    "<?xml version=\"1.0\" encoding=\"utf-8\"?>\n"
    "<NvSource xmlns:xsi=\"http://www.w3.org/2001/XMLSchema-instance\" "
    "xsi:noNamespaceSchemaLocation=\"..\\Schema\\NvSource.xsd\">\n";
constexpr std::string_view kEnd = "</NvSource>";

NvSourceItem ReadItem(const XmlElement& element) {
  NvSourceItem item;
  if (element.name == "NvItem") {
    item.id = static_cast<uint16_t>(RequiredNumber(element, "id", UINT16_MAX));
    item.slot.subscription = static_cast<uint16_t>(NumberAttribute(element, "subscriptionid", UINT16_MAX).value_or(0));
  } else {
    item.path = TextAttribute(element, "fullpathname");
    if (item.path.empty()) throw BadXml("<NvEfsItem> without fullpathname");
  }
  item.name = TextAttribute(element, "name");
  item.slot.element = static_cast<uint16_t>(NumberAttribute(element, "index", kHighestElement).value_or(0));
  const std::string mapping = TextAttribute(element, "mapping");
  const std::string encoding = TextAttribute(element, "encoding");
  item.is_direct = mapping == "direct";
  if (!item.is_direct && mapping != "byteStream") throw BadXml("<" + element.name + ">: mapping \"" + mapping + "\"");
  if (encoding != (item.is_direct ? "dec" : "hex")) {
    throw BadXml("<" + element.name + ">: mapping \"" + mapping + "\" with encoding \"" + encoding + "\"");
  }
  if (!element.children.empty()) throw BadXml("<" + element.name + "> holds elements");
  item.value = element.text;
  return item;
}

uint32_t ReadRoamingListNumber(const XmlElement& element) {
  const std::string text = TextAttribute(element, "nam");
  uint32_t number = 0;
  const auto result = std::from_chars(text.data(), text.data() + text.size(), number, 16);
  if (text.empty() || result.ec != std::errc() || result.ptr != text.data() + text.size()) {
    throw BadXml("<PRLItem>: nam \"" + text + "\"");
  }
  return number;
}

std::string ItemText(const NvSourceItem& item) {
  const std::string element = item.id ? "NvItem" : "NvEfsItem";
  std::string text = "<" + element;
  if (item.id) {
    text += AttributeText("id", std::to_string(*item.id)) +
            AttributeText("subscriptionid", std::to_string(item.slot.subscription));
  } else {
    text += AttributeText("fullpathname", item.path);
  }
  text += AttributeText("name", item.name);
  text += item.is_direct ? " mapping=\"direct\" encoding=\"dec\"" : " mapping=\"byteStream\" encoding=\"hex\"";
  return text + AttributeText("index", std::to_string(item.slot.element)) + ">" + EscapeXml(item.value) + "</" +
         element + ">";
}

std::string HexNumber(uint32_t number) {
  std::array<char, 8> digits;
  return {digits.data(), std::to_chars(digits.data(), digits.data() + digits.size(), number, 16).ptr};
}

}  // namespace

NvError LoadSource(const std::string& path, NvSource& source, std::string& problem) {
  XmlElement root;
  switch (LoadXml(path, root, problem)) {
    case XmlResult::kNoParser:
      return NvError::kNoXmlParser;
    case XmlResult::kMalformed:
      return NvError::kCannotLoadSource;
    case XmlResult::kOk:
      break;
  }
  return ReadSource(root, source, problem);
}

NvError ReadSource(const XmlElement& root, NvSource& source, std::string& problem) {
  try {
    NvSource read;
    if (root.name != "NvSource") throw BadXml("the root element is <" + root.name + ">");
    for (const XmlElement& element : root.children) {
      if (element.name == "NvItem" || element.name == "NvEfsItem") {
        read.items.push_back(ReadItem(element));
      } else if (element.name == "PRLItem") {
        read.roaming_lists[ReadRoamingListNumber(element)] = element.text;
      } else {
        throw BadXml("<" + element.name + "> is not expected in <NvSource>");
      }
    }
    source = std::move(read);
    return NvError::kNone;
  } catch (const BadXml& bad) {
    problem = bad.what();
    return NvError::kBadSource;
  }
}

std::string SourceText(const NvSource& source) {
  std::string text(kHead);
  for (const NvSourceItem& item : source.items) text += ItemText(item) + "\n";
  for (const auto& [number, list] : source.roaming_lists) {
    text += "<PRLItem nam=\"" + HexNumber(number) + "\">" + EscapeXml(list) + "</PRLItem>\n";
  }
  text += kEnd;  // nothing comes behind it, not even the end of the line
  return text;
}

NvError SaveSource(const std::string& path, const NvSource& source) {
  const std::string text = SourceText(source);
  AtomicFile file;
  if (const auto error = file.Open(path)) return NotWritten(NvError::kCannotOpenSource, path, error);
  const std::vector<uint8_t> bytes(text.begin(), text.end());
  std::error_code error = file.Write(bytes);
  if (!error) error = file.Commit();
  return error ? NotWritten(NvError::kCannotSaveSource, path, error) : NvError::kNone;
}

}  // namespace kral::nv
