// Any text as definition, source or filter file; behind a zero byte, what a handset keeps as the value of what is
// defined. What was accepted must come out again in a form that is accepted, and values of every type that was defined
// must survive their way through decimal numbers.
#include <algorithm>
#include <cstdint>
#include <string>
#include <vector>

#include "fuzz/support.h"
#include "platform/xml_document.h"
#include "storage/nv/nv_definition_xml.h"
#include "storage/nv/nv_filter.h"
#include "storage/nv/nv_source.h"
#include "storage/nv/nv_value.h"

namespace {

using namespace kral;
using fuzz::Require;
using namespace kral::nv;

constexpr size_t kMostItems = 64;  // are looked at; some types are large

XmlElement Parsed(const std::string& text) {
  XmlElement root;
  std::string problem;
  Require(ParseXml({reinterpret_cast<const uint8_t*>(text.data()), text.size()}, root, problem) == XmlResult::kOk);
  return root;
}

void CheckValues(const NvItem& item, uint8_t fill) {
  const auto value = item.type->Cut(NvBytes(item.type->longest(), fill));
  if (!value) return;
  Require(item.type->Holds(*value));
  std::string problem;
  Require(item.type->FromText(item.type->ToText(*value), problem) == *value);
  const auto stored = ToStored(item, *value);
  if (!stored) return;
  NvItem copy = item;
  const auto back = FromStored(copy, *stored);
  // A numbered item of variable size fills its data field.
  Require(back.has_value() && back->size() >= value->size());
}

void CheckStored(NvItem item, std::span<const uint8_t> stored) {
  const auto value = FromStored(item, stored);
  if (!value) return;
  std::string problem;
  Require(item.type->Holds(*value) && item.type->FromText(item.type->ToText(*value), problem) == *value);
  std::string members;
  for (const auto& [name, text] : item.type->ToMembers(*value)) members += (members.empty() ? "" : ",") + text;
  Require(members == item.type->ToText(*value));
}

void FuzzDefinitions(const XmlElement& root, std::span<const uint8_t> stored) {
  NvDefinitionFile file;
  std::string problem;
  if (ReadDefinitions(root, NvDefinitionKind::kDefinitions, {}, file, problem) != NvError::kNone) return;
  std::string text = "<NvDefinition>";
  for (size_t i = 0; i < file.items.size() && i < kMostItems; ++i) {
    CheckValues(file.items[i], 0);
    CheckValues(file.items[i], 0xFF);
    CheckStored(file.items[i], stored);
    text += DefinitionText(file.items[i]);
  }
  NvDefinitionFile again;
  Require(ReadDefinitions(Parsed(text + "</NvDefinition>"), NvDefinitionKind::kDefinitions, {}, again, problem) ==
          NvError::kNone);
  for (size_t i = 0; i < again.items.size(); ++i) {
    Require(again.items[i].id == file.items[i].id);
    Require(again.items[i].type->longest() == file.items[i].type->longest());
  }
}

void FuzzSource(const XmlElement& root) {
  NvSource source;
  std::string problem;
  if (ReadSource(root, source, problem) != NvError::kNone) return;
  NvSource again;
  Require(ReadSource(Parsed(SourceText(source)), again, problem) == NvError::kNone);
  Require(again.items.size() == source.items.size());
  for (size_t i = 0; i < source.items.size(); ++i) {
    Require(again.items[i].id == source.items[i].id && again.items[i].slot == source.items[i].slot);
    Require(again.items[i].path == source.items[i].path && again.items[i].value == source.items[i].value);
  }
  Require(again.roaming_lists == source.roaming_lists);
}

void FuzzFilter(const XmlElement& root) {
  NvFilter filter;
  std::string problem;
  if (filter.Read(root, problem) != NvError::kNone) return;
  Require(!filter.is_empty());
  NvItem item;
  item.id = 453;
  item.name = "FTM_MODE";
  const bool passes = filter.Passes(item);
  Require(filter.Read(root, problem) == NvError::kNone &&
          filter.Passes(item) == passes);  // the same again adds nothing
  if (filter.Read(Parsed("<NvFilter><NV>453</NV></NvFilter>"), problem) == NvError::kNone) Require(filter.Passes(item));
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  const std::span input(data, size);
  const auto document = input.first(static_cast<size_t>(std::ranges::find(input, 0) - input.begin()));
  XmlElement root;
  std::string problem;
  if (ParseXml(document, root, problem) != XmlResult::kOk) return 0;
  FuzzDefinitions(root, input.subspan(std::min(document.size() + 1, size)));
  FuzzSource(root);
  FuzzFilter(root);
  return 0;
}
