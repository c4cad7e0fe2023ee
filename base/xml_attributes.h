// Attributes of definition, source and filter files, checked.
#ifndef KRAL_BASE_XML_ATTRIBUTES_H
#define KRAL_BASE_XML_ATTRIBUTES_H

#include <cstdint>
#include <optional>
#include <stdexcept>
#include <string>
#include <string_view>

#include "platform/xml_document.h"

namespace kral {

// A document that is well-formed and still cannot be used. The text tells where and why.
class BadXml : public std::runtime_error {
 public:
  using std::runtime_error::runtime_error;
};

// Decimal digits only; nothing for any other text and beyond the limit.
std::optional<uint64_t> ParseDecimal(std::string_view text, uint64_t limit);

// These throw BadXml when the attribute is there and no such value.
std::optional<uint64_t> NumberAttribute(const XmlElement& element, std::string_view name, uint64_t limit);
bool FlagAttribute(const XmlElement& element, std::string_view name);  // 1, true; absent: false
// Throws BadXml when the attribute is missing.
uint64_t RequiredNumber(const XmlElement& element, std::string_view name, uint64_t limit);
// Empty when absent.
std::string TextAttribute(const XmlElement& element, std::string_view name);

// As it is written: a blank, the name, and the value in quotation marks.
std::string AttributeText(std::string_view name, std::string_view value);

}  // namespace kral

#endif
