// Reads attributes; what they mean is left to the readers of definitions, sources and filters.
#include "base/xml_attributes.h"

#include <charconv>

namespace kral {
namespace {

[[noreturn]] void Reject(const XmlElement& element, std::string_view name, const std::string& value) {
  throw BadXml("<" + element.name + ">: " + std::string(name) + "=\"" + value + "\" is out of range");
}

}  // namespace

std::optional<uint64_t> ParseDecimal(std::string_view text, uint64_t limit) {
  uint64_t value = 0;
  const auto result = std::from_chars(text.data(), text.data() + text.size(), value);
  if (result.ec != std::errc() || result.ptr != text.data() + text.size() || value > limit) return std::nullopt;
  return value;
}

std::optional<uint64_t> NumberAttribute(const XmlElement& element, std::string_view name, uint64_t limit) {
  const std::string* text = element.Attribute(name);
  if (text == nullptr) return std::nullopt;
  const auto value = ParseDecimal(*text, limit);
  if (!value) Reject(element, name, *text);
  return value;
}

bool FlagAttribute(const XmlElement& element, std::string_view name) {
  const std::string* text = element.Attribute(name);
  if (text == nullptr || *text == "0" || *text == "false") return false;
  if (*text != "1" && *text != "true") Reject(element, name, *text);
  return true;
}

uint64_t RequiredNumber(const XmlElement& element, std::string_view name, uint64_t limit) {
  const auto value = NumberAttribute(element, name, limit);
  if (!value) throw BadXml("<" + element.name + "> without " + std::string(name));
  return *value;
}

std::string TextAttribute(const XmlElement& element, std::string_view name) {
  const std::string* text = element.Attribute(name);
  return text == nullptr ? std::string() : *text;
}

std::string AttributeText(std::string_view name, std::string_view value) {
  return std::string(" ").append(name).append("=\"").append(EscapeXml(value)).append("\"");
}

}  // namespace kral
