// The tree of an XML document, and escaping; parsing is the system's.
#include "platform/xml_document.h"

#include <algorithm>
#include <cstring>
#include <optional>

#include "platform/file_util.h"

namespace kral {
namespace {

// The characters of a document that markup is made of; all others are one and the same. They look alike in the
// encodings in use: one byte, or two or four with zeros around it.
class Markup {
 public:
  explicit Markup(std::span<const uint8_t> bytes) : bytes_(bytes) {
    const auto zero = [&](size_t at) { return at < bytes.size() && bytes[at] == 0; };
    if (bytes.size() < 4) return;
    if (bytes[0] == 0xFE || bytes[0] == 0xFF) {  // a byte order mark
      unit_ = zero(2) && zero(3) ? 4 : 2;
      place_ = bytes[0] == 0xFE ? 1 : 0;
    } else if (zero(0) || zero(1)) {
      unit_ = zero(1) && (zero(0) || zero(2)) ? 4 : 2;
      place_ = zero(0) ? unit_ - 1 : 0;
    }
  }

  size_t size() const { return bytes_.size() / unit_; }
  char operator[](size_t index) const {
    if (unit_ == 1) return static_cast<char>(bytes_[index]);
    const auto unit = bytes_.subspan(index * unit_, unit_);
    for (size_t i = 0; i < unit_; ++i) {
      if (i != place_ && unit[i] != 0) return '\0';
    }
    return static_cast<char>(unit[place_]);
  }
  // Its next place, or the end.
  size_t Find(char character, size_t from) const {
    if (unit_ == 1) {
      const auto rest = bytes_.subspan(std::min(from, size()));
      const void* const found = rest.empty() ? nullptr : std::memchr(rest.data(), character, rest.size());
      return found != nullptr ? static_cast<size_t>(static_cast<const uint8_t*>(found) - bytes_.data()) : size();
    }
    while (from < size() && (*this)[from] != character) ++from;
    return from;
  }
  bool StartsAt(size_t index, std::string_view text) const {
    if (index + text.size() > size()) return false;
    for (size_t i = 0; i < text.size(); ++i) {
      if ((*this)[index + i] != text[i]) return false;
    }
    return true;
  }
  // The place of the last character of the text, or the end.
  size_t EndOf(std::string_view text, size_t from) const {
    while (from < size() && !StartsAt(from, text)) ++from;
    return std::min(from + text.size() - 1, size());
  }

 private:
  std::span<const uint8_t> bytes_;
  size_t unit_ = 1;
  size_t place_ = 0;  // of the byte that is not zero
};

// From its '<'. Gives the place of its '>', or the end; nothing for a tag beyond the limits.
std::optional<size_t> EndOfTag(const Markup& markup, size_t begin) {
  size_t attributes = 0;
  for (size_t at = begin; at < markup.size(); ++at) {
    const char character = markup[at];
    if (character == '>') {
      return at;
    } else if (character == '"' || character == '\'') {
      at = markup.Find(character, at + 1);
    } else if (character == '=') {
      ++attributes;
    }
    if (at - begin >= kXmlTagLimit || attributes > kXmlAttributeLimit) return std::nullopt;
  }
  return markup.size();
}

// False when the element is not among these.
bool CountInFront(const XmlElement& at, const XmlElement& element, size_t& count) {
  if (&at == &element) return true;
  ++count;
  return std::ranges::any_of(at.children, [&](const XmlElement& child) { return CountInFront(child, element, count); });
}

// Where a comment, a section of plain characters or an instruction ends; nothing where none begins.
std::optional<size_t> EndOfAside(const Markup& markup, size_t at) {
  if (markup.StartsAt(at, "<!--")) return markup.EndOf("-->", at + 4);
  if (markup.StartsAt(at, "<![CDATA[")) return markup.EndOf("]]>", at);
  if (markup.StartsAt(at, "<?")) return markup.EndOf("?>", at);
  return std::nullopt;
}

}  // namespace

bool HasBoundedTags(std::span<const uint8_t> document, std::string& problem) {
  const Markup markup(document);
  for (size_t at = markup.Find('<', 0); at < markup.size(); at = markup.Find('<', at + 1)) {
    if (const auto aside = EndOfAside(markup, at)) {
      at = *aside;
    } else if (const auto end = EndOfTag(markup, at)) {
      at = *end;
    } else {
      problem = "an element has more than " + std::to_string(kXmlAttributeLimit) +
                " attributes or a tag of more than " + std::to_string(kXmlTagLimit) + " characters";
      return false;
    }
  }
  return true;
}

uint32_t LineOf(std::span<const uint8_t> document, const XmlElement& root, const XmlElement& element) {
  size_t in_front = 0;  // elements that begin before this one
  if (!CountInFront(root, element, in_front)) return 0;
  const Markup markup(document);
  uint32_t line = 1;
  size_t seen = 0;  // the character up to which lines are counted
  const auto count_to = [&](size_t end) {
    for (; seen < end; ++seen) {
      if (markup[seen] == '\n') ++line;
    }
  };
  for (size_t at = 0; at < markup.size(); ++at) {
    if (markup[at] != '<') continue;
    count_to(at);
    if (const auto aside = EndOfAside(markup, at)) {
      at = *aside;
    } else if (!markup.StartsAt(at, "</") && in_front-- == 0) {
      return line;
    } else {
      at = EndOfTag(markup, at).value_or(markup.size());
    }
  }
  return 0;
}

const std::string* XmlElement::Attribute(std::string_view wanted) const {
  for (const auto& [attribute, value] : attributes) {
    if (attribute == wanted) return &value;
  }
  return nullptr;
}

const XmlElement* XmlElement::Child(std::string_view wanted) const {
  const auto child = std::ranges::find_if(children, [wanted](const auto& c) { return c.name == wanted; });
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
