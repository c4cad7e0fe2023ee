// Reads definition files: families, commands, records and enumerations. A file that contradicts itself is refused as a
// whole.
#include "commands/defined/definition_xml.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <iterator>
#include <set>
#include <utility>

#include "base/diag_packet.h"
#include "commands/defined/field_xml.h"

namespace kral::defined {
namespace {

constexpr size_t kMostCommands = 65536;
constexpr size_t kLongestHeader = 16;   // more than any frame puts in front of the fields
constexpr size_t kLongestReply = 4091;  // with what the frame puts in front: longer ones are dropped when they come

std::string RequiredText(const XmlElement& element, const char* name) {
  const std::string* const text = element.Attribute(name);
  if (text == nullptr) throw BadXml("<" + element.name + "> without " + name);
  return *text;
}

class Reader {
 public:
  Reader(FileContext& file, const Definitions& known, std::vector<CommandPtr>& commands)
      : file_(file), known_(known), commands_(commands) {}

  void Read(const XmlElement& root) {
    file_.at = &root;
    if (root.name != "CommandDefinition") throw BadXml("the root element is <" + root.name + ">");
    RefuseForm(root);
    ForEach(root, "Enumeration", [&](const XmlElement& element) { ReadEnumeration(element); });
    ForEach(root, "Record", [&](const XmlElement& element) { NameRecord(element); });
    ForEach(root, "Record", [&](const XmlElement& element) { TryRecord(element); });
    ForEach(root, "Family", [&](const XmlElement& element) { ReadFamily(element); });
    for (const XmlElement& element : root.children) {
      file_.at = &element;
      if (element.name != "Enumeration" && element.name != "Record" && element.name != "Family") {
        throw BadXml("<" + element.name + "> is not expected in <CommandDefinition>");
      }
    }
  }

 private:
  // The root may name a schema.
  static void RefuseForm(const XmlElement& root) {
    XmlElement form;
    form.name = root.name;
    form.text = root.text;
    std::ranges::copy_if(root.attributes, std::back_inserter(form.attributes), [](const auto& attribute) {
      return !attribute.first.starts_with("xmlns") && !attribute.first.starts_with("xsi:");
    });
    RefuseOthers(form, {});
  }

  template <class Visit>
  void ForEach(const XmlElement& parent, std::string_view name, Visit visit) {
    for (const XmlElement& element : parent.children) {
      file_.at = &element;
      if (element.name == name) visit(element);
    }
  }

  // --- What families share ------------------------------------------------------------------------------------------

  void ReadEnumeration(const XmlElement& element) {
    RefuseOthers(element, {"name"});
    const std::string name = RequiredText(element, "name");
    RequireName(element, name, false);
    auto enumeration = std::make_shared<Enumeration>();
    Field widest;  // of either sign
    widest.width = 8;
    for (const XmlElement& value : element.children) {
      file_.at = &value;
      if (value.name != "Value") throw BadXml("<" + value.name + "> is not expected in <Enumeration>");
      RefuseOthers(value, {"name", "value"});
      RefuseInside(value);
      const std::string word = RequiredText(value, "name");
      if (word.empty() || word.find_first_of(" \t\r\n,=\"") != std::string::npos) {
        throw BadXml("<Value>: name=\"" + word + "\" is empty, or has a blank, comma, quotation mark or =");
      }
      const std::string number = RequiredText(value, "value");
      widest.kind = number.starts_with('-') ? Kind::kSigned : Kind::kUnsigned;
      const auto bits = ParseNumber(widest, number);
      if (!bits) throw BadXml("<Value>: value=\"" + number + "\" is no whole number");
      if (ParseNumber(widest, word)) throw BadXml("<Value>: name=\"" + word + "\" is a number");
      if (enumeration->Find(word) != nullptr) throw Twice(name, "values", word);
      enumeration->values.emplace_back(word, *bits);
    }
    if (!file_.enumerations.emplace(name, std::move(enumeration)).second) {
      throw BadXml("there are two enumerations of the name " + name);
    }
  }

  void NameRecord(const XmlElement& element) {
    RefuseOthers(element, {"name"});
    const std::string name = RequiredText(element, "name");
    RequireName(element, name, false);
    if (IsType(name)) throw BadXml("<Record>: " + name + " is a type");
    if (!file_.records.emplace(name, &element).second) throw BadXml("there are two records of the name " + name);
  }

