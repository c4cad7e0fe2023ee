// Loads definitions, reads and writes items, and names the numbers of their values.
#include "tools/kral/nv_items.h"

#include <fmt/format.h>

#include <algorithm>
#include <array>
#include <charconv>

#include "platform/xml_document.h"
#include "tools/kral/error_lines.h"
#include "tools/kral/hex_bytes.h"

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

// RF NV items are files that have an id, too, in eight digits.
std::optional<std::uint16_t> RfIdOf(std::string_view path) {
  constexpr std::string_view kFolder = "/nv/item_files/rfnv/";
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

// JSON numbers beyond what a double holds exactly stay exact here: the library's words have up to 64 bits.
Json JsonNumber(const std::string& text) {
  if (text.starts_with('-')) {
    std::int64_t value = 0;
    std::from_chars(text.data(), text.data() + text.size(), value);
    return value;
  }
  std::uint64_t value = 0;
  std::from_chars(text.data(), text.data() + text.size(), value);
  return value;
}

struct NamedNumbers {
  std::string name;
  bool is_list;
  std::vector<std::string> numbers;
};

std::vector<NamedNumbers> Named(const NvItem& item, const std::vector<std::string>& numbers) {
  const NvForm* form = nullptr;
  for (const NvForm& candidate : item.forms) {
    const bool fits = candidate.selector.empty() || (!numbers.empty() && candidate.selector == numbers[0]);
    if (fits && (form == nullptr || form->selector.empty())) form = &candidate;
  }
  std::vector<NamedNumbers> named;
  if (form == nullptr) return named;
  std::size_t next = 0;
  for (const NvMember& member : form->members) {
    const std::size_t count = std::min(member.count, numbers.size() - next);
    const auto first = numbers.begin() + static_cast<std::ptrdiff_t>(next);
    named.push_back({member.name, member.count > 1, {first, first + static_cast<std::ptrdiff_t>(count)}});
    next += count;
  }
  return named;
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
    case 5:
      return "5, never written";
    case KRAL_NV_STATUS_READ_ONLY:
      return "7, read-only";
    default:
      return fmt::to_string(status);
  }
}

std::string NvItem::Title() const {
  const std::string which = path.empty() ? fmt::to_string(id.value_or(0)) : path;
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
    if (ParseXml(bytes, element, problem) == XmlResult::kOk) items_.push_back(ItemOf(element));
  }
}

NvItem NvItems::Find(const std::string& which) const {
  const auto id = ParseId(which);
  const auto found = std::find_if(items_.begin(), items_.end(), [&](const NvItem& item) {
    return item.name == which || item.path == which || (id && item.id == id);
  });
  if (found != items_.end()) return *found;
  NvItem item;
  item.defined = false;
  item.id = id;
  if (id) return item;
  if (which.find('/') == std::string::npos) {
    throw ToolError(ExitCode::kUsage, fmt::format("there is no item {}", which),
                    "give an NV id, a path of the handset, or the name of an item in a file given by --defs");
  }
  item.path = which;
  return item;
}

void NvItems::Check(std::uint32_t code, const std::string& what, std::uint32_t allowed) const {
  if (code == 0 || code == allowed) return;
  if (code == KRAL_NV_ERROR_NO_CONNECTION) throw session_.Explain(what);
  std::array<char, 128> text{};
  KRAL_NV_GetErrorText(0, code, text.data(), static_cast<std::uint32_t>(text.size()));
  const auto lines = ErrorLines();
  const std::string detail = lines.empty() ? "" : Printable(lines.back());
  throw ToolError(ExitOf(code), fmt::format("{}: {}{}", what, text.data(), detail.empty() ? "" : " - " + detail),
                  "--log FILE tells every item; docs/nv.md describes the files");
}

bool NvItems::Read(const NvItem& item, std::uint16_t& status) {
  session_.Begin();
  status = 0;
  if (!item.path.empty()) {
    const std::uint32_t code = KRAL_NV_ReadNVItemFromMobileByEfsFilename(session_.handle(), item.path.c_str());
    Check(code, item.path, KRAL_NV_ERROR_CANNOT_READ_FILE_ITEM);
    return code == 0;
  }
  if (item.defined) {
    const std::uint32_t code = KRAL_NV_ReadNVItemFromMobileByNVID(session_.handle(), *item.id, &status);
    Check(code, fmt::format("NV item {}", *item.id), KRAL_NV_ERROR_CANNOT_GET_VALUE);
    return code == 0;
  }
  bytes_.assign(KRAL_NV_DATA_SIZE, 0);
  session_.Run(fmt::format("NV item {}", *item.id), [&] {
    return options_.subscription
               ? KRAL_DIAG_NV_READ_EXT_F(session_.handle(), *item.id, bytes_.data(), *options_.subscription,
                                         KRAL_NV_DATA_SIZE, &status)
               : KRAL_DIAG_NV_READ_F(session_.handle(), *item.id, bytes_.data(), KRAL_NV_DATA_SIZE, &status);
  });
  return status == KRAL_NV_STATUS_DONE;
}

