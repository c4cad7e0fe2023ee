// Reads definition files into items and data types. A file that contradicts itself is refused as a whole.
#include "storage/nv/nv_definition_xml.h"

#include <algorithm>
#include <array>
#include <optional>
#include <set>
#include <span>
#include <unordered_map>
#include <utility>

#include "base/xml_attributes.h"
#include "commands/ftm/rf_nv.h"
#include "commands/nv/nv_item.h"

namespace kral::nv {
namespace {

// Data types within data types multiply, and so do the names of their members: what they come to in one file is
// limited.
constexpr size_t kMostMembers = size_t{1} << 20;
constexpr size_t kLongestMemberName = 255;
constexpr size_t kMostNameBytes = size_t{32} << 20;
constexpr size_t kLongestPath = 1024;
constexpr size_t kMostForms = 256;

std::optional<uint8_t> WidthOf(std::string_view type) {
  constexpr std::array<std::pair<std::string_view, uint8_t>, 4> kWords = {
      {{"word8", 1}, {"word16", 2}, {"word32", 4}, {"word64", 8}}};
  for (const auto& [name, width] : kWords) {
    if (name == type) return width;
  }
  return std::nullopt;
}

class Reader {
 public:
  Reader(const NvDefinitions& known, NvDefinitionFile& file) : known_(known), file_(file) {}

  void Read(const XmlElement& root, NvDefinitionKind kind) {
    const bool items_allowed = kind == NvDefinitionKind::kDefinitions;
    if (root.name != (items_allowed ? "NvDefinition" : "NvDataTypeDictionary")) {
      throw BadXml("the root element is <" + root.name + ">");
    }
    for (size_t i = 0; i < root.children.size(); ++i) {
      const XmlElement& element = root.children[i];
      if (element.name == "DataType") {
        i += ReadSharedType(std::span(root.children).subspan(i)) - 1;
      } else if (items_allowed && (element.name == "NvItem" || element.name == "NvEfsItem")) {
        file_.items.push_back(ReadItem(element));
      } else {
        throw BadXml("<" + element.name + "> is not expected in <" + root.name + ">");
      }
    }
  }

 private:
  // --- Data types ----------------------------------------------------------------------------------------------------

  NvTypePtr FindType(const std::string& name) const {
    const auto own = own_types_.find(name);
    return own == own_types_.end() ? known_.FindType(name) : own->second;
  }

  // Elements of one name that follow each other are the forms of one type. Gives how many there are.
  size_t ReadSharedType(std::span<const XmlElement> elements) {
    const std::string name = TextAttribute(elements[0], "name");
    if (name.empty()) throw BadXml("<DataType> without name");
    if (WidthOf(name)) throw BadXml("<DataType>: " + name + " is a word of its own");
    if (own_types_.contains(name)) throw BadXml("<DataType>: " + name + " is defined twice");
    const auto ends = [&](const XmlElement& element) {
      return element.name != "DataType" || TextAttribute(element, "name") != name;
    };
    const auto end = std::ranges::find_if(elements, ends);
    const auto count = static_cast<size_t>(end - elements.begin());
    const NvTypePtr type = MakeType(name, elements.first(count), false);
    own_types_[name] = type;
    file_.types.push_back(type);
    return count;
  }

  NvTypePtr MakeType(const std::string& name, std::span<const XmlElement> elements, bool variable_size) {
    if (elements.size() > kMostForms) throw BadXml(name + " has too many forms");
    std::vector<NvForm> forms;
    std::set<std::optional<uint64_t>> selectors;
    for (const XmlElement& element : elements) {
      if (element.name != "DataType")
        throw BadXml("<" + element.name + "> is not expected in the place of a <DataType>");
      variable_size = variable_size || FlagAttribute(element, "variableSize");
      forms.push_back(ReadForm(element));
      const NvForm& form = forms.back();
      const NvMember& first = form.members[0];
      const NvMember& expected = forms[0].members[0];
      if (elements.size() > 1 &&
          (first.count != 1 || first.width != expected.width || first.is_signed != expected.is_signed)) {
        throw BadXml("the forms of " + name + " begin with different members");
      }
      if (form.selector && first.width < 8 && *form.selector >> 8 * first.width != 0) {
        throw BadXml("the first member of " + name + " never is " + std::to_string(*form.selector));
      }
      if (!selectors.insert(form.selector).second) throw BadXml("two forms of " + name + " have the same variantType");
    }
    return std::make_shared<NvDataType>(name, std::move(forms), variable_size);
  }