  // A record that no command uses may still contradict itself.
  void TryRecord(const XmlElement& element) {
    if (element.children.empty()) throw BadXml("a record without fields");
    XmlElement use;
    use.children.resize(1);
    use.children[0].name = "Field";
    use.children[0].attributes = {{"name", "record"}, {"type", TextAttribute(element, "name")}};
    Message message;
    try {
      FieldReader(file_, message).Read(use);
    } catch (const BadXml&) {
      if (file_.at == &use || file_.at == &use.children[0]) file_.at = &element;
      throw;
    }
    file_.at = &element;
  }

  // --- Families -----------------------------------------------------------------------------------------------------

  void ReadFamily(const XmlElement& element) {
    RefuseOthers(element, {"name", "frame", "mode", "header", "subsystem", "order"});
    const std::string family = RequiredText(element, "name");
    RequireName(element, family, false);
    if (!families_.insert(family).second) throw BadXml("there are two families of the name " + family);
    const std::string order = TextAttribute(element, "order");
    if (!order.empty() && order != "big" && order != "little") {
      throw BadXml(family + ": order=\"" + order + "\" is neither big nor little");
    }
    const Framing framing = ReadFraming(element, family);
    std::set<std::string> names;
    for (const XmlElement& child : element.children) {
      file_.at = &child;
      file_.big_endian = order == "big";
      if (child.name != "Command") throw BadXml("<" + child.name + "> is not expected in <Family>");
      RefuseOthers(child, {"name", "id", "mode", "doc"});
      const std::string name = RequiredText(child, "name");
      RequireName(child, name, true);
      if (!names.insert(name).second) throw Twice(family, "commands", name);
      const std::string full_name = FullName(family, name);
      if (known_.Find(full_name)) throw BadXml(full_name + " is defined already");
      if (commands_.size() == kMostCommands) throw BadXml("too many commands");
      commands_.push_back(ReadCommand(child, full_name, framing));
    }
  }

  static BadXml Twice(const std::string& owner, const char* things, const std::string& name) {
    return BadXml(owner + " has two " + things + " of the name " + name);
  }
  static std::string FullName(const std::string& family, const std::string& name) { return family + "." + name; }

  static Framing ReadFraming(const XmlElement& element, const std::string& family) {
    const std::string frame = RequiredText(element, "frame");
    Framing framing;
    if (frame == "ftm") {
      ReadMode(element, family, framing);
    } else if (frame == "ftm59") {
      framing.frame = Frame::kFtmLegacy;
    } else if (frame == "diag") {
      framing.frame = Frame::kDiagnostic;
    } else if (frame == "subsystem") {
      framing.frame = Frame::kSubsystem;
      framing.subsystem = static_cast<uint8_t>(RequiredNumber(element, "subsystem", UINT8_MAX));
    } else {
      throw BadXml(family + ": frame=\"" + frame + "\" is none of ftm, ftm59, diag, subsystem");
    }
    const auto only_for = [&](const char* attribute, Frame wanted) {
      if (framing.frame != wanted && element.Attribute(attribute) != nullptr) {
        throw BadXml(family + ": frame=\"" + frame + "\" has no " + attribute);
      }
    };
    only_for("mode", Frame::kFtm);
    only_for("header", Frame::kFtm);
    only_for("subsystem", Frame::kSubsystem);
    return framing;
  }

  static void ReadMode(const XmlElement& element, const std::string& family, Framing& framing) {
    const std::string mode = RequiredText(element, "mode");
    if (mode == "current") {
      framing.mode_rule = ModeRule::kCurrent;
    } else {
      framing.mode_id = static_cast<uint16_t>(RequiredNumber(element, "mode", UINT16_MAX));
    }
    const std::string header = TextAttribute(element, "header");
    if (header == "extended") {
      framing.header = ftm::HeaderForm::kExtended;
    } else if (header == "pmic") {
      framing.header = ftm::HeaderForm::kPmic;
    } else if (!header.empty() && header != "plain") {
      throw BadXml(family + ": header=\"" + header + "\" is none of plain, extended, pmic");
    }
  }

