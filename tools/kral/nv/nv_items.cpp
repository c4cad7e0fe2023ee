// Loads definitions, finds, reads and writes items. How they are shown is in nv_item_output.cpp.
#include "tools/kral/nv/nv_items.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <string_view>

#include "platform/xml_document.h"
#include "tools/kral/call_failure.h"
#include "tools/kral/format.h"
#include "tools/kral/hex_bytes.h"
#include "tools/kral/output.h"

namespace kral::tool {
namespace {

std::optional<std::uint16_t> ParseId(std::string_view text) {
  std::uint16_t id = 0;
  const auto [end, error] = std::from_chars(text.data(), text.data() + text.size(), id);
  if (error != std::errc() || end != text.data() + text.size()) return std::nullopt;
  return id;
}

std::string Attribute(const XmlElement& element, std::string_view name) {
  const std::string* text = element.Attribute(name);
  return text == nullptr ? std::string() : *text;
}

std::size_t Number(const XmlElement& element, std::string_view name, std::size_t fallback) {
  const std::string text = Attribute(element, name);
  std::size_t value = fallback;
  std::from_chars(text.data(), text.data() + text.size(), value);
  return value;
}

// Names and paths; these are the same with and without a slash in front.
std::string KeyOf(std::string_view text) {
  return std::string(text.substr(text.starts_with('/') ? 1 : 0));
}

// RF NV items are files that have an id, too, in eight digits.
std::optional<std::uint16_t> RfIdOf(std::string_view path) {
  constexpr std::string_view kFolder = "nv/item_files/rfnv/";
  if (path.starts_with('/')) path.remove_prefix(1);
  if (!path.starts_with(kFolder) || path.size() != kFolder.size() + 8) return std::nullopt;
  return ParseId(path.substr(kFolder.size()));
}

NvItem ItemOf(const XmlElement& element) {
  NvItem item;
  item.path = Attribute(element, "fullpathname");
  item.id = item.path.empty() ? ParseId(Attribute(element, "id")) : RfIdOf(item.path);
  item.name = Attribute(element, "name");
  item.max_index = static_cast<std::uint16_t>(Number(element, "maxIndex", 0));
  for (const XmlElement& type : element.children) {
    NvForm form{Attribute(type, "variantType"), {}};
    for (const XmlElement& member : type.children) {
      const bool is_signed = !Attribute(member, "signed").empty();
      form.members.push_back({Attribute(member, "name"), (is_signed ? "signed " : "") + Attribute(member, "typeid"),
                              Number(member, "num_of_element", 1)});
    }
    item.forms.push_back(std::move(form));
  }
  return item;
}

// Fills a text of the library that tells its length beforehand.
template <class AskLength, class Ask>
std::optional<std::string> TextOf(AskLength&& ask_length, Ask&& ask) {
  std::uint32_t length = 0;
  if (ask_length(&length) != 0) return std::nullopt;
  std::string text(length, '\0');
  if (ask(text.data(), length) != 0) return std::nullopt;
  text.resize(length - 1);
  return text;
}

std::vector<std::string> Split(const std::string& numbers) {
  std::vector<std::string> parts;
  for (std::size_t begin = 0; begin < numbers.size();) {
    const std::size_t end = std::min(numbers.find(',', begin), numbers.size());
    parts.push_back(numbers.substr(begin, end - begin));
    begin = end + 1;
  }
  return parts;
}

NvReading::Kind KindOf(std::uint16_t failure) {
  return failure == KRAL_NV_STATUS_NEVER_WRITTEN || failure == KRAL_NV_STATUS_UNKNOWN_ITEM ? NvReading::Kind::kNoValue
                                                                                           : NvReading::Kind::kRefused;
}

std::string WordsOf(const NvItem& item) {
  return item.path.empty() ? Format("NV item {}", *item.id) : item.path;
}

ExitCode ExitOf(std::uint32_t code) {
  switch (code) {
    case KRAL_NV_ERROR_INDEX_OUT_OF_BOUND:
    case KRAL_NV_ERROR_NOT_DEFINED:
    case KRAL_NV_ERROR_CANNOT_SET_VALUE:
      return ExitCode::kUsage;
    case KRAL_NV_ERROR_NO_VALUE:
    case KRAL_NV_ERROR_CANNOT_GET_VALUE:
    case KRAL_NV_ERROR_CANNOT_READ_FILE_ITEM:
    case KRAL_NV_ERROR_CANNOT_WRITE_FILE_ITEM:
      return ExitCode::kRefused;
    case KRAL_NV_ERROR_NO_XML_PARSER:
    case KRAL_NV_ERROR_UNKNOWN:
      return ExitCode::kInternal;
    default:
      return ExitCode::kBadFile;
  }
}

}  // namespace

std::string DescribeNvStatus(std::uint16_t status) {
  switch (status) {
    case KRAL_NV_STATUS_NEVER_WRITTEN:
      return "5, never written";
    case KRAL_NV_STATUS_UNKNOWN_ITEM:
      return "6, unknown to the handset";
    case KRAL_NV_STATUS_READ_ONLY:
      return "7, read-only";
    default:
      return std::to_string(status);
  }
}

std::string DescribeReading(const NvItem& item, const NvReading& reading) {
  if (!item.path.empty()) return reading.kind == NvReading::Kind::kNoValue ? "there is no such file" : "refused";
  // Refused as a whole, an answer has no status.
  return reading.status == 0 ? "refused" : "status " + DescribeNvStatus(reading.status);
}

std::string NvItem::Title() const {
  const std::string which = path.empty() ? std::to_string(id.value_or(0)) : path;
  return name.empty() ? which : which + " " + Printable(name);
}

NvItems::NvItems(Session& session, const NvOptions& options) : session_(session), options_(options) {
  for (const std::string& file : options.dictionaries) LoadFile(file, true);
  for (const std::string& file : options.definitions) LoadFile(file, false);
  ListItems();
  if (!options.subscription) return;
  Check(KRAL_NV_SetTargetSupportMultiSIM(session.handle(), 1), "the choice of the subscription");
  Check(KRAL_NV_SetCurrentSubscriptionIndex(session.handle(), *options.subscription), "the choice of the subscription");
}

void NvItems::LoadFile(const std::string& file, bool dictionary) {
  session_.Begin();
  const std::uint32_t code = dictionary ? KRAL_NV_LoadNVDataTypeDictinary(session_.handle(), file.c_str())
                                        : KRAL_NV_LoadNVDefinitionFile(session_.handle(), file.c_str());
  Check(code, file, KRAL_NV_ERROR_REDEFINED);
}

void NvItems::ListItems() {
  std::uint32_t numbered = 0;
  std::uint32_t files = 0;
  KRAL_NV_GetNumOfNVDefinition(session_.handle(), &numbered);
  KRAL_NV_GetNumOfNVEfsDefinition(session_.handle(), &files);
  for (std::uint32_t i = 0; i < numbered + files; ++i) {
    const auto text = TextOf(
        [&](std::uint32_t* length) { return KRAL_NV_GetNVDefinitionByIndexStringLength(session_.handle(), i, length); },
        [&](char* buffer, std::uint32_t size) {
          return KRAL_NV_GetNVDefinitionByIndex(session_.handle(), i, buffer, size);
        });
    XmlElement element;
    std::string problem;
    if (!text) continue;
    const std::vector<std::uint8_t> bytes(text->begin(), text->end());
    if (ParseXml(bytes, element, problem) != XmlResult::kOk) continue;
    items_.push_back(ItemOf(element));
    const NvItem& item = items_.back();
    // Numbered items come before the files that have an id, too, and go before them.
    if (item.id) by_id_.try_emplace(*item.id, items_.size() - 1);
    if (!item.path.empty()) by_text_.try_emplace(KeyOf(item.path), items_.size() - 1);
    if (!item.name.empty()) by_text_.try_emplace(KeyOf(item.name), items_.size() - 1);
  }
}

NvItem NvItems::Find(std::uint16_t id) const {
  if (const auto found = by_id_.find(id); found != by_id_.end()) return items_[found->second];
  NvItem item;
  item.defined = false;
  item.id = id;
  return item;
}

NvItem NvItems::Find(const std::string& which) const {
  if (const auto id = ParseId(which)) return Find(*id);
  if (const auto found = by_text_.find(KeyOf(which)); found != by_text_.end()) return items_[found->second];
  if (which.find('/') == std::string::npos) {
    throw ToolError(ExitCode::kUsage, Format("there is no item {}", which),
                    "give an NV id, a path of the handset, or the name of an item in a file given by --defs");
  }
  NvItem item;
  item.defined = false;
  item.path = which;
  return item;
}

void NvItems::Check(std::uint32_t code, const std::string& what, std::uint32_t allowed) const {
  if (code == 0 || code == allowed) return;
  const auto record = LastError(session_.handle());
  if (code == KRAL_NV_ERROR_NO_CONNECTION) throw session_.Explain(what);
  constexpr const char* kHint = "--log FILE tells every item; docs/nv.md describes the files";
  if (record && record->code != KRAL_ERROR_INTERNAL) {
    const ToolError error = ExplainRecord(*record, what, session_.port(), kHint);
    const bool names_it =
        record->code == KRAL_ERROR_BAD_FILE || std::string_view(error.what()).find(what) != std::string_view::npos;
    if (names_it) throw error;
    throw ToolError(error.code(), Format("{}: {}", what, error.what()), kHint, record);
  }
  std::array<char, 128> text{};
  KRAL_NV_GetErrorText(0, code, text.data(), static_cast<std::uint32_t>(text.size()));
  throw ToolError(ExitOf(code), Format("{}: {}", what, text.data()), kHint, record);
}

NvReading NvItems::Read(const NvItem& item) {
  session_.Begin();
  if (!item.path.empty()) return ReadFile(item);
  return item.defined ? ReadDefined(item) : ReadBytes(item);
}

NvReading NvItems::ReadFile(const NvItem& item) {
  const std::uint32_t code = KRAL_NV_ReadNVItemFromMobileByEfsFilename(session_.handle(), item.path.c_str());
  Check(code, item.path, KRAL_NV_ERROR_CANNOT_READ_FILE_ITEM);
  NvReading reading;
  if (code != 0) {
    const bool is_missing = IsNoSuchFile(LastError(session_.handle()));
    reading.kind = is_missing ? NvReading::Kind::kNoValue : NvReading::Kind::kRefused;
  } else {
    reading.elements = Elements(item);
  }
  return reading;
}

NvReading NvItems::ReadDefined(const NvItem& item) {
  NvReading reading;
  const std::uint32_t code = KRAL_NV_ReadNVItemFromMobileByNVID(session_.handle(), *item.id, &reading.status);
  Check(code, Format("NV item {}", *item.id), KRAL_NV_ERROR_CANNOT_GET_VALUE);
  if (code != 0) {
    reading.kind = KindOf(reading.status);
  } else {
    reading.elements = Elements(item);
  }
  return reading;
}

NvReading NvItems::ReadBytes(const NvItem& item) {
  const std::string what = Format("NV item {}", *item.id);
  const KRAL_HANDLE handle = session_.handle();
  NvReading reading;
  reading.bytes.assign(KRAL_NV_DATA_SIZE, 0);
  const bool answered =
      (options_.subscription
           ? KRAL_DIAG_NV_READ_EXT_F(handle, *item.id, reading.bytes.data(), *options_.subscription, KRAL_NV_DATA_SIZE,
                                     &reading.status)
           : KRAL_DIAG_NV_READ_F(handle, *item.id, reading.bytes.data(), KRAL_NV_DATA_SIZE, &reading.status)) != 0;
  if (!answered) {
    const ToolError error = session_.Explain(what);
    if (error.code() != ExitCode::kRefused) throw error;
    reading.kind = NvReading::Kind::kRefused;
    return reading;
  }
  // The library looks for an id that the handset does not have among the files, too: it is asked for those only that
  // are there. What it has read then is what is shown.
  if (reading.status == KRAL_NV_STATUS_DONE && keeps_undefined_) {
    const std::uint32_t code = KRAL_NV_ReadNVItemFromMobileByNVID(handle, *item.id, &reading.status);
    Check(code, what, KRAL_NV_ERROR_CANNOT_GET_VALUE);
    if (code != 0) {
      reading.kind = KindOf(reading.status);
      return reading;
    }
    std::uint32_t size = KRAL_NV_DATA_SIZE;
    Check(KRAL_NV_GetNVValueByteStreamByNVID(handle, *item.id, 0, reading.bytes.data(), &size), what);
  }
  if (reading.status != KRAL_NV_STATUS_DONE) reading.kind = KindOf(reading.status);
  return reading;
}

std::vector<std::uint8_t> NvItems::Set(const NvItem& item, std::uint16_t array_index, const std::string& value) const {
  const std::string what = WordsOf(item);
  if (item.defined) {
    Check(item.path.empty()
              ? KRAL_NV_SetNVValueStringByNVID(session_.handle(), *item.id, array_index, value.c_str())
              : KRAL_NV_SetNVValueStringByEfsFilename(session_.handle(), item.path.c_str(), value.c_str()),
          what);
    return {};
  }
  if (!item.path.empty()) {
    throw ToolError(ExitCode::kUsage, Format("{} is not defined", item.path),
                    "give its definition by --defs, or write the file with kral fs put");
  }
  auto bytes = ParseHex({value});
  if (bytes.size() <= KRAL_NV_DATA_SIZE) return bytes;
  throw ToolError(ExitCode::kUsage, Format("{} bytes are too many for {}", bytes.size(), what),
                  "an item has 128 bytes at most");
}

void NvItems::Write(const NvItem& item, std::uint16_t array_index, const std::string& value) {
  session_.Begin();
  std::uint16_t status = 0;
  const std::string what = WordsOf(item);
  const auto bytes = Set(item, array_index, value);
  if (item.defined && item.path.empty()) {
    const std::uint32_t code = KRAL_NV_WriteNVItemToMobileByNVID(session_.handle(), *item.id, &status);
    if (status == 0) return Check(code, what);
  } else if (item.defined) {
    return Check(KRAL_NV_WriteNVItemToMobileByEfsFilename(session_.handle(), item.path.c_str()), what);
  } else {
    const auto size = static_cast<std::uint16_t>(bytes.size());
    session_.Run(what, [&] {
      return options_.subscription ? KRAL_DIAG_NV_WRITE_EXT_F(session_.handle(), *item.id, bytes.data(),
                                                              *options_.subscription, size, &status)
                                   : KRAL_DIAG_NV_WRITE_F(session_.handle(), *item.id, bytes.data(), size, &status);
    });
  }
  if (status == KRAL_NV_STATUS_DONE) return;
  KRAL_ERROR record{};
  record.code = KRAL_ERROR_REFUSED;
  record.status_kind = KRAL_ERROR_STATUS_NV;
  record.status = status;
  throw ToolError(ExitCode::kRefused, Format("the handset refused {}: status {}", what, DescribeNvStatus(status)),
                  "the item may be read-only or the handset may need an unlock", record);
}

std::optional<std::string> NvItems::Value(const NvItem& item, std::uint16_t array_index) const {
  const KRAL_HANDLE handle = session_.handle();
  if (!item.path.empty()) {
    return TextOf(
        [&](std::uint32_t* length) {
          return KRAL_NV_GetNVValueStringByEfsFilenameStringLength(handle, item.path.c_str(), length);
        },
        [&](char* text, std::uint32_t size) {
          return KRAL_NV_GetNVValueStringByEfsFilename(handle, item.path.c_str(), text, size);
        });
  }
  return TextOf(
      [&](std::uint32_t* length) {
        return KRAL_NV_GetNVValueStringByNVIDStringLength(handle, *item.id, array_index, length);
      },
      [&](char* text, std::uint32_t size) {
        return KRAL_NV_GetNVValueStringByNVID(handle, *item.id, array_index, text, size);
      });
}

std::vector<NvElement> NvItems::Elements(const NvItem& item) const {
  std::vector<NvElement> elements;
  for (std::uint32_t index = 0; index <= item.max_index; ++index) {
    const auto element = static_cast<std::uint16_t>(index);
    if (const auto value = Value(item, element)) elements.push_back({element, Split(*value)});
  }
  return elements;
}

}  // namespace kral::tool