  NvForm ReadForm(const XmlElement& element) {
    NvForm form;
    form.selector = NumberAttribute(element, "variantType", UINT64_MAX);
    size_t size = 0;
    for (const XmlElement& member : element.children) {
      if (member.name != "Member") throw BadXml("<" + member.name + "> is not expected in <DataType>");
      AppendMember(member, form.members, size);
    }
    if (form.members.empty()) throw BadXml("<DataType> without members");
    if (form.selector && form.members[0].count != 1) throw BadXml("a variantType needs a first member of one element");
    return form;
  }

  void AppendMember(const XmlElement& element, std::vector<NvMember>& members, size_t& size) {
    const std::string type_name = TextAttribute(element, "typeid");
    const auto count = static_cast<uint32_t>(NumberAttribute(element, "num_of_element", kLongestValue).value_or(1));
    const std::string name = TextAttribute(element, "name");
    if (count == 0) throw BadXml("<Member name=\"" + name + "\"> of no element");
    if (const auto width = WidthOf(type_name)) {
      Append(members, size, {name, *width, FlagAttribute(element, "signed"), count});
      return;
    }
    const NvTypePtr type = FindType(type_name);
    if (type == nullptr) {
      throw BadXml("Unsupported NV dataType. Should be word8, word16, word32, or word64: " + type_name);
    }
    if (type->forms().size() != 1 || type->forms()[0].selector || type->variable_size()) {
      throw BadXml(type_name + " has forms or a variable size, and cannot be a member's type");
    }
    for (uint32_t i = 0; i < count; ++i) {
      const std::string prefix = count > 1 ? name + "[" + std::to_string(i) + "]." : name + ".";
      for (const NvMember& inner : type->forms()[0].members) {
        Append(members, size, {prefix + inner.name, inner.width, inner.is_signed, inner.count});
      }
    }
  }

  void Append(std::vector<NvMember>& members, size_t& size, NvMember member) {
    size += member.size();
    if (size > kLongestValue) throw BadXml("a data type of more than " + std::to_string(kLongestValue) + " bytes");
    if (member.name.size() > kLongestMemberName)
      throw BadXml("a member's name of more than " + std::to_string(kLongestMemberName) + " bytes");
    name_bytes_ += member.name.size();
    if (++member_count_ > kMostMembers || name_bytes_ > kMostNameBytes) throw BadXml("too many members");
    members.push_back(std::move(member));
  }

  // --- Items ---------------------------------------------------------------------------------------------------------

  NvItem ReadItem(const XmlElement& element) {
    NvItem item;
    if (element.name == "NvItem") {
      item.id = static_cast<uint16_t>(RequiredNumber(element, "id", UINT16_MAX));
    } else {
      item.path = TextAttribute(element, "fullpathname");
      if (item.path.empty() || item.path.size() > kLongestPath) throw BadXml("<NvEfsItem> without fullpathname");
      item.id = RfIdOfPath(item.path);
    }
    item.name = TextAttribute(element, "name");
    item.version = TextAttribute(element, "version");
    item.compressed = FlagAttribute(element, "compressed");
    item.max_index = static_cast<uint16_t>(NumberAttribute(element, "maxIndex", kHighestElement).value_or(0));
    item.type = ReadTypeOfItem(element, item);
    CheckSize(item);
    return item;
  }

