// XML parsing on Linux, by libxml2's callbacks: no tree of its own is built.
#include "platform/xml_document.h"

#include <libxml/parser.h>
#include <libxml/parserInternals.h>

#include <exception>
#include <memory>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

namespace kral {
namespace {

std::string_view Text(const xmlChar* text) {
  return text != nullptr ? reinterpret_cast<const char*>(text) : std::string_view();
}

// Builds the tree node by node. Nothing is thrown through libxml2, which is C.
class Builder {
 public:
  explicit Builder(xmlParserCtxt* parser) : parser_(parser) {}

  bool stopped() const { return stopped_; }
  const std::string& fault() const { return fault_; }
  // What a callback could not let through.
  void ThrowAgain() const {
    if (thrown_) std::rethrow_exception(thrown_);
  }
  XmlElement TakeRoot() { return std::move(root_); }

  static xmlSAXHandler Callbacks() {
    xmlSAXHandler callbacks{};
    callbacks.initialized = XML_SAX2_MAGIC;
    callbacks.internalSubset = [](void* self, auto...) {
      static_cast<Builder*>(self)->Stop("document type declarations are not accepted");
    };
    callbacks.startElementNs = [](void* self, const xmlChar* name, const xmlChar* prefix, const xmlChar*, int spaces,
                                  const xmlChar** space, int attributes, int, const xmlChar** attribute) {
      static_cast<Builder*>(self)->Guarded([=](Builder& builder) {
        builder.Open(Name(prefix, name), {space, 2 * static_cast<size_t>(spaces)},
                     {attribute, 5 * static_cast<size_t>(attributes)});
      });
    };
    callbacks.endElementNs = [](void* self, const xmlChar*, const xmlChar*, const xmlChar*) {
      static_cast<Builder*>(self)->Close();
    };
    callbacks.characters = Characters;
    callbacks.ignorableWhitespace = Characters;
    callbacks.cdataBlock = Characters;
    callbacks.serror = [](void* self, xmlErrorPtr error) {
      static_cast<Builder*>(self)->Guarded([=](Builder& builder) { builder.KeepFirst(*error); });
    };
    return callbacks;
  }

 private:
  static void Characters(void* self, const xmlChar* text, int size) {
    static_cast<Builder*>(self)->Guarded([=](Builder& builder) {
      builder.Append({reinterpret_cast<const char*>(text), static_cast<size_t>(size)});
    });
  }

  // As written.
  static std::string Name(const xmlChar* prefix, const xmlChar* name) {
    if (prefix == nullptr) return std::string(Text(name));
    return std::string(Text(prefix)).append(":").append(Text(name));
  }

  template <class Step>
  void Guarded(Step step) {
    try {
      step(*this);
    } catch (const std::exception&) {
      thrown_ = std::current_exception();
      xmlStopParser(parser_);
    }
  }

  // `spaces`: of each namespace its prefix and what it stands for; `attributes`: of each its name, prefix, namespace,
  // and the value's begin and end.
  void Open(std::string name, std::span<const xmlChar*> spaces, std::span<const xmlChar*> attributes) {
    if (path_.size() >= kXmlDepthLimit) return Stop("elements nested too deeply");
    // Only the innermost open element grows, so the pointers to the others stay good.
    XmlElement& element = path_.empty() ? root_ : path_.back()->children.emplace_back();
    element.name = std::move(name);
    element.attributes.reserve(spaces.size() / 2 + attributes.size() / 5);
    for (; !spaces.empty(); spaces = spaces.subspan(2)) {
      const auto* const declared = reinterpret_cast<const xmlChar*>("xmlns");
      element.attributes.emplace_back(spaces[0] == nullptr ? Name(nullptr, declared) : Name(declared, spaces[0]),
                                      Text(spaces[1]));
    }
    for (; !attributes.empty(); attributes = attributes.subspan(5)) {
      const std::string_view value(reinterpret_cast<const char*>(attributes[3]),
                                   static_cast<size_t>(attributes[4] - attributes[3]));
      element.attributes.emplace_back(Name(attributes[1], attributes[0]), value);
    }
    path_.push_back(&element);
  }

  void Close() {
    if (!path_.empty()) path_.pop_back();
  }

  void Append(std::string_view text) {
    if (!path_.empty()) path_.back()->text += text;
  }

  void KeepFirst(const xmlError& error) {
    if (!fault_.empty() || error.message == nullptr || error.level < XML_ERR_ERROR) return;
    fault_ = "line " + std::to_string(error.line) + ": " + error.message;
    while (!fault_.empty() && fault_.back() == '\n') fault_.pop_back();
  }

  void Stop(const char* why) {
    stopped_ = true;
    fault_ = why;
    xmlStopParser(parser_);
  }

  xmlParserCtxt* const parser_;
  XmlElement root_;
  std::vector<XmlElement*> path_;
  std::string fault_;  // the first
  bool stopped_ = false;
  std::exception_ptr thrown_;
};

struct FreeParser {
  void operator()(xmlParserCtxt* parser) const { xmlFreeParserCtxt(parser); }
};

}  // namespace

XmlResult ParseXml(std::span<const uint8_t> document, XmlElement& root, std::string& problem) {
  if (document.size() > kXmlSizeLimit) {
    problem = "the document is too large";
    return XmlResult::kMalformed;
  }
  if (!HasBoundedTags(document, problem)) return XmlResult::kMalformed;
  if (document.empty()) {
    problem = "the document is empty";
    return XmlResult::kMalformed;
  }
  const std::unique_ptr<xmlParserCtxt, FreeParser> parser(
      xmlCreateMemoryParserCtxt(reinterpret_cast<const char*>(document.data()), static_cast<int>(document.size())));
  if (!parser) {
    problem = "the parser cannot be made";
    return XmlResult::kNoParser;
  }
  // Entities in attributes come as characters. There are none but &lt; and its like: declarations are not accepted.
  xmlCtxtUseOptions(parser.get(), XML_PARSE_NONET | XML_PARSE_NOENT);
  Builder builder(parser.get());
  *parser->sax = Builder::Callbacks();
  parser->userData = &builder;
  xmlParseDocument(parser.get());
  builder.ThrowAgain();
  if (parser->wellFormed != 1 || builder.stopped()) {
    problem = builder.fault().empty() ? "the document is not well-formed" : builder.fault();
    return XmlResult::kMalformed;
  }
  root = builder.TakeRoot();
  return XmlResult::kOk;
}

}  // namespace kral
