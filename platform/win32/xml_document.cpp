// XML parsing on Windows, by MSXML 6.
#include "platform/xml_document.h"

#include <windows.h>
// Behind windows.h, whose types it needs.
#include <msxml2.h>
#include <oleauto.h>

#include <memory>
#include <utility>

#include "platform/win32/com_object.h"
#include "platform/win32/wide_text.h"

namespace kral {
namespace {

// IXMLDOMDocument2, for which MinGW's import libraries have no identifier.
constexpr IID kDocument2 = {0x2933BF95, 0x7B36, 0x11D2, {0xB2, 0x0E, 0x00, 0xC0, 0x4F, 0x98, 0x3E, 0x60}};

struct FreeString {
  void operator()(wchar_t* text) const { ::SysFreeString(text); }
};
using OwnedString = std::unique_ptr<wchar_t, FreeString>;

// COM on the calling thread for the time of one document; a host that has chosen its own model keeps it.
class ComOnThisThread {
 public:
  ComOnThisThread() : result_(::CoInitializeEx(nullptr, COINIT_MULTITHREADED)) {}
  ~ComOnThisThread() {
    if (SUCCEEDED(result_)) ::CoUninitialize();
  }
  ComOnThisThread(const ComOnThisThread&) = delete;
  ComOnThisThread& operator=(const ComOnThisThread&) = delete;

