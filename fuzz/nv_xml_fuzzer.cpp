// Any text as definition, source or filter file. What was accepted must come out again in a form that is accepted, and
// values of every type that was defined must survive their way through decimal numbers.
#include <cstdint>
#include <cstdlib>
#include <string>
#include <vector>

#include "platform/xml_document.h"
#include "storage/nv/nv_definition_xml.h"
#include "storage/nv/nv_filter.h"
#include "storage/nv/nv_source.h"
#include "storage/nv/nv_value.h"

namespace {

using namespace kral;
using namespace kral::nv;

constexpr size_t kMostItems = 64;  // are looked at; some types are large

void Check(bool condition) {
  if (!condition) std::abort();
}

XmlElement Parsed(const std::string& text) {
  XmlElement root;
  std::string problem;
  Check(ParseXml({reinterpret_cast<const uint8_t*>(text.data()), text.size()}, root, problem) == XmlResult::kOk);
  return root;
}

void CheckValues(const NvItem& item, uint8_t fill) {
  const auto value = item.type->Cut(NvBytes(item.type->longest(), fill));
  if (!value) return;
  Check(item.type->Holds(*value));
  std::string problem;
  Check(item.type->FromText(item.type->ToText(*value), problem) == *value);
  const auto stored = ToStored(item, *value);
  if (!stored) return;
  NvItem copy = item;
  const auto back = FromStored(copy, *stored);
  // A numbered item of variable size fills its data field.
  Check(back.has_value() && back->size() >= value->size());
}

void FuzzDefinitions(const XmlElement& root) {
  NvDefinitionFile file;
  std::string problem;
  if (ReadDefinitions(root, NvDefinitionKind::kDefinitions, {}, file, problem) != NvError::kNone) return;
  std::string text = "<NvDefinition>";
  for (size_t i = 0; i < file.items.size() && i < kMostItems; ++i) {
    CheckValues(file.items[i], 0);
    CheckValues(file.items[i], 0xFF);
    text += DefinitionText(file.items[i]);
  }
  NvDefinitionFile again;
  Check(ReadDefinitions(Parsed(text + "</NvDefinition>"), NvDefinitionKind::kDefinitions, {}, again, problem) ==
        NvError::kNone);
  for (size_t i = 0; i < again.items.size(); ++i) {
    Check(again.items[i].id == file.items[i].id);
    Check(again.items[i].type->longest() == file.items[i].type->longest());
  }
}

void FuzzSource(const XmlElement& root) {
  NvSource source;
  std::string problem;
  if (ReadSource(root, source, problem) != NvError::kNone) return;
  NvSource again;
  Check(ReadSource(Parsed(SourceText(source)), again, problem) == NvError::kNone);
  Check(again.items.size() == source.items.size());
  for (size_t i = 0; i < source.items.size(); ++i) {
    Check(again.items[i].id == source.items[i].id && again.items[i].slot == source.items[i].slot);
    Check(again.items[i].path == source.items[i].path && again.items[i].value == source.items[i].value);
  }
  Check(again.roaming_lists == source.roaming_lists);
}

void FuzzFilter(const XmlElement& root) {
  NvFilter filter;
  std::string problem;
  if (filter.Read(root, problem) != NvError::kNone) return;
  Check(!filter.is_empty());
  NvItem item;
  item.id = 453;
  item.name = "FTM_MODE";
  const bool passes = filter.Passes(item);
  Check(filter.Read(root, problem) == NvError::kNone && filter.Passes(item) == passes);  // the same again adds nothing
  if (filter.Read(Parsed("<NvFilter><NV>453</NV></NvFilter>"), problem) == NvError::kNone) Check(filter.Passes(item));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  XmlElement root;
  std::string problem;
  if (ParseXml({data, size}, root, problem) != XmlResult::kOk) return 0;
  FuzzDefinitions(root);
  FuzzSource(root);
  FuzzFilter(root);
  return 0;
}
