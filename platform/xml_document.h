// XML documents: parsed whole by the system's parser (MSXML 6 on Windows, libxml2 on Linux) into a plain tree.
// External entities, document type declarations and the network are off.
#ifndef KRAL_PLATFORM_XML_DOCUMENT_H
#define KRAL_PLATFORM_XML_DOCUMENT_H

#include <cstddef>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace kral {

struct XmlElement {
  std::string name;  // UTF-8, as written, prefix included
  std::vector<std::pair<std::string, std::string>> attributes;
  std::string text;  // the character data directly inside, joined
  std::vector<XmlElement> children;

  const std::string* Attribute(std::string_view wanted) const;  // null when absent
  const XmlElement* Child(std::string_view wanted) const;       // the first of that name
};

enum class XmlResult {
  kOk,
  kNoParser,   // the system's parser cannot be had
  kMalformed,  // not well-formed, too deep, too large, with a document type declaration, or beyond a limit
};

inline constexpr size_t kXmlSizeLimit = size_t{64} << 20;
inline constexpr size_t kXmlDepthLimit = 64;
// Of a tag. Parsers compare each attribute with all before it: many thousands of one element take minutes.
inline constexpr size_t kXmlTagLimit = size_t{64} << 10;
inline constexpr size_t kXmlAttributeLimit = 64;

// On anything but kOk the reason is in `problem` and `root` is as before.
XmlResult ParseXml(std::span<const uint8_t> document, XmlElement& root, std::string& problem);
XmlResult LoadXml(const std::string& path, XmlElement& root, std::string& problem);

// For the bodies of ParseXml, before the system's parser sees the document: false, with the reason, when a tag is
// beyond its limits.
bool HasBoundedTags(std::span<const uint8_t> document, std::string& problem);

// The line, from 1, on which an element of the parsed document begins. Parsers need not tell it, so the document is
// looked through: for messages.
uint32_t LineOf(std::span<const uint8_t> document, const XmlElement& root, const XmlElement& element);

// For text and attribute values: & < > " ' become entities.
std::string EscapeXml(std::string_view text);

}  // namespace kral

#endif