void NvItems::Write(const NvItem& item, std::uint16_t array_index, const std::string& value) {
  session_.Begin();
  std::uint16_t status = 0;
  const std::string what = item.path.empty() ? fmt::format("NV item {}", *item.id) : item.path;
  if (item.defined && item.path.empty()) {
    Check(KRAL_NV_SetNVValueStringByNVID(session_.handle(), *item.id, array_index, value.c_str()), what);
    const std::uint32_t code = KRAL_NV_WriteNVItemToMobileByNVID(session_.handle(), *item.id, &status);
    if (status == 0) return Check(code, what);
  } else if (item.defined) {
    Check(KRAL_NV_SetNVValueStringByEfsFilename(session_.handle(), item.path.c_str(), value.c_str()), what);
    return Check(KRAL_NV_WriteNVItemToMobileByEfsFilename(session_.handle(), item.path.c_str()), what);
  } else if (!item.path.empty()) {
    throw ToolError(ExitCode::kUsage, fmt::format("{} is not defined", item.path),
                    "give its definition by --defs, or write the file with kral fs put");
  } else {
    const auto bytes = ParseHex({value});
    if (bytes.size() > KRAL_NV_DATA_SIZE) {
      throw ToolError(ExitCode::kUsage, fmt::format("{} bytes are too many for {}", bytes.size(), what),
                      "an item has 128 bytes at most");
    }
    const auto size = static_cast<std::uint16_t>(bytes.size());
    session_.Run(what, [&] {
      return options_.subscription ? KRAL_DIAG_NV_WRITE_EXT_F(session_.handle(), *item.id, bytes.data(),
                                                              *options_.subscription, size, &status)
                                   : KRAL_DIAG_NV_WRITE_F(session_.handle(), *item.id, bytes.data(), size, &status);
    });
  }
  if (status == KRAL_NV_STATUS_DONE) return;
  throw ToolError(ExitCode::kRefused, fmt::format("the handset refused {}: status {}", what, DescribeNvStatus(status)),
                  "the item may be read-only or the handset may need an unlock");
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

Json NvItems::ToJson(const NvItem& item) const {
  Json json = Json::object();
  if (item.id) json["id"] = *item.id;
  if (!item.path.empty()) json["path"] = Printable(item.path);
  if (!item.name.empty()) json["name"] = item.name;
  if (!item.defined && item.path.empty()) {
    json["bytes"] = HexText(bytes_);
    return json;
  }
  Json elements = Json::array();
  for (std::uint32_t index = 0; index <= item.max_index; ++index) {
    const auto value = Value(item, static_cast<std::uint16_t>(index));
    if (!value) continue;
    Json members = Json::object();
    Json numbers = Json::array();
    for (const auto& number : Split(*value)) numbers.push_back(JsonNumber(number));
    for (const auto& member : Named(item, Split(*value))) {
      Json list = Json::array();
      for (const auto& number : member.numbers) list.push_back(JsonNumber(number));
      members[member.name] = member.is_list || list.empty() ? list : list[0];
    }
    Json element = {{"index", index}, {"value", item.defined ? members : numbers}};
    elements.push_back(std::move(element));
  }
  if (item.max_index > 0) {
    json["elements"] = elements;
  } else {
    json["value"] = elements.empty() ? Json() : elements[0]["value"];
  }
  return json;
}

std::string NvItems::ToText(const NvItem& item) const {
  std::string text = item.Title() + "\n";
  if (!item.defined && item.path.empty()) return text + HexDump(bytes_);
  for (std::uint32_t index = 0; index <= item.max_index; ++index) {
    const auto value = Value(item, static_cast<std::uint16_t>(index));
    if (!value) continue;
    const std::string element = item.max_index > 0 ? fmt::format("[{}] ", index) : "";
    if (!item.defined) text += fmt::format("  {}{}\n", element, *value);
    for (const auto& member : Named(item, Split(*value))) {
      text += fmt::format("  {}{:<24} {}\n", element, member.name, fmt::join(member.numbers, " "));
    }
  }
  return text;
}

}  // namespace kral::tool