  CommandPtr ReadCommand(const XmlElement& element, const std::string& name, const Framing& framing) {
    auto command = std::make_shared<Command>();
    command->name = name;
    command->documentation = TextAttribute(element, "doc");
    command->framing = framing;
    const uint64_t highest = framing.frame == Frame::kDiagnostic ? UINT8_MAX : UINT16_MAX;
    command->id = static_cast<uint16_t>(RequiredNumber(element, "id", highest));
    if (TextAttribute(element, "mode") == "by_rf_mode") {
      if (framing.mode_rule != ModeRule::kCurrent) throw BadXml(name + ": the family has a mode id of its own");
      command->framing.mode_rule = ModeRule::kByRfMode;
    } else if (element.Attribute("mode") != nullptr) {
      throw BadXml(name + ": mode=\"" + TextAttribute(element, "mode") + "\" is not by_rf_mode");
    }
    ReadMessages(element, *command);
    file_.at = &element;
    CheckMessages(*command);
    return command;
  }

  void ReadMessages(const XmlElement& element, Command& command) {
    bool has_request = false;
    bool has_reply = false;
    for (const XmlElement& child : element.children) {
      file_.at = &child;
      const bool is_request = child.name == "Request";
      if (!is_request && child.name != "Reply") throw BadXml("<" + child.name + "> is not expected in <Command>");
      if (std::exchange(is_request ? has_request : has_reply, true)) {
        throw BadXml(command.name + " has two elements <" + child.name + ">");
      }
      FieldReader(file_, is_request ? command.request : command.reply).Read(child);
    }
    command.reply.is_open = command.reply.is_open || !has_reply;
  }

  // What stands in front of the fields of a reply, at least.
  static size_t HeaderSize(const Framing& framing) {
    constexpr std::array<size_t, 4> kSizes = {6, 7, 1, 4};
    return kSizes[static_cast<size_t>(framing.frame)];
  }

  static void CheckMessages(const Command& command) {
    constexpr size_t kRoom = CDiagPacket::kCapacity - kLongestHeader;
    if (command.request.shortest > kRoom) {
      throw BadXml(command.name + " has a request of more than " + std::to_string(kRoom) + " bytes");
    }
    const size_t reply = HeaderSize(command.framing) + command.reply.shortest;
    if (reply > kLongestReply) {
      throw BadXml(command.name + " has a reply of " + std::to_string(reply) + " bytes: none of more than " +
                   std::to_string(kLongestReply) + " is received");
    }
    const auto is_status = [](const Field* field) { return field->is_status(); };
    if (std::ranges::any_of(command.request.slots, is_status))
      throw BadXml(command.name + " has a status in its request");
    if (std::ranges::count_if(command.reply.slots, is_status) > 1)
      throw BadXml(command.name + " has two status fields");
    if (command.framing.mode_rule != ModeRule::kByRfMode) return;
    const auto& fields = command.request.fields;
    if (fields.empty() || fields[0].kind != Kind::kUnsigned || fields[0].width != 2 || fields[0].is_array) {
      throw BadXml(command.name + ": by_rf_mode needs an RF mode, u16, as the first field");
    }
  }

  FileContext& file_;
  const Definitions& known_;
  std::vector<CommandPtr>& commands_;
  std::set<std::string> families_;
};

// Texts of parsers begin with the line where they know it.
uint32_t LineOfFault(std::string_view text) {
  constexpr std::string_view kLine = "line ";
  uint32_t line = 0;
  if (text.starts_with(kLine)) std::from_chars(text.data() + kLine.size(), text.data() + text.size(), line);
  return line;
}

}  // namespace

bool ReadDefinitions(std::span<const uint8_t> document, const Definitions& known, std::vector<CommandPtr>& commands,
                     Problem& problem) {
  XmlElement root;
  if (ParseXml(document, root, problem.text) != XmlResult::kOk) {
    problem.line = LineOfFault(problem.text);
    return false;
  }
  FileContext file;
  try {
    std::vector<CommandPtr> read;
    Reader(file, known, read).Read(root);
    commands = std::move(read);
    return true;
  } catch (const BadXml& bad) {
    problem.line = LineOf(document, root, *file.at);
    problem.text = problem.line != 0 ? "line " + std::to_string(problem.line) + ": " + bad.what() : bad.what();
    return false;
  }
}

}  // namespace kral::defined