  NvTypePtr ReadTypeOfItem(const XmlElement& element, const NvItem& item) {
    const std::string* shared = element.Attribute("typeid");
    if ((shared != nullptr) != element.children.empty()) {
      throw BadXml(item.Title() + " needs either a typeid or a <DataType>");
    }
    if (shared != nullptr) {
      NvTypePtr type = FindType(*shared);
      if (type == nullptr) throw BadXml(item.Title() + ": there is no data type " + *shared);
      return type;
    }
    return MakeType("", element.children, FlagAttribute(element, "variableSize"));
  }

  static void CheckSize(const NvItem& item) {
    if (item.is_file() && item.is_array()) throw BadXml(item.Title() + " is a file and has no maxIndex");
    // How much a compressed value takes is known when there is one.
    if (item.compressed) return;
    size_t room = kLongestValue;
    if (item.is_file() && item.id) room = kRfDataSize;
    if (!item.is_file()) room = item.is_array() ? kDataSize - 1 : kDataSize;
    if (item.type->longest() > room) {
      throw BadXml(item.Title() + " has a data type of more than " + std::to_string(room) + " bytes");
    }
  }

  const NvDefinitions& known_;
  NvDefinitionFile& file_;
  std::unordered_map<std::string, NvTypePtr> own_types_;
  size_t member_count_ = 0;
  size_t name_bytes_ = 0;
};

std::string FormText(const NvDataType& type, const NvForm& form) {
  std::string text = "<DataType";
  if (!type.name().empty()) text += AttributeText("name", type.name());
  if (form.selector) text += AttributeText("variantType", std::to_string(*form.selector));
  if (type.variable_size()) text += AttributeText("variableSize", "1");
  text += ">";
  for (const NvMember& member : form.members) {
    text += "<Member" + AttributeText("name", member.name) +
            AttributeText("typeid", "word" + std::to_string(8 * member.width));
    if (member.is_signed) text += AttributeText("signed", "1");
    if (member.count != 1) text += AttributeText("num_of_element", std::to_string(member.count));
    text += "/>";
  }
  return text + "</DataType>";
}

}  // namespace

NvError ReadDefinitions(const XmlElement& root, NvDefinitionKind kind, const NvDefinitions& known,
                        NvDefinitionFile& file, std::string& problem) {
  try {
    NvDefinitionFile read;
    Reader(known, read).Read(root, kind);
    file = std::move(read);
    return NvError::kNone;
  } catch (const BadXml& bad) {
    problem = bad.what();
    return NvError::kBadDefinition;
  }
}

NvError LoadDefinitionFile(const std::string& path, NvDefinitionKind kind, const NvDefinitions& known,
                           NvDefinitionFile& file, std::string& problem) {
  XmlElement root;
  switch (LoadXml(path, root, problem)) {
    case XmlResult::kNoParser:
      return NvError::kNoXmlParser;
    case XmlResult::kMalformed:
      return NvError::kCannotLoadDefinition;
    case XmlResult::kOk:
      break;
  }
  return ReadDefinitions(root, kind, known, file, problem);
}

std::string DataTypeText(const NvDataType& type) {
  std::string text;
  for (const NvForm& form : type.forms()) text += FormText(type, form);
  return text;
}

std::string DefinitionText(const NvItem& item) {
  const char* const element = item.is_file() ? "NvEfsItem" : "NvItem";
  std::string text("<");
  text += element;
  text += item.is_file() ? AttributeText("fullpathname", item.path) : AttributeText("id", std::to_string(*item.id));
  text += AttributeText("name", item.name);
  if (!item.version.empty()) text += AttributeText("version", item.version);
  if (item.is_array()) text += AttributeText("maxIndex", std::to_string(item.max_index));
  if (item.compressed) text += AttributeText("compressed", "1");
  const NvDataType unnamed("", item.type->forms(), item.type->variable_size());
  return text + ">" + DataTypeText(unnamed) + "</" + element + ">";
}

}  // namespace kral::nv
