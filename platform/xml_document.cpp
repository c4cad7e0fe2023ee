// The tree of an XML document, and escaping; parsing is the system's.
#include "platform/xml_document.h"

#include <algorithm>

#include "platform/file_util.h"

namespace kral {

const std::string* XmlElement::Attribute(std::string_view wanted) const {
  for (const auto& [attribute, value] : attributes) {
    if (attribute == wanted) return &value;
  }
  return nullptr;
}

const XmlElement* XmlElement::Child(std::string_view wanted) const {
  const auto child =
      std::find_if(children.begin(), children.end(), [wanted](const auto& c) { return c.name == wanted; });
  return child != children.end() ? &*child : nullptr;
}

XmlResult LoadXml(const std::string& path, XmlElement& root, std::string& problem) {
  std::vector<uint8_t> document;
  if (const std::error_code error = ReadWholeFile(path, kXmlSizeLimit, document)) {
    problem = path + ": " + error.message();
    return XmlResult::kMalformed;
  }
  const XmlResult result = ParseXml(document, root, problem);
  if (result != XmlResult::kOk) problem = path + ": " + problem;
  return result;
}

std::string EscapeXml(std::string_view text) {
  std::string escaped;
  escaped.reserve(text.size());
  for (const char character : text) {
    switch (character) {
      case '&':
        escaped += "&amp;";
        break;
      case '<':
        escaped += "&lt;";
        break;
      case '>':
        escaped += "&gt;";
        break;
      case '"':
        escaped += "&quot;";
        break;
      case '\'':
        escaped += "&apos;";
        break;
      default:
        escaped += character;
        break;
    }
  }
  return escaped;
}

}  // namespace kral
