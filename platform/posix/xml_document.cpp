// XML parsing on Linux, by libxml2's pull reader: no tree of its own is built.
#include "platform/xml_document.h"

#include <libxml/xmlreader.h>

#include <memory>
#include <utility>

namespace kral {
namespace {

struct FreeReader {
  void operator()(xmlTextReader* reader) const { xmlFreeTextReader(reader); }
};

std::string_view Text(const xmlChar* text) {
  return text != nullptr ? reinterpret_cast<const char*>(text) : std::string_view();
}

void KeepFirst(void* argument, xmlErrorPtr error) {
  auto& problem = *static_cast<std::string*>(argument);
  if (!problem.empty() || error->message == nullptr) return;
  problem = "line " + std::to_string(error->line) + ": " + error->message;
  while (!problem.empty() && problem.back() == '\n') problem.pop_back();
}

void TakeAttributes(xmlTextReader* reader, XmlElement& element) {
  while (xmlTextReaderMoveToNextAttribute(reader) == 1) {
    element.attributes.emplace_back(Text(xmlTextReaderConstName(reader)), Text(xmlTextReaderConstValue(reader)));
  }
  xmlTextReaderMoveToElement(reader);
}

// Builds the tree node by node; gives the reason why it had to stop, or an empty text.
class Builder {
 public:
  std::string Take(xmlTextReader* reader) {
    switch (xmlTextReaderNodeType(reader)) {
      case XML_READER_TYPE_DOCUMENT_TYPE:
        return "document type declarations are not accepted";
      case XML_READER_TYPE_ELEMENT:
        return Open(reader);
      case XML_READER_TYPE_END_ELEMENT:
        if (!path_.empty()) path_.pop_back();
        return {};
      case XML_READER_TYPE_TEXT:
      case XML_READER_TYPE_CDATA:
      case XML_READER_TYPE_SIGNIFICANT_WHITESPACE:
        if (!path_.empty()) path_.back()->text += Text(xmlTextReaderConstValue(reader));
        return {};
      default:
        return {};
    }
  }

  XmlElement TakeRoot() { return std::move(root_); }

 private:
  std::string Open(xmlTextReader* reader) {
    if (path_.size() >= kXmlDepthLimit) return "elements nested too deeply";
    // Only the innermost open element grows, so the pointers to the others stay good.
    XmlElement& element = path_.empty() ? root_ : path_.back()->children.emplace_back();
    const bool empty = xmlTextReaderIsEmptyElement(reader) == 1;
    element.name = Text(xmlTextReaderConstName(reader));
    TakeAttributes(reader, element);
    if (!empty) path_.push_back(&element);
    return {};
  }

  XmlElement root_;
  std::vector<XmlElement*> path_;
};

}  // namespace

XmlResult ParseXml(std::span<const uint8_t> document, XmlElement& root, std::string& problem) {
  if (document.size() > kXmlSizeLimit) {
    problem = "the document is too large";
    return XmlResult::kMalformed;
  }
  if (!HasBoundedTags(document, problem)) return XmlResult::kMalformed;
  const std::unique_ptr<xmlTextReader, FreeReader> reader(
      xmlReaderForMemory(reinterpret_cast<const char*>(document.data()), static_cast<int>(document.size()), nullptr,
                         nullptr, XML_PARSE_NONET | XML_PARSE_NOCDATA));
  if (!reader) {
    problem = "the parser cannot be made";
    return XmlResult::kNoParser;
  }
  std::string errors;
  xmlTextReaderSetStructuredErrorHandler(reader.get(), KeepFirst, &errors);
  Builder builder;
  int more = xmlTextReaderRead(reader.get());
  for (; more == 1; more = xmlTextReaderRead(reader.get())) {
    if (std::string stopped = builder.Take(reader.get()); !stopped.empty()) {
      problem = std::move(stopped);
      return XmlResult::kMalformed;
    }
  }
  if (more != 0) {
    problem = errors.empty() ? "the document is not well-formed" : errors;
    return XmlResult::kMalformed;
  }
  root = builder.TakeRoot();
  return XmlResult::kOk;
}

}  // namespace kral