 private:
  HRESULT result_;
};

std::string ToUtf8(BSTR text) {
  return Utf8Text({text, ::SysStringLen(text)});
}

// Calls a getter of the object that hands out a string.
template <class Object>
std::string Get(Object* object, HRESULT (STDMETHODCALLTYPE Object::*getter)(BSTR*)) {
  BSTR text = nullptr;
  if (FAILED((object->*getter)(&text))) return {};
  return ToUtf8(OwnedString(text).get());
}

std::string NodeText(IXMLDOMNode* node) {
  VARIANT value;
  ::VariantInit(&value);
  std::string text;
  if (SUCCEEDED(node->get_nodeValue(&value)) && value.vt == VT_BSTR) text = ToUtf8(value.bstrVal);
  ::VariantClear(&value);
  return text;
}

void TakeAttributes(IXMLDOMNode* node, XmlElement& element) {
  IXMLDOMNamedNodeMap* found = nullptr;
  if (FAILED(node->get_attributes(&found)) || found == nullptr) return;
  const Owned<IXMLDOMNamedNodeMap> attributes(found);
  IXMLDOMNode* next = nullptr;
  while (attributes->nextNode(&next) == S_OK && next != nullptr) {
    const Owned<IXMLDOMNode> attribute(std::exchange(next, nullptr));
    element.attributes.emplace_back(Get(attribute.get(), &IXMLDOMNode::get_nodeName), NodeText(attribute.get()));
  }
}

// False when elements are nested too deeply.
bool TakeElement(IXMLDOMNode* node, XmlElement& element, size_t depth) {
  if (depth > kXmlDepthLimit) return false;
  element.name = Get(node, &IXMLDOMNode::get_nodeName);
  TakeAttributes(node, element);
  IXMLDOMNode* next = nullptr;
  node->get_firstChild(&next);
  while (next != nullptr) {
    const Owned<IXMLDOMNode> child(std::exchange(next, nullptr));
    DOMNodeType type = NODE_INVALID;
    child->get_nodeType(&type);
    if (type == NODE_ELEMENT && !TakeElement(child.get(), element.children.emplace_back(), depth + 1)) return false;
    if (type == NODE_TEXT || type == NODE_CDATA_SECTION) element.text += NodeText(child.get());
    child->get_nextSibling(&next);
  }
  return true;
}

Owned<IXMLDOMDocument2> MakeDocument() {
  CLSID id{};
  IXMLDOMDocument2* document = nullptr;
  if (FAILED(::CLSIDFromProgID(L"Msxml2.DOMDocument.6.0", &id))) return nullptr;
  if (FAILED(::CoCreateInstance(id, nullptr, CLSCTX_INPROC_SERVER, kDocument2, reinterpret_cast<void**>(&document))))
    return nullptr;
  document->put_async(VARIANT_FALSE);
  document->put_validateOnParse(VARIANT_FALSE);
  document->put_resolveExternals(VARIANT_FALSE);
  document->put_preserveWhiteSpace(VARIANT_TRUE);
  // Document type declarations are prohibited by default in version 6; said once more for those who changed it.
  VARIANT prohibit;
  ::VariantInit(&prohibit);
  prohibit.vt = VT_BOOL;
  prohibit.boolVal = VARIANT_TRUE;
  const OwnedString name(::SysAllocString(L"ProhibitDTD"));
  document->setProperty(name.get(), prohibit);
  return Owned<IXMLDOMDocument2>(document);
}

std::string ParseError(IXMLDOMDocument2* document) {
  IXMLDOMParseError* found = nullptr;
  if (FAILED(document->get_parseError(&found)) || found == nullptr) return "the document is not well-formed";
  const Owned<IXMLDOMParseError> error(found);
  LONG line = 0;
  error->get_line(&line);
  std::string text = "line " + std::to_string(line) + ": " + Get(error.get(), &IXMLDOMParseError::get_reason);
  while (!text.empty() && (text.back() == '\n' || text.back() == '\r')) text.pop_back();
  return text;
}

// The bytes as an array of the kind from which MSXML finds the encoding itself.
bool LoadBytes(IXMLDOMDocument2* document, std::span<const uint8_t> bytes) {
  SAFEARRAY* array = ::SafeArrayCreateVector(VT_UI1, 0, static_cast<ULONG>(bytes.size()));
  if (array == nullptr) return false;
  VARIANT source;
  ::VariantInit(&source);
  source.vt = VT_ARRAY | VT_UI1;
  source.parray = array;
  void* memory = nullptr;
  VARIANT_BOOL loaded = VARIANT_FALSE;
  if (SUCCEEDED(::SafeArrayAccessData(array, &memory))) {
    std::ranges::copy(bytes, static_cast<uint8_t*>(memory));
    ::SafeArrayUnaccessData(array);
    if (FAILED(document->load(source, &loaded))) loaded = VARIANT_FALSE;
  }
  ::VariantClear(&source);
  return loaded == VARIANT_TRUE;
}

// Some parsers take a declaration in spite of the property.
bool HasDocumentType(IXMLDOMDocument2* document) {
  IXMLDOMDocumentType* found = nullptr;
  if (FAILED(document->get_doctype(&found)) || found == nullptr) return false;
  found->Release();
  return true;
}

XmlResult Malformed(std::string& problem, std::string reason) {
  problem = std::move(reason);
  return XmlResult::kMalformed;
}

}  // namespace

XmlResult ParseXml(std::span<const uint8_t> document, XmlElement& root, std::string& problem) {
  if (document.empty()) return Malformed(problem, "the document is empty");
  if (document.size() > kXmlSizeLimit) return Malformed(problem, "the document is too large");
  if (!HasBoundedTags(document, problem)) return XmlResult::kMalformed;
  const ComOnThisThread com;
  const Owned<IXMLDOMDocument2> parsed = MakeDocument();
  if (!parsed) {
    problem = "MSXML 6 is not installed";
    return XmlResult::kNoParser;
  }
  if (!LoadBytes(parsed.get(), document)) return Malformed(problem, ParseError(parsed.get()));
  if (HasDocumentType(parsed.get())) return Malformed(problem, "document type declarations are not accepted");
  IXMLDOMElement* found = nullptr;
  if (FAILED(parsed->get_documentElement(&found)) || found == nullptr) return Malformed(problem, "no root element");
  const Owned<IXMLDOMElement> element(found);
  XmlElement tree;
  if (!TakeElement(element.get(), tree, 1)) return Malformed(problem, "elements nested too deeply");
  root = std::move(tree);
  return XmlResult::kOk;
}

}  // namespace kral
